#include "mixed/equations.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <cmath>
#include <limits>

#include "mixed/constraint.hpp"

namespace sm::mixed {
namespace {

constexpr std::int64_t kLanes = 8;  // right-hand sides of one solve

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

}  // namespace

Equations::Equations(Module& module, const ScaledDesign& design, const Gram& gram, Part part)
    : Equations(module, design, gram, part, nullptr) {}

Equations::Equations(const Equations& all, Part part) : Equations(all.module_, all.design_, all.gram_, part, &all) {}

Equations::Equations(Module& module, const ScaledDesign& design, const Gram& gram, Part part, const Equations* all)
    : module_(module), design_(design), gram_(gram), part_(part) {
  order_ = part == Part::all ? design.unknowns() : design.random_count();
  if (part == Part::all) {
    for (const std::int64_t j : design.model().fixed.aliased) aliased_unknowns_.push_back(design.random_count() + j);
  }
  for (const DesignTerm& term : design.terms()) {
    if (!term.precision) continue;
    for (const std::int64_t row : term.precision->null_rows) {
      for (std::int64_t c = 0; c < term.k; ++c) null_unknowns_.push_back(term.first + row * term.k + c);
    }
  }
  try {
    module_.tell("assembling the equations", 0.0);
    matrix_ = assemble();
    find_places_of_last_rows();
    // Finding an order takes some hundred operations for each entry, whatever comes of it.
    module_.tell("ordering the equations", (all ? 10.0 : 300.0) * static_cast<double>(values_.size()));
    if (all) {
      order_like(*all);
    } else {
      order_and_analyse();
    }
  } catch (...) {
    if (matrix_) module_.fn().qxsmDestroyMatrix(module_.instance, &matrix_);
    throw;
  }
}

Equations::~Equations() {
  if (matrix_) module_.fn().qxsmDestroyMatrix(module_.instance, &matrix_);
}

SmMatrix* Equations::assemble() {
  const char* const doing = "assembling the mixed-model equations";
  module_.expect_ok(module_.fn().qxsmnewss(module_.instance, &matrix_, order_), doing);
  const auto assign = module_.fn().qxsmassign;
  std::size_t entries = 0;
  walk_blocks(design_, gram_, part_, [&](const Block& block) {
    for (std::size_t a = 0; a < block.k; ++a) {
      for (std::size_t c = block.diagonal() ? a : 0; c < block.m; ++c) {
        const SmStatus status =
            assign(matrix_, static_cast<std::int64_t>(block.row + a), static_cast<std::int64_t>(block.col + c), 0, 1.0);
        if (status != SM_OK) module_.expect_ok(status, doing);
        ++entries;
      }
    }
  });
  module_.expect_ok(module_.fn().qxsmclose(matrix_, std::numeric_limits<double>::quiet_NaN()), doing);
  values_.resize(entries);
  return matrix_;
}

void Equations::fill(const Factors& factors) {
  const std::size_t terms = design_.terms().size();
  std::vector<double> half;  // G T
  walk_blocks(design_, gram_, part_, [&](const Block& block) {
    const auto k = block.k;
    const auto m = block.m;
    const double* right = block.g;
    if (k == 1 && m == 1) {
      const double half_product = block.s < terms ? right[0] * factors[block.s][0] : right[0];
      const double product = block.t < terms ? factors[block.t][0] * half_product : half_product;
      values_[block.place(0, 0)] = block.t == block.s ? product + block.precision : product;
      return;
    }
    if (block.s < terms) {
      const std::vector<double>& factor = factors[block.s];
      half.assign(k * m, 0.0);
      for (std::size_t a = 0; a < k; ++a) {
        for (std::size_t c = 0; c < m; ++c) {
          for (std::size_t e = 0; e < m; ++e) half[a * m + c] += block.g[a * m + e] * factor[c * m + e];
        }
      }
      right = half.data();
    }
    for (std::size_t a = 0; a < k; ++a) {
      for (std::size_t c = block.diagonal() ? a : 0; c < m; ++c) {
        double sum = 0.0;
        if (block.t < terms) {
          for (std::size_t e = 0; e < k; ++e) sum += factors[block.t][a * k + e] * right[e * m + c];
        } else {
          sum = right[a * m + c];
        }
        if (block.t == block.s && a == c) sum += block.precision;
        values_[block.place(a, c)] = sum;
      }
    }
  });
}

void Equations::find_places_of_last_rows() {
  const std::vector<std::int64_t> last = last_rows();
  last_places_.resize(last.size());
  if (last.empty()) return;
  std::vector<std::size_t> number(at(order_), last.size());
  for (std::size_t i = 0; i < last.size(); ++i) number[at(last[i])] = i;
  walk_blocks(design_, gram_, part_, [&](const Block& block) {
    for (std::size_t a = 0; a < block.k; ++a) {
      for (std::size_t c = block.diagonal() ? a : 0; c < block.m; ++c) {
        for (const std::size_t unknown : {block.row + a, block.col + c}) {
          if (number[unknown] < last.size()) last_places_[number[unknown]].push_back(block.place(a, c));
        }
      }
    }
  });
}

// Rows and columns that are cleared have a pivot of exactly zero.
void Equations::refill(const std::vector<std::int64_t>& cleared) {
  const std::vector<std::int64_t> last = last_rows();
  std::vector<std::pair<std::size_t, double>> kept;
  for (std::size_t i = 0; i < last.size(); ++i) {
    if (std::find(cleared.begin(), cleared.end(), last[i]) == cleared.end()) continue;
    for (const std::size_t place : last_places_[i]) {
      kept.emplace_back(place, values_[place]);
      values_[place] = 0.0;
    }
  }
  module_.expect_ok(module_.qxsmrefill(matrix_, values_.data()), "filling the mixed-model equations");
  for (auto entry = kept.rbegin(); entry != kept.rend(); ++entry) values_[entry->first] = entry->second;
}

bool Equations::factor(const Factors& factors, const std::vector<std::int64_t>& superfluous) {
  inverse_known_ = false;
  if (order_ == 0) return true;  // the module has no answers about an empty matrix
  for (const std::vector<double>& factor : factors) {
    for (const double element : factor) {
      if (!std::isfinite(element)) return false;
    }
  }
  fill(factors);
  for (;;) {
    std::vector<std::int64_t> cleared = superfluous;
    if (without_aliased_) cleared.insert(cleared.end(), aliased_unknowns_.begin(), aliased_unknowns_.end());
    refill(cleared);
    module_.tell("factoring the equations", flops_);
    const SmStatus status = module_.qxsmnumfact(matrix_);
    if (status != SM_NOT_DEFINITE) {
      module_.expect_ok(status, "factoring the mixed-model equations");
      module_.expect_ok(module_.fn().qxsmlogdet(matrix_, &log_det_), "reading the log-determinant");
      module_.expect_ok(module_.fn().qxsmrank(matrix_, &rank_), "reading the rank");
      if (pivots_as_expected()) return std::isfinite(log_det_);
    } else {
      doubt_ = "the mixed-model equations are not positive semidefinite";
    }
    if (without_aliased_ || aliased_unknowns_.empty()) return false;
    without_aliased_ = true;
  }
}

bool Equations::pivots_as_expected() {
  const auto nulls = static_cast<std::int64_t>(null_unknowns_.size());
  const std::int64_t nulls_from = order_ - nulls;
  const std::int64_t aliased_from = nulls_from - static_cast<std::int64_t>(aliased_unknowns_.size());
  for (std::int64_t i = 0; i < aliased_from; ++i) {
    if (matrix_->factor_diag[i] != 0.0) continue;
    const std::int64_t unknown = matrix_->perm[i];
    const bool fixed = unknown >= design_.random_count();
    doubt_ = fixed ? fmt::format("the column '{}' of the fixed effects cannot be told from a sum of others",
                                 design_.model().fixed.names[at(unknown - design_.random_count())])
                   : "a random effect cannot be told from a sum of others";
    return false;
  }
  for (std::int64_t i = aliased_from; i < nulls_from; ++i) {
    if (matrix_->factor_diag[i] == 0.0) continue;
    doubt_ = "a column of the fixed effects that depends on others was not found to";
    return false;
  }
  dropped_.clear();
  for (std::int64_t i = nulls_from; i < order_; ++i) {
    if (matrix_->factor_diag[i] == 0.0) dropped_.push_back(matrix_->perm[i]);
  }
  return true;
}

std::vector<double> Equations::solve(std::span<const double> b, std::int64_t count) {
  std::vector<double> x(b.size());
  for (std::int64_t first = 0; first < count; first += kLanes) {
    const std::int64_t lanes = std::min(kLanes, count - first);
    const std::size_t offset = at(first * order_);
    module_.expect_ok(
        module_.fn().qxsmsubst(matrix_, b.data() + offset, x.data() + offset, static_cast<std::int32_t>(lanes)),
        "solving the mixed-model equations");
  }
  return x;
}

std::vector<double> Equations::product(std::span<const double> b, std::int64_t count) const {
  std::vector<double> y(b.size(), 0.0);
  walk_blocks(design_, gram_, part_, [&](const Block& block) {
    for (std::size_t a = 0; a < block.k; ++a) {
      for (std::size_t c = block.diagonal() ? a : 0; c < block.m; ++c) {
        const double value = values_[block.place(a, c)];
        const std::size_t i = block.row + a;
        const std::size_t j = block.col + c;
        for (std::size_t lane = 0; lane < at(count); ++lane) {
          const std::size_t offset = lane * at(order_);
          y[offset + i] += value * b[offset + j];
          if (i != j) y[offset + j] += value * b[offset + i];
        }
      }
    }
  });
  return y;
}

void Equations::forget_inverse() {
  inverse_known_ = false;
  inverse_.clear();
  inverse_.shrink_to_fit();
}

namespace {

// What a block of C adds to the derivatives of log|C| by the factors, 2 tr(C^- T'G dT): to that of the row's term and,
// off the diagonal, to that of the column's.
class TraceSum {
 public:
  TraceSum(const Factors& factors, Factors& gradient) : factors_(factors), gradient_(gradient) {}

