#include "mixed/relationship.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <cmath>
#include <utility>

#include "mixed/error.hpp"
#include "mixed/inbreeding.hpp"

namespace sm::mixed {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

// Adds up contributions to the upper triangle of a symmetric matrix, and sorts them into rows.
class UpperSum {
 public:
  explicit UpperSum(std::int64_t order) : diagonal_(at(order), 0.0), start_(at(order) + 2, 0) {}

  void add(std::int64_t i, std::int64_t j, double value) {
    if (i == j) {
      diagonal_[at(i)] += value;
      return;
    }
    const auto [row, col] = std::minmax(i, j);
    ++start_[at(row) + 2];
    parts_.push_back({row, col, value});
  }

  void finish(Precision& precision) {
    std::vector<std::pair<std::int64_t, double>> entries = scattered();
    const auto n = static_cast<std::int64_t>(diagonal_.size());
    precision.order = n;
    precision.row_start.assign(1, 0);
    for (std::int64_t i = 0; i < n; ++i) {
      precision.col.push_back(i);
      precision.value.push_back(diagonal_[at(i)]);
      const auto begin = entries.begin() + start_[at(i)];
      const auto end = entries.begin() + start_[at(i) + 1];
      std::sort(begin, end);
      for (auto entry = begin; entry != end;) {
        const std::int64_t col = entry->first;
        double value = 0.0;
        for (; entry != end && entry->first == col; ++entry) value += entry->second;
        if (value == 0.0) continue;  // a parent's share as a mate may cancel that as an offspring
        precision.col.push_back(col);
        precision.value.push_back(value);
      }
      precision.row_start.push_back(static_cast<std::int64_t>(precision.col.size()));
    }
  }

 private:
  struct Part {
    std::int64_t row;
    std::int64_t col;
    double value;
  };

  // By row, in any order within one.
  std::vector<std::pair<std::int64_t, double>> scattered() {
    for (std::size_t i = 2; i < start_.size(); ++i) start_[i] += start_[i - 1];
    std::vector<std::pair<std::int64_t, double>> entries(parts_.size());
    for (const Part& part : parts_) entries[at(start_[at(part.row) + 1]++)] = {part.col, part.value};
    std::vector<Part>().swap(parts_);
    return entries;
  }

  std::vector<double> diagonal_;
  std::vector<std::int64_t> start_;
  std::vector<Part> parts_;
};

[[noreturn]] void refuse_singular(const Pedigree& pedigree, std::int64_t animal, const std::string& file) {
  throw ModelError({.file = file,
                    .variable = pedigree.ids[at(animal)],
                    .what = "the parents are so inbred that the animal's genes are known from theirs",
                    .expected = "a relationship matrix that has an inverse",
                    .advice = "leave out the animal, or the oldest generations of selfing"});
}

}  // namespace

double mendelian_variance(const Pedigree& pedigree, const std::vector<double>& f, std::int64_t animal) {
  double variance = 1.0;
  for (const std::int64_t parent : {pedigree.sire[at(animal)], pedigree.dam[at(animal)]}) {
    if (parent != kUnknownParent) variance -= 0.25 * (1.0 + f[at(parent)]);
  }
  return variance;
}

std::vector<double> mendelian_variances(const Pedigree& pedigree, const std::vector<double>& f) {
  std::vector<double> d(pedigree.ids.size());
  for (std::int64_t i = 0; i < pedigree.size(); ++i) d[at(i)] = mendelian_variance(pedigree, f, i);
  return d;
}

Precision relationship_inverse(const Pedigree& pedigree, const std::vector<double>& f, const std::string& file) {
  Precision precision;
  UpperSum sum(pedigree.size());
  for (std::int64_t i = 0; i < pedigree.size(); ++i) {
    const double d = mendelian_variance(pedigree, f, i);
    if (d <= 0.0) refuse_singular(pedigree, i, file);
    precision.log_det -= std::log(d);
    // An animal less the mean of its parents: a row of the inverse of L. A selfed parent counts once with all of it.
    const std::int64_t sire = pedigree.sire[at(i)];
    const std::int64_t dam = pedigree.dam[at(i)];
    sum.add(i, i, 1.0 / d);
    if (sire != kUnknownParent) sum.add(i, sire, -0.5 / d);
    if (dam != kUnknownParent) sum.add(i, dam, -0.5 / d);
    if (sire != kUnknownParent) sum.add(sire, sire, 0.25 / d);
    if (dam != kUnknownParent) sum.add(dam, dam, 0.25 / d);
    if (sire != kUnknownParent && dam != kUnknownParent) sum.add(sire, dam, (sire == dam ? 0.5 : 0.25) / d);
  }
  sum.finish(precision);
  precision.inverse_diagonal_excess = f;
  return precision;
}

Precision pedigree_precision(const Pedigree& pedigree, const std::string& file) {
  return relationship_inverse(pedigree, inbreeding(pedigree), file);
}

double relationship_matrix_bytes(std::int64_t animals) {
  const auto n = static_cast<double>(animals);
  return 2.0 * sizeof(double) * 0.5 * n * (n + 1.0);
}

std::vector<double> relationship_matrix(const Pedigree& pedigree) {
  const std::int64_t n = pedigree.size();
  // In pedigree.order, by rows of the lower triangle, so that what a row needs is there.
  std::vector<std::int64_t> place(at(n));
  for (std::int64_t k = 0; k < n; ++k) place[at(pedigree.order[at(k)])] = k;
  std::vector<double> by_age(at(n * (n + 1) / 2));
  const auto element = [&](std::int64_t i, std::int64_t j) -> double& {
    return by_age[at(i >= j ? i * (i + 1) / 2 + j : j * (j + 1) / 2 + i)];
  };
  const auto place_of = [&](std::int64_t animal) { return animal == kUnknownParent ? animal : place[at(animal)]; };
  for (std::int64_t i = 0; i < n; ++i) {
    const std::int64_t sire = place_of(pedigree.sire[at(pedigree.order[at(i)])]);
    const std::int64_t dam = place_of(pedigree.dam[at(pedigree.order[at(i)])]);
    const auto half = [&](std::int64_t parent, std::int64_t j) {
      return parent == kUnknownParent ? 0.0 : 0.5 * element(parent, j);
    };
    for (std::int64_t j = 0; j < i; ++j) element(i, j) = half(sire, j) + half(dam, j);
    element(i, i) = 1.0 + (dam == kUnknownParent ? 0.0 : half(sire, dam));
  }
  std::vector<double> packed;
  packed.reserve(by_age.size());
  for (std::int64_t col = 0; col < n; ++col) {
    for (std::int64_t row = col; row < n; ++row) packed.push_back(element(place[at(row)], place[at(col)]));
  }
  return packed;
}

}  // namespace sm::mixed
