#include "mixed/optimum.hpp"

#include <algorithm>
#include <cmath>
#include <limits>

#include "mixed/curvature.hpp"
#include "mixed/factor_algebra.hpp"
#include "mixed/optimize.hpp"

namespace sm::mixed {
namespace {

constexpr double kNear = 0.03;     // singular values that may be zeros
constexpr double kOutwards = 0.2;  // how far a search goes back inside from a boundary that is none
constexpr double kCheap = 2e7;     // operations of an evaluation so quick that the search begins several times

class Finder {
 public:
  Finder(Likelihood& likelihood, const SearchOptions& options) : likelihood_(likelihood), options_(options) {}

  Optimum find(const Factors& start) {
    const auto rows = static_cast<double>(likelihood_.design().rows());
    const bool cheap = likelihood_.equations().facts().flops + 200.0 * rows <= kCheap;
    Optimum best = settle(search(Parameters(start)));
    if (!options_.several_starts || !cheap || best.convergence == Convergence::stopped) return best;
    quiet_ = true;
    for (const Factors& other_start : other_starts(start)) {
      if (!likelihood_.evaluate(other_start, false).defined) continue;
      Optimum other = settle(search(Parameters(other_start)));
      const bool lower = other.criterion < best.criterion - noise(best.criterion);
      const bool sounder = best.convergence != Convergence::converged && other.convergence == Convergence::converged &&
                           other.criterion < best.criterion + noise(best.criterion);
      if (lower || sounder) best = std::move(other);
    }
    return best;
  }

 private:
  static double noise(double criterion) { return 1e-9 * std::max(1.0, std::abs(criterion)); }

  // The criterion can have several minima: small and large variances, and each term as what explains most.
  static std::vector<Factors> other_starts(const Factors& like) {
    std::vector<std::vector<double>> sizes;
    for (const double size : {1.0, 0.15, 4.0}) sizes.emplace_back(like.size(), size);
    for (std::size_t t = 0; t < like.size() && like.size() > 1; ++t) {
      sizes.emplace_back(like.size(), 0.15);
      sizes.back()[t] = 2.0;
    }
    std::vector<Factors> starts;
    for (const std::vector<double>& size : sizes) {
      Factors start;
      for (std::size_t t = 0; t < like.size(); ++t) {
        const std::size_t n = Parameters::order_of(like[t]);
        Dense factor(n * n, 0.0);
        for (std::size_t c = 0; c < n; ++c) factor[c * n + c] = size[t];
        start.push_back(std::move(factor));
      }
      if (start != like) starts.push_back(std::move(start));
    }
    return starts;
  }

  Optimum search(Parameters parameters) {
    Factors factors;
    CriterionParts parts;
    const Objective objective = [&](std::span<const double> values) {
      factors = parameters.factors(values);
      parts = likelihood_.evaluate(factors, true);
      Evaluation evaluation{.value = std::numeric_limits<double>::infinity(), .gradient = {}};
      evaluation.gradient.assign(values.size(), 0.0);
      if (!parts.defined) return evaluation;
      evaluation.value = likelihood_.profiled(parts);
      evaluation.gradient = parameters.gradient(likelihood_.profiled_gradient(parts));
      return evaluation;
    };
    MinimiseOptions options;
    options.max_iterations = options_.max_iterations;
    options.derivative_free = options_.derivative_free;
    options.curvature = [&] { return average_curvature(likelihood_, parameters, factors, parts); };
    if (!quiet_) options.progress = options_.progress;
    Minimum minimum = minimise(objective, parameters.values(), options);
    return {.parameters = std::move(parameters),
            .values = std::move(minimum.x),
            .criterion = minimum.value,
            .hessian = std::move(minimum.hessian),
            .convergence = minimum.convergence,
            .optimizer = std::move(minimum.optimizer),
            .iterations = std::move(minimum.iterations)};
  }

