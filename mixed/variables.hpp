// The variables of terms over the rows of a table: numbers, and factors with their levels in order.
#pragma once

#include <map>
#include <string>
#include <utility>
#include <vector>

#include "mixed/coding.hpp"
#include "mixed/design.hpp"
#include "mixed/frame.hpp"

namespace sm::mixed {

class Variables {
 public:
  Variables(const Frame& frame, const std::string& formula, const DesignOptions& options);

  bool is_factor(const Column& column) const;

  // What a list of terms is made of. A variable that has been met before is not made again.
  struct Made {
    std::vector<CodedVariable> coded;
    CodedData data;
  };
  Made make(const TermList& list);

  // A column as a factor, with its levels in order; text that was never meant as levels is not refused.
  const Factor& factor(const Node& name);

  // A column that must be numbers: a factor by option is refused.
  void expect_numbers(const Node& expression, const std::string& label) const;

  std::vector<std::string>& notes() { return notes_; }

 private:
  void note_twins(const Column& column, const std::vector<std::string>& levels);
  void order_levels(const Column& column, Factor& factor);
  std::vector<std::string> given_levels(const Column& column, const Factor& factor);

  const Frame& frame_;
  const std::string& formula_;
  const DesignOptions& options_;
  std::map<std::string, Factor> factors_;
  std::vector<std::string> notes_;
};

}  // namespace sm::mixed
