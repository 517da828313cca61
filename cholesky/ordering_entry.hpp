// Entering a matrix into an OrderingGraph. The file ordering_graph.hpp explains how, and why it may.
#pragma once

#include "cholesky/ordering_graph.hpp"

namespace sm {

template <class Index>
std::uint64_t OrderingGraph<Index>::bytes(i64 vertices, const EdgeCount& count, i64 slack) {
  const auto n = static_cast<std::uint64_t>(vertices);
  const auto e = static_cast<std::uint64_t>(count.edges);
  const std::uint64_t heads = sizeof(Index) == 4 ? 0 : n;
  const std::uint64_t arena = 2 * e + 2 * n + static_cast<std::uint64_t>(slack) * e;
  const std::uint64_t words = count.long_rows > 0 ? 2 * n : n;
  return sizeof(Node) * (n + 1) + sizeof(i64) * words +
         sizeof(Index) * (heads + static_cast<std::uint64_t>(slots(vertices, count)) + arena);
}

// A long vertex has 3/2 cells for each neighbour, so that making room by dropping the absorbed elements is paid for by
// what came before; each edge between two of them has an owner.
template <class Index>
i64 OrderingGraph<Index>::slots(i64 vertices, const EdgeCount& count) {
  const i64 for_long = 4 * count.long_rows + count.long_entries + count.long_entries / 2;
  return 2 * count.edges + 3 * vertices + for_long + count.long_entries / 2;
}

template <class Index>
OrderingGraph<Index>::OrderingGraph(i64 vertices, const EdgeCount& count, std::span<std::byte> memory,
                                    std::span<std::byte> spare, i64* perm, i64* inv_perm)
    : n_(static_cast<Index>(vertices)),
      count_(count),
      graph_(reinterpret_cast<Node*>(memory.data())),
      time_(reinterpret_cast<i64*>(graph_ + n_ + 1)),
      hubs_of_(reinterpret_cast<std::uint64_t*>(time_ + n_)),
      slots_(reinterpret_cast<Index*>(hubs_of_ + (count.long_rows > 0 ? n_ : 0))),
      perm_(perm),
      mark_(reinterpret_cast<Index*>(inv_perm)),
      head_(sizeof(Index) == 4 ? mark_ + n_ : slots_),
      lists_(graph_, head_, time_, n_),
      bits_(spare),
      half_left_(n_ / 2),
      visits_due_(vertices) {
  if (sizeof(Index) != 4) slots_ += n_;
  arena_ = slots_ + slots(vertices, count);
  const auto before = static_cast<std::size_t>(reinterpret_cast<std::byte*>(arena_) - memory.data());
  arena_size_ = static_cast<Index>((memory.size() - before) / sizeof(Index));
}

// At most 64 vertices of the highest degrees. Their edges need rows in order.
template <class Index>
void OrderingGraph<Index>::find_hubs() {
  if (!count_.tidy || count_.long_rows == 0) return;
  hub_count_ = kHubs + 1;
  for (i64 degree = kShort; hub_count_ > kHubs; degree *= 2) {
    hub_count_ = 0;
    for (Index v = 0; v < n_ && hub_count_ <= kHubs; ++v) {
      if (perm_[v] <= degree) continue;
      if (hub_count_ < kHubs) hubs_[hub_count_] = v;
      ++hub_count_;
    }
  }
}

// Gives every vertex its slots: first the short ones, then the long ones, then hubs. Until its row is entered, mark is
// where its next neighbour goes, kGone for a hub.
template <class Index>
Index OrderingGraph<Index>::lay_out() {
  Index end = 0;
  const auto set = [&](Index v, Index head, Index room) {
    end += head;
    vertex(v) = {static_cast<Index>(perm_[v]), 0, 0, end, n_, n_, lists_.kOutside, 0};
    Lists& lists = lists_of(vertex(v));
    lists.room = room;
    lists.tail = lists.listed = 0;
    end += room;
  };
  for (Index v = 0; v < n_; ++v) {
    if (perm_[v] > kShort) continue;
    set(v, kShortHead, static_cast<Index>(perm_[v]));
    mark_[v] = end;
  }
  long_lists_ = end;
  const auto set_long = [&](Index v) {
    const Index degree = static_cast<Index>(perm_[v]);
    set(v, kLongHead, degree + degree / 2 + 1);
    lists_of(vertex(v)).own = lists_of(vertex(v)).owned = 0;
  };
  for (Index v = 0, hub = 0; count_.long_rows > 0 && v < n_; ++v) {
    if (perm_[v] <= kShort) continue;
    mark_[v] = kGone;
    if (hub < hub_count_ && hubs_[hub] == v) {
      ++hub;
      continue;
    }
    end += static_cast<Index>(perm_[v]);
    mark_[v] = end;
    set_long(v);
  }
  if (hub_count_ > 0) hub_lists_ = end;
  for (Index hub = 0; hub < hub_count_; ++hub) {
    set_long(hubs_[hub]);
    lists_of(vertex(hubs_[hub])).start = hub;
  }
  return end;
}

// Its neighbours are all there.
template <class Index>
void OrderingGraph<Index>::close_list(Index v) {
  const Vertex& mine = vertex(v);
  Lists& lists = lists_of(mine);
  if (is_long(mine)) {
    lists.start = mark_[v];
  } else {
    lists.tail = lists.listed = mine.list + lists.room - mark_[v];
  }
}

// The neighbours before i are there already.
template <class Index>
void OrderingGraph<Index>::enter_row(const SmMatrix& m, Index i) {
  Index place = mark_[i];
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
  mark_[i] = place;
  close_list(i);
  if (hubs != 0) hubs_of_[i] |= hubs;
}

template <class Index>
void OrderingGraph<Index>::enter_hub(const SmMatrix& m, Index i) {
  const std::uint64_t bit = hub_bit(i);
  const i64 end = m.row_start[i + 1];
  for (i64 p = m.row_start[i]; p < end; ++p) {
    const i64 j = m.col_index[p];
    if (j <= static_cast<i64>(i)) continue;
    if (end - p >= kNeighbours && are_neighbours(m.col_index + p)) {
      for (i64 q = 0; q < kNeighbours; ++q) hubs_of_[j + q] |= bit;
      p += kNeighbours - 1;
    } else {
      hubs_of_[j] |= bit;
    }
  }
}

// Of two hubs only the second has learnt of the first.
template <class Index>
void OrderingGraph<Index>::join_hubs() {
  for (Index k = 0; k < hub_count_; ++k) {
    for (Index j = 0; j < k; ++j) hubs_of_[hubs_[j]] |= (hubs_of_[hubs_[k]] >> j & 1) << k;
  }
}

// Rows in any order, with repeated entries. A vertex's degree list link keeps the row that met it last.
template <class Index>
void OrderingGraph<Index>::enter_untidy(const SmMatrix& m) {
  for (Index i = 0; i < n_; ++i) {
    for (i64 p = m.row_start[i]; p < m.row_start[i + 1]; ++p) {
      if (m.col_index[p] <= static_cast<i64>(i)) continue;
      const Index j = static_cast<Index>(m.col_index[p]);
      if (vertex(j).child == i) continue;
      vertex(j).child = i;
      slots_[--mark_[i]] = j;
      slots_[--mark_[j]] = i;
    }
    close_list(i);
  }
}

// An edge between long vertices belongs to its end of lower degree: a vertex owns few, however many it has.
template <class Index>
void OrderingGraph<Index>::own_edges(Index end) {
  for (Index v = 0; v < n_; ++v) {
    const Vertex& mine = vertex(v);
    if (!is_long(mine) || is_hub(mine)) continue;
    Lists& lists = lists_of(mine);
    lists.own = end;
    for (Index k = lists.start; k + kLongHead < mine.list; ++k) {
      const Index w = slots_[k];
      const Vertex& other = vertex(w);
      if (!is_long(other)) continue;
      if (other.vertices > mine.vertices || (other.vertices == mine.vertices && w > v)) slots_[end++] = w;
    }
    lists.owned = end - lists.own;
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
  if (!count_.tidy) enter_untidy(m);
  for (Index i = 0; count_.tidy && i < n_; ++i) is_hub(vertex(i)) ? enter_hub(m, i) : enter_row(m, i);
  join_hubs();
  if (count_.long_rows > static_cast<i64>(hub_count_)) own_edges(end);
  vertex(n_) = {};
  lists_.clear();
  for (Index v = 0; v < n_; ++v) {
    mark_[v] = 0;
    lists_.insert_newest(v, vertex(v).vertices + 1, Known::exact);
  }
}

}  // namespace sm
