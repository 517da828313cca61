// Henderson's rules for the inverse of the relationship matrix: C. R. Henderson, "A simple method for computing the
// inverse of a numerator relationship matrix used in prediction of breeding values", Biometrics 32 (1976) 69-83, here
// without inbreeding.
#include <fmt/format.h>

#include <algorithm>
#include <array>

#include "bench/generators/generators.hpp"
#include "bench/generators/random.hpp"

namespace sm::bench {
namespace {

constexpr int kYears = 12;
constexpr int kHerdSize = 600;
constexpr int kYoungest = 2;  // years between a parent and its offspring
constexpr int kOldest = 6;
constexpr double kDamKnown = 0.95;
constexpr double kInsemination = 0.70;  // share of sires from the pool
constexpr double kHerdBull = 0.25;      // share of sires from the herd; the others are not known
constexpr int kAnimalsPerPoolBull = 1500;
constexpr double kRecorded = 0.60;
constexpr double kRatio = 2.0;
constexpr int kUnknown = -1;

using Animals = std::vector<int>;

class Population {
 public:
  Population(int animals, Random& random)
      : random_(random),
        herds_(std::max(1, animals / kHerdSize)),
        pool_size_(std::max(1, animals / kAnimalsPerPoolBull)),
        dams_(static_cast<std::size_t>(kYears * herds_)),
        bulls_(dams_.size()),
        chosen_(static_cast<std::size_t>(herds_)) {}

  [[nodiscard]] int herds() const { return herds_; }

  // Chooses the bulls of the year: the pool, and two in each herd.
  void begin(int year) {
    pool_.clear();
    for (int b = 0; b < pool_size_; ++b) {
      const int bull = parent(bulls_, year, random_.below(herds_));
      if (bull != kUnknown) pool_.push_back(bull);
    }
    for (int h = 0; h < herds_; ++h) {
      chosen_[static_cast<std::size_t>(h)] = {parent(bulls_, year, h), parent(bulls_, year, h)};
    }
  }

  int dam(int year, int herd) { return random_.uniform() < kDamKnown ? parent(dams_, year, herd) : kUnknown; }

  int sire(int herd) {
    const double u = random_.uniform();
    if (u < kInsemination) return pool_.empty() ? kUnknown : pool_[at(random_.below(static_cast<int>(pool_.size())))];
    return u < kInsemination + kHerdBull ? chosen_[at(herd)][at(random_.below(2))] : kUnknown;
  }

  void born(int animal, int year, int herd) {
    (random_.below(2) == 0 ? dams_ : bulls_)[at(year * herds_ + herd)].push_back(animal);
  }

 private:
  static std::size_t at(int i) { return static_cast<std::size_t>(i); }

  int parent(const std::vector<Animals>& candidates, int year, int herd) {
    const int oldest = std::max(0, year - kOldest);
    const int youngest = year - kYoungest;
    if (youngest < oldest) return kUnknown;
    const Animals& born = candidates[at((oldest + random_.below(youngest - oldest + 1)) * herds_ + herd)];
    return born.empty() ? kUnknown : born[at(random_.below(static_cast<int>(born.size())))];
  }

  Random& random_;
  int herds_, pool_size_;
  std::vector<Animals> dams_, bulls_;  // by year and herd
  Animals pool_;
  std::vector<std::array<int, 2>> chosen_;
};

// The part of one animal in the inverse of the relationship matrix. Numbers are of equations; kUnknown stays.
void enter_pedigree(Triplets& upper, int animal, int sire, int dam) {
  const int known = (sire != kUnknown) + (dam != kUnknown);
  const double weight = kRatio * (known == 2 ? 2.0 : known == 1 ? 4.0 / 3.0 : 1.0);
  upper.add(animal, animal, weight);
  for (const int parent : {sire, dam}) {
    if (parent == kUnknown) continue;
    upper.add(parent, animal, -0.5 * weight);
    upper.add(parent, parent, 0.25 * weight);
  }
  if (known == 2) upper.add(sire, dam, 0.25 * weight);
}

}  // namespace

Problem animal_model(int animals) {
  Random random(4);
  Population population(animals, random);
  const int fixed = kYears * population.herds();
  const int n = fixed + animals;
  Problem p{.family = "d",
            .name = fmt::format("{} animals", animals),
            .n = n,
            .rank = n,
            .upper = {},
            .rhs = std::vector<double>(static_cast<std::size_t>(n))};
  const auto equation = [&](int animal) { return animal == kUnknown ? kUnknown : fixed + animal; };
  // A herd without a record in some year would have an empty equation; one extra record each keeps it out.
  for (int h = 0; h < fixed; ++h) p.upper.add(h, h, 1.0);
  int year = -1;
  for (int i = 0; i < animals; ++i) {
    const int now = static_cast<int>(static_cast<long>(i) * kYears / animals);
    if (now != year) population.begin(year = now);
    const int herd = i % population.herds();
    enter_pedigree(p.upper, fixed + i, equation(population.sire(herd)), equation(population.dam(year, herd)));
    population.born(i, year, herd);
    if (random.uniform() >= kRecorded) continue;
    const int herd_year = year * population.herds() + herd;
    const double record = random.between(-1.0, 1.0);
    p.upper.add(herd_year, herd_year, 1.0);
    p.upper.add(herd_year, fixed + i, 1.0);
    p.upper.add(fixed + i, fixed + i, 1.0);
    p.rhs[static_cast<std::size_t>(herd_year)] += record;
    p.rhs[static_cast<std::size_t>(fixed + i)] += record;
  }
  return p;
}

}  // namespace sm::bench
