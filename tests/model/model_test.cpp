// Random calls of every operation beside a plain model of the whole module. A difference prints the host, the seed, the
// last calls and the records; the same seed makes the same calls again. More seeds than the listed ones:
//   QXESM_MODEL_SEEDS=1000-3000 model_test --gtest_filter='*random*'
#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <map>
#include <string>

#include "model/machine.hpp"

namespace sm::test {
namespace {

constexpr Index kSteps = 3000;
// Seeds that have found a difference once.
constexpr std::uint64_t kOnceFailed[] = {1};

struct Seeds {
  unsigned long long first = 1;
  unsigned long long last = 24;
};

Seeds seeds() {
  Seeds s;
  const char* text = std::getenv("QXESM_MODEL_SEEDS");
  if (text && std::sscanf(text, "%llu-%llu", &s.first, &s.last) != 2) s.last = 0;
  return s;
}

class ModelTest : public ::testing::TestWithParam<HostKind> {
 protected:
  void run(std::uint64_t seed) {
    Machine machine(GetParam(), seed);
    const std::string text = machine.run(kSteps);
    EXPECT_TRUE(text.empty()) << name_of(GetParam()) << " host, seed " << seed << ": " << text;
    const std::string left = machine.close();
    EXPECT_EQ(left, "") << "seed " << seed;
    for (const auto& [name, count] : machine.counts()) {
      counts_[name].calls += count.calls;
      counts_[name].served += count.served;
    }
    for (const auto& [situation, count] : machine.met()) met_[situation] += count;
  }
  void expect_met(const std::string& situation) {
    EXPECT_GE(met_[situation], 10) << situation << " is met too rarely to be tested";
  }
  std::map<std::string, Count> counts_;
  std::map<std::string, Index> met_;
};
INSTANTIATE_BOTH_HOSTS(ModelTest);

TEST_P(ModelTest, random_calls_agree_with_the_model) {
  const Seeds s = seeds();
  ASSERT_GE(s.last, s.first) << "QXESM_MODEL_SEEDS is first-last";
  for (std::uint64_t seed = s.first; seed <= s.last && !HasFailure(); ++seed) run(seed);
  Index calls = 0;
  for (const auto& [name, count] : counts_) {
    calls += count.calls;
    RecordProperty(name, std::to_string(count.calls) + " calls, " + std::to_string(count.served) + " served");
    EXPECT_GE(count.served, 50) << name << " is served too rarely to be tested";
  }
  EXPECT_GE(calls, 50000);
  for (const char* type : {"2/21", "2/22", "2/23", "3/22", "3/23", "6/22", "6/23"})
    expect_met(std::string(type) + " state 1");
  for (const char* type : {"2/22", "2/23", "3/22", "3/23", "6/22", "6/23"})
    for (const char* state : {" state 0 tied", " state 1 tied"}) expect_met(std::string(type) + state);
  for (const char* state : {"0", "1", "2", "3", "4", "5"}) expect_met(std::string("3/21 state ") + state);
  for (const char* type : {"3/22", "3/23", "6/22", "6/23"})
    for (const char* state : {" state 5", " state 6"})
      for (const char* place : {" separate", " in place"}) expect_met(std::string(type) + state + place);
}

TEST_P(ModelTest, seeds_that_once_failed_agree_with_the_model) {
  for (const std::uint64_t seed : kOnceFailed) run(seed);
}

}  // namespace
}  // namespace sm::test
