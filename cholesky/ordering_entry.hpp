// Entering a matrix into an OrderingGraph. The file ordering_graph.hpp explains how, and why it may.
#pragma once

#include "cholesky/ordering_graph.hpp"

namespace sm {

// Rows of more edges would leave a vertex too many of its own: then each edge belongs to its end of lower degree.
inline constexpr i64 kLongRow = 32;

template <class Index>
std::uint64_t OrderingGraph<Index>::bytes(i64 vertices, const EdgeCount& count, i64 slack) {
  const auto n = static_cast<std::uint64_t>(vertices);
  const auto e = static_cast<std::uint64_t>(count.edges);
  const std::uint64_t heads = sizeof(Index) == 4 ? 0 : n;
  const std::uint64_t own = count.longest > kLongRow ? e : 0;
  const std::uint64_t lists = 2 * e + 3 * e + 3 * n;
  const std::uint64_t arena = 2 * e + 2 * n + static_cast<std::uint64_t>(slack) * e;
  const std::uint64_t words = count.highest > kLongRow ? 2 * n : n;
  return sizeof(Node) * (n + 1) + sizeof(i64) * words + sizeof(Edges) * n +
         sizeof(Index) * (heads + own + lists + arena);
}

template <class Index>
OrderingGraph<Index>::OrderingGraph(i64 vertices, const EdgeCount& count, void* memory, std::uint64_t bytes, i64* perm,
                                    i64* inv_perm)
    : n_(static_cast<Index>(vertices)),
      count_(count),
      graph_(static_cast<Node*>(memory)),
      time_(reinterpret_cast<i64*>(graph_ + n_ + 1)),
      hubs_of_(reinterpret_cast<std::uint64_t*>(time_ + n_)),
      edges_(reinterpret_cast<Edges*>(hubs_of_ + (count.highest > kLongRow ? n_ : 0))),
      slots_(reinterpret_cast<Index*>(edges_ + n_)),
      perm_(perm),
      mark_(reinterpret_cast<Index*>(inv_perm)),
      head_(sizeof(Index) == 4 ? mark_ + n_ : slots_),
      lists_(graph_, head_, time_, n_) {
  if (sizeof(Index) != 4) slots_ += n_;
  const i64 own = count.longest > kLongRow ? count.edges : 0;
  arena_ = slots_ + 5 * count.edges + 3 * vertices + own;
  const auto end = reinterpret_cast<std::uintptr_t>(memory) + bytes;
  arena_size_ = static_cast<Index>((end - reinterpret_cast<std::uintptr_t>(arena_)) / sizeof(Index));
}

// At most 64 vertices of the highest degrees. Their edges need rows in order.
template <class Index>
void OrderingGraph<Index>::find_hubs() {
  if (!count_.tidy || count_.highest <= static_cast<i64>(kWalked)) return;
  hub_count_ = kHubs + 1;
  for (i64 degree = kWalked; hub_count_ > kHubs; degree *= 2) {
    hub_count_ = 0;
    for (Index v = 0; v < n_ && hub_count_ <= kHubs; ++v) {
      if (perm_[v] <= degree) continue;
      if (hub_count_ < kHubs) hubs_[hub_count_] = v;
      ++hub_count_;
    }
  }
}

// Gives every vertex its room, hubs behind the others. Until its row is entered, mark is where its next neighbour goes,
// kGone for a hub.
template <class Index>
Index OrderingGraph<Index>::lay_out() {
  Index end = 0;
  Index hub = 0;
  const auto set_vertex = [&](Index v) {
    const Index degree = static_cast<Index>(perm_[v]);
    slots_[end] = degree + degree / 2 + 1;
    slots_[end + 1] = 0;
    vertex(v) = {degree, 0, 0, end + 2, n_, n_, lists_.kOutside, degree + 1};
    end += 2 + slots_[end];
  };
  for (Index v = 0; v < n_; ++v) {
    if (hub < hub_count_ && hubs_[hub] == v) {
      mark_[v] = kGone;
      ++hub;
      continue;
    }
    end += static_cast<Index>(perm_[v]);
    mark_[v] = end;
    set_vertex(v);
  }
  if (hub_count_ > 0) hub_lists_ = end;
  for (hub = 0; hub < hub_count_; ++hub) {
    set_vertex(hubs_[hub]);
    edges_[hubs_[hub]] = {hub, end, 0};
  }
  return end;
}

// The neighbours before i are there already. Those behind it head its list: as long as no row is long, their edges are
// its own.
template <class Index>
void OrderingGraph<Index>::enter_row(const SmMatrix& m, Index i) {
  Index place = mark_[i];
  const Index before = place;
  std::uint64_t hubs = 0;
  for (i64 p = m.row_start[i]; p < m.row_start[i + 1]; ++p) {
    if (m.col_index[p] <= static_cast<i64>(i)) continue;
    const Index j = static_cast<Index>(m.col_index[p]);
    if (mark_[j] == kGone) {
      hubs |= hub_bit(j);
      continue;
    }
    slots_[--place] = j;
    slots_[--mark_[j]] = i;
  }
  edges_[i] = {place, place, before - place};
  if (hubs != 0) hubs_of_[i] |= hubs;
}

template <class Index>
void OrderingGraph<Index>::enter_hub(const SmMatrix& m, Index i) {
  const std::uint64_t bit = hub_bit(i);
  for (i64 p = m.row_start[i]; p < m.row_start[i + 1]; ++p) {
    if (m.col_index[p] <= static_cast<i64>(i)) continue;
    const Index j = static_cast<Index>(m.col_index[p]);
    hubs_of_[j] |= bit;
    if (mark_[j] == kGone) hubs_of_[i] |= hub_bit(j);
  }
}

// Rows in any order, with repeated entries. A vertex's degree list link keeps the row that met it last.
template <class Index>
void OrderingGraph<Index>::enter_untidy(const SmMatrix& m) {
  for (Index i = 0; i < n_; ++i) {
    const Index before = mark_[i];
    for (i64 p = m.row_start[i]; p < m.row_start[i + 1]; ++p) {
      if (m.col_index[p] <= static_cast<i64>(i)) continue;
      const Index j = static_cast<Index>(m.col_index[p]);
      if (vertex(j).child == i) continue;
      vertex(j).child = i;
      slots_[--mark_[i]] = j;
      slots_[--mark_[j]] = i;
    }
    edges_[i] = {mark_[i], mark_[i], before - mark_[i]};
  }
}

// Where rows are long, an edge belongs to its end of lower degree: a vertex owns few, however many it has.
template <class Index>
void OrderingGraph<Index>::own_edges(Index end) {
  for (Index v = 0; v < n_; ++v) {
    const Vertex& mine = vertex(v);
    if (is_hub(mine)) continue;
    edges_[v].own = end;
    for (Index k = edges_[v].start; k + 2 < mine.list; ++k) {
      const Index w = slots_[k];
      const Index other = vertex(w).vertices;
      if (other > mine.vertices || (other == mine.vertices && w > v)) slots_[end++] = w;
    }
    edges_[v].owned = end - edges_[v].own;
  }
}

template <class Index>
void OrderingGraph<Index>::enter(const SmMatrix& m) {
  find_hubs();
  if (hub_count_ == 0) {
    hubs_of_ = nullptr;
  } else {
    std::fill_n(hubs_of_, n_, 0);
  }
  const Index end = lay_out();
  Index longest = 0;
  if (!count_.tidy) enter_untidy(m);
  for (Index i = 0; i < n_; ++i) {
    if (count_.tidy) is_hub(vertex(i)) ? enter_hub(m, i) : enter_row(m, i);
    longest = std::max(longest, edges_[i].owned);
  }
  if (longest > kLongRow) own_edges(end);
  lists_.clear();
  for (Index v = 0; v < n_; ++v) {
    mark_[v] = 0;
    lists_.insert_newest(v, vertex(v).vertices + 1, Known::exact);
  }
}

}  // namespace sm
