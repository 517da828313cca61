// Replays what the fuzzer starts from and what it found.
#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <vector>

#include "fuzz/reader_entry.hpp"

namespace {

std::vector<std::filesystem::path> corpus() {
  std::vector<std::filesystem::path> files;
  for (const auto& file : std::filesystem::directory_iterator(QXSM_CORPUS)) files.push_back(file.path());
  std::sort(files.begin(), files.end());
  return files;
}

class Corpus : public ::testing::TestWithParam<std::filesystem::path> {};

// The entry function ends the program when the reader breaks a promise, so each file is a test of its own.
TEST_P(Corpus, keeps_every_promise_of_the_reader) {
  std::ifstream file(GetParam(), std::ios::binary);
  ASSERT_TRUE(file);
  const std::vector<char> bytes{std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
  EXPECT_EXIT(
      {
        sm::fuzz::read_bytes(reinterpret_cast<const std::uint8_t*>(bytes.data()), bytes.size());
        std::exit(0);
      },
      ::testing::ExitedWithCode(0), "");
}

INSTANTIATE_TEST_SUITE_P(Files, Corpus, ::testing::ValuesIn(corpus()), [](const auto& file) {
  std::string name = file.param.filename().string();
  std::replace_if(
      name.begin(), name.end(), [](unsigned char c) { return !std::isalnum(c); }, '_');
  return name;
});

}  // namespace
