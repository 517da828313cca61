#include "mixed/alias_groups.hpp"

#include <algorithm>
#include <cmath>
#include <numeric>
#include <unordered_map>

namespace sm::mixed {
namespace {

// A column with more than this part of the rows is held as one over all of them.
constexpr std::int64_t kWide = 8;
// Dummies are, while those columns have no more numbers than this.
constexpr std::int64_t kMostDummies = 40'000'000;

double norm_of(const std::vector<double>& values) {
  double sum = 0.0;
  for (const double value : values) sum += value * value;
  return std::sqrt(sum);
}

class Grouping {
 public:
  explicit Grouping(const WeightedColumns& x) : x_(x) {}

  std::vector<GroupedColumn> run() {
    made_.reserve(static_cast<std::size_t>(x_.cols()));
    for (std::int64_t j = 0; j < x_.cols(); ++j) take(j);
    return std::move(made_);
  }

 private:
  void take(std::int64_t j) {
    GroupedColumn column;
    std::uint64_t support = 1469598103934665603u;  // FNV-1a over the rows: equal supports meet
    bool constant = true;
    column.row.reserve(static_cast<std::size_t>(x_.entries(j)));
    column.value.reserve(column.row.capacity());
    x_.for_each(j, [&](std::size_t row, double value) {
      column.row.push_back(static_cast<std::int32_t>(row));
      column.value.push_back(value);
      support = (support ^ row) * 1099511628211u;
      constant = constant && value == column.value.front();
    });
    column.size = norm_of(column.value);
    const bool wide = x_.entries(j) * kWide > x_.rows();
    if (wide && (!constant || static_cast<std::int64_t>(dense_.size()) * x_.rows() < kMostDummies)) {
      make_dense(column);
      take_off(column, dense_);
      dense_.push_back(j);
    } else {
      std::vector<std::int64_t>& group = same_rows_[support];
      if (group.empty() || made_[static_cast<std::size_t>(group.front())].row == column.row) {
        take_off(column, group);
        group.push_back(j);
      }
    }
    column.scale = norm_of(column.value);
    double rounding = kRounding * column.size;
    for (const auto& [k, share] : column.shares)
      rounding += std::fabs(share) * made_[static_cast<std::size_t>(k)].noise;
    column.nothing = column.scale <= kNothing * column.size + rounding;
    if (column.nothing) column.scale = 1.0;
    column.noise = rounding / column.scale;
    for (double& value : column.value) value = column.nothing ? 0.0 : value / column.scale;
    made_.push_back(std::move(column));
  }

  // The others are orthonormal, and have their entries at the same places.
  void take_off(GroupedColumn& column, const std::vector<std::int64_t>& others) const {
    std::vector<double> shares(others.size(), 0.0);
    for (int pass = 0; pass < 2; ++pass) {
      for (std::size_t k = 0; k < others.size(); ++k) {
        const std::vector<double>& other = made_[static_cast<std::size_t>(others[k])].value;
        const double share = std::inner_product(other.begin(), other.end(), column.value.begin(), 0.0);
        for (std::size_t p = 0; p < other.size(); ++p) column.value[p] -= share * other[p];
        shares[k] += share;
      }
    }
    for (std::size_t k = 0; k < others.size(); ++k) column.shares.emplace_back(others[k], shares[k]);
  }

  void make_dense(GroupedColumn& column) const {
    std::vector<double> values(static_cast<std::size_t>(x_.rows()), 0.0);
    for (std::size_t p = 0; p < column.row.size(); ++p)
      values[static_cast<std::size_t>(column.row[p])] = column.value[p];
    column.value = std::move(values);
    column.row = {};
    column.dense = true;
  }

  const WeightedColumns& x_;
  std::vector<GroupedColumn> made_;
  std::unordered_map<std::uint64_t, std::vector<std::int64_t>> same_rows_;
  std::vector<std::int64_t> dense_;
};

}  // namespace

std::vector<GroupedColumn> group_columns(const WeightedColumns& x) { return Grouping(x).run(); }

}  // namespace sm::mixed
