#include "cli/sparse.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <cmath>
#include <utility>

#include "cli/error.hpp"
#include "cli/format.hpp"

namespace sm::cli {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

// Sorts one row by column, keeping the file order of equal columns.
void sort_row(CompressedRows& m, std::int64_t begin, std::int64_t end,
              std::vector<std::pair<std::int64_t, double>>& row) {
  if (std::is_sorted(m.col.begin() + begin, m.col.begin() + end)) return;
  row.clear();
  for (std::int64_t p = begin; p < end; ++p) row.emplace_back(m.col[at(p)], m.value[at(p)]);
  std::stable_sort(row.begin(), row.end(), [](const auto& a, const auto& b) { return a.first < b.first; });
  for (std::int64_t p = begin; p < end; ++p) std::tie(m.col[at(p)], m.value[at(p)]) = row[at(p - begin)];
}

[[noreturn]] void refuse_sum(const std::string& name, std::int64_t row, std::int64_t col, double sum) {
  throw CommandError({.file = name,
                      .what = fmt::format("the entries at row {}, column {} add up to {}", row + 1, col + 1, sum),
                      .expected = "a finite sum",
                      .advice = "entries at one position are added together; remove or scale them"});
}

// Sorts every row and adds up what stands at one position, in place.
void sort_and_merge(CompressedRows& m, const std::string& name) {
  std::vector<std::pair<std::int64_t, double>> buffer;
  std::int64_t out = 0;
  for (std::int64_t i = 0; i < m.rows; ++i) {
    const std::int64_t begin = m.start[at(i)];
    const std::int64_t end = m.start[at(i + 1)];
    sort_row(m, begin, end, buffer);
    m.start[at(i)] = out;
    for (std::int64_t p = begin; p < end; ++out) {
      const std::int64_t col = m.col[at(p)];
      double sum = m.value[at(p++)];
      while (p < end && m.col[at(p)] == col) sum += m.value[at(p++)];
      if (!std::isfinite(sum)) refuse_sum(name, i, col, sum);
      m.col[at(out)] = col;
      m.value[at(out)] = sum;
    }
  }
  m.start[at(m.rows)] = out;
  m.col.resize(at(out));
  m.value.resize(at(out));
}

}  // namespace

std::optional<std::int64_t> find_entry(const CompressedRows& rows, std::int64_t row, std::int64_t col) {
  const auto begin = rows.col.begin() + rows.start[at(row)];
  const auto end = rows.col.begin() + rows.start[at(row + 1)];
  const auto found = std::lower_bound(begin, end, col);
  if (found == end || *found != col) return std::nullopt;
  return found - rows.col.begin();
}

void require_memory(double bytes, std::uint64_t limit, const std::string& what) {
  if (limit == 0 || bytes <= static_cast<double>(limit)) return;
  throw CommandError({.code = ExitCode::no_memory,
                      .what = fmt::format("out of memory: {} need {}", what, bytes_text(bytes)),
                      .expected = fmt::format("at most {}", bytes_text(static_cast<double>(limit))),
                      .advice = "check the sizes in the file, or raise --memory"});
}

void EntryStore::begin(const Header& header) {
  header_ = header;
  size_ = 0;
  chunks_.clear();
}

void EntryStore::take(std::span<const Entry> entries) {
  for (const Entry& entry : entries) {
    if (header_.layout == Layout::array && entry.value == 0.0) continue;
    if (chunks_.empty() || chunks_.back().size() == kChunk) chunks_.emplace_back().reserve(kChunk);
    chunks_.back().push_back(entry);
    ++size_;
  }
}

// Counting sort by row. start[i + 1] first counts row i, then is the place of its next entry.
void EntryStore::scatter(CompressedRows& m) {
  m.start.assign(at(m.rows) + 2, 0);
  for (const auto& chunk : chunks_) {
    for (const Entry& entry : chunk) ++m.start[at(entry.row) + 2];
  }
  for (std::size_t i = 2; i < m.start.size(); ++i) m.start[i] += m.start[i - 1];
  for (auto& chunk : chunks_) {
    for (const Entry& entry : chunk) {
      const std::size_t p = at(m.start[at(entry.row) + 1]++);
      m.col[p] = entry.col;
      m.value[p] = entry.value;
    }
    std::vector<Entry>().swap(chunk);
  }
  m.start.pop_back();
}

CompressedRows EntryStore::compress(const std::string& name, std::uint64_t limit) {
  CompressedRows m;
  m.rows = header_.rows;
  m.cols = header_.cols;
  require_memory(8.0 * static_cast<double>(m.rows) + 16.0 * static_cast<double>(size_), limit,
                 fmt::format("{} rows with {} entries", m.rows, size_));
  m.col.resize(at(size_));
  m.value.resize(at(size_));
  scatter(m);
  chunks_.clear();
  size_ = 0;
  sort_and_merge(m, name);
  return m;
}

SymmetryCheck check_symmetry(const CompressedRows& full) {
  SymmetryCheck check;
  const auto compare = [&](std::int64_t i, std::int64_t p) {
    const std::int64_t j = full.col[at(p)];
    if (j == i) return;
    const auto mirror = find_entry(full, j, i);
    if (!mirror) check.pattern = false;
    const double value = full.value[at(p)];
    const double mirrored = mirror ? full.value[at(*mirror)] : 0.0;
    if (value == mirrored || !check.values) return;
    check.values = false;
    check.row = std::max(i, j);
    check.col = std::min(i, j);
    check.below = i > j ? value : mirrored;
    check.above = i > j ? mirrored : value;
  };
  for (std::int64_t i = 0; i < full.rows && (check.pattern || check.values); ++i) {
    for (std::int64_t p = full.start[at(i)]; p < full.start[at(i + 1)]; ++p) compare(i, p);
  }
  return check;
}

void keep_upper_triangle(CompressedRows& m) {
  std::int64_t out = 0;
  for (std::int64_t i = 0; i < m.rows; ++i) {
    const std::int64_t begin = std::exchange(m.start[at(i)], out);
    for (std::int64_t p = begin; p < m.start[at(i + 1)]; ++p) {
      if (m.col[at(p)] < i) continue;
      m.col[at(out)] = m.col[at(p)];
      m.value[at(out++)] = m.value[at(p)];
    }
  }
  m.start[at(m.rows)] = out;
  m.col.resize(at(out));
  m.value.resize(at(out));
  m.col.shrink_to_fit();
  m.value.shrink_to_fit();
}

void multiply_symmetric(const CompressedRows& upper, const double* x, double* y) {
  std::fill_n(y, upper.rows, 0.0);
  for (std::int64_t i = 0; i < upper.rows; ++i) {
    double sum = 0.0;
    for (std::int64_t p = upper.start[at(i)]; p < upper.start[at(i + 1)]; ++p) {
      const std::int64_t j = upper.col[at(p)];
      sum += upper.value[at(p)] * x[j];
      if (j != i) y[j] += upper.value[at(p)] * x[i];
    }
    y[i] += sum;
  }
}

double infinity_norm_symmetric(const CompressedRows& upper) {
  std::vector<double> sums(at(upper.rows), 0.0);
  for (std::int64_t i = 0; i < upper.rows; ++i) {
    for (std::int64_t p = upper.start[at(i)]; p < upper.start[at(i + 1)]; ++p) {
      const std::int64_t j = upper.col[at(p)];
      sums[at(i)] += std::fabs(upper.value[at(p)]);
      if (j != i) sums[at(j)] += std::fabs(upper.value[at(p)]);
    }
  }
  return sums.empty() ? 0.0 : *std::max_element(sums.begin(), sums.end());
}

}  // namespace sm::cli
