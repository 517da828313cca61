#include "mixed/frame.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <charconv>
#include <cmath>
#include <numeric>

#include "mixed/error.hpp"
#include "mixed/expression.hpp"
#include "mixed/formula.hpp"
#include "mixed/words.hpp"

namespace sm::mixed {
namespace {

// A column of text with this many different numbers, and hardly anything else, is one of numbers with slips in it.
constexpr std::size_t kSlipNumbers = 10;
constexpr double kSlipShare = 0.9;

bool parse_integer(const std::string& text, std::int64_t& value) {
  const auto [stop, error] = std::from_chars(text.data(), text.data() + text.size(), value);
  return error == std::errc() && stop == text.data() + text.size();
}

bool looks_like_number(std::string text) {
  double value = 0.0;
  if (parse_number(text, value)) return true;
  std::replace(text.begin(), text.end(), ',', '.');
  return parse_number(text, value);
}

std::string advice_for(const std::string& cell) {
  double value = 0.0;
  std::string decimal = cell;
  std::replace(decimal.begin(), decimal.end(), ',', '.');
  if (cell != decimal && parse_number(decimal, value)) return "write a decimal point here, and in other cells like it";
  return "correct it, or write NA if the value is missing";
}

// The column that begins with the name, "height (cm)" for height; empty unless there is one such.
std::string longer_name(const std::string& name, const std::vector<std::string>& names) {
  std::string longer;
  for (const std::string& candidate : names) {
    if (!candidate.starts_with(name)) continue;
    if (!longer.empty()) return "";
    longer = candidate;
  }
  return longer;
}

// What to do about a name that no column has.
std::string advice_for_name(const std::string& name, const std::vector<std::string>& names) {
  std::string meant = nearest_name(name, names);
  double value = 0.0;
  const auto is_number = [&](const std::string& each) { return parse_number(each, value); };
  if (meant.empty() && std::any_of(names.begin(), names.end(), is_number)) {
    return fmt::format("its first line, {}, seems to be data: put a line with the names of the columns above it",
                       listed(names, 12));
  }
  if (meant.empty() && names.size() == 1) {
    return fmt::format("its only column is {}: separate columns with commas, tabs or semicolons", quote(names[0]));
  }
  if (meant.empty()) meant = longer_name(name, names);
  if (meant.empty()) return fmt::format("its columns are {}", listed(names, 12));
  const std::string written = print_name(meant);
  return written == meant ? fmt::format("did you mean '{}'?", meant)
                          : fmt::format("did you mean '{}'? In a formula it stands in backquotes: {}", meant, written);
}

// Whole numbers that lie close together are sorted by a table of all between. False when they are not such.
bool distinct_whole_numbers(const std::vector<double>& values, Factor& factor, std::vector<std::size_t>& first) {
  if (values.empty()) return false;
  const auto [least, largest] = std::minmax_element(values.begin(), values.end());
  const double range = *largest - *least;
  if (!(range < 8.0 * static_cast<double>(values.size())) || !(std::fabs(*least) < 1e15)) return false;
  std::vector<std::size_t> seen(static_cast<std::size_t>(range) + 1, values.size());
  for (std::size_t i = values.size(); i-- > 0;) {
    const double beyond = values[i] - *least;
    if (!(beyond >= 0.0 && beyond <= range) || values[i] != std::floor(values[i])) return false;
    seen[static_cast<std::size_t>(beyond)] = i;
  }
  std::vector<std::int32_t> place(seen.size());
  for (std::size_t k = 0; k < seen.size(); ++k) {
    if (seen[k] == values.size()) continue;
    place[k] = static_cast<std::int32_t>(first.size());
    first.push_back(seen[k]);
    factor.levels.push_back(print_number(*least + static_cast<double>(k)));
  }
  factor.code.reserve(values.size());
  for (const double value : values) factor.code.push_back(place[static_cast<std::size_t>(value - *least)]);
  return true;
}

Factor distinct_numbers(const std::vector<double>& values, std::vector<std::size_t>& first) {
  if (Factor whole; distinct_whole_numbers(values, whole, first)) return whole;
  std::vector<double> sorted = values;
  std::sort(sorted.begin(), sorted.end());
  sorted.erase(std::unique(sorted.begin(), sorted.end()), sorted.end());
  Factor factor;
  factor.code.reserve(values.size());
  first.assign(sorted.size(), values.size());
  for (std::size_t i = 0; i < values.size(); ++i) {
    const auto place = std::lower_bound(sorted.begin(), sorted.end(), values[i]) - sorted.begin();
    auto& seen = first[static_cast<std::size_t>(place)];
    seen = std::min(seen, i);
    factor.code.push_back(static_cast<std::int32_t>(place));
  }
  for (const double value : sorted) factor.levels.push_back(print_number(value));
  return factor;
}

}  // namespace

void sort_levels(std::vector<std::string>& levels) {
  std::vector<std::pair<std::int64_t, std::string>> numbered;
  numbered.reserve(levels.size());
  for (const std::string& level : levels) {
    std::int64_t value = 0;
    if (!parse_integer(level, value)) break;
    numbered.emplace_back(value, level);
  }
  if (numbered.size() < levels.size()) return std::sort(levels.begin(), levels.end());
  std::sort(numbered.begin(), numbered.end());
  for (std::size_t i = 0; i < levels.size(); ++i) levels[i] = std::move(numbered[i].second);
}

const Column& Frame::column(const Node& name) const {
  const Column* const found = table_.find(name.text);
  if (found) return *found;
  const std::string what = fmt::format("{} has no column of this name", table_.name());
  const std::string advice = advice_for_name(name.text, table_.column_names());
  if (name.column == 0) throw ModelError({.variable = name.text, .what = what, .advice = advice});
  refuse_formula(formula_, {.column = name.column, .variable = name.text, .what = what, .advice = advice});
}

const Column& Frame::use(const Node& name) {
  const Column& found = column(name);
  if (std::find(used_.begin(), used_.end(), &found) == used_.end()) used_.push_back(&found);
  return found;
}

void Frame::take_rows(MissingValues policy) {
  const std::int64_t all = table_.rows();
  std::vector<char> lacks(static_cast<std::size_t>(all), 0);
  std::int64_t first_row = all;
  const Column* first_column = nullptr;
  for (const Column* column : used_) {
    if (column->missing == 0) continue;
    missing_.emplace_back(column->name, column->missing);
    for (std::int64_t row = 0; row < all; ++row) {
      if (!column->missing_at(row)) continue;
      lacks[static_cast<std::size_t>(row)] = 1;
      if (row < first_row) {
        first_row = row;
        first_column = column;
      }
    }
  }
  if (policy == MissingValues::fail && first_column) {
    const Cell cell = table_.cell(*first_column, first_row);
    throw ModelError({.file = table_.name(),
                      .line = cell.line,
                      .column = cell.column,
                      .variable = first_column->name,
                      .what = "a value is missing",
                      .expected = "none to be",
                      .advice = "complete it, or drop such rows with --na drop"});
  }
  rows_.clear();
  for (std::int64_t row = 0; row < all; ++row) {
    if (!lacks[static_cast<std::size_t>(row)]) rows_.push_back(row);
  }
  if (!rows_.empty()) return;
  std::string counts;
  for (const auto& [name, count] : missing_)
    counts += fmt::format("{}'{}' {}", counts.empty() ? "" : ", ", name, count);
  throw ModelError(
      {.file = table_.name(),
       .what = fmt::format("no observation is left: each of the {} lacks a value ({})", count_of(all, "row"), counts),
       .advice = "leave the emptiest variable out of the model"});
}

void Frame::keep_rows(const std::vector<char>& keep) {
  std::vector<std::int64_t> kept;
  for (std::size_t i = 0; i < rows_.size(); ++i) {
    if (keep[i]) kept.push_back(rows_[i]);
  }
  rows_ = std::move(kept);
}

void Frame::not_a_number(const Column& column, const std::string& advice) const {
  std::int64_t row = 0;
  double value = 0.0;
  const auto is_number = [&](std::int64_t at) {
    const std::int32_t code = column.code[static_cast<std::size_t>(at)];
    return code < 0 || parse_number(column.labels[static_cast<std::size_t>(code)], value);
  };
  while (is_number(row)) ++row;
  const Cell cell = table_.cell(column, row);
  throw ModelError({.file = table_.name(),
                    .line = cell.line,
                    .column = cell.column,
                    .variable = column.name,
                    .what = "found " + quote(cell.text),
                    .expected = "a number",
                    .advice = advice.empty() ? advice_for(cell.text) : advice_for(cell.text) + advice});
}

std::vector<double> Frame::column_numbers(const Node& name) const {
  const Column& found = column(name);
  if (!found.numeric) not_a_number(found, "");
  std::vector<double> values;
  values.reserve(rows_.size());
  for (const std::int64_t row : rows_) values.push_back(found.number[static_cast<std::size_t>(row)]);
  return values;
}

std::vector<double> Frame::numbers(const Node& expression, const std::string& label) const {
  std::vector<double> values =
      evaluate(expression, rows_.size(), [this](const Node& name) { return column_numbers(name); });
  const auto bad = std::find_if(values.begin(), values.end(), [](double value) { return !std::isfinite(value); });
  if (bad == values.end()) return values;
  const auto place = static_cast<std::size_t>(bad - values.begin());
  const auto number = [&](const Node& name) { return column(name).number[static_cast<std::size_t>(rows_[place])]; };
  const NoValue none = find_no_value(expression, number);
  Cell first;
  std::string cells;
  for (const Node* const name : names_in(*none.part)) {
    const Cell cell = this->cell(column(*name), place);
    cells += fmt::format("{} '{}' is {}", cells.empty() ? ", where" : " and", name->text, quote(cell.text));
    if (first.line == 0) first = cell;
  }
  throw ModelError({.file = table_.name(),
                    .line = first.line,
                    .column = first.column,
                    .variable = label,
                    .what = none.why + cells,
                    .expected = "a finite number",
                    .advice = "write NA for the cell, or use another expression"});
}

Factor Frame::distinct(const Column& column) const {
  Factor factor;
  if (!column.numeric) {
    std::vector<std::int32_t> renumbered(column.labels.size(), -1);
    factor.code.reserve(rows_.size());
    for (const std::int64_t row : rows_) {
      const auto code = static_cast<std::size_t>(column.code[static_cast<std::size_t>(row)]);
      if (renumbered[code] < 0) {
        renumbered[code] = static_cast<std::int32_t>(factor.levels.size());
        factor.levels.push_back(column.labels[code]);
      }
      factor.code.push_back(renumbered[code]);
    }
    return factor;
  }
  std::vector<double> values;
  values.reserve(rows_.size());
  for (const std::int64_t row : rows_) values.push_back(column.number[static_cast<std::size_t>(row)]);
  std::vector<std::size_t> first;
  factor = distinct_numbers(values, first);
  if (!column.plain) take_labels(column, first, factor);
  return factor;
}

// The text of the first cell of each level.
void Frame::take_labels(const Column& column, const std::vector<std::size_t>& first, Factor& factor) const {
  std::vector<std::size_t> by_row(first.size());
  std::iota(by_row.begin(), by_row.end(), 0);
  std::sort(by_row.begin(), by_row.end(), [&](std::size_t a, std::size_t b) { return first[a] < first[b]; });
  std::vector<std::int64_t> rows;
  rows.reserve(first.size());
  for (const std::size_t level : by_row) rows.push_back(rows_[first[level]]);
  const std::vector<Cell> cells = table_.cells(column, rows);
  for (std::size_t i = 0; i < cells.size(); ++i) factor.levels[by_row[i]] = cells[i].text;
}

void Frame::refuse_slip(const Column& column) const {
  if (column.numeric) return;
  const auto numbers =
      static_cast<std::size_t>(std::count_if(column.labels.begin(), column.labels.end(), looks_like_number));
  // With decimal commas throughout, however few of them are different.
  const bool commas = numbers == column.labels.size() &&
                      std::any_of(column.labels.begin(), column.labels.end(),
                                  [](const std::string& label) { return label.find(',') != std::string::npos; });
  if (commas) not_a_number(column, fmt::format("; if the column is a factor, name it: --factor {}", column.name));
  if (numbers < kSlipNumbers || static_cast<double>(numbers) < kSlipShare * static_cast<double>(column.labels.size())) {
    return;
  }
  not_a_number(column, fmt::format("; if the column is a factor, name it: --factor {}", column.name));
}

}  // namespace sm::mixed
