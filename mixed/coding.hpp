// How terms become columns: R's rules of contrasts, dummies and products, and its names of the columns.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "mixed/formula.hpp"
#include "mixed/model.hpp"

namespace sm::mixed {

enum class Contrasts { treatment, sum };

struct CodedVariable {
  std::string label{};
  Node expression{};
  bool factor = false;
  std::vector<std::string> levels{};  // of a factor

  std::int64_t level(const std::string& name) const;  // -1 when there is none
};

struct CodedTerm {
  std::string label;           // "(Intercept)", "a:b"
  std::vector<int> variables;  // places in the variables of the coding; none for the intercept
  std::vector<char> dummies;   // of each: a column for every level, instead of contrasts
  std::int64_t first = 0;      // its columns
  std::int64_t count = 1;
};

// The value of a variable in one row.
struct Setting {
  double number = 0.0;
  std::int32_t code = 0;
};

struct Coding {
  Contrasts contrasts = Contrasts::treatment;
  std::vector<CodedVariable> variables;
  std::vector<CodedTerm> terms;
  std::vector<std::string> names;  // of the columns

  std::int64_t cols() const { return static_cast<std::int64_t>(names.size()); }
};

// The values of the variables over the rows: numbers of some, codes of the others.
struct CodedData {
  std::vector<std::vector<double>> number;
  std::vector<std::vector<std::int32_t>> code;
};

struct CodedEntry {
  std::int64_t column = 0;
  double value = 0.0;
};

// `variables` are those of the list, in its order. Throws ModelError when there would be more than `most` columns.
Coding make_coding(const TermList& list, std::vector<CodedVariable> variables, Contrasts contrasts, std::int64_t most);

// The columns that are not zero where the variables have these values; they replace `entries`.
void encode(const Coding& coding, const CodedTerm& term, const std::vector<Setting>& settings,
            std::vector<CodedEntry>& entries);

SparseColumns sparse_columns(const Coding& coding, const CodedData& data, std::int64_t rows);

// rows x cols by rows.
std::vector<double> dense_rows(const Coding& coding, const CodedData& data, std::int64_t rows);

}  // namespace sm::mixed
