// The help teaches by examples; they are run here, and must print what the help shows.
#include <algorithm>
#include <iterator>
#include <regex>
#include <sstream>

#include "cli/command.hpp"

namespace sm::test {
namespace {

const std::vector<std::string> kSubcommands{"info",      "factor",  "solve",    "invdiag", "quad", "trace", "hermite",
                                            "estimable", "convert", "pedigree", "lmm",     "reml", "blup",  "grid"};

class Help : public CommandTest {
 protected:
  // A line with its columns closed up, and without the numbers that differ between machines or runs: times, and what
  // is rounding error.
  static std::string comparable(const std::string& line) {
    for (const char* label : {"relative residual", "log-determinant", "peak memory", "numeric", "tr(", "iterations"}) {
      if (line.rfind(label, 0) == 0) return label;
    }
    std::string text;
    std::unique_copy(line.begin(), line.end(), std::back_inserter(text),
                     [](char a, char b) { return a == ' ' && b == ' '; });
    return text;
  }

  // The paths as the help has them.
  static std::string relative(std::string text) {
    const std::string folder = QXSM_SOURCE "/";
    for (std::size_t at = text.find(folder); at != std::string::npos; at = text.find(folder)) {
      text.erase(at, folder.size());
    }
    return text;
  }

  static std::vector<std::string> lines_of(const std::string& text) {
    std::vector<std::string> lines;
    std::istringstream stream(text);
    for (std::string line; std::getline(stream, line);) lines.push_back(line);
    return lines;
  }

  // As a shell takes a line apart, which may have words in single quotes.
  static std::vector<std::string> words_of(const std::string& line) {
    std::vector<std::string> words;
    bool open = false;
    bool quoted = false;
    for (const char c : line) {
      if (c == '\'') {
        quoted = !quoted;
      } else if (c == ' ' && !quoted) {
        open = false;
        continue;
      }
      if (!open) words.emplace_back();
      open = true;
      if (c != '\'') words.back() += c;
    }
    return words;
  }

  // Lines that end in a backslash go on in the next.
  static std::string joined(const std::string& help) { return std::regex_replace(help, std::regex(" \\\\\n +"), " "); }

  // Runs "qxsm ..." in a copy of the place where the help's paths lead somewhere.
  Outcome run_line(const std::string& line) const {
    std::vector<std::string> arguments = words_of(line);
    EXPECT_EQ(arguments.front(), "qxsm");
    arguments.erase(arguments.begin());
    for (std::string& word : arguments) {
      if (word.rfind("data/", 0) == 0 || word.rfind("examples/", 0) == 0) word.insert(0, QXSM_SOURCE "/");
    }
    return qxsm(arguments, {.folder = path("")});
  }

  // Answers how many lines of output were compared.
  int repeat_examples(const std::string& help) const {
    int compared = 0;
    Outcome run;
    for (const std::string& line : lines_of(joined(help))) {
      if (line.rfind("  $ ", 0) == 0) {
        const std::size_t code_at = line.find("# exit code ");
        run = run_line(line.substr(4, line.find('#') - 4));
        EXPECT_EQ(run.code, code_at == std::string::npos ? 0 : std::stoi(line.substr(code_at + 12))) << line << "\n"
                                                                                                     << run.err;
        run.out = relative(run.out);
      } else if (run.code >= 0 && line.rfind("  ", 0) == 0 && line != "  ...") {
        std::vector<std::string> printed;
        for (const std::string& out : lines_of(run.out)) printed.push_back(comparable(out));
        EXPECT_NE(std::find(printed.begin(), printed.end(), comparable(line.substr(2))), printed.end()) << line << "\n"
                                                                                                        << run.out;
        ++compared;
      } else if (line.empty() && compared > 0) {
        break;
      }
    }
    return compared;
  }
};

TEST_F(Help, explains_purpose_example_options_and_exit_codes) {
  for (const std::string& command : kSubcommands) {
    const Outcome run = qxsm({command, "--help"});
    EXPECT_EQ(run.code, 0);
    EXPECT_EQ(run.err, "");
    std::size_t position = 0;
    for (const std::string& part :
         {std::string("Example"), std::string("$ qxsm ") + command, std::string("Usage: qxsm ") + command,
          std::string("Options:"), std::string("--json"), std::string("Exit codes:"), std::string("  0  "),
          std::string("  1  "), std::string("  2  "), std::string("  3  ")}) {
      position = run.out.find(part, position);
      ASSERT_NE(position, std::string::npos) << part << " in order in\n" << run.out;
    }
  }
}

TEST_F(Help, lists_the_subcommands_with_their_purpose) {
  const Outcome run = qxsm({"--help"});
  EXPECT_EQ(run.code, 0);
  for (const char* part :
       {"  info       Show what a file holds", "  factor     Order and factor", "  solve      Solve A x = b",
        "  invdiag    Compute the diagonal", "  quad       Compute the form", "  trace      Compute the trace",
        "  hermite    Compute the Hermite form", "  estimable  Tell which rows",
        "  convert    Write a matrix in another form", "  pedigree   Find inbreeding", "  lmm        Fit a linear",
        "  reml       Fit a model", "  blup       Predict random", "  grid       Write the matrix", "Exit codes:"}) {
    EXPECT_NE(run.out.find(part), std::string::npos) << part << " in\n" << run.out;
  }
}

TEST_F(Help, shows_examples_that_print_what_it_says) {
  EXPECT_GE(repeat_examples(qxsm({"--help"}).out), 4);
  for (const std::string& command : kSubcommands) {
    if (command == "grid") continue;  // its example is too large for a test
    EXPECT_GE(repeat_examples(qxsm({command, "--help"}).out), 4) << command;
  }
}

}  // namespace
}  // namespace sm::test
