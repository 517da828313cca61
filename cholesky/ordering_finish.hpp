// The end of an elimination, once the boundary of one element holds all that is left.
//
// Every degree is then the same, and what the general step would do comes down to this: the next pivot is the last
// vertex of the boundary, being the last to enter the degree lists; the new boundary is the old one without it; the
// vertices that have no element left go, in the order of the boundary; and of those that have a single one left the
// first with each such element moves to the end, in that order. So only vertices whose elements were absorbed, and
// those with a single one, have to be looked at: in designs with dense ends (all levels of a factor linked through the
// records) the rest of the boundary is long.
#pragma once

#include <algorithm>

#include "cholesky/ordering_graph.hpp"

namespace sm {

// The one element, but for `all`, of a vertex that has two.
template <class Index>
Index OrderingGraph<Index>::other_element(const Vertex& v, Index all) const {
  const Index* list = elements_of(v);
  for (Index k = 0; k < v.cells; ++k) {
    if (list[k] != all && element(list[k]).size != 0) return list[k];
  }
  const Index* cell = list + lists_of(v).room - lists_of(v).tail;
  while (element(*cell).size == 0) ++cell;
  return *cell;
}

// Absorbs the elements of the pivot. Vertices that are left with nothing but `all` go to `gone`, those with one more to
// `single`; a vertex may pass from the second to the first.
template <class Index>
void OrderingGraph<Index>::absorb_elements(Index pivot, Index all, Stack& gone, Stack& single) {
  const auto take = [&](Index name) {
    Element& e = element(name);
    if (name == all || e.size == 0) return;
    for (Index b = 0; b < e.size; ++b) {
      const Index v = arena_[e.begin + b];
      const Index left = --vertex(v).elements;
      if (v == pivot) continue;
      if (left == 1) gone.push(v);
      if (left == 2) single.push(v);
    }
    e.size = 0;
  };
  const Vertex& mine = vertex(pivot);
  const Index* list = elements_of(mine);
  for (Index k = 0; k < mine.cells; ++k) take(list[k]);
  const Lists& lists = lists_of(mine);
  for (Index k = lists.listed + 1; k <= lists.tail; ++k) take(list[lists.room - k]);
}

// Adds the new single vertices, takes off those that have gone, and moves the prototypes to the end.
template <class Index>
void OrderingGraph<Index>::sort_singles(Stack& singles, const Stack& fresh, i64& place) {
  Index first = n_;
  Index* end = &first;
  const auto append = [&](Index v) {
    *end = v;
    end = &vertex(v).sibling;
  };
  Index k = 0;
  for (Index s = 0; s < singles.count; ++s) {
    const Index v = singles.items[s];
    if (mark_[v] == kGone) continue;
    for (; k < fresh.count && time_[fresh.items[k]] < time_[v]; ++k) append(fresh.items[k]);
    append(v);
  }
  for (; k < fresh.count; ++k) append(fresh.items[k]);
  *end = n_;
  next_stamp();
  singles.count = 0;
  Index rest = first;
  end = &first;
  while (rest != n_) {
    const Index v = rest;
    rest = vertex(v).sibling;
    Element& single = element(vertex(v).child);
    if (single.claimed == stamp_) {
      singles.push(v);
    } else {
      single.claimed = stamp_;
      append(v);
    }
  }
  *end = n_;
  for (Index v = first; v != n_; v = vertex(v).sibling) {
    time_[v] = place++;
    singles.push(v);
  }
}

template <class Index>
void OrderingGraph<Index>::finish(Index all) {
  Index left = element(all).size;
  reserve(2 * left);
  const Index* boundary = arena_ + element(all).begin;
  const auto earlier = [this](Index a, Index b) { return time_[a] < time_[b]; };
  const auto keep_single = [&](Index v) { vertex(v).child = other_element(vertex(v), all); };
  Stack singles{head_, 0};
  i64 place = 0;
  for (Index b = 0; b < left; ++b) {
    const Index v = boundary[b];
    time_[v] = place++;
    if (vertex(v).elements != 2) continue;
    keep_single(v);
    singles.push(v);
  }
  while (ordered_ < n_) {
    while (singles.count == 0 && mark_[boundary[left - 1]] == kGone) --left;
    const Index pivot = singles.count > 0 ? singles.items[--singles.count] : boundary[--left];
    number(pivot);
    Stack gone{arena_ + top_, 0};
    Stack fresh{gone.items + element(all).size, 0};
    absorb_elements(pivot, all, gone, fresh);
    std::sort(gone.items, gone.items + gone.count, earlier);
    for (Index k = 0; k < gone.count; ++k) number(gone.items[k]);
    Index* const end =
        std::remove_if(fresh.items, fresh.items + fresh.count, [this](Index v) { return mark_[v] == kGone; });
    fresh.count = static_cast<Index>(end - fresh.items);
    std::sort(fresh.items, end, earlier);
    std::for_each(fresh.items, end, keep_single);
    if (singles.count + fresh.count > 0) sort_singles(singles, fresh, place);
  }
}

}  // namespace sm
