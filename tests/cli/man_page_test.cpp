// The manual page says what the help says: each subcommand has a section, with each of its options.
#include <map>
#include <regex>
#include <set>
#include <sstream>

#include "cli/command.hpp"

namespace sm::test {
namespace {

class ManPage : public CommandTest {
 protected:
  // The text of each section, .SH and .SS alike, by its title, with its dashes as people type them.
  static std::map<std::string, std::string> sections() {
    const std::string source = read(std::string(QXSM_SOURCE) + "/docs/qxsm.1");
    std::string text;
    for (std::size_t i = 0; i < source.size(); ++i) {
      if (source.compare(i, 2, "\\-") == 0) ++i;
      text += source[i];
    }
    std::map<std::string, std::string> parts;
    std::istringstream lines(text);
    std::string* current = nullptr;
    for (std::string line; std::getline(lines, line);) {
      if (line.rfind(".SH ", 0) == 0 || line.rfind(".SS ", 0) == 0) current = &parts[line.substr(4)];
      if (current) *current += line + "\n";
    }
    return parts;
  }

  // The subcommands that the help lists.
  static std::vector<std::string> subcommands() {
    std::istringstream lines(qxsm({"--help"}).out);
    std::vector<std::string> names;
    bool listed = false;
    for (std::string line; std::getline(lines, line);) {
      if (listed && line.rfind("  ", 0) == 0) names.push_back(line.substr(2, line.find(' ', 2) - 2));
      if (listed && line.empty()) break;
      if (line == "Subcommands:") listed = true;
    }
    return names;
  }

  // The options that a help explains.
  static std::set<std::string> options(const std::string& help) {
    std::istringstream lines(help.substr(help.find("\nOptions:\n") + 10));
    std::set<std::string> names;
    const std::regex option("(--?[a-z][a-z-]*)(,(--[a-z-]+))?");
    for (std::string line; std::getline(lines, line) && !line.empty();) {
      std::smatch found;
      if (line.rfind("  -", 0) != 0 || !std::regex_search(line, found, option)) continue;
      names.insert(found[1]);
      if (found[3].matched) names.insert(found[3]);
    }
    return names;
  }

  // Whether a section explains the option: in the line after a .TP.
  static bool explains(const std::string& section, const std::string& option) {
    std::istringstream lines(section);
    const std::regex word("(^|[^a-z-])" + option + "($|[^a-z-])");
    bool tag = false;
    for (std::string line; std::getline(lines, line); tag = line == ".TP") {
      if (tag && std::regex_search(line, word)) return true;
    }
    return false;
  }
};

TEST_F(ManPage, has_a_section_for_each_subcommand_and_each_of_its_options_there) {
  const auto parts = sections();
  const auto commands = subcommands();
  EXPECT_EQ(commands.size(), 14u);
  ASSERT_TRUE(parts.contains("Common options"));
  std::size_t seen = 0;
  for (const std::string& command : commands) {
    ASSERT_TRUE(parts.contains(command)) << command;
    EXPECT_NE(parts.at(command).find("qxsm " + command), std::string::npos);
    const auto names = options(qxsm({command, "--help"}).out);
    EXPECT_TRUE(names.contains("--json") && names.contains("-h") && names.contains("--help")) << command;
    for (const std::string& name : names) {
      const bool common = explains(parts.at("Common options"), name);
      EXPECT_TRUE(common || explains(parts.at(command), name)) << command << " " << name;
      seen += common ? 0 : 1;
    }
  }
  EXPECT_GE(seen, 20u);
}

TEST_F(ManPage, names_no_option_that_its_subcommand_does_not_have) {
  const auto parts = sections();
  for (const std::string& command : subcommands()) {
    const auto names = options(qxsm({command, "--help"}).out);
    const std::string& text = parts.at(command);
    const std::regex tagged("\\.(B|BI|BR|RB) (\\[ )?(--?[a-z][a-z-]*)");
    for (auto at = std::sregex_iterator(text.begin(), text.end(), tagged); at != std::sregex_iterator(); ++at) {
      EXPECT_TRUE(names.contains((*at)[3])) << command << " " << (*at)[3];
    }
  }
}

TEST_F(ManPage, has_the_options_without_a_subcommand_and_every_exit_code) {
  const auto parts = sections();
  for (const std::string& name : options(qxsm({"--help"}).out)) {
    EXPECT_TRUE(explains(parts.at("OPTIONS"), name)) << name;
  }
  for (const char* code : {"0", "1", "2", "3"}) {
    EXPECT_NE(parts.at("EXIT STATUS").find(std::string(".B ") + code + "\n"), std::string::npos) << code;
  }
  for (const char* section : {"NAME", "SYNOPSIS", "DESCRIPTION", "FILES", "EXAMPLES"}) {
    EXPECT_TRUE(parts.contains(section)) << section;
  }
}

TEST_F(ManPage, names_the_version_of_the_command) {
  const std::string version = qxsm({"--version"}).out;
  const std::string number = version.substr(5, version.find('\n') - 5);
  EXPECT_NE(read(std::string(QXSM_SOURCE) + "/docs/qxsm.1").find("\"qxesm " + number + "\""), std::string::npos);
}

}  // namespace
}  // namespace sm::test
