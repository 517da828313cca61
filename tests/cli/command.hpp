// Runs the command as a program, and makes the files that it is run on.
#pragma once

#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <tuple>
#include <vector>

#include "cli/printed_json.hpp"

namespace sm::test {

struct Outcome {
  int code = -1;  // the exit code, or -1 when the program was ended by a signal
  std::string out;
  std::string err;

  PrintedJson json() const { return PrintedJson::parse(out); }
  // What stands behind a label in the text; a test failure when there is no such line.
  std::string fact(const std::string& label) const;
};

// How a program is started. A file descriptor below 0 stands for a file of the runner's own.
struct Streams {
  std::string input{};        // what the program finds on standard input
  const char* out = nullptr;  // a file to open for standard output
  int in_file = -1;
  int out_file = -1;
  int err_file = -1;
  std::string library_path{};                 // LD_LIBRARY_PATH
  std::string folder{};                       // working directory
  const char* terminal = nullptr;             // TERM
  std::function<void(int process)> beside{};  // runs in a thread of its own, beside the program
};

Outcome qxsm(const std::vector<std::string>& arguments, const Streams& streams = {});

// Whether the program is built with sanitizers, which take memory and time of their own.
bool sanitized();

// A folder of its own for each test.
class CommandTest : public ::testing::Test {
 protected:
  CommandTest();
  ~CommandTest() override;

  std::string path(const std::string& name) const { return folder_ + "/" + name; }
  // Writes a file and answers its path.
  std::string file(const std::string& name, const std::string& content) const;
  // The same, with "%%MatrixMarket matrix <kind>\n" in front.
  std::string matrix(const std::string& name, const std::string& kind, const std::string& rest) const;
  // A coordinate file, of a lower triangle or the whole, with entries in three of four positions: multiples of 1/64, so
  // that sums of products are exact.
  std::string scattered(const std::string& name, int rows, int cols, bool lower, std::uint64_t seed) const;
  static std::string read(const std::string& path);
  static std::string shipped(const std::string& name) { return std::string(QXSM_SOURCE) + "/data/" + name; }
  static std::string example(const std::string& name) { return std::string(QXSM_SOURCE) + "/examples/" + name; }

 private:
  std::string folder_;
};

// The values of a Matrix Market array, read without the command's own reader.
std::vector<double> array_values(const std::string& text);
// Entries of a coordinate file, zero-based, as they stand.
std::vector<std::tuple<int, int, double>> coordinate_entries(const std::string& text);

// The message names the file and the line, says what was found and what was expected, and ends with advice.
void expect_message(const Outcome& run, int code, const std::vector<std::string>& parts);

}  // namespace sm::test
