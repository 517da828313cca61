// Replays what the fuzzer of tables starts from and what it found.
#include <gtest/gtest.h>

#include <algorithm>
#include <cctype>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <vector>

#include "fuzz/table_entry.hpp"

namespace {

std::vector<std::filesystem::path> corpus() {
  std::vector<std::filesystem::path> files;
  for (const auto& file : std::filesystem::directory_iterator(QXESM_TABLE_CORPUS)) files.push_back(file.path());
  std::sort(files.begin(), files.end());
  return files;
}

class TableCorpus : public ::testing::TestWithParam<std::filesystem::path> {};

// The entry function ends the program when a promise is broken, so each file is a test of its own.
TEST_P(TableCorpus, keeps_every_promise_of_tables_and_formulas) {
  std::ifstream file(GetParam(), std::ios::binary);
  ASSERT_TRUE(file);
  const std::vector<char> bytes{std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
  EXPECT_EXIT(
      {
        sm::fuzz::read_table(reinterpret_cast<const std::uint8_t*>(bytes.data()), bytes.size());
        std::exit(0);
      },
      ::testing::ExitedWithCode(0), "");
}

INSTANTIATE_TEST_SUITE_P(Files, TableCorpus, ::testing::ValuesIn(corpus()), [](const auto& file) {
  std::string name = file.param.filename().string();
  std::replace_if(
      name.begin(), name.end(), [](unsigned char c) { return !std::isalnum(c); }, '_');
  return name;
});

}  // namespace
