#include "cli/lines.hpp"

#include <fmt/core.h>

#include <cstring>

#include "cli/error.hpp"

namespace sm::cli {

LineReader::LineReader(ByteSource& source, std::string name, std::size_t buffer)
    : source_(source), name_(std::move(name)), buffer_(std::make_unique_for_overwrite<char[]>(buffer)), size_(buffer) {}

// Moves the unfinished line to the front and reads on behind it.
bool LineReader::refill() {
  if (ended_) return false;
  if (begin_ > 0) {
    std::memmove(buffer_.get(), buffer_.get() + begin_, end_ - begin_);
    end_ -= begin_;
    begin_ = 0;
  }
  if (end_ == size_) {
    throw CommandError({.file = name_,
                        .line = number_ + 1,
                        .what = fmt::format("found a line of more than {} bytes", size_ - 1),
                        .expected = "lines of text with one entry each",
                        .advice = "check that this is a Matrix Market file"});
  }
  const std::size_t got = source_.read(buffer_.get() + end_, size_ - end_);
  end_ += got;
  ended_ = got == 0;
  return !ended_;
}

bool LineReader::next(std::string_view& line) {
  std::size_t searched = begin_;
  for (;;) {
    const char* from = buffer_.get() + searched;
    if (const void* feed = std::memchr(from, '\n', end_ - searched)) {
      const auto length = static_cast<std::size_t>(static_cast<const char*>(feed) - (buffer_.get() + begin_));
      line = {buffer_.get() + begin_, length};
      begin_ += length + 1;
      ++number_;
      return true;
    }
    const std::size_t kept = end_ - begin_;
    if (!refill()) break;
    searched = begin_ + kept;
  }
  if (begin_ == end_) return false;
  line = {buffer_.get() + begin_, end_ - begin_};  // the last line may lack its line feed
  begin_ = end_;
  unterminated_ = true;
  ++number_;
  return true;
}

}  // namespace sm::cli
