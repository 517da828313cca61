#include "mixed/table.hpp"

#include <fmt/core.h>
#include <sys/stat.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <unordered_map>

#include "mixed/csv.hpp"
#include "mixed/error.hpp"
#include "mixed/words.hpp"

namespace sm::mixed {
namespace {

constexpr double kMissing = std::numeric_limits<double>::quiet_NaN();

struct TextHash {
  using is_transparent = void;
  std::size_t operator()(std::string_view text) const { return std::hash<std::string_view>{}(text); }
};

// A column while it is read: numbers until a cell is none.
class ColumnBuilder {
 public:
  ColumnBuilder(std::string name, bool numeric) {
    column_.name = std::move(name);
    column_.numeric = numeric;
  }

  // False when the cells before this one were taken for numbers, and lost what they looked like.
  bool add(std::string_view cell) {
    if (is_missing(cell)) {
      ++column_.missing;
      if (column_.numeric) {
        column_.number.push_back(kMissing);
      } else {
        column_.code.push_back(-1);
      }
      return true;
    }
    double value = 0.0;
    if (column_.numeric) {
      if (parse_number(cell, value)) {
        column_.number.push_back(value);
        column_.plain = column_.plain && is_plain_integer(cell);
        return true;
      }
      if (static_cast<std::int64_t>(column_.number.size()) != column_.missing) return false;
      column_.numeric = false;
      column_.code.assign(column_.number.size(), -1);
      column_.number = {};
    }
    column_.code.push_back(code_of(cell));
    return true;
  }

  const std::string& name() const { return column_.name; }
  Column finish() {
    column_.plain = column_.plain && column_.numeric;
    return std::move(column_);
  }

 private:
  std::int32_t code_of(std::string_view cell) {
    const auto known = codes_.find(cell);
    if (known != codes_.end()) return known->second;
    const auto code = static_cast<std::int32_t>(column_.labels.size());
    column_.labels.emplace_back(cell);
    codes_.emplace(column_.labels.back(), code);
    return code;
  }

  Column column_;
  std::unordered_map<std::string, std::int32_t, TextHash, std::equal_to<>> codes_;
};

std::string advice_for_unnamed(bool last) {
  return last ? "name it, or take away the delimiter at the end of the lines"
              : "name it (or write the table without row names)";
}

class TableLoader {
 public:
  TableLoader(const std::string& name, char delimiter) : name_(name), delimiter_(delimiter) {}

  std::vector<Column> load(std::string_view text) {
    // A column whose first cells are numbers and a later one is not is read once more, as text.
    do {
      again_ = false;
      names_.clear();
      rows_ = 0;
      scan_csv(text, name_, delimiter_, [this](const CsvRow& row) { return take(row); });
    } while (again_);
    if (names_.empty() || rows_ == 0) no_rows();
    std::vector<Column> columns;
    columns.reserve(builders_.size());
    for (ColumnBuilder& builder : builders_) columns.push_back(builder.finish());
    return columns;
  }
  std::int64_t rows() const { return rows_; }

 private:
  bool take(const CsvRow& row) {
    if (names_.empty()) {
      take_header(row);
      return true;
    }
    if (row.fields.size() != builders_.size()) ragged(row);
    for (std::size_t c = 0; c < builders_.size(); ++c) {
      if (text_[c] == 2) continue;
      if (!builders_[c].add(row.fields[c])) {
        text_[c] = 2;
        again_ = true;
      }
    }
    ++rows_;
    return true;
  }

  void take_header(const CsvRow& row) {
    refuse_numbers(row);
    for (std::size_t c = 0; c < row.fields.size(); ++c) {
      const std::string_view name = row.fields[c];
      const auto same = std::find(names_.begin(), names_.end(), name);
      if (name.empty() || same != names_.end()) {
        const CsvPlace place = place_of_field(row, delimiter_, c);
        throw ModelError({.file = name_,
                          .line = place.line,
                          .column = place.column,
                          .variable = std::string(name),
                          .what = name.empty() ? fmt::format("column {} has no name", c + 1)
                                               : fmt::format("columns {} and {} have the same name",
                                                             same - names_.begin() + 1, c + 1),
                          .expected = "a header line with a name of its own for each column",
                          .advice = name.empty() ? advice_for_unnamed(c + 1 == row.fields.size()) : "rename one"});
      }
      names_.emplace_back(name);
    }
    text_.resize(names_.size(), 0);
    builders_.clear();
    for (std::size_t c = 0; c < names_.size(); ++c) {
      text_[c] = text_[c] != 0;
      builders_.emplace_back(names_[c], text_[c] == 0);
    }
  }

