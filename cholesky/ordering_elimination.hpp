// Eliminating the vertices of an OrderingGraph. The file ordering_graph.hpp explains how, and why it may.
#pragma once

#include "cholesky/ordering_graph.hpp"

namespace sm {

// Without an instruction that older processors lack, and without a call.
inline unsigned count_bits(std::uint64_t bits) {
  bits -= bits >> 1 & 0x5555555555555555U;
  bits = (bits & 0x3333333333333333U) + (bits >> 2 & 0x3333333333333333U);
  bits = (bits + (bits >> 4)) & 0x0F0F0F0F0F0F0F0FU;
  return static_cast<unsigned>(bits * 0x0101010101010101U >> 56);
}

template <class Index>
void OrderingGraph<Index>::restart_stamps() {
  for (Index v = 0; v < n_; ++v) {
    if (mark_[v] != kGone) {
      mark_[v] = 0;
    } else {
      element(v).met = element(v).claimed = 0;
    }
  }
  marked_ = kGone;
  stamp_ = 1;
}

// The newest of the vertices of least degree; what is only bounded is counted on the way.
template <class Index>
Index OrderingGraph<Index>::take_minimum() {
  for (;;) {
    const Index v = lists_.first();
    const Index least = vertex(v).degree;
    lists_.remove(v);
    if (lists_.known(v) == Known::exact) return v;
    const Index enough = 2 * least + 8;
    const Index degree = count_degree(v, enough);
    if (degree == least) {
      vertex(v).degree = degree;
      return v;
    }
    lists_.insert_late(v, degree, degree <= enough ? Known::exact : Known::bound);
  }
}

// 1 + the number of neighbours, or a number above `enough` once there are more than that. The boundary of the newest
// element stays marked: the next vertex is often on it.
template <class Index>
Index OrderingGraph<Index>::count_degree(Index v, Index enough) {
  if (stamp_ >= kGone - 2) restart_stamps();
  Vertex& mine = vertex(v);
  walk_elements(mine, [](Element&) {});
  const Index* list = elements_of(mine);
  const Index newest = list[mine.cells - 1];
  const Element& first = element(newest);
  if (marked_ != newest) {
    next_stamp();
    for (Index b = 0; b < first.size; ++b) mark_[arena_[first.begin + b]] = stamp_;
    marked_ = newest;
    marked_stamp_ = stamp_;
  }
  next_stamp();
  const Index stamp = stamp_;
  const Index marked = marked_stamp_;
  Index degree = first.size + mine.vertices;
  for (Index k = mine.cells - 1; k-- > 0 && degree <= enough;) {
    const Element& e = element(list[k]);
    const Index* boundary = arena_ + e.begin;
    const Index size = e.size;
    for (Index b = 0; b < size; ++b) {
      Index& mark = mark_[boundary[b]];
      const Index seen = mark;
      const bool fresh = seen != stamp && seen != marked;
      degree += fresh;
      mark = fresh ? stamp : seen;
    }
  }
  return degree;
}

// Room for `more` at the end of the arena: the boundaries in use move to its beginning.
template <class Index>
void OrderingGraph<Index>::reserve(Index more) {
  if (arena_size_ - top_ >= more) return;
  Index to = 0;
  for (Index from = 0; from < top_;) {
    const Index name = arena_[from];
    if (name >= n_) {
      from += 1 + name - n_;
      continue;
    }
    Element& e = element(name);
    std::copy_n(arena_ + from, e.size + 1, arena_ + to);
    from += e.size + 1;
    e.begin = to + 1;
    to += e.size + 1;
  }
  top_ = to;
}

// What the elements that the pivot absorbs bound, the newest element first. Contained elements lead to nothing new.
template <class Index>
Index* OrderingGraph<Index>::add_elements(const Vertex& pivot, Index* end) {
  const Index* list = elements_of(pivot);
  const Index stamp = stamp_;
  for (Index k = pivot.cells; k-- > 0;) {
    Element& e = element(list[k]);
    const Index size = e.size;
    const Index* from = arena_ + e.begin;
    for (Index b = 0; b < size; ++b) {
      const Index v = from[b];
      Vertex& other = vertex(v);
      --other.elements;
      __builtin_prefetch(elements_of(other));
      if (mark_[v] >= stamp) continue;
      *end++ = v;
      mark_[v] = stamp;
    }
    if (size != 0) absorb(e);
  }
  const Lists& lists = lists_of(pivot);
  for (Index k = lists.tail; k > lists.listed; --k) {
    Element& e = element(list[lists.room - k]);
    if (e.size == 0) continue;
    for (Index b = 0; b < e.size; ++b) --vertex(arena_[e.begin + b]).elements;
    absorb(e);
  }
  return end;
}

// What is left of the pivot's own neighbours: hubs have their place among the others, which descend.
template <class Index>
Index* OrderingGraph<Index>::add_neighbours(Index pivot, Index* end) {
  const Vertex& mine = vertex(pivot);
  const Lists& lists = lists_of(mine);
  const Index* const list_end = is_long(mine) ? slots_ + mine.list - kLongHead : elements_of(mine) + lists.room;
  const Index* neighbour = is_long(mine) ? slots_ + lists.start : list_end - lists.listed;
  std::uint64_t hubs = hubs_of_ != nullptr ? hubs_of_[pivot] : 0;
  for (Index left = mine.vertices; left > 0;) {
    Index v = neighbour != list_end ? *neighbour : 0;
    bool from_list = true;
    if (hubs != 0) {
      const int highest = 63 - std::countl_zero(hubs);
      const Index hub = hubs_[highest];
      if (neighbour == list_end || hub > v) {
        v = hub;
        hubs ^= std::uint64_t{1} << highest;
        from_list = false;
      }
    }
    neighbour += from_list;
    if (mark_[v] >= stamp_) continue;  // eliminated, or covered by an element of the pivot
    mark_[v] = stamp_;
    --vertex(v).vertices;
    --left;
    *end++ = v;
  }
  return end;
}

// The neighbours of a hub know of it, but not it of them.
template <class Index>
Index* OrderingGraph<Index>::add_hub_neighbours(Index pivot, Index* end) {
  const std::uint64_t bit = hub_bit(pivot);
  Index left = vertex(pivot).vertices;
  for (Index v = n_; left > 0;) {
    if (mark_[--v] >= stamp_ || (hubs_of_[v] & bit) == 0) continue;
    mark_[v] = stamp_;
    --vertex(v).vertices;
    --left;
    *end++ = v;
  }
  return end;
}

// The uneliminated neighbours of the pivot.
template <class Index>
Index* OrderingGraph<Index>::form_element(Index pivot, Index& size) {
  const Vertex& mine = vertex(pivot);
  reserve(2 * mine.degree);  // the purge sets the prototypes aside behind the boundary
  next_stamp();
  Index* const boundary = arena_ + top_ + 1;
  Index* end = add_elements(mine, boundary);
  if (mine.vertices > 0) end = is_hub(mine) ? add_hub_neighbours(pivot, end) : add_neighbours(pivot, end);
  marked_ = pivot;
  marked_stamp_ = stamp_;
  size = static_cast<Index>(end - boundary);
  return boundary;
}

// Finds the hubs of a boundary, and those of its vertices whose lists of elements are not walked.
template <class Index>
void OrderingGraph<Index>::find_passed(const Index* boundary, Index size) {
  its_hubs_ = passed_hubs_ = 0;
  passed_others_ = 0;
  walked_ = std::max(size / 2, kWalked);
  if (count_.long_rows == 0) return;
  for (Index b = 0; b < size; ++b) {
    const Index v = boundary[b];
    const std::uint64_t bit = hub_bit(v);
    its_hubs_ |= bit;
    if (is_walked(vertex(v))) continue;
    passed_hubs_ |= bit;
    passed_others_ += bit == 0;
  }
}

// Takes from hubs the edges to so many vertices.
template <class Index>
void OrderingGraph<Index>::cover_hubs(std::uint64_t bits, Index times) {
  for (; bits != 0; bits &= bits - 1) vertex(hubs_[std::countr_zero(bits)]).vertices -= times;
}

// Of two long vertices.
template <class Index>
void OrderingGraph<Index>::cover_own(Vertex& v) {
  Lists& lists = lists_of(v);
  Index* own = slots_ + lists.own;
  Index kept = 0;
  for (Index k = 0; k < lists.owned; ++k) {
    const Index w = own[k];
    if (mark_[w] == stamp_) {
      --v.vertices;
      --vertex(w).vertices;
    } else if (mark_[w] != kGone) {
      own[kept++] = w;
    }
  }
  lists.owned = kept;
}

// Of a short vertex. Those to other short ones are covered from both ends.
template <class Index>
void OrderingGraph<Index>::cover_list(Vertex& v) {
  Lists& lists = lists_of(v);
  Index* const end = elements_of(v) + lists.room;
  const Index listed = lists.listed;
  const Index stamp = stamp_;
  const bool beside_long = count_.long_rows > 0;
  Index kept = 0;
  Index covered = 0;
  for (Index k = 1; k <= listed; ++k) {
    const Index w = *(end - k);
    const Index mark = mark_[w];
    if (mark == stamp) {
      ++covered;
      if (beside_long && is_long(vertex(w))) --vertex(w).vertices;
    } else if (mark != kGone) {
      *(end - ++kept) = w;
    }
  }
  v.vertices -= covered;
  lists.listed = kept;
  const Index contained = lists.tail - listed;
  for (Index k = 1; k <= contained; ++k) *(end - kept - k) = *(end - listed - k);
  lists.tail = kept + contained;
}

// The new element covers the edges inside its boundary.
template <class Index>
void OrderingGraph<Index>::cover_edges(const Index* boundary, Index size) {
  std::uint64_t last = 0;  // hubs that the previous vertices had in common
  Index times = 0;
  for (Index b = 0; b < size; ++b) {
    const Index v = boundary[b];
    Vertex& mine = vertex(v);
    if (mine.vertices == 0) continue;
    const std::uint64_t covered = its_hubs_ != 0 ? its_hubs_ & hubs_of_[v] : 0;
    if (covered != 0) {
      hubs_of_[v] ^= covered;
      mine.vertices -= count_bits(covered);
      if (!is_hub(mine)) {
        if (covered != last) {
          cover_hubs(last, times);
          last = covered;
          times = 0;
        }
        ++times;
      }
    }
    is_long(mine) ? cover_own(mine) : cover_list(mine);
  }
  cover_hubs(last, times);
}

// Visits the elements on the list of a vertex, takes off the absorbed ones and sets apart the contained ones.
template <class Index>
template <class Visit>
[[gnu::always_inline]] inline void OrderingGraph<Index>::walk_elements(Vertex& v, Visit&& visit) {
  const Index cells = v.cells;
  Index* list = elements_of(v);
  Index kept = 0;
  bool any_contained = false;
  for (Index k = 0; k < cells; ++k) {
    const Index name = list[k];
    Element& e = element(name);
    if (e.size == 0) continue;
    list[kept++] = name;
    any_contained |= e.live == 0;
    visit(e);
  }
  v.cells = kept;
  if (any_contained) set_contained_apart(v);
}

// Contained elements go to the end of the room, from the right so that none is lost.
template <class Index>
[[gnu::noinline]] void OrderingGraph<Index>::set_contained_apart(Vertex& v) {
  Index* list = elements_of(v);
  Lists& lists = lists_of(v);
  Index kept = 0;
  for (Index k = 0; k < v.cells; ++k) {
    if (element(list[k]).live != 0) std::swap(list[kept++], list[k]);
  }
  for (Index k = v.cells; k-- > kept;) list[lists.room - ++lists.tail] = list[k];
  v.cells = kept;
}

// The only element of a vertex whose list has been walked.
template <class Index>
Index OrderingGraph<Index>::single_element(Vertex& v) {
  const Index* list = elements_of(v);
  if (v.cells == 1) return list[0];
  Lists& lists = lists_of(v);
  while (element(list[lists.room - lists.tail]).size == 0) --lists.tail;
  return list[lists.room - lists.tail];
}

template <class Index>
[[gnu::noinline]] void OrderingGraph<Index>::make_room(Vertex& v) {
  walk_elements(v, [](Element&) {});
  Index* list = elements_of(v);
  Lists& lists = lists_of(v);
  const Index contained = lists.listed + 1;
  if (v.vertices == 0) lists.listed = 0;
  Index kept = lists.listed;
  for (Index k = contained; k <= lists.tail; ++k) {
    const Index e = list[lists.room - k];
    if (element(e).size != 0) list[lists.room - ++kept] = e;
  }
  lists.tail = kept;
}

template <class Index>
void OrderingGraph<Index>::push_element(Vertex& v, Index e) {
  const Lists& lists = lists_of(v);
  if (v.cells + lists.tail == lists.room) make_room(v);
  elements_of(v)[v.cells++] = e;
  ++v.elements;
}

// Eliminates the vertices that nothing but the new element touches. Of those that it leaves with the same single
// element the first is the prototype and goes to the end.
template <class Index>
typename OrderingGraph<Index>::Element OrderingGraph<Index>::purge(Index pivot, Index* boundary, Index size) {
  Index* const prototypes = boundary + size;
  Index count = 0;
  Index kept = 0;
  const Index stamp = stamp_;
  const std::uint64_t passed = passed_hubs_;
  const auto meet = [stamp, passed](Element& e) {
    Index outside = e.met == stamp ? e.outside : e.size;
    if (passed != 0 && e.met != stamp) outside -= count_bits(e.hubs & passed);
    e.outside = outside - 1;
    e.met = stamp;
  };
  for (Index b = 0; b < size; ++b) {
    const Index v = boundary[b];
    Vertex& mine = vertex(v);
    if (b + 2 < size) {
      const Vertex& next = vertex(boundary[b + 2]);
      const Index* ahead = elements_of(next);
      const Index cells = std::min<Index>(next.cells, 4);
      for (Index k = 0; k < cells; ++k) __builtin_prefetch(&graph_[ahead[k]]);
    }
    if (lists_.holds(v)) lists_.remove(v);
    if (mine.elements + mine.vertices == 0) {
      number(v);
      continue;
    }
    bool claims = false;
    if (is_walked(mine)) {
      walk_elements(mine, meet);
      if (mine.elements == 1 && mine.vertices == 0) {
        Element& single = element(single_element(mine));
        claims = single.claimed != stamp;
        single.claimed = stamp;
      }
    }
    push_element(mine, pivot);
    prototypes[count] = v;
    count += claims;
    boundary[kept] = v;
    kept += !claims;
  }
  std::copy_n(prototypes, count, boundary + kept);
  const Index left = kept + count;
  prototypes_ = count;
  return {left, left, static_cast<Index>(boundary - arena_), 0, 0, 0, its_hubs_};
}

template <class Index>
void OrderingGraph<Index>::update_degree(Index v, const Element& made) {
  Vertex& mine = vertex(v);
  if (mine.cells > walked_ + 1) {
    lists_.insert_newest(v, mine.degree, Known::bound);
    return;
  }
  const bool prototype = mine.elements == 2 && mine.vertices == 0;
  const Index* list = elements_of(mine);
  const Index stamp = stamp_;
  Index most = 0;
  Index sum = 0;
  for (Index k = 0; k + 1 < mine.cells; ++k) {
    Element& e = element(list[k]);
    if (e.met != stamp) {  // a list that has become short since
      sum += e.size;
      continue;
    }
    if (e.claimed == stamp && !prototype) return;  // outmatched
    e.live = e.outside == 0 ? 0 : e.live;
    most = std::max(most, e.outside);
    sum += e.outside;
  }
  const Index base = made.size + mine.vertices;
  Index bound = mine.degree;
  if (most > passed_others_) bound = std::max(bound, base + most - passed_others_);
  const bool known = bound == std::min(base + sum, n_ - ordered_);
  lists_.insert_newest(v, bound, known ? Known::exact : Known::bound);
}

// The vertices that the new element leaves with the same two elements as a prototype come in no list: they cannot be
// taken before it.
template <class Index>
void OrderingGraph<Index>::update_degrees(const Index* boundary, const Element& made, Index eliminated) {
  const Index ordinary = made.size - prototypes_;
  for (Index b = 0; b < made.size; ++b) {
    const Index v = boundary[b];
    Vertex& mine = vertex(v);
    // What was known before still holds but for the vertices that have gone since.
    const Index bound = mine.degree > eliminated ? mine.degree - eliminated : 0;
    mine.degree = std::max(bound, made.size + mine.vertices);
    if (b >= ordinary || mine.elements != 2 || mine.vertices != 0) update_degree(v, made);
  }
}

template <class Index>
void OrderingGraph<Index>::eliminate_all() {
  while (ordered_ < n_) {
    const Index before = ordered_;
    const Index pivot = take_minimum();
    number(pivot);
    Index size = 0;
    Index* boundary = form_element(pivot, size);
    find_passed(boundary, size);
    cover_edges(boundary, size);
    const Element made = purge(pivot, boundary, size);
    element(pivot) = made;
    if (made.size == 0) continue;
    arena_[top_] = pivot;
    top_ += made.size + 1;
    if (made.size == n_ - ordered_) {
      finish(pivot);
    } else {
      update_degrees(boundary, made, ordered_ - before);
    }
  }
}

}  // namespace sm
