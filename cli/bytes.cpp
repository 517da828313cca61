#include "cli/bytes.hpp"

#include <fcntl.h>
#include <fmt/core.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <limits>
#include <new>

#include "cli/error.hpp"

namespace sm::cli {
namespace {

constexpr int kGzipWindow = 15 + 16;  // zlib's way of saying: the largest window, and a gzip header

}  // namespace

FileBytes::FileBytes(const std::string& path, ReadProgress progress) : progress_(std::move(progress)) {
  file_ = path == "-" ? STDIN_FILENO : ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (file_ < 0) {
    throw CommandError({.file = path,
                        .what = fmt::format("cannot be opened ({})", system_message(errno)),
                        .expected = "a readable Matrix Market file",
                        .advice = "check the path and its permissions"});
  }
  struct stat status {};
  if (::fstat(file_, &status) == 0 && S_ISREG(status.st_mode)) total_ = static_cast<std::uint64_t>(status.st_size);
}

FileBytes::~FileBytes() {
  if (file_ > STDIN_FILENO) ::close(file_);
}

std::size_t FileBytes::read(char* out, std::size_t size) {
  for (;;) {
    const ssize_t got = ::read(file_, out, size);
    if (got >= 0) {
      done_ += static_cast<std::uint64_t>(got);
      if (progress_) progress_(done_, total_);
      return static_cast<std::size_t>(got);
    }
    if (errno == EINTR) continue;
    trouble_ = fmt::format("cannot be read ({})", system_message(errno));
    return 0;
  }
}

std::size_t MemoryBytes::read(char* out, std::size_t size) {
  const std::size_t count = std::min({size, piece_, rest_.size()});
  std::copy_n(rest_.begin(), count, out);
  rest_ = rest_.subspan(count);
  return count;
}

GunzipBytes::GunzipBytes(ByteSource& inner, std::size_t buffer)
    : inner_(inner), input_(std::make_unique_for_overwrite<char[]>(buffer)), input_size_(buffer) {
  if (!has_magic()) return;
  stream_ = std::make_unique<z_stream>();
  if (inflateInit2(stream_.get(), kGzipWindow) != Z_OK) throw std::bad_alloc();
}

GunzipBytes::~GunzipBytes() {
  if (stream_) inflateEnd(stream_.get());
}

bool GunzipBytes::refill() {
  if (input_begin_ > 0) {
    std::memmove(input_.get(), input_.get() + input_begin_, input_end_ - input_begin_);
    input_end_ -= input_begin_;
    input_begin_ = 0;
  }
  const std::size_t got = inner_.read(input_.get() + input_end_, input_size_ - input_end_);
  input_end_ += got;
  return got > 0;
}

bool GunzipBytes::has_magic() {
  while (input_end_ - input_begin_ < 2 && refill()) {
  }
  return input_end_ - input_begin_ >= 2 && input_[input_begin_] == '\x1f' && input_[input_begin_ + 1] == '\x8b';
}

std::size_t GunzipBytes::read(char* out, std::size_t size) {
  if (!stream_) return read_plain(out, size);
  const std::size_t wanted = std::min<std::size_t>(size, std::numeric_limits<uInt>::max());
  stream_->next_out = reinterpret_cast<Bytef*>(out);
  stream_->avail_out = static_cast<uInt>(wanted);
  while (!finished_ && stream_->avail_out == wanted) {
    if (input_begin_ == input_end_ && !refill()) {
      finished_ = true;
      trouble_ = "the gzip data end early";
      break;
    }
    stream_->next_in = reinterpret_cast<Bytef*>(input_.get() + input_begin_);
    stream_->avail_in = static_cast<uInt>(input_end_ - input_begin_);
    const int answer = inflate(stream_.get(), Z_NO_FLUSH);
    input_begin_ = input_end_ - stream_->avail_in;
    if (answer == Z_STREAM_END) {
      finished_ = !start_member();
    } else if (answer != Z_OK && answer != Z_BUF_ERROR) {
      finished_ = true;
      trouble_ = fmt::format("the gzip data are damaged ({})", stream_->msg ? stream_->msg : "zlib gives no reason");
    }
  }
  return wanted - stream_->avail_out;
}

std::size_t GunzipBytes::read_plain(char* out, std::size_t size) {
  if (input_begin_ == input_end_) return inner_.read(out, size);
  const std::size_t count = std::min(size, input_end_ - input_begin_);
  std::memcpy(out, input_.get() + input_begin_, count);
  input_begin_ += count;
  return count;
}

bool GunzipBytes::start_member() {
  if (!has_magic()) return false;  // what follows the last member is no concern of ours, as with gunzip
  return inflateReset2(stream_.get(), kGzipWindow) == Z_OK;
}

}  // namespace sm::cli
