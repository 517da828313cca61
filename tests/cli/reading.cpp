#include "cli/reading.hpp"

#include <gtest/gtest.h>
#include <zlib.h>

namespace sm::test {

void Recorder::take(std::span<const cli::Entry> entries) {
  for (const auto& [row, col, value] : entries) entries_.emplace_back(row, col, value);
}

std::string file_of(const std::string& kind, const std::string& rest) {
  return "%%MatrixMarket matrix " + kind + "\n" + rest;
}

Recorder read_text(std::string_view text, std::size_t piece) {
  Recorder recorder;
  cli::MemoryBytes bytes(text, piece);
  try {
    cli::read_matrix_market(bytes, "good.mtx", recorder);
  } catch (const cli::CommandError& error) {
    ADD_FAILURE() << error.what();
  }
  return recorder;
}

cli::Problem refusal(std::string_view text, std::size_t buffer) {
  Recorder recorder;
  cli::MemoryBytes bytes(text);
  try {
    cli::read_matrix_market(bytes, "bad.mtx", recorder, buffer);
  } catch (const cli::CommandError& error) {
    EXPECT_EQ(error.problem().file, "bad.mtx");
    EXPECT_EQ(error.problem().code, cli::ExitCode::bad_input);
    EXPECT_FALSE(error.problem().advice.empty());
    return error.problem();
  }
  ADD_FAILURE() << "was read: " << text;
  return {};
}

std::string gzip(std::string_view text) {
  z_stream stream{};
  EXPECT_EQ(deflateInit2(&stream, Z_BEST_COMPRESSION, Z_DEFLATED, 15 + 16, 8, Z_DEFAULT_STRATEGY), Z_OK);
  std::string out(deflateBound(&stream, text.size()), '\0');
  stream.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(text.data()));
  stream.avail_in = static_cast<uInt>(text.size());
  stream.next_out = reinterpret_cast<Bytef*>(out.data());
  stream.avail_out = static_cast<uInt>(out.size());
  EXPECT_EQ(deflate(&stream, Z_FINISH), Z_STREAM_END);
  out.resize(stream.total_out);
  deflateEnd(&stream);
  return out;
}

}  // namespace sm::test
