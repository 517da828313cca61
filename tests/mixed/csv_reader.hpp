// A plain reader of comma-separated text as RFC 4180 has it, to read back what was written.
#pragma once

#include <string>
#include <vector>

namespace sm::mixed::test {

using Rows = std::vector<std::vector<std::string>>;

inline Rows parsed_csv(const std::string& text) {
  Rows rows;
  std::vector<std::string> row;
  std::string field;
  bool quoted = false;
  for (std::size_t i = 0; i < text.size(); ++i) {
    const char c = text[i];
    if (quoted) {
      if (c != '"') {
        field += c;
      } else if (i + 1 < text.size() && text[i + 1] == '"') {
        field += '"';
        ++i;
      } else {
        quoted = false;
      }
    } else if (c == '"') {
      quoted = true;
    } else if (c == ',' || c == '\n') {
      row.push_back(field);
      field.clear();
      if (c == '\n') {
        rows.push_back(row);
        row.clear();
      }
    } else {
      field += c;
    }
  }
  return rows;
}

}  // namespace sm::mixed::test
