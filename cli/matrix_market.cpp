#include "cli/matrix_market.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <array>
#include <tuple>
#include <utility>

#include "cli/error.hpp"
#include "cli/fields.hpp"
#include "cli/lines.hpp"
#include "cli/matrix_market_header.hpp"

namespace sm::cli {
namespace {

class DataReader {
 public:
  DataReader(LineReader& lines, const Header& header, EntrySink& sink) : lines_(lines), header_(header), sink_(sink) {}
  void run();

 private:
  bool parse_fast(std::string_view line, Entry& entry) const;
  Entry parse_slow(std::string_view line) const;
  bool parse_value(std::string_view field, double& value) const;
  void place(Entry& entry);
  void place_coordinate(Entry& entry);
  void place_array(Entry& entry);
  void flush();
  [[noreturn]] void refuse(std::string what, std::string expected, std::string advice) const;
  [[noreturn]] void refuse_truncated(const std::string& reason) const;
  void refuse_cut_line() const;
  std::string advice_for_line() const;

  static constexpr std::size_t kBatch = 1024;
  LineReader& lines_;
  const Header& header_;
  EntrySink& sink_;
  std::array<Entry, kBatch> batch_;
  std::size_t batched_ = 0;
  std::int64_t read_ = 0;
  std::int64_t array_row_ = 0;  // where the next value of an array goes
  std::int64_t array_col_ = 0;
  std::int64_t first_above_ = 0;  // lines of the first entry on either side of the diagonal (symmetric coordinate)
  std::int64_t first_below_ = 0;
};

void DataReader::refuse(std::string what, std::string expected, std::string advice) const {
  throw CommandError({.file = lines_.name(),
                      .line = lines_.number(),
                      .what = std::move(what),
                      .expected = std::move(expected),
                      .advice = std::move(advice)});
}

void DataReader::refuse_truncated(const std::string& reason) const {
  refuse(fmt::format("{} after {} of {} entries", reason, read_, header_.entries),
         fmt::format("{} (announced in line {})", header_.entries, header_.size_line),
         "the file looks truncated: fetch or write it again, or correct the size line");
}

// A bad line that is also the end of the bytes is a symptom; what cut it short is the news.
void DataReader::refuse_cut_line() const {
  if (!lines_.unterminated()) return;
  const std::string trouble = lines_.trouble();
  if (!trouble.empty()) refuse_truncated(trouble);
  if (read_ + 1 < header_.entries) refuse_truncated("the file ends inside this line,");
}

std::string DataReader::advice_for_line() const {
  std::string advice = header_.layout == Layout::array ? "write one value to a line" : "write one entry to a line";
  if (lines_.unterminated()) advice += " (the file ends in this line: it may be truncated)";
  return advice;
}

// The three numbers of an ordinary line. False for anything else, right or wrong: the slow road then decides.
bool DataReader::parse_fast(std::string_view line, Entry& entry) const {
  const char* p = line.data();
  const char* const end = p + line.size();
  p = skip_blanks(p, end);
  if (header_.layout == Layout::coordinate) {
    if (!(p = scan_index(p, end, entry.row)) || p == end || !is_blank(*p)) return false;
    p = skip_blanks(p, end);
    if (!(p = scan_index(p, end, entry.col))) return false;
    if (header_.field != Field::pattern) {
      if (p == end || !is_blank(*p)) return false;
      p = skip_blanks(p, end);
    }
  }
  entry.value = 1.0;
  if (header_.field == Field::real && !(p = scan_real(p, end, entry.value))) return false;
  if (header_.field == Field::integer) {
    std::int64_t value = 0;
    if (!(p = scan_integer(p, end, value))) return false;
    entry.value = static_cast<double>(value);
  }
  return skip_blanks(p, end) == end;
}

bool DataReader::parse_value(std::string_view field, double& value) const {
  if (header_.field == Field::real) return parse_real(field, value);
  std::int64_t whole = 0;
  if (!parse_integer(field, whole)) return false;
  value = static_cast<double>(whole);
  return true;
}

Entry DataReader::parse_slow(std::string_view line) const {
  const bool coordinate = header_.layout == Layout::coordinate;
  const bool valued = header_.field != Field::pattern;
  const auto fields = split_fields(line);
  const std::size_t count = (coordinate ? 2u : 0u) + (valued ? 1u : 0u);
  if (fields.size() != count) {
    const char* shape = !coordinate ? "1 (value)" : valued ? "3 (row column value)" : "2 (row column)";
    refuse(fmt::format("found {} field{} ({})", fields.size(), fields.size() == 1 ? "" : "s", quote(line)), shape,
           advice_for_line());
  }
  Entry entry{0, 0, 1.0};
  if (coordinate) {
    for (const auto& [role, field, index] :
         {std::tuple{"row", fields[0], &entry.row}, {"column", fields[1], &entry.col}}) {
      if (!parse_index(field, *index)) {
        refuse(fmt::format("found {} {}", role, quote(field)), fmt::format("a {} number, counted from 1", role),
               advice_for_line());
      }
    }
  }
  if (valued && !parse_value(fields.back(), entry.value)) {
    const bool real = header_.field == Field::real;
    refuse("found value " + quote(fields.back()), real ? "a finite number" : "a whole number (line 1 says integer)",
           real ? "replace the value, or remove the entry and lower the count in the size line"
                : "replace the value, or write real instead of integer in line 1");
  }
  return entry;
}

void DataReader::place_coordinate(Entry& entry) {
  for (const auto& [role, index, count] :
       {std::tuple{"row", &entry.row, header_.rows}, {"column", &entry.col, header_.cols}}) {
    if (*index < 1 || *index > count) {
      refuse(fmt::format("found {} {}", role, *index),
             count == 0 ? fmt::format("no entries, as the matrix has no {}s", role) : fmt::format("1 to {}", count),
             fmt::format("correct the index, or the size in line {}", header_.size_line));
    }
    --*index;
  }
  if (header_.symmetry == Symmetry::general || entry.row == entry.col) return;
  std::int64_t& first = entry.row > entry.col ? first_below_ : first_above_;
  if (first == 0) first = lines_.number();
  if (first_above_ > 0 && first_below_ > 0) {
    // Adding the two up would double what a careless writer meant as a full matrix.
    refuse(fmt::format("found an entry {} the diagonal, and one on the other side in line {}",
                       entry.row > entry.col ? "below" : "above", std::min(first_above_, first_below_)),
           "one triangle in a symmetric file", "remove one triangle, or write general instead of symmetric in line 1");
  }
  if (entry.row > entry.col) std::swap(entry.row, entry.col);
}

void DataReader::place_array(Entry& entry) {
  const bool symmetric = header_.symmetry == Symmetry::symmetric;
  entry.row = array_row_;
  entry.col = array_col_;
  if (symmetric) std::swap(entry.row, entry.col);  // the file holds the lower triangle
  if (++array_row_ == header_.rows) {
    ++array_col_;
    array_row_ = symmetric ? array_col_ : 0;
  }
}

void DataReader::place(Entry& entry) {
  if (header_.layout == Layout::coordinate) {
    place_coordinate(entry);
  } else {
    place_array(entry);
  }
}

void DataReader::flush() {
  if (batched_ > 0) sink_.take({batch_.data(), batched_});
  batched_ = 0;
}

void DataReader::run() {
  std::string_view line;
  while (lines_.next(line)) {
    Entry entry;
    if (read_ == header_.entries || !parse_fast(line, entry)) {
      if (is_skipped(line)) continue;
      if (read_ == header_.entries) {
        refuse("found a further entry (" + quote(line) + ")",
               fmt::format("{} (announced in line {})", header_.entries, header_.size_line),
               "remove it, or correct the size line");
      }
      refuse_cut_line();
      entry = parse_slow(line);
    }
    place(entry);
    batch_[batched_++] = entry;
    ++read_;
    if (batched_ == kBatch) flush();
  }
  const std::string trouble = lines_.trouble();
  if (!trouble.empty()) refuse_truncated(trouble);
  if (read_ < header_.entries) refuse_truncated("the file ends");
  flush();
}

}  // namespace

Header read_matrix_market(ByteSource& source, const std::string& name, EntrySink& sink, std::size_t buffer) {
  GunzipBytes bytes(source, buffer);
  LineReader lines(bytes, name, buffer);
  const Header header = read_header(lines);
  sink.begin(header);
  DataReader(lines, header, sink).run();
  return header;
}

}  // namespace sm::cli
