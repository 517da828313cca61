#include "cli/matrix_market_header.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <cctype>

#include "cli/error.hpp"
#include "cli/fields.hpp"

namespace sm::cli {
namespace {

constexpr const char* kBanner = "\"%%MatrixMarket matrix coordinate|array real|integer|pattern general|symmetric\"";

std::string lower(std::string_view text) {
  std::string out(text);
  std::transform(out.begin(), out.end(), out.begin(), [](unsigned char c) { return std::tolower(c); });
  return out;
}

[[noreturn]] void refuse(const LineReader& lines, std::string what, std::string expected, std::string advice) {
  throw CommandError({.file = lines.name(),
                      .line = std::max<std::int64_t>(lines.number(), 1),
                      .what = std::move(what),
                      .expected = std::move(expected),
                      .advice = std::move(advice)});
}

// A word of the banner: one that is served, or an explanation.
template <class Value>
Value choose(const LineReader& lines, const char* role, std::string_view word,
             std::initializer_list<std::pair<const char*, Value>> choices, const char* advice) {
  std::string expected;
  for (const auto& [name, value] : choices) {
    if (lower(word) == name) return value;
    expected += expected.empty() ? name : fmt::format(" or {}", name);
  }
  refuse(lines, fmt::format("found the {} {}", role, quote(word)), expected, advice);
}

void read_banner(LineReader& lines, Header& header) {
  std::string_view line;
  if (!lines.next(line)) {
    const std::string trouble = lines.trouble();
    refuse(lines, trouble.empty() ? "found an empty file" : trouble, std::string("the line ") + kBanner,
           "check that this is the file you mean");
  }
  const auto words = split_fields(line);
  if (words.empty() || lower(words[0]) != "%%matrixmarket") {
    refuse(lines, "found " + quote(line), std::string("the line ") + kBanner,
           "check that this is a Matrix Market file");
  }
  if (words.size() != 5) {
    refuse(lines, fmt::format("found {} words in the banner ({})", words.size(), quote(line)),
           std::string("5: ") + kBanner, "complete the first line");
  }
  if (lower(words[1]) != "matrix") {
    refuse(lines, "found the object " + quote(words[1]), "matrix", "only matrices are read");
  }
  header.layout =
      choose<Layout>(lines, "layout", words[2], {{"coordinate", Layout::coordinate}, {"array", Layout::array}},
                     "write the matrix in one of these layouts");
  header.field = choose<Field>(lines, "field", words[3],
                               {{"real", Field::real}, {"integer", Field::integer}, {"pattern", Field::pattern}},
                               "complex matrices are not served; split the matrix into its real and imaginary parts");
  header.symmetry = choose<Symmetry>(
      lines, "symmetry", words[4], {{"general", Symmetry::general}, {"symmetric", Symmetry::symmetric}},
      "hermitian and skew-symmetric matrices are not served; write a real matrix out as general");
  if (header.layout == Layout::array && header.field == Field::pattern) {
    refuse(lines, "found an array of the field \"pattern\"", "real or integer",
           "a pattern needs the coordinate layout");
  }
}

void announce(LineReader& lines, Header& header, std::string_view line) {
  const bool coordinate = header.layout == Layout::coordinate;
  const char* shape = coordinate ? "3 whole numbers (rows columns entries)" : "2 whole numbers (rows columns)";
  const char* advice = "correct the size line; counts are written without sign, point or separator";
  const auto fields = split_fields(line);
  const std::size_t count = coordinate ? 3 : 2;
  if (fields.size() != count) {
    refuse(lines, fmt::format("found {} fields ({})", fields.size(), quote(line)), shape, advice);
  }
  std::int64_t* const targets[] = {&header.rows, &header.cols, &header.entries};
  for (std::size_t i = 0; i < count; ++i) {
    if (!parse_index(fields[i], *targets[i])) refuse(lines, "found " + quote(fields[i]), shape, advice);
  }
}

// What has to fit into 63 bits, and the number of values of an array.
void check_sizes(const LineReader& lines, Header& header) {
  const bool symmetric = header.symmetry == Symmetry::symmetric;
  if (symmetric && header.rows != header.cols) {
    refuse(lines, fmt::format("found {} rows and {} columns", header.rows, header.cols),
           "as many rows as columns in a symmetric file", "correct the size line, or the word symmetric in line 1");
  }
  if (header.layout == Layout::coordinate) return;
  // n (n + 1) / 2 without a product that leaves the range: one of the two factors is even.
  std::int64_t height = header.rows;
  std::int64_t width = header.cols;
  if (symmetric) {
    height = header.rows % 2 == 0 ? header.rows / 2 : header.rows;
    width = header.rows % 2 == 0 ? header.rows + 1 : header.rows / 2 + 1;
  }
  if (__builtin_mul_overflow(height, width, &header.entries)) {
    refuse(lines, fmt::format("found an array of {} x {} values", header.rows, header.cols), "fewer than 2^63 values",
           "correct the size line");
  }
}

}  // namespace

bool is_skipped(std::string_view line) {
  const char* const end = line.data() + line.size();
  const char* const p = skip_blanks(line.data(), end);
  return p == end || *p == '%';
}

Header read_header(LineReader& lines) {
  Header header;
  read_banner(lines, header);
  std::string_view line;
  do {
    if (!lines.next(line)) {
      const std::string trouble = lines.trouble();
      refuse(lines, trouble.empty() ? "the file ends before its size line" : trouble,
             header.layout == Layout::array ? "a line with rows and columns" : "a line with rows, columns and entries",
             "the file looks truncated: fetch or write it again");
    }
  } while (is_skipped(line));
  header.size_line = lines.number();
  announce(lines, header, line);
  check_sizes(lines, header);
  return header;
}

}  // namespace sm::cli
