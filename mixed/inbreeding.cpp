#include "mixed/inbreeding.hpp"

#include <algorithm>
#include <array>
#include <bit>
#include <span>
#include <tuple>
#include <utility>

#include "mixed/relationship.hpp"

namespace sm::mixed {
namespace {

constexpr std::size_t kLanes = 16;
using Lanes = std::array<double, kLanes>;

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

// Only parents are anybody's ancestors. They are numbered by generation and within one by their own parents, so that
// sibs and half sibs, who share ancestors, stand together; the number behind the last stands for nobody.
struct Parents {
  std::vector<std::int64_t> number;  // of each animal; -1 for those without offspring
  std::vector<std::int64_t> sire;    // of each parent, by number
  std::vector<std::int64_t> dam;
  std::vector<double> mendelian;  // variances, as far as they are known

  std::int64_t nobody() const { return static_cast<std::int64_t>(sire.size()); }
};

struct NumberedParent {
  std::int64_t sire;
  std::int64_t dam;
  std::int64_t animal;
  bool operator<(const NumberedParent& other) const {
    return std::tie(sire, dam, animal) < std::tie(other.sire, other.dam, other.animal);
  }
};

Parents number_parents(const Pedigree& pedigree) {
  Parents parents;
  parents.number.assign(pedigree.ids.size(), -1);
  for (const auto* side : {&pedigree.sire, &pedigree.dam}) {
    for (const std::int64_t parent : *side) {
      if (parent != kUnknownParent) parents.number[at(parent)] = 0;
    }
  }
  const auto nobody = std::count(parents.number.begin(), parents.number.end(), 0);
  const auto number_of = [&](std::int64_t animal) {
    return animal == kUnknownParent ? nobody : parents.number[at(animal)];
  };
  std::vector<NumberedParent> generation;
  for (std::size_t i = 0; i < pedigree.order.size(); ++i) {
    const std::int64_t animal = pedigree.order[i];
    if (parents.number[at(animal)] >= 0) {
      generation.push_back({number_of(pedigree.sire[at(animal)]), number_of(pedigree.dam[at(animal)]), animal});
    }
    const bool last = i + 1 == pedigree.order.size() ||
                      pedigree.generation[at(pedigree.order[i + 1])] != pedigree.generation[at(animal)];
    if (!last) continue;
    std::sort(generation.begin(), generation.end());
    for (const NumberedParent& parent : generation) {
      parents.number[at(parent.animal)] = parents.nobody();
      parents.sire.push_back(parent.sire);
      parents.dam.push_back(parent.dam);
    }
    generation.clear();
  }
  parents.mendelian.assign(parents.sire.size(), 0.0);
  return parents;
}

// A couple with a child; couples with one pivot are looked at together.
struct Couple {
  std::int64_t pivot;
  std::int64_t mate;
  std::int64_t child;
  bool operator<(const Couple& other) const {
    return std::tie(pivot, mate, child) < std::tie(other.pivot, other.mate, other.child);
  }
};

// The two sweeps for up to kLanes pivots at a time.
class Sweeps {
 public:
  explicit Sweeps(const Parents& parents)
      : parents_(parents), rows_(parents.sire.size() + 1, Lanes{}), met_(parents.sire.size() / 64 + 1, 0) {}

  // The relationships of up to kLanes pivots with their mates: put(couple, relationship) for each of the couples, which
  // are sorted by pivot.
  template <class Put>
  void relate(std::span<const Couple> couples, Put put) {
    std::size_t lane = 0;
    for (std::size_t i = 0; i < couples.size(); ++i) {
      if (i == 0 || couples[i].pivot != couples[i - 1].pivot) {
        lane = i == 0 ? 0 : lane + 1;
        rows_[at(couples[i].pivot)][lane] = 1.0;
        meet(couples[i].pivot);
      }
      meet(couples[i].mate);
    }
    up();
    down();
    lane = 0;
    for (std::size_t i = 0; i < couples.size(); ++i) {
      if (i > 0 && couples[i].pivot != couples[i - 1].pivot) ++lane;
      put(couples[i], rows_[at(couples[i].mate)][lane]);
    }
    for (const std::int64_t j : ancestors_) rows_[at(j)].fill(0.0);
  }

 private:
  void meet(std::int64_t j) {
    met_[at(j) / 64] |= std::uint64_t{1} << (at(j) % 64);
    last_ = std::max(last_, j);
  }

