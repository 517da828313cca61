// The elements of the vertices on a new boundary, and their degrees. The file ordering_graph.hpp explains how, and why
// it may.
#pragma once

#include "cholesky/ordering_graph.hpp"

namespace sm {

// Visits the elements on the list of a vertex, takes off the absorbed ones and sets apart the contained ones.
template <class Index>
template <class Visit>
[[gnu::always_inline]] inline void OrderingGraph<Index>::walk_elements(Vertex& v, Visit&& visit) {
  const Index cells = v.cells;
  Index* list = elements_of(v);
  Index kept = 0;
  bool crowded = false;
  for (Index k = 0; k < cells; ++k) {
    const Index name = list[k];
    Element& e = element(name);
    if (e.size == 0) continue;
    if (e.live == 0) {
      Lists& lists = lists_of(v);
      if (cells + lists.tail < lists.room) {
        list[lists.room - ++lists.tail] = name;
        continue;
      }
      crowded = true;
    }
    list[kept++] = name;
    visit(e, name);
  }
  v.cells = kept;
  if (crowded) set_contained_apart(v);
}

// Contained elements go to the end of the room where it is full, from the right so that none is lost.
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
  walk_elements(v, [](Element&, Index) {});
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
  const auto meet = [stamp, passed](Element& e, Index) {
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
      const Index cells = std::min<Index>(next.cells, 8);
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

// The pivot that comes next, unless this one leaves a lower degree, and the node of the one after it.
template <class Index>
void OrderingGraph<Index>::fetch_next(Index degree) const {
  const Vertex& next = vertex(lists_.top(degree));
  __builtin_prefetch(slots_ + next.list);
  __builtin_prefetch(&graph_[next.child]);
}

// The newest of the vertices of least degree; what is only bounded is counted on the way.
template <class Index>
Index OrderingGraph<Index>::take_minimum() {
  for (;;) {
    const Index v = lists_.first();
    const Index least = vertex(v).degree;
    lists_.remove(v);
    if (lists_.known(v) == Known::exact) {
      fetch_next(least);
      return v;
    }
    const Index enough = bits_.in_use() ? n_ : 2 * least + 8;
    const Index degree = bits_.in_use() ? count_by_bits(v) : count_degree(v, enough);
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
  walk_elements(mine, [](Element&, Index) {});
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
  const Index most = std::min(enough, n_ - ordered_ - 1);  // beyond it there is nobody else
  for (Index k = mine.cells - 1; k-- > 0 && degree <= most;) {
    if (k >= 4) __builtin_prefetch(&graph_[list[k - 4]]);
    if (k >= 2) {
      const Index* next = arena_ + element(list[k - 2]).begin;
      __builtin_prefetch(next);
      __builtin_prefetch(next + 16);
      __builtin_prefetch(next + 32);
    }
    const Element& e = element(list[k]);
    const Index* boundary = arena_ + e.begin;
    const Index size = e.size;
    visits_ += size;
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

// 1 + the number of neighbours.
template <class Index>
Index OrderingGraph<Index>::count_by_bits(Index v) {
  Vertex& mine = vertex(v);
  bits_.clear();
  walk_elements(mine, [this](Element& e, Index name) {
    visits_ += e.size;
    bits_.join(name, arena_ + e.begin, e.size);
  });
  return bits_.count() + mine.vertices;
}

}  // namespace sm
