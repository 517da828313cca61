// Eliminating the vertices of an OrderingGraph. The file ordering_graph.hpp explains how, and why it may.
#pragma once

#include "cholesky/ordering_graph.hpp"

namespace sm {

template <class Index>
void OrderingGraph<Index>::restart_stamps() {
  for (Index v = 0; v < n_; ++v) {
    if (vertex(v).mark != kGone) {
      vertex(v).mark = 0;
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
  walk_elements(v, [](Element&) {});
  const Vertex& mine = vertex(v);
  const Index* list = elements_of(v);
  const Index newest = list[mine.cells - 1];
  const Element& first = element(newest);
  if (marked_ != newest) {
    next_stamp();
    for (Index b = 0; b < first.size; ++b) vertex(arena_[first.begin + b]).mark = stamp_;
    marked_ = newest;
    marked_stamp_ = stamp_;
  }
  next_stamp();
  Index degree = first.size + mine.vertices;
  for (Index k = mine.cells - 1; k-- > 0 && degree <= enough;) {
    const Element& e = element(list[k]);
    const Index* boundary = arena_ + e.begin;
    for (Index b = 0; b < e.size; ++b) {
      Index& mark = vertex(boundary[b]).mark;
      if (mark == stamp_ || mark == marked_stamp_) continue;
      mark = stamp_;
      ++degree;
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

// The uneliminated neighbours of the pivot: what the elements that it absorbs bound, the newest element first, then
// what is left of its own neighbours. Contained elements lead to nothing new.
template <class Index>
Index* OrderingGraph<Index>::form_element(Index pivot, Index& size) {
  Vertex& mine = vertex(pivot);
  reserve(2 * mine.degree);  // the purge sets the prototypes aside behind the boundary
  next_stamp();
  Index* const boundary = arena_ + top_ + 1;
  Index* end = boundary;
  const Index* list = elements_of(pivot);
  for (Index k = mine.cells; k-- > 0;) {
    Element& e = element(list[k]);
    const Index* from = arena_ + e.begin;
    for (Index b = 0; b < e.size; ++b) {
      Vertex& other = vertex(from[b]);
      --other.elements;
      if (other.mark >= stamp_) continue;
      other.mark = stamp_;
      __builtin_prefetch(&places_[from[b]]);
      *end++ = from[b];
    }
    if (e.size != 0) absorb(e);
  }
  const Index* const room_end = elements_of(pivot + 1);
  for (const Index* cell = room_end - places_[pivot].contained; cell != room_end; ++cell) {
    Element& e = element(*cell);
    if (e.size == 0) continue;
    for (Index b = 0; b < e.size; ++b) --vertex(arena_[e.begin + b]).elements;
    absorb(e);
  }
  const Index* neighbour = neighbours_ + places_[pivot].start;
  for (Index left = mine.vertices; left > 0; ++neighbour) {
    Vertex& other = vertex(*neighbour);
    if (other.mark >= stamp_) continue;  // eliminated, or covered by an element of the pivot
    other.mark = stamp_;
    --other.vertices;
    --left;
    *end++ = *neighbour;
  }
  marked_ = pivot;
  marked_stamp_ = stamp_;
  size = static_cast<Index>(end - boundary);
  return boundary;
}

// The new element covers the edges inside its boundary. Also finds the hubs on it.
template <class Index>
void OrderingGraph<Index>::cover_edges(const Index* boundary, Index size) {
  its_hubs_ = passed_hubs_ = 0;
  passed_others_ = 0;
  walked_ = std::max(size / 2, kWalked);
  for (Index b = 0; b < size; ++b) {
    const Index v = boundary[b];
    Vertex& mine = vertex(v);
    const std::uint64_t bit = hub_bit(v);
    __builtin_prefetch(elements_of(v));
    its_hubs_ |= bit;
    if (!is_walked(mine)) {
      passed_hubs_ |= bit;
      passed_others_ += bit == 0;
    }
    if (mine.vertices == 0) continue;
    Index* own = own_ + places_[v].own_start;
    Index kept = 0;
    for (Index k = 0; k < places_[v].owned; ++k) {
      Vertex& other = vertex(own[k]);
      if (other.mark == stamp_) {
        --mine.vertices;
        --other.vertices;
      } else if (other.mark != kGone) {
        own[kept++] = own[k];
      }
    }
    places_[v].owned = kept;
  }
}

// Visits the elements on the list of a vertex that are neither absorbed nor contained, and takes the others off.
template <class Index>
template <class Visit>
void OrderingGraph<Index>::walk_elements(Index v, Visit&& visit) {
  const Index cells = vertex(v).cells;
  Index* list = elements_of(v);
  Index kept = 0;
  for (Index k = 0; k < cells; ++k) {
    Element& e = element(list[k]);
    if (e.size == 0 || e.contained) continue;
    if (kept != k) std::swap(list[kept], list[k]);
    ++kept;
    visit(e);
  }
  if (kept != cells) set_contained_apart(v, kept);
}

// Behind the first `kept` cells: contained elements go to the end of the room, from the right so that none is lost.
template <class Index>
void OrderingGraph<Index>::set_contained_apart(Index v, Index kept) {
  Vertex& mine = vertex(v);
  Index* list = elements_of(v);
  const Index room = element_room(v);
  Index& contained = places_[v].contained;
  for (Index k = mine.cells; k-- > kept;) {
    if (element(list[k]).size != 0) list[room - ++contained] = list[k];
  }
  mine.cells = kept;
}

// The only element of a vertex whose list has been walked.
template <class Index>
Index OrderingGraph<Index>::single_element(Index v) {
  const Index* list = elements_of(v);
  if (vertex(v).cells == 1) return list[0];
  const Index room = element_room(v);
  Index& contained = places_[v].contained;
  while (element(list[room - contained]).size == 0) --contained;
  return list[room - contained];
}

template <class Index>
void OrderingGraph<Index>::make_room(Index v) {
  walk_elements(v, [](Element&) {});
  Index* list = elements_of(v);
  const Index room = element_room(v);
  Index& contained = places_[v].contained;
  Index kept = 0;
  for (Index k = 1; k <= contained; ++k) {
    const Index e = list[room - k];
    if (element(e).size != 0) list[room - ++kept] = e;
  }
  contained = kept;
}

template <class Index>
void OrderingGraph<Index>::push_element(Index v, Index e) {
  Vertex& mine = vertex(v);
  if (mine.cells + places_[v].contained == element_room(v)) make_room(v);
  elements_of(v)[mine.cells++] = e;
  ++mine.elements;
}

// Eliminates the vertices that nothing but the new element touches. Of those that it leaves with the same single
// element the first is the prototype and goes to the end.
template <class Index>
typename OrderingGraph<Index>::Element OrderingGraph<Index>::purge(Index pivot, Index* boundary, Index size) {
  Index* const prototypes = boundary + size;
  Index count = 0;
  Index kept = 0;
  const auto meet = [this](Element& e) {
    if (e.met != stamp_) {
      e.met = stamp_;
      e.outside = e.size;
      if (passed_hubs_ != 0) {
        const auto its = static_cast<std::uint64_t>(inv_perm_[&reinterpret_cast<Node&>(e) - graph_]);
        e.outside -= static_cast<Index>(std::popcount(its & passed_hubs_));
      }
    }
    --e.outside;
  };
  for (Index b = 0; b < size; ++b) {
    const Index v = boundary[b];
    Vertex& mine = vertex(v);
    if (b + 2 < size) {
      const Index* ahead = elements_of(boundary[b + 2]);
      const Index cells = std::min<Index>(vertex(boundary[b + 2]).cells, 4);
      for (Index k = 0; k < cells; ++k) __builtin_prefetch(&graph_[ahead[k]]);
    }
    if (lists_.holds(v)) lists_.remove(v);
    if (mine.elements + mine.vertices == 0) {
      number(v);
      continue;
    }
    bool claims = false;
    if (is_walked(mine)) {
      walk_elements(v, meet);
      if (mine.elements == 1 && mine.vertices == 0) {
        Element& single = element(single_element(v));
        claims = single.claimed != stamp_;
        single.claimed = stamp_;
      }
    }
    push_element(v, pivot);
    if (claims) {
      prototypes[count++] = v;
    } else {
      boundary[kept++] = v;
    }
  }
  std::copy_n(prototypes, count, boundary + kept);
  return {kGone, kept + count, static_cast<Index>(boundary - arena_), count, 0, 0, 0, 0};
}

template <class Index>
void OrderingGraph<Index>::update_degree(Index v, const Element& made) {
  Vertex& mine = vertex(v);
  if (mine.cells > walked_ + 1) {
    lists_.insert_newest(v, mine.degree, Known::bound);
    return;
  }
  const bool prototype = mine.elements == 2 && mine.vertices == 0;
  const Index* list = elements_of(v);
  Index most = 0;
  Index sum = 0;
  for (Index k = 0; k + 1 < mine.cells; ++k) {
    Element& e = element(list[k]);
    if (e.met != stamp_) {  // a list that has become short since
      sum += e.size;
      continue;
    }
    if (e.claimed == stamp_ && !prototype) return;  // outmatched
    if (e.outside == 0) e.contained = 1;
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
  const Index ordinary = made.size - made.prototypes;
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
    cover_edges(boundary, size);
    const Element made = purge(pivot, boundary, size);
    element(pivot) = made;
    inv_perm_[pivot] = static_cast<i64>(its_hubs_);
    if (made.size == 0) continue;
    arena_[top_] = pivot;
    top_ += made.size + 1;
    if (made.size == n_ - ordered_) {
      finish(pivot);
    } else {
      update_degrees(boundary, made, ordered_ - before);
    }
  }
  for (Index k = 0; k < n_; ++k) inv_perm_[perm_[k]] = static_cast<i64>(k);
}

}  // namespace sm
