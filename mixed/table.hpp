// A table of data: columns of numbers, and columns of text by dictionary.
#pragma once

#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace sm::mixed {

// NA, a point and nothing at all are missing values.
bool is_missing(std::string_view cell);

// Numeric when every cell that is not missing is a number; a column without any cell is that too.
struct Column {
  std::string name;
  bool numeric = true;
  bool plain = true;                // of numbers: all are integers as they are printed, so that a number is its text
  std::vector<double> number;       // NaN where missing; empty for text
  std::vector<std::int32_t> code;   // of text: place in `labels`, -1 where missing
  std::vector<std::string> labels;  // the distinct cells, in order of appearance
  std::int64_t missing = 0;

  bool missing_at(std::int64_t row) const;
};

// One cell as it stands in the file.
struct Cell {
  std::int64_t line = 0;
  std::int64_t column = 0;  // in characters, from 1
  std::string text;
};

class Table {
 public:
  // CSV or TSV with a header line; "-" is standard input. Throws ModelError with the place of what is wrong.
  static Table read(const std::string& path);
  static Table parse(std::string text, const std::string& name);

  const std::string& name() const { return name_; }
  std::int64_t rows() const { return rows_; }
  const std::vector<Column>& columns() const { return columns_; }
  const Column* find(std::string_view name) const;  // null when there is none
  std::vector<std::string> column_names() const;

  // Some cells of a column, for messages and for labels; `rows` ascend. Reads the file again.
  std::vector<Cell> cells(const Column& column, std::span<const std::int64_t> rows) const;
  Cell cell(const Column& column, std::int64_t row) const { return cells(column, {&row, 1}).front(); }

 private:
  void load(std::string_view text);

  std::string name_;
  std::shared_ptr<const std::string> text_;  // kept only where it cannot be read again
  char delimiter_ = ',';
  std::int64_t rows_ = 0;
  std::vector<Column> columns_;
};

}  // namespace sm::mixed