  // `inverse`: the block of C^-, k x m by rows.
  void add(const Block& block, std::span<const double> inverse) {
    const std::size_t terms = factors_.size();
    if (block.k == 1 && block.m == 1) {
      add_number(block, 2.0 * inverse[0]);
      return;
    }
    if (block.t < terms) add_row(block, inverse);
    if (!block.diagonal() && block.s < terms) add_column(block, inverse);
  }

 private:
  void add_number(const Block& block, double twice) {
    const std::size_t terms = factors_.size();
    const bool fixed = block.s == terms;
    if (block.t < terms) gradient_[block.t][0] += twice * (fixed ? block.g[0] : factors_[block.s][0] * block.g[0]);
    if (!block.diagonal() && !fixed) gradient_[block.s][0] += twice * (factors_[block.t][0] * block.g[0]);
  }

  // gradient(b, a) += 2 sum_c inverse(a, c) (T_s' G')(c, b)
  void add_row(const Block& block, std::span<const double> inverse) {
    std::vector<double>& sums = gradient_[block.t];
    const bool fixed = block.s == factors_.size();
    for (std::size_t c = 0; c < block.m; ++c) {
      for (std::size_t b = 0; b < block.k; ++b) {
        double product = 0.0;
        if (fixed) {
          product = block.g[b * block.m + c];
        } else {
          const double* const factor = &factors_[block.s][c * block.m];
          for (std::size_t e = 0; e < block.m; ++e) product += factor[e] * block.g[b * block.m + e];
        }
        for (std::size_t a = 0; a < block.k; ++a) sums[a * block.k + b] += 2.0 * inverse[a * block.m + c] * product;
      }
    }
  }

