#include "mixed/pedigree_file.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <array>
#include <cctype>
#include <string_view>
#include <utility>

#include "mixed/csv.hpp"
#include "mixed/error.hpp"

namespace sm::mixed {
namespace {

constexpr std::array<std::string_view, 3> kNames{"id", "sire", "dam"};
constexpr const char* kHeading = "begin the file with a line id,sire,dam";

bool same_letters(std::string_view a, std::string_view b) {
  return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                    [](unsigned char x, unsigned char y) { return std::tolower(x) == std::tolower(y); });
}

bool is_number(std::string_view text) {
  return !text.empty() && text.find_first_not_of("0123456789") == std::string_view::npos;
}

// Takes the rows of a file as they come, the heading first.
class PedigreeReader {
 public:
  explicit PedigreeReader(const std::string& file) : file_(file) {}

  void take(const CsvRow& row) {
    if (width_ == 0) {
      take_heading(row);
      return;
    }
    if (row.fields.size() != width_) {
      throw ModelError({.file = file_,
                        .line = row.line,
                        .what = fmt::format("found {} fields", row.fields.size()),
                        .expected = fmt::format("{}, as in the heading", width_),
                        .advice = "complete the line; leave the field of an unknown parent empty"});
    }
    const auto field = [&](std::size_t i) { return std::string(row.fields[columns_[i]]); };
    rows_.push_back({field(0), field(1), field(2), row.line});
  }

  Pedigree finish() {
    if (rows_.empty()) {
      throw ModelError({.file = file_,
                        .what = "the file has no animals",
                        .expected = "a heading, and a line for each animal",
                        .advice = kHeading});
    }
    Pedigree pedigree = make_pedigree(rows_, file_);
    pedigree.notes.insert(pedigree.notes.begin(), notes_.begin(), notes_.end());
    return pedigree;
  }

 private:
  [[noreturn]] void refuse_heading(const CsvRow& row, std::string what, std::string expected) const {
    throw ModelError({.file = file_,
                      .line = row.line,
                      .what = std::move(what),
                      .expected = std::move(expected),
                      .advice = kHeading});
  }

  void take_heading(const CsvRow& row) {
    width_ = row.fields.size();
    std::size_t found = 0;
    std::size_t displaced = kNames.size();
    for (std::size_t i = 0; i < kNames.size(); ++i) {
      const auto same = [&](std::string_view field) { return same_letters(field, kNames[i]); };
      const auto column = std::find_if(row.fields.begin(), row.fields.end(), same);
      if (column == row.fields.end()) continue;
      if (std::find_if(column + 1, row.fields.end(), same) != row.fields.end()) {
        refuse_heading(row, fmt::format("two columns are called {}", kNames[i]), "one of each name");
      }
      columns_[i] = static_cast<std::size_t>(column - row.fields.begin());
      if (columns_[i] != i) displaced = i;
      ++found;
    }
    if (found < kNames.size()) take_first_three(row, displaced);
  }

  void take_first_three(const CsvRow& row, std::size_t displaced) {
    if (displaced < kNames.size()) {
      refuse_heading(row, fmt::format("the column {} is there, but not all of the others", kNames[displaced]),
                     "columns called id, sire and dam");
    }
    if (width_ < kNames.size()) {
      refuse_heading(row, fmt::format("found {} columns", width_), "three: animal, sire and dam");
    }
    columns_ = {0, 1, 2};
    for (const std::string_view name : row.fields.first(kNames.size())) {
      if (!is_unknown_animal(name) && !is_number(name)) continue;
      refuse_heading(row, "the first line is an animal and no heading", "names of the columns");
    }
    notes_.push_back(fmt::format("animal, sire and dam are taken from the first three columns: {}, {}, {}",
                                 row.fields[0], row.fields[1], row.fields[2]));
  }

  const std::string& file_;
  std::size_t width_ = 0;  // columns; 0 before the heading
  std::array<std::size_t, 3> columns_{};
  std::vector<PedigreeRow> rows_;
  std::vector<std::string> notes_;
};

}  // namespace

Pedigree parse_pedigree(const std::string& text, const std::string& name) {
  PedigreeReader reader(name);
  scan_csv(text, name, sniff_delimiter(text), [&](const CsvRow& row) {
    reader.take(row);
    return true;
  });
  return reader.finish();
}

Pedigree read_pedigree(const std::string& path) {
  return parse_pedigree(read_text(path), path == "-" ? "standard input" : path);
}

}  // namespace sm::mixed
