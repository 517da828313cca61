// The raw output: one JSON object a line, and a line for people on the terminal.
#pragma once

#include <fstream>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "bench/harness/race.hpp"

namespace sm::bench {

using Json = nlohmann::ordered_json;

// What was measured where.
struct Subject {
  std::string family, name;
  double n = 0.0, entries = 0.0;
};

class Records {
 public:
  // Throws std::runtime_error when the file cannot be written.
  explicit Records(const std::string& file);

  void write(const Json& line);
  // One race, with numbers beside the times in `facts`.
  void write(const Subject& subject, const std::string& phase, const std::string& variant,
             const std::vector<Outcome>& outcomes, const Json& facts = Json::object());
  // Results of our own or a peer's that were refused so far.
  [[nodiscard]] int faults() const { return faults_; }

 private:
  std::ofstream file_;
  int faults_ = 0;
};

}  // namespace sm::bench
