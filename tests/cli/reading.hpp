// Reads texts, and keeps what the reader reports.
#pragma once

#include <string>
#include <string_view>
#include <tuple>
#include <vector>

#include "cli/error.hpp"
#include "cli/matrix_market.hpp"

namespace sm::test {

using Triple = std::tuple<std::int64_t, std::int64_t, double>;

class Recorder : public cli::EntrySink {
 public:
  void begin(const cli::Header& header) override { header_ = header; }
  void take(std::span<const cli::Entry> entries) override;
  const cli::Header& header() const { return header_; }
  const std::vector<Triple>& entries() const { return entries_; }

 private:
  cli::Header header_;
  std::vector<Triple> entries_;
};

// `text` without its banner: "%%MatrixMarket matrix " + kind + "\n" + rest.
std::string file_of(const std::string& kind, const std::string& rest);

// The entries of a file that must be read; a test failure when it is refused.
Recorder read_text(std::string_view text, std::size_t piece = SIZE_MAX);

// The refusal of a file named bad.mtx; a test failure, and an empty problem, when it is read.
cli::Problem refusal(std::string_view text, std::size_t buffer = cli::kReadBuffer);

std::string gzip(std::string_view text);

}  // namespace sm::test
