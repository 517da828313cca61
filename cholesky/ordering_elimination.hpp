// Eliminating the vertices of an OrderingGraph: the boundary of a new element, and the edges that it covers. The file
// ordering_graph.hpp explains how, and why it may.
#pragma once

#include "cholesky/ordering_graph.hpp"

namespace sm {

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
    __builtin_prefetch(&lists_of(vertex(v)));
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
  walked_ = bits_.in_use() ? kWalkedBesideBits : std::max(size / 8, kWalked);
  if (count_.long_rows == 0 && walked_ >= kShort) return;  // no list is longer
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

// Once counting has visited as many vertices as the graph had, which pays for looking through them all, and a boundary
// has as many vertices as it would take words. What was counted when twice as many vertices were left tells nothing:
// grids have their ties to settle at the beginning, and nothing later.
template <class Index>
bool OrderingGraph<Index>::bits_due(Index boundary) {
  const Index left = n_ - ordered_;
  const bool counted = visits_ > visits_due_;
  if (left > half_left_) return counted && !bits_.in_use() && boundary >= bits_.words_for(left);
  half_left_ = left / 2;
  visits_ = 0;
  visits_due_ = static_cast<i64>(n_);
  if (!bits_.in_use() || !bits_.outgrown(left)) return false;
  if (!counted) bits_.stop();
  return counted;
}

// After a refusal counting has to go on for twice as long before all is looked through again: where many boundaries are
// short, as those of the records of a student, there is no room for them to the end.
template <class Index>
void OrderingGraph<Index>::use_bits() {
  visits_ = 0;
  Index large = 0;
  const auto visit_boundaries = [this](auto&& visit) {
    for (Index from = 0; from < top_;) {
      const Index name = arena_[from];
      const Index size = name < n_ ? element(name).size : name - n_;
      if (name < n_) visit(name, arena_ + from + 1, size);
      from += 1 + size;
    }
  };
  const Index left = n_ - ordered_;
  const Index words = bits_.words_for(left);
  visit_boundaries([&](Index, const Index*, Index size) { large += bits_.large(size, words); });
  if (!bits_.start(n_, left, large)) {
    visits_due_ *= 2;
    return;
  }
  half_left_ = left / 2;
  for (Index v = 0; v < n_; ++v) {
    if (mark_[v] != kGone) bits_.enter(v);
  }
  visit_boundaries([this](Index name, const Index* boundary, Index size) { bits_.add(name, boundary, size); });
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
      return;
    }
    update_degrees(boundary, made, ordered_ - before);
    if (bits_due(made.size)) {
      use_bits();
    } else if (bits_.in_use()) {
      bits_.add(pivot, boundary, made.size);
    }
  }
}

}  // namespace sm
