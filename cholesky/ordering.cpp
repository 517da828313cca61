// Minimum-degree ordering of a closed symmetric sparse matrix: its workspace, and which road is taken.
#include "cholesky/ordering.hpp"

#include <algorithm>
#include <cstddef>
#include <span>

#include "cholesky/ordering_graph.hpp"
#include "cholesky/ordering_steps.hpp"
#include "cholesky/steps.hpp"
#include "store/checks.hpp"

namespace sm {

namespace {

EdgeCount count_tidy_edges(const SmMatrix& m, i64* degree) {
  EdgeCount count;
  std::fill_n(degree, m.rows, 0);
  for (i64 i = 0; i < m.rows; ++i) {
    i64 before = i;
    i64 entries = 0;
    const i64 end = m.row_start[i + 1];
    const bool is_long = end - m.row_start[i] > kShort;
    for (i64 p = m.row_start[i]; p < end; ++p) {
      const i64 j = m.col_index[p];
      if (is_long && j > before && end - p >= kNeighbours && are_neighbours(m.col_index + p)) {
        for (i64 q = 0; q < kNeighbours; ++q) ++degree[j + q];
        before = j + kNeighbours - 1;
        entries += kNeighbours;
        p += kNeighbours - 1;
        continue;
      }
      if (j <= i) continue;
      count.tidy &= j > before;
      before = j;
      ++degree[j];
      ++entries;
    }
    degree[i] += entries;
    count.edges += entries;
  }
  return count;
}

i64 count_distinct_edges(const SmMatrix& m, i64* degree, i64* met) {
  i64 edges = 0;
  std::fill_n(degree, m.rows, 0);
  std::fill_n(met, m.rows, -1);
  for (i64 i = 0; i < m.rows; ++i) {
    for (i64 p = m.row_start[i]; p < m.row_start[i + 1]; ++p) {
      const i64 j = m.col_index[p];
      if (j <= i || met[j] == i) continue;
      met[j] = i;
      ++degree[i];
      ++degree[j];
      ++edges;
    }
  }
  return edges;
}

}  // namespace

EdgeCount count_edges(const SmMatrix& m, i64* degree, i64* met) {
  EdgeCount count = count_tidy_edges(m, degree);
  if (!count.tidy) count.edges = count_distinct_edges(m, degree, met);
  for (i64 i = 0; i < m.rows; ++i) {
    if (degree[i] <= kShort) continue;
    ++count.long_rows;
    count.long_entries += degree[i];
  }
  return count;
}

namespace {

i64 half_of_workspace(const SmMatrix& m) { return (m.factor_block * m.work_capacity - m.rows) / 2; }

// The plain road keeps n list heads and two slots an edge in each half of the workspace; the last edge must find its
// first slot below the last one.
bool holds(const SmMatrix& m, i64 edges) {
  const i64 half = half_of_workspace(m);
  return half >= m.rows && (edges == 0 || m.rows + 1 + 2 * (edges - 1) < half);
}

// Grows the capacity by one step.
SmStatus grow_capacity(SmMatrix& m) {
  const double limit = static_cast<double>(SM_MAX_ELEMENTS);
  if (m.work_capacity == 0) {
    const i64 words_an_entry = 4 / m.factor_block;
    const double first =
        4.0 * static_cast<double>(m.rows) + static_cast<double>(m.nnz) * static_cast<double>(words_an_entry);
    if (first > limit) return SM_TOO_LARGE;
    m.work_capacity = static_cast<i64>(first);
  }
  const double capacity = static_cast<double>(m.work_capacity) + static_cast<double>(m.nnz);
  if (capacity * static_cast<double>(m.factor_block) >= limit) return SM_TOO_LARGE;
  m.work_capacity += m.nnz;
  return m.work_capacity < 1 ? SM_TOO_LARGE : SM_OK;  // no size that this operation set
}

// The first capacity of the growth that holds the edges.
SmStatus try_workspace(SmMatrix& m, i64 edges) {
  give_back(m.pool, m.work);
  do {
    SM_TRY(grow_capacity(m));
  } while (!holds(m, edges));
  return allocate(m.pool, m.work_capacity, Fill::none, m.work);
}

}  // namespace

SmStatus take_workspace(SmMatrix& m, i64 edges) {
  const SmStatus status = try_workspace(m, edges);
  if (status != SM_OK) {
    give_back(m.pool, m.work);
    m.work_capacity = 0;
  }
  return status;
}

namespace {

// The boundaries make use of one more number an edge than they need.
constexpr i64 kSlack = 1;

std::uint64_t whole_words(std::uint64_t bytes) { return (bytes + sizeof(i64) - 1) / sizeof(i64) * sizeof(i64); }

// False when neither the workspace nor the pool has the memory.
template <class Index>
bool order_graph(SmMatrix& m, const EdgeCount& count, i64* perm, i64* inv_perm) {
  using Graph = OrderingGraph<Index>;
  const std::uint64_t bytes = whole_words(Graph::bytes(m.rows, count, kSlack));
  const std::span work = std::as_writable_bytes(std::span(m.work, static_cast<std::size_t>(m.work_capacity)));
  Scratch<std::byte> scratch;
  std::span<std::byte> memory = work.first(std::min<std::size_t>(bytes, work.size()));
  std::span<std::byte> spare = work.subspan(memory.size());
  if (Graph::bytes(m.rows, count) > work.size()) {
    if (scratch.take(m.pool, static_cast<i64>(bytes)) != SM_OK) return false;
    memory = {scratch.data(), bytes};
    spare = work;
  }
  Graph graph(m.rows, count, memory, spare, perm, inv_perm);
  graph.enter(m);
  graph.eliminate_all();
  for (i64 k = 0; k < m.rows; ++k) inv_perm[perm[k]] = k;
  return true;
}

// An index counts vertices, slots, and twice the vertices.
bool fits_narrow(i64 rows, const EdgeCount& count) {
  return OrderingGraph<std::uint32_t>::bytes(rows, count, kSlack) / sizeof(std::uint32_t) < UINT32_MAX;
}

SmStatus order_in_workspace(SmMatrix& m, Road road, i64* perm, i64* inv_perm) {
  const EdgeCount count = count_edges(m, perm, inv_perm);
  SM_TRY(take_workspace(m, count.edges));
  if (road == Road::best) road = fits_narrow(m.rows, count) ? Road::narrow : Road::wide;
  if (road == Road::narrow && order_graph<std::uint32_t>(m, count, perm, inv_perm)) return SM_OK;
  if (road == Road::wide && order_graph<std::uint64_t>(m, count, perm, inv_perm)) return SM_OK;
  return order_plainly(m, m.work, half_of_workspace(m), perm, inv_perm) ? SM_OK : SM_NO_MEMORY;
}

}  // namespace

SmStatus order_by(SmMatrix& m, Road road) {
  SM_PASS(may_order(m));
  SM_TRY(need_pool(m));
  Scratch<i64> perm;
  Scratch<i64> inv_perm;
  if (!m.perm) SM_TRY(perm.take(m.pool, m.rows));
  if (!m.inv_perm) SM_TRY(inv_perm.take(m.pool, m.rows));
  SM_TRY(order_in_workspace(m, road, m.perm ? m.perm : perm.data(), m.inv_perm ? m.inv_perm : inv_perm.data()));
  if (!m.perm) m.perm = perm.release();
  if (!m.inv_perm) m.inv_perm = inv_perm.release();
  m.state = SM_STATE_ORDERED;
  return SM_OK;
}

SmStatus order(SmMatrix& m) { return order_by(m, Road::best); }

}  // namespace sm
