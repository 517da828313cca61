#include "mixed/row_ids.hpp"

#include <fmt/core.h>

#include <string_view>
#include <unordered_map>

#include "mixed/csv.hpp"
#include "mixed/error.hpp"

namespace sm::mixed {
namespace {

std::string_view trimmed(std::string_view text) {
  constexpr std::string_view kBlanks = " \t\r\v\f";
  const std::size_t begin = text.find_first_not_of(kBlanks);
  return begin == std::string_view::npos ? "" : text.substr(begin, text.find_last_not_of(kBlanks) + 1 - begin);
}

std::vector<std::string> lines_of(std::string_view text) {
  std::vector<std::string> lines;
  constexpr std::string_view kByteOrderMark = "\xef\xbb\xbf";
  if (text.starts_with(kByteOrderMark)) text.remove_prefix(kByteOrderMark.size());
  while (!text.empty()) {
    const std::size_t end = text.find('\n');
    lines.emplace_back(text.substr(0, end));
    text.remove_prefix(end == std::string_view::npos ? text.size() : end + 1);
  }
  return lines;
}

}  // namespace

std::vector<std::string> row_ids(const std::vector<std::string>& lines, std::int64_t order, const std::string& file) {
  std::vector<std::string> ids;
  ids.reserve(static_cast<std::size_t>(order));
  for (const std::string& line : lines) ids.emplace_back(trimmed(line));
  if (lines.empty()) {
    for (std::int64_t i = 1; i <= order; ++i) ids.push_back(std::to_string(i));
  }
  std::unordered_map<std::string_view, std::int64_t> seen;
  for (std::size_t i = 0; i < ids.size(); ++i) {
    const auto line = static_cast<std::int64_t>(i + 1);
    if (ids[i].empty()) {
      throw ModelError({.file = file,
                        .line = line,
                        .what = "the line is empty",
                        .expected = "an id",
                        .advice = "write one id a line, in the order of the rows of the matrix"});
    }
    const auto [first, is_new] = seen.try_emplace(ids[i], line);
    if (!is_new) {
      throw ModelError({.file = file,
                        .line = line,
                        .variable = ids[i],
                        .what = fmt::format("the id is in line {} already", first->second),
                        .expected = "an id of its own for each row",
                        .advice = "correct one of the two"});
    }
  }
  if (static_cast<std::int64_t>(ids.size()) != order) {
    throw ModelError({.file = file,
                      .what = fmt::format("found {} ids", ids.size()),
                      .expected = fmt::format("{}, one for each row of the matrix", order),
                      .advice = "write one id a line, without a heading"});
  }
  return ids;
}

std::vector<std::string> read_row_ids(const std::string& path, std::int64_t order) {
  if (path.empty()) return row_ids({}, order, path);
  const std::vector<std::string> lines = lines_of(read_text(path));
  const std::string name = path == "-" ? "standard input" : path;
  if (lines.empty()) {
    throw ModelError({.file = name,
                      .what = "the file is empty",
                      .expected = fmt::format("{} ids, one for each row of the matrix", order),
                      .advice = "write one id a line, without a heading"});
  }
  return row_ids(lines, order, name);
}

}  // namespace sm::mixed
