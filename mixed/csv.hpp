// Tables of text as they stand in a file: rows of fields, and where each of them is.
#pragma once

#include <cstdint>
#include <functional>
#include <span>
#include <string>
#include <string_view>

namespace sm::mixed {

// The bytes of a file, or of standard input for "-"; what they decompress to when they are gzip (by content, not by
// name). Throws ModelError when it cannot be read or has bytes that no text has.
std::string read_text(const std::string& path);

struct CsvRow {
  std::int64_t line = 0;                     // where the row begins, from 1
  std::string_view source;                   // as written, with its line end
  std::span<const std::string_view> fields;  // unquoted, without blanks around them
};

struct CsvPlace {
  std::int64_t line = 0;
  std::int64_t column = 0;  // in characters, from 1
};

// Comma, tab or semicolon, whichever the first line has most of outside quotes; comma when it has none.
char sniff_delimiter(std::string_view text);

// Calls `take` with every row that is not blank until it answers false. `name` is the file's, for messages. A byte
// order mark before the text is passed over. Throws ModelError for quotes that are not closed or stand inside a field.
void scan_csv(std::string_view text, const std::string& name, char delimiter,
              const std::function<bool(const CsvRow& row)>& take);

// Where field `index` of a row begins; where the row ends when it has fewer.
CsvPlace place_of_field(const CsvRow& row, char delimiter, std::size_t index);

}  // namespace sm::mixed