  // Data without names, before two equal numbers are taken for two columns of the same name.
  void refuse_numbers(const CsvRow& row) const {
    double value = 0.0;
    std::size_t numbers = 0;
    for (const std::string_view field : row.fields) {
      if (parse_number(field, value)) ++numbers;
      if (!parse_number(field, value) && !is_missing(field)) return;
    }
    if (numbers == 0) return;
    throw ModelError({.file = name_,
                      .line = row.line,
                      .column = 1,
                      .what = "found nothing but numbers in the first line",
                      .expected = "the names of the columns",
                      .advice = "put a header line above the data"});
  }

  // What a row with more fields than the header may mean.
  std::string advice_for_more(const CsvRow& row) const {
    if (names_.size() == 1) return "if the first line is a title, take it away";
    const auto digits = [](std::string_view text) {
      return !text.empty() && text.find_first_not_of("0123456789") == std::string_view::npos;
    };
    for (std::size_t i = 0; delimiter_ == ',' && i + 1 < row.fields.size(); ++i) {
      const std::string_view whole = row.fields[i];
      if (!digits(whole.starts_with('-') ? whole.substr(1) : whole) || !digits(row.fields[i + 1])) continue;
      return fmt::format("if {},{} is one number, write it with a decimal point: {}.{}", whole, row.fields[i + 1],
                         whole, row.fields[i + 1]);
    }
    return "put a field that holds the delimiter in quotes";
  }

  [[noreturn]] void ragged(const CsvRow& row) const {
    const std::size_t wanted = builders_.size();
    const CsvPlace place = place_of_field(row, delimiter_, std::min(row.fields.size(), wanted));
    const bool few = row.fields.size() < wanted;
    throw ModelError({.file = name_,
                      .line = place.line,
                      .column = place.column,
                      .variable = few ? names_[row.fields.size()] : "",
                      .what = fmt::format("found {}", count_of(static_cast<std::int64_t>(row.fields.size()), "field")),
                      .expected = fmt::format("{} as in the header", wanted),
                      .advice = few ? "write NA for a value that is missing" : advice_for_more(row)});
  }

  [[noreturn]] void no_rows() const {
    const bool nothing = names_.empty();
    throw ModelError({.file = name_,
                      .line = 1,
                      .what = nothing ? "the file is empty" : "there is no row of data below the header",
                      .expected = "a header line and at least one row",
                      .advice = "check that this is the file you mean"});
  }

  const std::string& name_;
  char delimiter_;
  std::vector<std::string> names_;
  std::vector<ColumnBuilder> builders_;
  std::vector<char> text_;  // by column: 0 numbers as far as is known, 1 read as text, 2 to be read again as text
  std::int64_t rows_ = 0;
  bool again_ = false;
};

bool can_be_read_again(const std::string& path) {
  struct stat status {};
  return path != "-" && ::stat(path.c_str(), &status) == 0 && S_ISREG(status.st_mode);
}

}  // namespace

bool is_missing(std::string_view cell) { return cell.empty() || cell == "." || cell == "NA"; }

bool Column::missing_at(std::int64_t row) const {
  const auto at = static_cast<std::size_t>(row);
  return numeric ? std::isnan(number[at]) : code[at] < 0;
}

Table Table::read(const std::string& path) {
  Table table;
  table.name_ = path;
  std::string text = read_text(path);
  table.load(text);
  if (!can_be_read_again(path)) table.text_ = std::make_shared<const std::string>(std::move(text));
  return table;
}

Table Table::parse(std::string text, const std::string& name) {
  Table table;
  table.name_ = name;
  table.load(text);
  table.text_ = std::make_shared<const std::string>(std::move(text));
  return table;
}

void Table::load(std::string_view text) {
  delimiter_ = sniff_delimiter(text);
  TableLoader loader(name_, delimiter_);
  columns_ = loader.load(text);
  rows_ = loader.rows();
}

const Column* Table::find(std::string_view name) const {
  const auto found = std::find_if(columns_.begin(), columns_.end(), [&](const Column& c) { return c.name == name; });
  return found == columns_.end() ? nullptr : &*found;
}

std::vector<std::string> Table::column_names() const {
  std::vector<std::string> names;
  for (const Column& column : columns_) names.push_back(column.name);
  return names;
}

std::vector<Cell> Table::cells(const Column& column, std::span<const std::int64_t> rows) const {
  std::vector<Cell> found;
  if (rows.empty()) return found;
  const auto index = static_cast<std::size_t>(&column - columns_.data());
  const std::string again = text_ ? std::string() : read_text(name_);
  std::int64_t row = -1;  // the header
  scan_csv(text_ ? *text_ : again, name_, delimiter_, [&](const CsvRow& line) {
    if (row++ != rows[found.size()] || index >= line.fields.size()) return true;
    const CsvPlace place = place_of_field(line, delimiter_, index);
    found.push_back({.line = place.line, .column = place.column, .text = std::string(line.fields[index])});
    return found.size() < rows.size();
  });
  // The file was changed meanwhile: better no place than a wrong one.
  found.resize(rows.size());
  return found;
}

}  // namespace sm::mixed
