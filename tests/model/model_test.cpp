// Random calls of every operation beside a plain model of the whole module. A difference prints the host, the seed, the
// last calls and the records; the same seed makes the same calls again.
#include <gtest/gtest.h>

#include <map>
#include <string>

#include "model/machine.hpp"

namespace sm::test {
namespace {

constexpr Index kSteps = 3000;
constexpr std::uint64_t kSeeds = 24;
// Seeds that have found a difference once.
constexpr std::uint64_t kOnceFailed[] = {1};

class ModelTest : public ::testing::TestWithParam<HostKind> {};
INSTANTIATE_BOTH_HOSTS(ModelTest);

void run(HostKind host, std::uint64_t seed, std::map<std::string, Count>& counts) {
  Machine machine(host, seed);
  const std::string text = machine.run(kSteps);
  if (!text.empty()) ADD_FAILURE() << name_of(host) << " host, seed " << seed << ": " << text;
  for (const auto& [name, count] : machine.counts()) {
    counts[name].calls += count.calls;
    counts[name].served += count.served;
  }
}

TEST_P(ModelTest, random_calls_agree_with_the_model) {
  std::map<std::string, Count> counts;
  for (std::uint64_t seed = 1; seed <= kSeeds && !HasFailure(); ++seed) run(GetParam(), seed, counts);
  Index calls = 0;
  for (const auto& [name, count] : counts) {
    calls += count.calls;
    EXPECT_GE(count.served, 50) << name << " is served too rarely to be tested";
    if (std::getenv("QXESM_MODEL_COUNTS")) std::printf("%-20s %8ld %8ld\n", name.c_str(), count.calls, count.served);
  }
  EXPECT_GE(calls, 50000);
}

TEST_P(ModelTest, seeds_that_once_failed_agree_with_the_model) {
  std::map<std::string, Count> counts;
  for (const std::uint64_t seed : kOnceFailed) run(GetParam(), seed, counts);
}

}  // namespace
}  // namespace sm::test
