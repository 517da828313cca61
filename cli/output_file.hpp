// A file that results are written to, as gzip when its name ends in .gz. It is opened before the work begins, so that a
// bad path does not cost a long run, and changed only when there is something to write.
#pragma once

#include <fmt/format.h>

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace sm::cli {

class OutputFile {
 public:
  // "-" is standard output. Throws CommandError when the path cannot be written, or is one of the `inputs`.
  OutputFile(std::string path, const std::vector<std::string>& inputs);
  ~OutputFile();  // removes a file that this object created and did not finish
  OutputFile(const OutputFile&) = delete;
  OutputFile& operator=(const OutputFile&) = delete;

  // The text is formatted into `buffer()`, and goes out through flush_if_full() and finish().
  fmt::memory_buffer& buffer() { return buffer_; }
  void flush_if_full();
  void finish();

  const std::string& path() const { return path_; }
  bool is_standard_output() const;

 private:
  void refuse_inputs(const std::vector<std::string>& inputs) const;
  void write(std::string_view bytes);
  void flush(bool last);

  class Gzip;
  std::string path_;
  std::unique_ptr<Gzip> gzip_;  // null: the text goes out as it is
  int file_ = -1;
  bool created_ = false;
  bool finished_ = false;
  fmt::memory_buffer buffer_;
};

// Text with a file name in it as one comment: a line break in the name must not end it.
std::string comment_text(std::string text);

// Writes columns as a Matrix Market array with 17 significant digits, enough for every double.
void write_array(OutputFile& out, std::int64_t rows, std::int64_t cols, const double* values,
                 const std::string& comment);

}  // namespace sm::cli
