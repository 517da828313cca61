#include "cli/output_file.hpp"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <zlib.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <iterator>
#include <new>
#include <utility>

#include "cli/error.hpp"
#include "cli/report.hpp"

namespace sm::cli {
namespace {

constexpr std::size_t kFull = 1'048'576;
constexpr int kMode = 0666;

[[noreturn]] void refuse(const std::string& path, int error_number) {
  throw CommandError({.file = path,
                      .what = fmt::format("cannot be written ({})", system_message(error_number)),
                      .advice = "check that the folder exists, its permissions and the free space"});
}

}  // namespace

// Text on its way to a gzip file.
class OutputFile::Gzip {
 public:
  Gzip() {
    constexpr int kGzipWindow = 15 + 16;  // the largest window, with a gzip header
    constexpr int kMemory = 8;
    if (deflateInit2(&stream_, Z_DEFAULT_COMPRESSION, Z_DEFLATED, kGzipWindow, kMemory, Z_DEFAULT_STRATEGY) != Z_OK) {
      throw std::bad_alloc();
    }
  }
  ~Gzip() { deflateEnd(&stream_); }
  Gzip(const Gzip&) = delete;
  Gzip& operator=(const Gzip&) = delete;

  // Hands out(bytes) what the text becomes; with `last` all that is still held back too.
  template <class Out>
  void take(const fmt::memory_buffer& text, bool last, Out out) {
    std::array<char, 65'536> packed;
    stream_.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(text.data()));
    stream_.avail_in = static_cast<uInt>(text.size());
    do {
      stream_.next_out = reinterpret_cast<Bytef*>(packed.data());
      stream_.avail_out = static_cast<uInt>(packed.size());
      deflate(&stream_, last ? Z_FINISH : Z_NO_FLUSH);
      out(std::string_view(packed.data(), packed.size() - stream_.avail_out));
    } while (stream_.avail_out == 0);
  }

 private:
  z_stream stream_{};
};

OutputFile::OutputFile(std::string path, const std::vector<std::string>& inputs) : path_(std::move(path)) {
  if (path_.ends_with(".gz")) gzip_ = std::make_unique<Gzip>();
  if (is_standard_output()) {
    file_ = STDOUT_FILENO;
    return;
  }
  refuse_inputs(inputs);
  file_ = ::open(path_.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, kMode);
  created_ = file_ >= 0;
  if (file_ < 0 && errno == EEXIST) file_ = ::open(path_.c_str(), O_WRONLY | O_CLOEXEC);
  if (file_ < 0) refuse(path_, errno);
}

OutputFile::~OutputFile() {
  if (file_ >= 0 && !is_standard_output()) ::close(file_);
  if (created_ && !finished_) ::unlink(path_.c_str());
}

bool OutputFile::is_standard_output() const { return path_ == "-"; }

void OutputFile::refuse_inputs(const std::vector<std::string>& inputs) const {
  struct stat mine {};
  if (::stat(path_.c_str(), &mine) != 0) return;
  for (const std::string& input : inputs) {
    struct stat theirs {};
    if (::stat(input.c_str(), &theirs) != 0 || mine.st_dev != theirs.st_dev || mine.st_ino != theirs.st_ino) continue;
    if (!S_ISREG(mine.st_mode)) continue;
    throw CommandError({.file = path_, .what = "is also an input", .advice = "give -o a path of its own"});
  }
}

void OutputFile::write(std::string_view bytes) {
  write_all(file_, bytes, is_standard_output() ? "standard output" : path_);
}

void OutputFile::flush(bool last) {
  if (gzip_) {
    gzip_->take(buffer_, last, [this](std::string_view bytes) { write(bytes); });
  } else {
    write({buffer_.data(), buffer_.size()});
  }
  buffer_.clear();
}

void OutputFile::flush_if_full() {
  if (buffer_.size() >= kFull) flush(false);
}

void OutputFile::finish() {
  flush(true);
  if (!is_standard_output()) {
    // What an earlier, longer file left behind. Not every file can be cut (a pipe, a device); those have no rest.
    const off_t end = ::lseek(file_, 0, SEEK_CUR);
    if (end >= 0 && ::ftruncate(file_, end) != 0 && errno != EINVAL) refuse(path_, errno);
    const int file = std::exchange(file_, -1);
    if (::close(file) != 0) refuse(path_, errno);
  }
  finished_ = true;
}

std::string comment_text(std::string text) {
  std::replace(text.begin(), text.end(), '\n', ' ');
  return text;
}

void write_array(OutputFile& out, std::int64_t rows, std::int64_t cols, const double* values,
                 const std::string& comment) {
  auto to = std::back_inserter(out.buffer());
  fmt::format_to(to, "%%MatrixMarket matrix array real general\n% {}\n{} {}\n", comment, rows, cols);
  for (std::int64_t i = 0; i < rows * cols; ++i) {
    fmt::format_to(to, "{:.16e}\n", values[i]);
    out.flush_if_full();
  }
  out.finish();
}

}  // namespace sm::cli
