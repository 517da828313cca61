// What is known about the equations and their factor before any value is: sizes and patterns.
#include <algorithm>

#include "mixed/equations.hpp"

namespace sm::mixed {
namespace {

constexpr std::int64_t kMostPlaces = 200000;

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

// Keeps every so many entries, so that about kMostPlaces are left.
class Thinner {
 public:
  Thinner(std::int64_t order, std::int64_t entries) : every_(std::max<std::int64_t>(1, entries / kMostPlaces)) {
    pattern_.order = order;
    pattern_.entries = entries;
  }
  void add(std::int64_t row, std::int64_t col) {
    // The diagonal is kept on a scale of its own: without it a thinned picture has no shape.
    const bool keep = row == col ? row % std::max<std::int64_t>(1, pattern_.order / 20000) == 0 : next_++ % every_ == 0;
    if (keep) pattern_.places.emplace_back(std::min(row, col), std::max(row, col));
  }
  SpyPattern take() { return std::move(pattern_); }

 private:
  std::int64_t every_;
  std::int64_t next_ = 0;
  SpyPattern pattern_;
};

}  // namespace

EquationFacts Equations::facts() const {
  EquationFacts facts;
  if (order_ == 0) return facts;
  facts.order = order_;
  facts.entries = static_cast<std::int64_t>(values_.size());
  facts.factor_entries = matrix_->factor_iu[order_] + order_;
  for (std::int64_t i = 0; i < order_; ++i) {
    const auto length = static_cast<double>(matrix_->factor_iu[i + 1] - matrix_->factor_iu[i]);
    facts.flops += length * (length + 2.0);
  }
  // What the inverse keeps of the blocks it is working on, at most, or of all of a small matrix or factor.
  const double fronts = std::min({13.6e6, 8.0 * static_cast<double>(order_) * static_cast<double>(order_),
                                  64.0 * static_cast<double>(facts.factor_entries)});
  // The entries are held as blocks, as rows of the module, as values to fill in and as elements of the inverse; the
  // factor once more while it is inverted.
  const auto entries = static_cast<double>(facts.entries);
  facts.bytes = gram_.bytes() + 48.0 * entries + 8.0 * static_cast<double>(matrix_->work_capacity) +
                8.0 * static_cast<double>(facts.factor_entries) + 160.0 * static_cast<double>(order_) +
                static_cast<double>(design_.rows()) * 100.0 + fronts;
  return facts;
}

SpyPattern Equations::spy_equations() const {
  Thinner thinner(order_, static_cast<std::int64_t>(values_.size()));
  walk_blocks(design_, gram_, part_, [&](const Block& block) {
    for (std::size_t a = 0; a < block.k; ++a) {
      for (std::size_t c = block.diagonal() ? a : 0; c < block.m; ++c) {
        thinner.add(static_cast<std::int64_t>(block.row + a), static_cast<std::int64_t>(block.col + c));
      }
    }
  });
  return thinner.take();
}

SpyPattern Equations::spy_factor() const {
  if (order_ == 0) return {};
  Thinner thinner(order_, matrix_->factor_iu[order_] + order_);
  for (std::int64_t i = 0; i < order_; ++i) {
    thinner.add(i, i);
    const std::int64_t length = matrix_->factor_iu[i + 1] - matrix_->factor_iu[i];
    for (std::int64_t p = 0; p < length; ++p) thinner.add(i, matrix_->factor_ju[at(matrix_->factor_iju[i] + p)]);
  }
  return thinner.take();
}

}  // namespace sm::mixed
