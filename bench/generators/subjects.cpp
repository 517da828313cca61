#include <fmt/format.h>

#include <array>

#include "bench/generators/generators.hpp"
#include "bench/generators/random.hpp"

namespace sm::bench {
namespace {

constexpr int kFixed = 10;
constexpr int kCoefficients = 6;
constexpr int kEffects = kFixed + kCoefficients;
constexpr int kRecords = 8;
constexpr double kCorrelation = 0.5;  // between neighbouring coefficients of a subject

using Row = std::array<double, kEffects>;
using Block = std::array<Row, kEffects>;

// The inverse of correlation^|i - j|, which is tridiagonal.
void add_prior(Block& block) {
  constexpr double scale = 1.0 / (1.0 - kCorrelation * kCorrelation);
  for (std::size_t c = 0; c < kCoefficients; ++c) {
    const bool end = c == 0 || c + 1 == kCoefficients;
    block[kFixed + c][kFixed + c] += scale * (end ? 1.0 : 1.0 + kCorrelation * kCorrelation);
    if (c + 1 < kCoefficients) block[kFixed + c][kFixed + c + 1] -= scale * kCorrelation;
  }
}

}  // namespace

Problem random_coefficients(int subjects) {
  const int n = kFixed + kCoefficients * subjects;
  Problem p{.family = "f",
            .name = fmt::format("{} subjects", subjects),
            .n = n,
            .rank = n,
            .upper = {},
            .rhs = std::vector<double>(static_cast<std::size_t>(n))};
  Random random(5);
  for (int s = 0; s < subjects; ++s) {
    const auto equation = [s](std::size_t effect) {
      const int e = static_cast<int>(effect);
      return e < kFixed ? e : e + kCoefficients * s;
    };
    Block block{};
    for (int record = 0; record < kRecords; ++record) {
      Row x{};
      for (double& value : x) value = random.between(-1.0, 1.0);
      const double y = random.between(-1.0, 1.0);
      for (std::size_t a = 0; a < kEffects; ++a) {
        p.rhs[static_cast<std::size_t>(equation(a))] += x[a] * y;
        for (std::size_t b = a; b < kEffects; ++b) block[a][b] += x[a] * x[b];
      }
    }
    add_prior(block);
    for (std::size_t a = 0; a < kEffects; ++a) {
      for (std::size_t b = a; b < kEffects; ++b) p.upper.add(equation(a), equation(b), block[a][b]);
    }
  }
  return p;
}

}  // namespace sm::bench