  // Takes nearly singular factors for singular ones where that is as good, and leaves a boundary that is not.
  Optimum settle(Optimum inside) {
    for (int round = 0; round < 4 && inside.convergence != Convergence::stopped; ++round) {
      Factors factors = inside.factors();
      std::vector<double> limits(factors.size(), kNear);
      bool moved = false;
      for (std::size_t attempt = 0; attempt <= factors.size(); ++attempt) {
        Parameters reduced(factors, limits);
        if (reduced.full()) return inside;
        Optimum boundary = search(std::move(reduced));
        if (boundary.convergence == Convergence::stopped) return inside;
        Factors better = boundary.factors();
        bool doubtful = false;
        const std::vector<std::size_t> open = open_terms(boundary, better, doubtful);
        if (open.empty()) {
          if (doubtful && leads_inside(boundary, better)) {
            append(boundary, inside);
            inside = std::move(boundary);
            moved = true;
            break;
          }
          if (boundary.criterion > inside.criterion + noise(inside.criterion)) return inside;
          append(boundary, inside);
          return boundary;
        }
        for (const std::size_t t : open) limits[t] = 0.0;
        if (boundary.criterion <= inside.criterion + noise(inside.criterion)) {
          // Nowhere to stay, neither on the boundary nor where the search had ended beside it.
          Optimum restarted = search(Parameters(better));
          if (restarted.criterion < inside.criterion - noise(inside.criterion)) {
            append(restarted, inside);
            inside = std::move(restarted);
            moved = true;
            break;
          }
        }
      }
      if (!moved) return inside;
    }
    return inside;
  }

  // Where rounding may hide that a boundary is none a search from beside it tells. `boundary` is then where it ended.
  bool leads_inside(Optimum& boundary, const Factors& beside) {
    if (!likelihood_.evaluate(beside, false).defined) return false;
    Optimum restarted = search(Parameters(beside));
    if (restarted.criterion >= boundary.criterion - noise(boundary.criterion)) return false;
    append(restarted, boundary);
    boundary = std::move(restarted);
    return true;
  }

  static void append(Optimum& later, const Optimum& earlier) {
    std::vector<Iteration> all = earlier.iterations;
    all.insert(all.end(), later.iterations.begin(), later.iterations.end());
    later.iterations = std::move(all);
  }

  // Terms whose variance wants to grow in a direction in which it is zero, and factors that have let it. The
  // criterion is even in a new column of a factor: its second derivative, from one difference of the gradient, tells.
  // Where it is within what the largest of them may leave in rounding a term is `doubtful`, and not among them.
  std::vector<std::size_t> open_terms(const Optimum& boundary, Factors& better, bool& doubtful) {
    constexpr double kStep = 1e-3;
    constexpr double kSurely = 1e-6;
    constexpr double kPerhaps = 1e-10;
    std::vector<std::size_t> open;
    const Factors factors = boundary.factors();
    for (std::size_t t = 0; t < factors.size(); ++t) {
      if (boundary.parameters.full(t)) continue;
      const std::size_t n = boundary.parameters.order(t);
      const std::size_t column = boundary.parameters.rank(t);
      Dense curvature(n * n, 0.0);
      double largest = 1.0;
      for (std::size_t a = 0; a < n; ++a) {
        Factors there = factors;
        there[t][column * n + a] = kStep;
        const CriterionParts parts = likelihood_.evaluate(there, true);
        if (!parts.defined) continue;
        const Factors gradient = likelihood_.profiled_gradient(parts);
        for (std::size_t b = 0; b < n; ++b) {
          const double element = gradient[t][column * n + b] / kStep;
          curvature[a * n + b] += 0.5 * element;
          curvature[b * n + a] += 0.5 * element;
          largest = std::max(largest, std::abs(element));
        }
      }
      const SmallestEigenvalue lowest = smallest_eigenvalue(curvature, n);
      if (lowest.value >= -kPerhaps * largest) continue;
      if (lowest.value >= -kSurely * largest) {
        doubtful = true;
      } else {
        open.push_back(t);
      }
      for (std::size_t a = 0; a < n; ++a) better[t][column * n + a] = kOutwards * lowest.vector[a];
    }
    return open;
  }

  Likelihood& likelihood_;
  const SearchOptions& options_;
  bool quiet_ = false;  // searches that only make sure are not reported
};

}  // namespace

Optimum find_optimum(Likelihood& likelihood, const Factors& start, const SearchOptions& options) {
  return Finder(likelihood, options).find(start);
}

}  // namespace sm::mixed
