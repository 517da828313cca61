#include "bench/harness/records.hpp"

#include <fmt/format.h>

#include <algorithm>
#include <cstdio>
#include <stdexcept>

namespace sm::bench {
namespace {

Json json_of(const Outcome& outcome) {
  Json line = {{"name", outcome.name}};
  if (!outcome.not_run.empty()) {
    line["not_run"] = outcome.not_run;
  } else if (!outcome.fault.empty()) {
    line["wrong"] = outcome.fault;
  } else {
    line["seconds"] = outcome.median();
    line["least"] = *std::min_element(outcome.seconds.begin(), outcome.seconds.end());
    line["most"] = *std::max_element(outcome.seconds.begin(), outcome.seconds.end());
    line["runs"] = outcome.seconds.size();
  }
  return line;
}

std::string text_of(const Outcome& outcome) {
  if (!outcome.not_run.empty()) return fmt::format("{}: not run, {}", outcome.name, outcome.not_run);
  if (!outcome.fault.empty()) return fmt::format("{}: WRONG, {}", outcome.name, outcome.fault);
  return fmt::format("{} {:.4g}", outcome.name, outcome.median());
}

}  // namespace

Records::Records(const std::string& file) : file_(file) {
  if (!file_) throw std::runtime_error("cannot write " + file);
}

void Records::write(const Json& line) { file_ << line.dump() << std::endl; }

void Records::write(const Subject& subject, const std::string& phase, const std::string& variant,
                    const std::vector<Outcome>& outcomes, const Json& facts) {
  Json line = {{"family", subject.family},   {"case", subject.name}, {"n", subject.n},
               {"entries", subject.entries}, {"phase", phase},       {"variant", variant},
               {"times", Json::array()}};
  std::string text;
  for (const Outcome& outcome : outcomes) {
    line["times"].push_back(json_of(outcome));
    text += (text.empty() ? "" : " | ") + text_of(outcome);
    if (!outcome.fault.empty()) ++faults_;
  }
  line["facts"] = facts;
  write(line);
  std::fputs(fmt::format("{} {:<28} {:<20} {}\n", subject.family, subject.name,
                         variant.empty() ? phase : phase + ", " + variant, text)
                 .c_str(),
             stderr);
}

}  // namespace sm::bench
