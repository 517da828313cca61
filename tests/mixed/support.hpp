// What the tests of tables, formulas and models share.
#pragma once

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "mixed/design.hpp"
#include "mixed/error.hpp"
#include "mixed/formula.hpp"
#include "mixed/table.hpp"

namespace sm::mixed::test {

inline Table table_of(const std::string& text) { return Table::parse(text, "t.csv"); }

inline Model model_of(const std::string& text, const std::string& formula, const DesignOptions& options = {}) {
  return build_model(table_of(text), parse_formula(formula), options);
}

// What a call throws as ModelError; a failure of the test when it throws nothing.
template <class Call>
Fault fault_of(Call&& call) {
  try {
    call();
  } catch (const ModelError& error) {
    return error.fault();
  }
  ADD_FAILURE() << "nothing was thrown";
  return {};
}

// Rows by columns.
inline std::vector<std::vector<double>> dense(const SparseColumns& x) {
  std::vector<std::vector<double>> rows(static_cast<std::size_t>(x.rows),
                                        std::vector<double>(static_cast<std::size_t>(x.cols()), 0.0));
  for (std::int64_t j = 0; j < x.cols(); ++j) {
    for (auto p = x.start[static_cast<std::size_t>(j)]; p < x.start[static_cast<std::size_t>(j) + 1]; ++p) {
      const auto row = static_cast<std::size_t>(x.row[static_cast<std::size_t>(p)]);
      rows[row][static_cast<std::size_t>(j)] = x.value[static_cast<std::size_t>(p)];
    }
  }
  return rows;
}

}  // namespace sm::mixed::test
