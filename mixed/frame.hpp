// The rows of a table that a model uses, and its columns over these rows.
#pragma once

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "mixed/syntax.hpp"
#include "mixed/table.hpp"

namespace sm::mixed {

enum class MissingValues { drop, fail };

// A column as levels: which one each row has.
struct Factor {
  std::vector<std::string> levels;
  std::vector<std::int32_t> code;
};

// Bytewise, or as numbers when all are integers.
void sort_levels(std::vector<std::string>& levels);

class Frame {
 public:
  Frame(const Table& table, std::string formula) : table_(table), formula_(std::move(formula)) {}

  const Table& table() const { return table_; }
  const std::vector<std::int64_t>& rows() const { return rows_; }  // of the table, ascending
  std::size_t size() const { return rows_.size(); }

  // The column that a name of the formula means (or an option, with place 0); its missing values will count.
  const Column& use(const Node& name);
  // The same without that.
  const Column& column(const Node& name) const;

  // Takes the rows without a missing value in any column that is used. What each of them lacks is counted.
  void take_rows(MissingValues policy);
  const std::vector<std::pair<std::string, std::int64_t>>& missing() const { return missing_; }

  // Goes on with those of the rows for which `keep` holds.
  void keep_rows(const std::vector<char>& keep);

  // The values of an expression, which must be finite. Throws ModelError at the cell where one is not.
  std::vector<double> numbers(const Node& expression, const std::string& label) const;

  // A column by its distinct cells among the rows; of numbers, by their distinct values, as first written. In order of
  // appearance of text, in order of values of numbers.
  Factor distinct(const Column& column) const;

  // A cell by its place among the rows.
  Cell cell(const Column& column, std::size_t place) const { return table_.cell(column, rows_[place]); }

  // Refuses a text column in which nearly all cells are numbers: it is one with a slip, not a factor.
  void refuse_slip(const Column& column) const;

 private:
  std::vector<double> column_numbers(const Node& name) const;
  void take_labels(const Column& column, const std::vector<std::size_t>& first, Factor& factor) const;
  [[noreturn]] void not_a_number(const Column& column, const std::string& advice) const;

  const Table& table_;
  std::string formula_;
  std::vector<const Column*> used_;
  std::vector<std::int64_t> rows_;
  std::vector<std::pair<std::string, std::int64_t>> missing_;
};

}  // namespace sm::mixed
