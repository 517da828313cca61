// Replays what the fuzzers start from and what they found.
#include <gtest/gtest.h>

#include <algorithm>
#include <cctype>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <vector>

#include "fuzz/reader_entry.hpp"
#include "fuzz/table_entry.hpp"

namespace {

using Entry = void (*)(const std::uint8_t*, std::size_t);
struct Input {
  Entry entry;
  std::filesystem::path file;
};

std::vector<Input> corpus(Entry entry, const char* folder) {
  std::vector<Input> inputs;
  for (const auto& file : std::filesystem::directory_iterator(folder)) inputs.push_back({entry, file.path()});
  std::sort(inputs.begin(), inputs.end(), [](const Input& a, const Input& b) { return a.file < b.file; });
  return inputs;
}

std::string test_name(const ::testing::TestParamInfo<Input>& input) {
  std::string name = input.param.file.filename().string();
  std::replace_if(
      name.begin(), name.end(), [](unsigned char c) { return !std::isalnum(c); }, '_');
  return name;
}

class Corpus : public ::testing::TestWithParam<Input> {};

// An entry function ends the program when a promise is broken, so each file is a test of its own.
TEST_P(Corpus, keeps_every_promise_of_what_is_fuzzed) {
  std::ifstream file(GetParam().file, std::ios::binary);
  ASSERT_TRUE(file);
  const std::vector<char> bytes{std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
  EXPECT_EXIT(
      {
        GetParam().entry(reinterpret_cast<const std::uint8_t*>(bytes.data()), bytes.size());
        std::exit(0);
      },
      ::testing::ExitedWithCode(0), "");
}

INSTANTIATE_TEST_SUITE_P(MatrixMarket, Corpus, ::testing::ValuesIn(corpus(sm::fuzz::read_bytes, QXSM_CORPUS)),
                         test_name);
INSTANTIATE_TEST_SUITE_P(Table, Corpus, ::testing::ValuesIn(corpus(sm::fuzz::read_table, QXESM_TABLE_CORPUS)),
                         test_name);

}  // namespace
