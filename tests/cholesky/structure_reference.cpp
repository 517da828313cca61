#include "cholesky/structure_reference.hpp"

#include <algorithm>

namespace sm::test {

namespace {

using Row = std::vector<std::int64_t>;

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

// Later neighbours of each place in the new order.
std::vector<Row> own_entries(const Graph& graph, const Row& perm) {
  Row place(at(graph.n));
  for (std::size_t k = 0; k < perm.size(); ++k) place[at(perm[k])] = static_cast<std::int64_t>(k);
  std::vector<Row> own(at(graph.n));
  for (const auto& [i, j] : graph.edges) {
    const std::int64_t a = place[at(i)];
    const std::int64_t b = place[at(j)];
    own[at(std::min(a, b))].push_back(std::max(a, b));
  }
  return own;
}

// Whether `row` needs slots of its own; the last block shrinks to where the row begins when it goes on behind it.
bool goes_behind(const Row& row, Row& stored, std::size_t block) {
  const auto hit = std::find(stored.begin() + static_cast<std::ptrdiff_t>(block), stored.end(), row.front());
  const auto length = std::min<std::ptrdiff_t>(stored.end() - hit, static_cast<std::ptrdiff_t>(row.size()));
  if (!std::equal(hit, hit + length, row.begin())) return true;
  if (hit != stored.end() && length == static_cast<std::ptrdiff_t>(row.size())) return false;
  stored.erase(hit, stored.end());
  return true;
}

}  // namespace

std::vector<std::vector<std::int64_t>> true_fill(const Graph& graph, const std::vector<std::int64_t>& perm) {
  const auto n = static_cast<std::size_t>(graph.n);
  std::vector<std::size_t> place(n);
  for (std::size_t k = 0; k < n; ++k) place[static_cast<std::size_t>(perm[k])] = k;
  std::vector<std::vector<bool>> linked(n, std::vector<bool>(n, false));
  for (const auto& [i, j] : graph.edges) {
    const std::size_t a = place[static_cast<std::size_t>(i)];
    const std::size_t b = place[static_cast<std::size_t>(j)];
    linked[a][b] = true;
    linked[b][a] = true;
  }
  std::vector<std::vector<std::int64_t>> rows(n);
  for (std::size_t k = 0; k < n; ++k) {
    for (std::size_t j = k + 1; j < n; ++j)
      if (linked[k][j]) rows[k].push_back(static_cast<std::int64_t>(j));
    for (const std::int64_t a : rows[k])
      for (const std::int64_t b : rows[k])
        if (a != b) linked[static_cast<std::size_t>(a)][static_cast<std::size_t>(b)] = true;
  }
  return rows;
}

std::vector<std::int64_t> compressed_subscripts(const Graph& graph, const std::vector<std::int64_t>& perm) {
  const std::vector<Row> rows = true_fill(graph, perm);
  const std::vector<Row> own = own_entries(graph, perm);
  std::vector<std::vector<std::size_t>> updating(rows.size());
  Row mark(rows.size(), -1);
  Row stored;
  std::size_t block = 0;
  for (std::size_t k = 0; k < rows.size(); ++k) {
    const Row& row = rows[k];
    if (row.size() > 1) updating[at(row.front())].push_back(k);
    const std::int64_t tag = mark[k];
    const bool marked = std::all_of(own[k].begin(), own[k].end(), [&](std::int64_t c) { return mark[at(c)] == tag; });
    if (updating[k].size() == 1 && marked) continue;
    std::size_t longest = 0;
    for (const std::size_t i : updating[k]) longest = std::max(longest, rows[i].size() - 1);
    if (row.size() == longest || !goes_behind(row, stored, block)) continue;
    block = stored.size();
    stored.insert(stored.end(), row.begin(), row.end());
    for (const std::int64_t c : row) mark[at(c)] = static_cast<std::int64_t>(k);
  }
  return stored;
}

}  // namespace sm::test
