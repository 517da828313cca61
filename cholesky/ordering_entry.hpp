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
  const std::uint64_t lists = 2 * e + 3 * e + n;
  const std::uint64_t arena = 2 * e + 2 * n + static_cast<std::uint64_t>(slack) * e;
  return alignof(Node) - 1 + sizeof(Node) * (n + 1) + sizeof(Index) * (heads + own + lists + arena);
}

template <class Index>
OrderingGraph<Index>::OrderingGraph(i64 vertices, const EdgeCount& count, void* memory, std::uint64_t bytes, i64* perm,
                                    i64* inv_perm)
    : n_(static_cast<Index>(vertices)),
      count_(count),
      graph_(reinterpret_cast<Node*>((reinterpret_cast<std::uintptr_t>(memory) + alignof(Node) - 1) &
                                     ~(std::uintptr_t{alignof(Node)} - 1))),
      slots_(reinterpret_cast<Index*>(graph_ + n_ + 1)),
      perm_(perm),
      mark_(reinterpret_cast<Index*>(inv_perm)),
      head_(sizeof(Index) == 4 ? mark_ + n_ : slots_),
      lists_(graph_, head_, n_) {
  if (sizeof(Index) != 4) slots_ += n_;
  const i64 own = count.longest > kLongRow ? count.edges : 0;
  arena_ = slots_ + 5 * count.edges + vertices + own;
  const auto end = reinterpret_cast<std::uintptr_t>(memory) + bytes;
  arena_size_ = static_cast<Index>((end - reinterpret_cast<std::uintptr_t>(arena_)) / sizeof(Index));
}

// At most 64 vertices of the highest degrees. Their edges need rows in order.
template <class Index>
void OrderingGraph<Index>::find_hubs() {
  if (!count_.tidy || count_.highest <= static_cast<i64>(kWalked)) return;
  for (i64 degree = kWalked;; degree *= 2) {
    hub_count_ = 0;
    for (Index v = 0; v < n_ && hub_count_ <= kHubs; ++v) {
      if (perm_[v] <= degree) continue;
      if (hub_count_ < kHubs) hubs_[hub_count_] = v;
      ++hub_count_;
    }
    if (hub_count_ > kHubs) continue;
    hub_room_ = room_for(static_cast<Index>(degree));
    return;
  }
}

// Gives every vertex its room. Until its row is entered, mark is where its next neighbour goes, kGone for a hub, and
// perm the bits of the hubs beside it.
template <class Index>
Index OrderingGraph<Index>::lay_out() {
  Index end = 0;
  Index hub = 0;
  for (Index v = 0; v < n_; ++v) {
    const Index degree = static_cast<Index>(perm_[v]);
    const Index room = room_for(degree);
    perm_[v] = 0;
    if (room > hub_room_) {
      vertex(v) = {degree, 0, 0, 0, n_, n_, lists_.kOutside, degree + 1, hub++, end, 0, end, room, 0, 0};
      mark_[v] = kGone;
    } else {
      end += degree;
      vertex(v) = {degree, 0, 0, 0, n_, n_, lists_.kOutside, degree + 1, 0, 0, 0, end, room, 0, 0};
      mark_[v] = end;
    }
    end += room;
  }
  return end;
}

// The neighbours before i are there already. Those behind it head its list: as long as no row is long, their edges are
// its own.
template <class Index>
void OrderingGraph<Index>::enter_row(const SmMatrix& m, Index i) {
  Index place = mark_[i];
  const Index before = place;
  auto hubs = static_cast<std::uint64_t>(perm_[i]);
  for (i64 p = m.row_start[i]; p < m.row_start[i + 1]; ++p) {
    if (m.col_index[p] <= static_cast<i64>(i)) continue;
    const Index j = static_cast<Index>(m.col_index[p]);
    if (mark_[j] == kGone) {
      hubs |= hub_bit(vertex(j));
      continue;
    }
    slots_[--place] = j;
    slots_[--mark_[j]] = i;
  }
  Vertex& mine = vertex(i);
  mine.start = mine.own = place;
  mine.owned = before - place;
  mine.hubs = hubs;
}

template <class Index>
void OrderingGraph<Index>::enter_hub(const SmMatrix& m, Index i) {
  const i64 bit = static_cast<i64>(hub_bit(vertex(i)));
  for (i64 p = m.row_start[i]; p < m.row_start[i + 1]; ++p) {
    if (m.col_index[p] <= static_cast<i64>(i)) continue;
    const Index j = static_cast<Index>(m.col_index[p]);
    perm_[j] |= bit;
    if (mark_[j] == kGone) perm_[i] |= static_cast<i64>(hub_bit(vertex(j)));
  }
  vertex(i).hubs = static_cast<std::uint64_t>(perm_[i]);
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
    Vertex& mine = vertex(i);
    mine.start = mine.own = mark_[i];
    mine.owned = before - mark_[i];
  }
}

// Where rows are long, an edge belongs to its end of lower degree: a vertex owns few, however many it has.
template <class Index>
void OrderingGraph<Index>::own_edges(Index end) {
  for (Index v = 0; v < n_; ++v) {
    Vertex& mine = vertex(v);
    mine.own = end;
    if (is_hub(mine)) continue;
    for (Index k = mine.start; k < mine.list; ++k) {
      const Index w = slots_[k];
      const Index other = vertex(w).vertices;
      if (other > mine.vertices || (other == mine.vertices && w > v)) slots_[end++] = w;
    }
    mine.owned = end - mine.own;
  }
}

template <class Index>
void OrderingGraph<Index>::enter(const SmMatrix& m) {
  find_hubs();
  const Index end = lay_out();
  Index longest = 0;
  if (!count_.tidy) enter_untidy(m);
  for (Index i = 0; i < n_; ++i) {
    if (count_.tidy) is_hub(vertex(i)) ? enter_hub(m, i) : enter_row(m, i);
    longest = std::max(longest, vertex(i).owned);
  }
  if (longest > kLongRow) own_edges(end);
  lists_.clear();
  for (Index v = 0; v < n_; ++v) {
    mark_[v] = 0;
    lists_.insert_newest(v, vertex(v).vertices + 1, Known::exact);
  }
}

}  // namespace sm
