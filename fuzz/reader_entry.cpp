#include "fuzz/reader_entry.hpp"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <span>
#include <string>

#include "cli/error.hpp"
#include "cli/matrix_market.hpp"

namespace sm::fuzz {
namespace {

constexpr std::size_t kBuffer = 2048;  // small, so that lines meet its end and runs are quick

void promise(bool kept) {
  if (!kept) std::abort();
}

class CheckingSink : public cli::EntrySink {
 public:
  void begin(const cli::Header& header) override {
    promise(header.rows >= 0 && header.cols >= 0 && header.entries >= 0 && header.size_line >= 2);
    header_ = header;
  }

  void take(std::span<const cli::Entry> entries) override {
    for (const cli::Entry& entry : entries) {
      promise(entry.row >= 0 && entry.row < header_.rows && entry.col >= 0 && entry.col < header_.cols);
      promise(header_.symmetry == cli::Symmetry::general || entry.row <= entry.col);
      promise(std::isfinite(entry.value));
      sum_ = sum_ * 31.0 + entry.value + static_cast<double>(entry.row) * 7.0 + static_cast<double>(entry.col);
      if (!(std::fabs(sum_) < 1e300)) sum_ = 0.0;
    }
    taken_ += static_cast<std::int64_t>(entries.size());
    promise(taken_ <= header_.entries);
  }

  bool complete() const { return taken_ == header_.entries; }
  double sum() const { return sum_; }

 private:
  cli::Header header_;
  std::int64_t taken_ = 0;
  double sum_ = 0.0;  // a checksum; any deterministic function of the entries in their order will do
};

// The outcome of a reading, in words that two readings can be compared by.
std::string outcome(std::span<const char> bytes, std::size_t piece) {
  const std::string name = "input.mtx";
  CheckingSink sink;
  try {
    cli::MemoryBytes source(bytes, piece);
    cli::read_matrix_market(source, name, sink, kBuffer);
  } catch (const cli::CommandError& error) {
    std::string message = error.what();
    promise(message.rfind(name + ":", 0) == 0 && error.problem().code == cli::ExitCode::bad_input);
    promise(error.problem().line >= 1 && !error.problem().advice.empty());
    promise(std::all_of(message.begin(), message.end(), [](char c) { return c >= 0x20 && c < 0x7f; }));
    return message;
  }
  promise(sink.complete());
  return std::to_string(sink.sum());
}

}  // namespace

void read_bytes(const std::uint8_t* data, std::size_t size) {
  const std::span<const char> bytes(reinterpret_cast<const char*>(data), size);
  const std::string whole = outcome(bytes, SIZE_MAX);
  promise(outcome(bytes, 1) == whole);
  promise(outcome(bytes, 61) == whole);
}

}  // namespace sm::fuzz