  // gradient(b, c) += 2 sum_a inverse(a, c) (T_t' G)(a, b)
  void add_column(const Block& block, std::span<const double> inverse) {
    std::vector<double>& sums = gradient_[block.s];
    for (std::size_t a = 0; a < block.k; ++a) {
      const double* const factor = &factors_[block.t][a * block.k];
      for (std::size_t b = 0; b < block.m; ++b) {
        double product = 0.0;
        for (std::size_t e = 0; e < block.k; ++e) product += factor[e] * block.g[e * block.m + b];
        for (std::size_t c = 0; c < block.m; ++c) sums[c * block.m + b] += 2.0 * inverse[a * block.m + c] * product;
      }
    }
  }

  const Factors& factors_;
  Factors& gradient_;
};

}  // namespace

Factors Equations::log_det_gradient(const Factors& factors, const Constraint& constraint) {
  Factors gradient;
  for (const std::vector<double>& factor : factors) gradient.emplace_back(factor.size(), 0.0);
  TraceSum sum(factors, gradient);
  visit_inverse(constraint, [&](const Block& block, std::span<const double> inverse) { sum.add(block, inverse); });
  return gradient;
}

void Equations::visit_inverse(const Constraint& constraint,
                              const std::function<void(const Block&, std::span<const double>)>& visit) {
  if (order_ == 0) return;
  if (!inverse_known_) {
    inverse_.resize(values_.size());
    module_.tell("inverting the equations", 2.0 * flops_);
    module_.expect_ok(module_.qxsminvpattern(matrix_, inverse_.data()), "inverting the mixed-model equations");
    inverse_known_ = true;
  }
  std::vector<double> element;
  walk_blocks(design_, gram_, part_, [&](const Block& block) {
    element.resize(block.k * block.m);
    for (std::size_t a = 0; a < block.k; ++a) {
      for (std::size_t c = 0; c < block.m; ++c) {
        const bool below = block.diagonal() && c < a;
        double& value = element[a * block.m + c];
        value = inverse_[below ? block.place(c, a) : block.place(a, c)];
        if (!constraint.empty()) value += constraint.covariance(block.row + a, block.col + c);
      }
    }
    visit(block, element);
  });
}

}  // namespace sm::mixed
