#include "cli/command.hpp"

#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <sstream>
#include <thread>

namespace sm::test {
namespace {

// A file without a name, for what a program reads or writes.
class Scratch {
 public:
  Scratch() {
    std::string name = ::testing::TempDir() + "qxsm_XXXXXX";
    file_ = mkstemp(name.data());
    EXPECT_GE(file_, 0);
    unlink(name.c_str());
  }
  ~Scratch() { close(file_); }
  int file() const { return file_; }

  void fill(const std::string& text) const {
    EXPECT_EQ(write(file_, text.data(), text.size()), static_cast<ssize_t>(text.size()));
    lseek(file_, 0, SEEK_SET);
  }
  std::string content() const {
    std::string text(static_cast<std::size_t>(lseek(file_, 0, SEEK_END)), '\0');
    EXPECT_EQ(pread(file_, text.data(), text.size(), 0), static_cast<ssize_t>(text.size()));
    return text;
  }

 private:
  int file_;
};

[[noreturn]] void start(std::vector<std::string> arguments, const Streams& streams, int in, int out, int err) {
  if (streams.out) out = open(streams.out, O_WRONLY);
  dup2(in, STDIN_FILENO);
  dup2(out, STDOUT_FILENO);
  dup2(err, STDERR_FILENO);
  if (streams.terminal) setenv("TERM", streams.terminal, 1);
  if (!streams.library_path.empty()) setenv("LD_LIBRARY_PATH", streams.library_path.c_str(), 1);
  if (!streams.folder.empty() && chdir(streams.folder.c_str()) != 0) _exit(126);
  arguments.insert(arguments.begin(), QXSM_COMMAND);
  std::vector<char*> pointers;
  for (std::string& argument : arguments) pointers.push_back(argument.data());
  pointers.push_back(nullptr);
  execv(QXSM_COMMAND, pointers.data());
  _exit(127);
}

}  // namespace

Outcome qxsm(const std::vector<std::string>& arguments, const Streams& streams) {
  const Scratch in;
  const Scratch out;
  const Scratch err;
  in.fill(streams.input);
  const int in_file = streams.in_file >= 0 ? streams.in_file : in.file();
  const int out_file = streams.out_file >= 0 ? streams.out_file : out.file();
  const int err_file = streams.err_file >= 0 ? streams.err_file : err.file();
  const pid_t child = fork();
  if (child == 0) start(arguments, streams, in_file, out_file, err_file);
  std::thread user;
  if (streams.beside) user = std::thread([&] { streams.beside(child); });
  int status = 0;
  EXPECT_EQ(waitpid(child, &status, 0), child);
  if (user.joinable()) user.join();
  return {.code = WIFEXITED(status) ? WEXITSTATUS(status) : -1, .out = out.content(), .err = err.content()};
}

std::string Outcome::fact(const std::string& label) const {
  std::istringstream lines(out);
  for (std::string line; std::getline(lines, line);) {
    if (line.rfind(label + "  ", 0) != 0) continue;
    return line.substr(line.find_first_not_of(' ', label.size()));
  }
  ADD_FAILURE() << "no line " << label << " in\n" << out;
  return {};
}

CommandTest::CommandTest() : folder_(::testing::TempDir() + "qxsm_test_XXXXXX") {
  EXPECT_NE(mkdtemp(folder_.data()), nullptr);
}

CommandTest::~CommandTest() { std::filesystem::remove_all(folder_); }

std::string CommandTest::file(const std::string& name, const std::string& content) const {
  std::ofstream(path(name), std::ios::binary) << content;
  return path(name);
}

std::string CommandTest::matrix(const std::string& name, const std::string& kind, const std::string& rest) const {
  return file(name, "%%MatrixMarket matrix " + kind + "\n" + rest);
}

std::string CommandTest::scattered(const std::string& name, int rows, int cols, bool lower, std::uint64_t seed) const {
  std::string text;
  int count = 0;
  for (int i = 1; i <= rows; ++i) {
    for (int j = 1; j <= (lower ? i : cols); ++j) {
      seed = seed * 6364136223846793005u + 1442695040888963407u;
      if (seed >> 62 == 0) continue;
      text += std::to_string(i) + " " + std::to_string(j) + " " +
              std::to_string((static_cast<double>(seed >> 54) - 512.0) / 64.0) + "\n";
      ++count;
    }
  }
  return matrix(name, std::string("coordinate real ") + (lower ? "symmetric" : "general"),
                std::to_string(rows) + " " + std::to_string(cols) + " " + std::to_string(count) + "\n" + text);
}

std::string CommandTest::read(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
}

std::vector<double> array_values(const std::string& text) {
  std::istringstream lines(text);
  std::string line;
  while (std::getline(lines, line) && line[0] == '%') {
  }
  std::vector<double> values;
  for (double value = 0.0; lines >> value;) values.push_back(value);
  return values;
}

std::vector<std::tuple<int, int, double>> coordinate_entries(const std::string& text) {
  std::istringstream lines(text);
  std::string line;
  while (std::getline(lines, line) && line[0] == '%') {
  }
  std::vector<std::tuple<int, int, double>> entries;
  int row = 0;
  int col = 0;
  for (double value = 0.0; lines >> row >> col >> value;) entries.emplace_back(row - 1, col - 1, value);
  return entries;
}

bool sanitized() {
#ifdef QXSM_SANITIZED
  return true;
#else
  return false;
#endif
}

void expect_message(const Outcome& run, int code, const std::vector<std::string>& parts) {
  EXPECT_EQ(run.code, code) << run.err;
  EXPECT_EQ(run.err.rfind("qxsm: ", 0), 0u) << run.err;
  EXPECT_EQ(run.err.find('\n'), run.err.size() - 1) << "one line: " << run.err;
  for (const std::string& part : parts) EXPECT_NE(run.err.find(part), std::string::npos) << part << " in " << run.err;
}

}  // namespace sm::test
