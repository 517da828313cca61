#include "mixed/gram.hpp"

#include <algorithm>

namespace sm::mixed {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

// Observations of each level of a term.
struct Occurrences {
  std::vector<std::int64_t> start;
  std::vector<std::int32_t> row;

  explicit Occurrences(const DesignTerm& term) : start(at(term.levels) + 1, 0), row(term.level->size()) {
    for (const std::int64_t level : *term.level) ++start[at(level) + 1];
    for (std::size_t l = 0; l < at(term.levels); ++l) start[l + 1] += start[l];
    std::vector<std::int64_t> next(start.begin(), start.end() - 1);
    for (std::size_t i = 0; i < row.size(); ++i) row[at(next[at((*term.level)[i])]++)] = static_cast<std::int32_t>(i);
  }
};

// One row of blocks as it is summed over observations: a block is opened when an observation first touches it.
class BlockRow {
 public:
  BlockRow(std::int64_t nodes, std::int64_t unknowns, std::int64_t most) {
    seen_.assign(at(nodes), -1);
    sum_.assign(at(unknowns * most), 0.0);
  }

  void begin(std::int64_t node, std::int64_t size) {
    node_ = node;
    size_ = at(size);
    touched_.clear();
  }
  void touch(std::int64_t node) {
    if (seen_[at(node)] == node_) return;
    seen_[at(node)] = node_;
    touched_.push_back(static_cast<std::int32_t>(node));
  }
  // The sums of one column of the row, for each unknown of the row's node.
  double* sums(std::int64_t unknown) { return &sum_[at(unknown) * size_]; }
  std::vector<std::int32_t>& touched() { return touched_; }
  std::size_t size() const { return size_; }

 private:
  std::int64_t node_ = -1;
  std::size_t size_ = 1;
  std::vector<std::int64_t> seen_;
  std::vector<double> sum_;
  std::vector<std::int32_t> touched_;
};

}  // namespace

void Gram::number_nodes(const ScaledDesign& design) {
  for (const DesignTerm& term : design.terms()) {
    first_node_.push_back(random_nodes_);
    first_unknown_.push_back(term.first);
    size_.push_back(term.k);
    single_ = single_ && term.k == 1 && term.first == random_nodes_;
    random_nodes_ += term.levels;
  }
  first_node_.push_back(random_nodes_);
  first_unknown_.push_back(design.random_count());
  single_ = single_ && design.random_count() == random_nodes_;
  size_.push_back(1);
  first_node_.push_back(random_nodes_ + design.fixed_count());
}

std::size_t Gram::term_of(std::int64_t node) const {
  return at(std::upper_bound(first_node_.begin() + 1, first_node_.end() - 1, node) - first_node_.begin()) - 1;
}

namespace {

// Fills block rows from the observations.
class Accumulator {
 public:
  Accumulator(const ScaledDesign& design, const Gram& gram)
      : design_(design), gram_(gram), next_(design.row_start().begin(), design.row_start().end() - 1) {
    for (const DesignTerm& term : design.terms()) occurrences_.emplace_back(term);
  }

  void add_level(std::size_t t, std::int64_t level, BlockRow& row) {
    const DesignTerm& term = design_.terms()[t];
    const auto k = at(term.k);
    const std::int64_t node = gram_.first_node(t) + level;
    row.touch(node);
    add_precision(t, level, row);
    const Occurrences& occurs = occurrences_[t];
    for (auto p = at(occurs.start[at(level)]); p < at(occurs.start[at(level) + 1]); ++p) {
      const auto i = at(occurs.row[p]);
      const double* const left = &term.z[i * k];
      for (std::size_t s = t; s < design_.terms().size(); ++s) {
        const DesignTerm& other = design_.terms()[s];
        const std::int64_t node_s = gram_.first_node(s) + (*other.level)[i];
        row.touch(node_s);
        add(i, left, &other.z[i * at(other.k)], other.k, gram_.unknown_of(s, node_s), row);
      }
      for (auto q = at(design_.row_start()[i]); q < at(design_.row_start()[i + 1]); ++q) {
        const std::int64_t column = design_.row_col()[q];
        row.touch(gram_.random_nodes() + column);
        add(i, left, &design_.row_value()[q], 1, design_.random_count() + column, row);
      }
    }
  }

