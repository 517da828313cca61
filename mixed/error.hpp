// What is wrong with a table, a formula or a model, in the words of the person who wrote it.
#pragma once

#include <cstdint>
#include <exception>
#include <string>

namespace sm::mixed {

struct Fault {
  std::string file{};       // empty: not about a file
  std::int64_t line = 0;    // of the file, from 1; 0: not about a line
  std::int64_t column = 0;  // character of the line or of the formula, from 1; 0: not about a place in it
  std::string variable{};   // the column of the table, the term of the formula; may be empty
  std::string what{};       // what was found, as a clause
  std::string expected{};   // what should have been there; may be empty
  std::string advice{};     // what to do next
  std::string excerpt{};    // lines to show below it: a formula, and a caret under the place; may be empty
};

// "milk.csv:17:9: 'yield': found "12,5", expected a number; write a decimal point"
std::string describe(const Fault& fault);

// Thrown for whatever the user can mend: data, formula, model. Failures of the module or of memory are not these.
class ModelError : public std::exception {
 public:
  explicit ModelError(Fault fault) : fault_(std::move(fault)), text_(describe(fault_)) {}
  const Fault& fault() const { return fault_; }
  const char* what() const noexcept override { return text_.c_str(); }

 private:
  Fault fault_;
  std::string text_;
};

}  // namespace sm::mixed
