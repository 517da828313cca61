// Random calls of every operation beside a plain model of the whole module. A difference prints the host, the seed, the
// last calls and the records; the same seed makes the same calls again. More seeds than the listed ones:
//   QXESM_MODEL_SEEDS=1000-3000 model_test --gtest_filter='*random*'
#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <string>

#include "model/machine.hpp"

namespace sm::test {
namespace {

constexpr Index kSteps = 4000;
// The seeds that together meet every combination; a slow build runs fewer.
constexpr unsigned long long kCompleteSeeds = 100;
// Seeds beyond the ordinary ones that have found a difference once.
constexpr std::uint64_t kOnceFailed[] = {212, 5200};

struct Seeds {
  unsigned long long first = 1;
  unsigned long long last = QXESM_MODEL_LAST_SEED;
  bool ordinary = true;
};

Seeds seeds() {
  Seeds s;
  const char* text = std::getenv("QXESM_MODEL_SEEDS");
  s.ordinary = text == nullptr;
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
    coverage_.add(machine.coverage());
  }
  Coverage coverage_;
};
INSTANTIATE_BOTH_HOSTS(ModelTest);

TEST_P(ModelTest, random_calls_agree_with_the_model) {
  const Seeds s = seeds();
  ASSERT_GE(s.last, s.first) << "QXESM_MODEL_SEEDS is first-last";
  for (std::uint64_t seed = s.first; seed <= s.last && !HasFailure(); ++seed) run(seed);
  RecordProperty("calls", std::to_string(coverage_.calls()));
  RecordProperty("refused_requests", std::to_string(coverage_.refused()));
  if (HasFailure()) return;
  if (!s.ordinary) {
    std::printf("%s", coverage_.table().c_str());
    return;
  }
  if (s.last < kCompleteSeeds) return;
  for (const std::string& line : missing_from(coverage_)) ADD_FAILURE() << line;
}

TEST_P(ModelTest, seeds_that_once_failed_agree_with_the_model) {
  for (const std::uint64_t seed : kOnceFailed) run(seed);
}

}  // namespace
}  // namespace sm::test