  // Columns of X are taken in ascending order: next_ points to the first entry of a row that was not yet taken.
  void add_column(std::int64_t j, BlockRow& row) {
    row.touch(gram_.random_nodes() + j);
    const SparseColumns& x = design_.x();
    for (auto p = at(x.start[at(j)]); p < at(x.start[at(j) + 1]); ++p) {
      const auto i = at(x.row[p]);
      for (auto q = at(next_[i]++); q < at(design_.row_start()[i + 1]); ++q) {
        const std::int64_t column = design_.row_col()[q];
        row.touch(gram_.random_nodes() + column);
        add(i, &x.value[p], &design_.row_value()[q], 1, design_.random_count() + column, row);
      }
    }
  }

 private:
  void add(std::size_t i, const double* left, const double* right, std::int64_t count, std::int64_t unknown,
           BlockRow& row) const {
    const double w = design_.weight(i);
    for (std::int64_t c = 0; c < count; ++c) {
      double* const sums = row.sums(unknown + c);
      const double factor = w * right[c];
      for (std::size_t a = 0; a < row.size(); ++a) sums[a] += left[a] * factor;
    }
  }

  void add_precision(std::size_t t, std::int64_t level, BlockRow& row) const {
    const Precision* const precision = design_.terms()[t].precision;
    if (!precision) return;
    for (auto p = at(precision->row_start[at(level)]); p < at(precision->row_start[at(level) + 1]); ++p) {
      row.touch(gram_.first_node(t) + precision->col[p]);
    }
  }

  const ScaledDesign& design_;
  const Gram& gram_;
  std::vector<Occurrences> occurrences_;
  std::vector<std::int64_t> next_;
};

}  // namespace

Gram::Gram(const ScaledDesign& design) {
  number_nodes(design);
  const std::int64_t count = random_nodes_ + design.fixed_count();
  start_.assign(at(count) + 1, 0);
  value_start_.assign(at(count) + 1, 0);
  BlockRow row(count, design.unknowns(), *std::max_element(size_.begin(), size_.end()));
  Accumulator accumulator(design, *this);
  for (std::int64_t node = 0; node < count; ++node) {
    const std::size_t t = term_of(node);
    row.begin(node, size_[t]);
    if (node < random_nodes_) {
      accumulator.add_level(t, node - first_node_[t], row);
    } else {
      accumulator.add_column(node - random_nodes_, row);
    }
    std::sort(row.touched().begin(), row.touched().end());
    for (const std::int32_t other : row.touched()) {
      column_.push_back(other);
      const std::size_t s = term_of(other);
      for (std::size_t a = 0; a < row.size(); ++a) {
        for (std::int64_t c = 0; c < size_[s]; ++c) value_.push_back(row.sums(unknown_of(s, other) + c)[a]);
      }
      std::fill_n(row.sums(unknown_of(s, other)), at(size_[s]) * row.size(), 0.0);
    }
    start_[at(node) + 1] = static_cast<std::int64_t>(column_.size());
    value_start_[at(node) + 1] = static_cast<std::int64_t>(value_.size());
  }
  column_.shrink_to_fit();
  value_.shrink_to_fit();
}

void Gram::add_product_of_single_unknowns(std::span<const double> x, std::span<double> y) const {
  for (std::size_t i = 0; i < at(nodes()); ++i) {
    auto p = at(start_[i]);
    double sum = value_[p] * x[i];  // the diagonal comes first
    for (++p; p < at(start_[i + 1]); ++p) {
      const auto j = at(column_[p]);
      sum += value_[p] * x[j];
      y[j] += value_[p] * x[i];
    }
    y[i] += sum;
  }
}

void Gram::add_product(std::span<const double> x, std::span<double> y) const {
  if (single_) return add_product_of_single_unknowns(x, y);
  for (std::size_t t = 0; t < size_.size(); ++t) {
    for (std::int64_t node = first_node_[t]; node < first_node_[t + 1]; ++node) {
      const auto k = at(size_[t]);
      const std::size_t i = at(unknown_of(t, node));
      const double* g = values(node);
      std::size_t s = t;
      for (const std::int32_t other : columns(node)) {
        while (other >= first_node_[s + 1]) ++s;
        const std::size_t j = at(unknown_of(s, other));
        const auto m = at(size_[s]);
        for (std::size_t a = 0; a < k; ++a) {
          for (std::size_t c = 0; c < m; ++c) {
            y[i + a] += g[a * m + c] * x[j + c];
            if (other != node) y[j + c] += g[a * m + c] * x[i + a];
          }
        }
        g += k * m;
      }
    }
  }
}

double Gram::bytes() const {
  return static_cast<double>(8 * (start_.capacity() + value_start_.capacity() + value_.capacity()) +
                             4 * column_.capacity());
}

}  // namespace sm::mixed
