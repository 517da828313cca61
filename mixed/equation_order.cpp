// The order in which the unknowns are eliminated: that of minimum degree, or the term with most levels first.
#include <algorithm>
#include <iterator>
#include <memory>

#include "mixed/equations.hpp"

namespace sm::mixed {
namespace {

// Where one factorization takes fewer operations than this for each entry, there is little to gain.
constexpr double kDear = 20.0;
constexpr double kMostFill = 100.0;  // of a factor that is worth a second look

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

// A matrix that goes when it is left.
class Copy {
 public:
  Copy(Module& module, SmMatrix* source, const char* doing) : module_(module) {
    module_.expect_ok(module_.fn().qxsmnew(module_.instance, &matrix_, SM_KIND_SYMMETRIC, SM_FORMAT_SPARSE), doing);
    const SmStatus status = module_.fn().qxsmclone(source, matrix_, 0);
    if (status == SM_OK) return;
    destroy();
    module_.expect_ok(status, doing);
  }
  ~Copy() { destroy(); }
  Copy(const Copy&) = delete;
  Copy& operator=(const Copy&) = delete;

  SmMatrix* get() const { return matrix_; }
  void exchange(SmMatrix*& other) { std::swap(matrix_, other); }

 private:
  void destroy() {
    if (matrix_) module_.fn().qxsmDestroyMatrix(module_.instance, &matrix_);
  }

  Module& module_;
  SmMatrix* matrix_ = nullptr;
};

}  // namespace

std::vector<std::int64_t> Equations::last_rows() const {
  std::vector<std::int64_t> rows = aliased_unknowns_;
  rows.insert(rows.end(), null_unknowns_.begin(), null_unknowns_.end());
  return rows;
}

// The order of a copy, with the last rows taken out of it, is given to the matrix itself.
void Equations::order_rows() {
  const char* const doing = "ordering the mixed-model equations";
  const std::vector<std::int64_t> last = last_rows();
  if (last.empty()) {
    module_.expect_ok(module_.qxsmmd(matrix_), doing);
    return;
  }
  const Copy copy(module_, matrix_, doing);
  module_.expect_ok(module_.qxsmmd(copy.get()), doing);
  std::vector<bool> is_last(at(order_), false);
  for (const std::int64_t row : last) is_last[at(row)] = true;
  std::vector<std::int64_t> perm;
  perm.reserve(at(order_));
  for (std::int64_t i = 0; i < order_; ++i) {
    if (!is_last[at(copy.get()->perm[i])]) perm.push_back(copy.get()->perm[i]);
  }
  perm.insert(perm.end(), last.begin(), last.end());
  module_.expect_ok(module_.qxsmorder(matrix_, perm.data()), doing);
}

void Equations::prepare_factor(SmMatrix* matrix) {
  module_.expect_ok(module_.qxsmreorder(matrix), "ordering the mixed-model equations");
  module_.expect_ok(module_.qxsmsymbfact(matrix), "finding the structure of the factor");
}

void Equations::order_like(const Equations& all) {
  if (order_ > 0) {
    std::vector<std::int64_t> perm;
    perm.reserve(at(order_));
    std::copy_if(all.matrix_->perm, all.matrix_->perm + all.order_, std::back_inserter(perm),
                 [&](std::int64_t unknown) { return unknown < order_; });
    module_.expect_ok(module_.qxsmorder(matrix_, perm.data()), "ordering the mixed-model equations");
  }
  prepare_factor(matrix_);
  if (order_ > 0) flops_ = facts().flops;
}

// Levels of one term without a precision do not meet in the equations: eliminated first, they fill in nothing but the
// square of the others. Of crossed factors minimum degree takes levels of either as their degrees come, and may end
// with more than that square, in rows that have less in common.
void Equations::order_and_analyse() {
  const std::vector<DesignTerm>& terms = design_.terms();
  const std::int64_t first = terms.empty() || terms.front().precision ? 0 : terms.front().levels * terms.front().k;
  const double others = static_cast<double>(order_ - first);
  const double most_entries = static_cast<double>(values_.size()) + 0.5 * others * (others + 1.0);
  std::unique_ptr<Copy> copy;
  if (first > 0 && terms.size() > 1 && most_entries < kMostFill * static_cast<double>(values_.size())) {
    copy = std::make_unique<Copy>(module_, matrix_, "ordering the mixed-model equations");
  }
  order_rows();
  prepare_factor(matrix_);
  if (order_ == 0) return;
  const EquationFacts facts_now = facts();
  flops_ = facts_now.flops;
  if (!copy || flops_ < kDear * static_cast<double>(values_.size()) ||
      most_entries >= static_cast<double>(facts_now.factor_entries)) {
    return;
  }
  std::vector<std::int64_t> perm(matrix_->perm, matrix_->perm + order_);
  std::stable_partition(perm.begin(), perm.end(), [&](std::int64_t unknown) { return unknown < first; });
  module_.expect_ok(module_.qxsmorder(copy->get(), perm.data()), "ordering the mixed-model equations");
  prepare_factor(copy->get());
  copy->exchange(matrix_);
  const double flops = facts().flops;
  if (flops < flops_) {
    flops_ = flops;
  } else {
    copy->exchange(matrix_);
  }
}

}  // namespace sm::mixed
