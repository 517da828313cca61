#include "cli/output_file.hpp"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <iterator>

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

OutputFile::OutputFile(std::string path, const std::vector<std::string>& inputs) : path_(std::move(path)) {
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

void OutputFile::flush() {
  write_all(file_, {buffer_.data(), buffer_.size()}, is_standard_output() ? "standard output" : path_);
  buffer_.clear();
}

void OutputFile::flush_if_full() {
  if (buffer_.size() >= kFull) flush();
}

void OutputFile::finish() {
  flush();
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
