#include "cli/output_file.hpp"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <limits>

#include "cli/error.hpp"
#include "cli/reading.hpp"

namespace sm::test {
namespace {

using cli::OutputFile;

std::string fresh(const std::string& name) {
  const std::string path = ::testing::TempDir() + "qxsm_output_" + std::to_string(getpid()) + "_" + name;
  std::filesystem::remove(path);
  return path;
}

std::string content(const std::string& path) {
  std::ifstream file(path);
  return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
}

TEST(OutputFile, an_array_reads_back_to_the_bit) {
  const std::string path = fresh("array.mtx");
  const std::vector<double> values{0.1, -1.0 / 3.0, 1e-310, std::numeric_limits<double>::max(), 0.0, 5e-324};
  OutputFile out(path, {});
  write_array(out, 3, 2, values.data(), "a comment");
  const std::string text = content(path);
  EXPECT_EQ(text.find("%%MatrixMarket matrix array real general\n% a comment\n3 2\n1.0000000000000001e-01\n"), 0u);
  const auto read = read_text(text);
  ASSERT_EQ(read.entries().size(), values.size());
  for (std::size_t i = 0; i < values.size(); ++i) EXPECT_EQ(std::get<2>(read.entries()[i]), values[i]);
  std::filesystem::remove(path);
}

TEST(OutputFile, a_name_in_gz_is_written_as_gzip_and_reads_back_to_the_bit) {
  const std::string path = fresh("array.mtx.gz");
  // More than what is formatted at a time.
  std::vector<double> values;
  for (int i = 0; i < 200'000; ++i) values.push_back(1.0 / (i + 3.0));
  OutputFile out(path, {});
  write_array(out, 200'000, 1, values.data(), "packed");
  const std::string bytes = content(path);
  EXPECT_EQ(bytes.substr(0, 2), "\x1f\x8b");
  const auto read = read_text(bytes);
  ASSERT_EQ(read.entries().size(), values.size());
  for (std::size_t i = 0; i < values.size(); ++i) EXPECT_EQ(std::get<2>(read.entries()[i]), values[i]);
  std::filesystem::remove(path);
}

TEST(OutputFile, a_shorter_result_leaves_nothing_of_an_older_file) {
  const std::string path = fresh("older.mtx");
  std::ofstream(path) << std::string(5000, 'x');
  const double value = 1.0;
  OutputFile out(path, {});
  write_array(out, 1, 1, &value, "short");
  EXPECT_EQ(content(path).find('x', 60), std::string::npos);
  EXPECT_EQ(read_text(content(path)).entries().size(), 1u);
  std::filesystem::remove(path);
}

TEST(OutputFile, a_file_that_was_not_finished_goes_again_but_an_older_one_stays) {
  const std::string path = fresh("unfinished.mtx");
  { OutputFile out(path, {}); }
  EXPECT_FALSE(std::filesystem::exists(path));
  std::ofstream(path) << "old";
  { OutputFile out(path, {}); }
  EXPECT_EQ(content(path), "old");
  std::filesystem::remove(path);
}

TEST(OutputFile, an_input_is_not_written_over_under_any_name) {
  const std::string path = fresh("input.mtx");
  const std::string link = fresh("link.mtx");
  std::ofstream(path) << "data";
  ASSERT_EQ(symlink(path.c_str(), link.c_str()), 0);
  EXPECT_THROW(OutputFile(path, {"other", path}), cli::CommandError);
  EXPECT_THROW(OutputFile(link, {path}), cli::CommandError);
  EXPECT_EQ(content(path), "data");
  std::filesystem::remove(path);
  std::filesystem::remove(link);
}

TEST(OutputFile, a_path_that_cannot_be_written_is_refused_at_once) {
  for (const std::string& path : {::testing::TempDir() + "no/such/folder/x.mtx", ::testing::TempDir()}) {
    try {
      OutputFile out(path, {});
      FAIL();
    } catch (const cli::CommandError& error) {
      EXPECT_EQ(error.problem().file, path);
      EXPECT_EQ(error.problem().code, cli::ExitCode::bad_input);
      EXPECT_NE(error.problem().what.find("cannot be written"), std::string::npos);
    }
  }
}

TEST(OutputFile, a_full_device_is_noticed) {
  if (!std::filesystem::exists("/dev/full")) GTEST_SKIP() << "no /dev/full here";
  OutputFile out("/dev/full", {});
  const double value = 1.0;
  EXPECT_THROW(write_array(out, 1, 1, &value, "x"), cli::CommandError);
}

}  // namespace
}  // namespace sm::test
