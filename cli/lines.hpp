// The lines of a byte source, with their numbers.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "cli/bytes.hpp"

namespace sm::cli {

class LineReader {
 public:
  // Reads through a buffer of that size, which no line may fill.
  LineReader(ByteSource& source, std::string name, std::size_t buffer);

  // The next line, without its line feed (a carriage return before it stays; it counts as a blank). False at the end.
  // The view holds until the next call.
  bool next(std::string_view& line);

  std::int64_t number() const { return number_; }  // of the line last read, from 1; 0 before the first
  const std::string& name() const { return name_; }
  std::string trouble() const { return source_.trouble(); }
  bool unterminated() const { return unterminated_; }  // the line last read ended with the file, without a line feed

 private:
  bool refill();

  ByteSource& source_;
  std::string name_;
  std::unique_ptr<char[]> buffer_;
  std::size_t size_;
  std::size_t begin_ = 0;
  std::size_t end_ = 0;
  std::int64_t number_ = 0;
  bool ended_ = false;
  bool unterminated_ = false;
};

}  // namespace sm::cli