  // From the youngest to the oldest: what each pivot has of each ancestor, and which ancestors there are.
  void up() {
    ancestors_.clear();
    const std::int64_t nobody = parents_.nobody();
    for (std::size_t word = at(last_) / 64 + 1; word-- > 0;) {
      while (met_[word] != 0) {
        const std::uint64_t highest = std::bit_floor(met_[word]);
        met_[word] ^= highest;
        const auto j = static_cast<std::int64_t>(word * 64) + std::countr_zero(highest);
        ancestors_.push_back(j);
        for (const std::int64_t parent : {parents_.sire[at(j)], parents_.dam[at(j)]}) {
          if (parent == nobody) continue;
          met_[at(parent) / 64] |= std::uint64_t{1} << (at(parent) % 64);
          for (std::size_t l = 0; l < kLanes; ++l) rows_[at(parent)][l] += 0.5 * rows_[at(j)][l];
        }
      }
    }
    last_ = 0;
  }

  // And back: what each of them shares with the pivots. The row of nobody is zero.
  void down() {
    for (std::size_t i = ancestors_.size(); i-- > 0;) {
      const std::size_t j = at(ancestors_[i]);
      const double d = parents_.mendelian[j];
      const Lanes& sire = rows_[at(parents_.sire[j])];
      const Lanes& dam = rows_[at(parents_.dam[j])];
      Lanes& own = rows_[j];
      for (std::size_t l = 0; l < kLanes; ++l) own[l] = own[l] * d + 0.5 * (sire[l] + dam[l]);
    }
  }

  const Parents& parents_;
  std::vector<Lanes> rows_;
  std::vector<std::uint64_t> met_;  // a bit for each parent that is still to be looked at
  std::int64_t last_ = 0;
  std::vector<std::int64_t> ancestors_;
};

// The coefficients, generation after generation.
class Coefficients {
 public:
  explicit Coefficients(const Pedigree& pedigree)
      : pedigree_(pedigree),
        parents_(number_parents(pedigree)),
        sweeps_(parents_),
        children_(parents_.sire.size(), 0),
        f_(pedigree.ids.size(), 0.0) {}

  std::vector<double> find() {
    const std::span<const std::int64_t> order(pedigree_.order);
    for (std::size_t begin = 0; begin < order.size();) {
      std::size_t end = begin;
      const std::int64_t number = pedigree_.generation[at(order[begin])];
      while (end < order.size() && pedigree_.generation[at(order[end])] == number) ++end;
      const auto generation = order.subspan(begin, end - begin);
      pair(generation);
      relate();
      for (const std::int64_t animal : generation) {
        const std::int64_t parent = parents_.number[at(animal)];
        if (parent >= 0) parents_.mendelian[at(parent)] = mendelian_variance(pedigree_, f_, animal);
      }
      begin = end;
    }
    return std::move(f_);
  }

 private:
  // The couples that have children in a generation; what needs no sweep is found here.
  void pair(std::span<const std::int64_t> generation) {
    couples_.clear();
    for (const std::int64_t child : generation) {
      const std::int64_t sire = pedigree_.sire[at(child)];
      const std::int64_t dam = pedigree_.dam[at(child)];
      if (sire == kUnknownParent || dam == kUnknownParent) continue;
      if (sire == dam) {
        f_[at(child)] = 0.5 * (1.0 + f_[at(sire)]);
        continue;
      }
      couples_.push_back({parents_.number[at(sire)], parents_.number[at(dam)], child});
      ++children_[at(couples_.back().pivot)];
      ++children_[at(couples_.back().mate)];
    }
    // Whoever has more children is the pivot, so that there are few.
    for (Couple& couple : couples_) {
      if (children_[at(couple.mate)] > children_[at(couple.pivot)]) std::swap(couple.pivot, couple.mate);
    }
    for (const Couple& couple : couples_) children_[at(couple.pivot)] = children_[at(couple.mate)] = 0;
    std::sort(couples_.begin(), couples_.end());
  }

  void relate() {
    for (std::size_t begin = 0; begin < couples_.size();) {
      std::size_t end = begin;
      for (std::size_t pivots = 0; end < couples_.size(); ++end) {
        if (end == begin || couples_[end].pivot != couples_[end - 1].pivot) ++pivots;
        if (pivots > kLanes) break;
      }
      sweeps_.relate({couples_.data() + begin, end - begin},
                     [&](const Couple& couple, double relationship) { f_[at(couple.child)] = 0.5 * relationship; });
      begin = end;
    }
  }

  const Pedigree& pedigree_;
  Parents parents_;
  Sweeps sweeps_;
  std::vector<std::int64_t> children_;  // of each parent, by number, in the generation that is looked at
  std::vector<double> f_;
  std::vector<Couple> couples_;
};

}  // namespace

std::vector<double> inbreeding(const Pedigree& pedigree) { return Coefficients(pedigree).find(); }

}  // namespace sm::mixed
