// The quotient graph of the minimum-degree ordering, for any number of vertices with very many neighbours.
//
// It gives the permutation of the plain road (ordering_plain.cpp), and rests on what that one's lists amount to:
// - The list of a vertex is: the elements that it lies in, the newest first, then those of its neighbours that no
//   element covers, in their first order. Nothing is ever put between them.
// - The boundary of an element is: its ordinary vertices in the order in which the list of the pivot led to them, then
//   the prototypes.
// - The degree of a vertex is the exact size of a set, so it does not matter when it is counted, as long as no
//   elimination has touched the vertex in between: and one that changes the set touches it.
// - Ties of the least degree go to the vertex whose degree was due last.
//
// What is walked less, and why nothing changes:
// - Neighbours are never unlinked. An uneliminated one is covered exactly if an element of the pivot leads to it, and
//   elements come first, so its mark tells. How many are left is counted: an edge is looked for from its end of lower
//   degree when both ends lie in a new boundary (an orientation that leaves any vertex few edges of its own: Chiba and
//   Nishizeki, "Arboricity and subgraph listing algorithms", SIAM J. Comput. 14 (1985) 210-223).
// - Absorbed elements stay on the lists, marked, until a list is walked for another reason or full. How many elements
//   of a vertex are left is counted while their boundaries are read, for the last time, into the new one.
// - The two counts tell what the plain road reads off a list: a vertex without any is interior, one with a single
//   element and nothing else is a prototype or a duplicate. So the list of a vertex in very many elements (a hub) need
//   not be walked at all. Other lists are, to count for each of their elements how much of its boundary is outside the
//   new one (Amestoy, Davis, Duff, "An approximate minimum degree ordering algorithm", SIAM J. Matrix Anal. Appl. 17
//   (1996) 886-905). With k hubs passed over, that number may be too large by k.
// - Degrees are bounded: from above by the sum of these numbers, from below by their maximum and by the former bound
//   less what has been eliminated since. Where the bounds meet the degree is known. Else the lower one enters the degree
//   lists, with the time when the degree was due, and the count waits until it is the least of all.
// - A vertex that a prototype outmatches has at least its degree and an earlier time, so that it is never taken before
//   the prototype, which touches it: whether it is in the lists makes no difference.
//
// Everything is in one block: a node for each vertex (and the element that it becomes), both directions of the edges,
// 3/2 cells for each neighbour of a vertex for its elements, so that making room by dropping the absorbed ones is paid
// by what came before, and an arena for the boundaries. Elements and vertices never take more than the slots of the
// edges that they replace, so boundaries fill at most one number an edge, with their headers two; three, and two a
// vertex for the boundary that is being made, keep the packing of the arena rare.
#pragma once

#include <algorithm>
#include <type_traits>

#include "cholesky/degree_lists.hpp"
#include "frame/core.hpp"

namespace sm {

template <class Index>
struct GraphVertex {
  Index mark;                    // the stamp of the last visit; kGone once eliminated
  Index vertices;                // neighbours that no element covers
  Index elements;                // elements that it lies in, but for absorbed ones
  Index cells;                   // elements on its list, absorbed ones included
  Index child, sibling, before;  // degree lists
  Index degree;                  // 1 + neighbours, or less while only a bound is known
};

template <class Index>
struct GraphElement {
  Index mark;        // kGone
  Index size;        // vertices on the boundary; 0: absorbed
  Index begin;       // of the boundary, in the arena
  Index prototypes;  // how many vertices at the end of the boundary were prototypes when it was formed
  Index outside;     // boundary vertices that are not on that of the element `met` (more if hubs were passed over)
  Index met;         // stamp of the elimination that counts `outside`
  Index claimed;     // stamp of the elimination in which a prototype claimed it
  Index unused;
};

template <class Index>
union GraphNode {
  GraphVertex<Index> vertex;
  GraphElement<Index> element;
};

template <class Index>
class OrderingGraph {
 public:
  // Bytes of memory for that many vertices and edges; aligned to a node.
  static std::uint64_t bytes(i64 vertices, i64 edges);

  // perm holds the number of neighbours of every row.
  OrderingGraph(i64 vertices, i64 edges, void* memory, i64* perm, i64* inv_perm);

  void enter(const SmMatrix& m, bool repeated);
  void eliminate_all();

 private:
  using Node = GraphNode<Index>;
  using Vertex = GraphVertex<Index>;
  using Element = GraphElement<Index>;
  static constexpr Index kGone = static_cast<Index>(-1);
  // Lists of more elements are not walked at each elimination beside them.
  static constexpr Index kWalked = 16;

  Vertex& vertex(Index v) const { return graph_[v].vertex; }
  Element& element(Index e) const { return graph_[e].element; }
  Index* elements_of(Index v) const { return elements_ + starts_[v] + starts_[v] / 2 + v; }
  Index element_room(Index v) const { return static_cast<Index>(elements_of(v + 1) - elements_of(v)); }

  void lay_out();
  void enter_edges(const SmMatrix& m, bool repeated);
  void own_edges();
  void next_stamp();
  Index take_minimum();
  Index count_degree(Index v, Index enough);
  void number(Index v) {
    vertex(v).mark = kGone;
    perm_[ordered_++] = static_cast<i64>(v);
  }
  Index* form_element(Index pivot, Index& size);
  void reserve(Index more);
  void cover_edges(const Index* boundary, Index size);
  Element purge(Index pivot, Index* boundary, Index size);
  Index walk_elements(Index v);
  void push_element(Index v, Index e);
  void update_degrees(const Index* boundary, const Element& made, Index eliminated);
  void update_degree(Index v, const Element& made);

  Index n_;
  Index edges_;
  Node* graph_;
  Index* head_;
  Index* starts_;      // of the neighbours of v in neighbours_
  Index* own_starts_;  // of the edges that v owns
  Index* owned_;       // how many are left of them
  Index* neighbours_;  // in the order of entry, the latest first
  Index* own_;         // neighbours of higher degree
  Index* elements_;
  Index* arena_;  // boundaries, each behind the number of its element, or n + its length when that is absorbed
  Index arena_size_;
  Index top_ = 0;
  i64* perm_;
  i64* inv_perm_;  // the times of the degree lists until the end
  DegreeLists<Index, Node> lists_;
  Index ordered_ = 0;
  Index stamp_ = 0;
  Index hubs_ = 0;  // vertices of the boundary whose elements were not walked
};

template <class Index>
std::uint64_t OrderingGraph<Index>::bytes(i64 vertices, i64 edges) {
  const auto n = static_cast<std::uint64_t>(vertices);
  const auto e = static_cast<std::uint64_t>(edges);
  return sizeof(Index) * (8 * n + (n + 1) + 2 * (n + 1) + n + 2 * e + e + (3 * e + n) + (3 * e + 2 * n));
}

template <class Index>
OrderingGraph<Index>::OrderingGraph(i64 vertices, i64 edges, void* memory, i64* perm, i64* inv_perm)
    : n_(static_cast<Index>(vertices)),
      edges_(static_cast<Index>(edges)),
      graph_(static_cast<Node*>(memory)),
      head_(reinterpret_cast<Index*>(graph_ + n_)),
      starts_(head_ + n_ + 1),
      own_starts_(starts_ + n_ + 1),
      owned_(own_starts_ + n_ + 1),
      neighbours_(owned_ + n_),
      own_(neighbours_ + 2 * edges_),
      elements_(own_ + edges_),
      arena_(elements_ + 3 * edges_ + n_),
      arena_size_(3 * edges_ + 2 * n_),
      perm_(perm),
      inv_perm_(inv_perm),
      lists_(graph_, head_, inv_perm, n_) {}

template <class Index>
void OrderingGraph<Index>::enter(const SmMatrix& m, bool repeated) {
  Index start = 0;
  for (Index v = 0; v < n_; ++v) {
    starts_[v] = start;
    const Index degree = static_cast<Index>(perm_[v]);
    start += degree;
    // While the edges are entered, mark is the row that met v last and cells where its next neighbour goes.
    vertex(v) = {kGone, degree, 0, start, 0, 0, lists_.kOutside, 0};
  }
  starts_[n_] = start;
  enter_edges(m, repeated);
  own_edges();
  for (Index v = 0; v < n_; ++v) {
    vertex(v).mark = 0;
    vertex(v).cells = 0;
    lists_.insert_newest(v, vertex(v).vertices + 1, Known::exact);
  }
}

template <class Index>
void OrderingGraph<Index>::enter_edges(const SmMatrix& m, bool repeated) {
  for (Index i = 0; i < n_; ++i) {
    for (i64 p = m.row_start[i]; p < m.row_start[i + 1]; ++p) {
      if (m.col_index[p] <= static_cast<i64>(i)) continue;
      const Index j = static_cast<Index>(m.col_index[p]);
      Vertex& other = vertex(j);
      if (repeated) {
        if (other.mark == i) continue;
        other.mark = i;
      }
      neighbours_[--vertex(i).cells] = j;
      neighbours_[--other.cells] = i;
    }
  }
}

// An edge belongs to its end of lower degree: a vertex owns few, however many it has.
template <class Index>
void OrderingGraph<Index>::own_edges() {
  Index end = 0;
  for (Index v = 0; v < n_; ++v) {
    own_starts_[v] = end;
    const Index degree = vertex(v).vertices;
    for (Index k = starts_[v]; k < starts_[v + 1]; ++k) {
      const Index w = neighbours_[k];
      const Index other = vertex(w).vertices;
      if (other > degree || (other == degree && w > v)) own_[end++] = w;
    }
    owned_[v] = end - own_starts_[v];
  }
  own_starts_[n_] = end;
}

template <class Index>
void OrderingGraph<Index>::next_stamp() {
  if (++stamp_ != kGone) return;
  for (Index v = 0; v < n_; ++v) {
    if (vertex(v).mark != kGone) {
      vertex(v).mark = 0;
    } else {
      element(v).met = element(v).claimed = 0;
    }
  }
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

// 1 + the number of neighbours, or a number above `enough` once there are more than that.
template <class Index>
Index OrderingGraph<Index>::count_degree(Index v, Index enough) {
  next_stamp();
  Vertex& mine = vertex(v);
  mine.mark = stamp_;
  Index degree = mine.vertices + 1;
  const Index* list = elements_of(v);
  for (Index k = mine.cells; k-- > 0 && degree <= enough;) {
    const Element& e = element(list[k]);
    const Index* boundary = arena_ + e.begin;
    for (Index b = 0; b < e.size; ++b) {
      Index& mark = vertex(boundary[b]).mark;
      degree += mark != stamp_;
      mark = stamp_;
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
// what is left of its own neighbours.
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
    if (e.size == 0) continue;
    const Index* from = arena_ + e.begin;
    for (Index b = 0; b < e.size; ++b) {
      Vertex& other = vertex(from[b]);
      --other.elements;
      if (other.mark >= stamp_) continue;
      other.mark = stamp_;
      *end++ = from[b];
    }
    arena_[e.begin - 1] = n_ + e.size;
    e.size = 0;
  }
  const Index* neighbour = neighbours_ + starts_[pivot];
  for (Index left = mine.vertices; left > 0; ++neighbour) {
    Vertex& other = vertex(*neighbour);
    if (other.mark >= stamp_) continue;  // eliminated, or covered by an element of the pivot
    other.mark = stamp_;
    --other.vertices;
    --left;
    *end++ = *neighbour;
  }
  size = static_cast<Index>(end - boundary);
  return boundary;
}

// The new element covers the edges inside its boundary.
template <class Index>
void OrderingGraph<Index>::cover_edges(const Index* boundary, Index size) {
  for (Index b = 0; b < size; ++b) {
    const Index v = boundary[b];
    Vertex& mine = vertex(v);
    if (mine.vertices == 0) continue;
    Index* own = own_ + own_starts_[v];
    Index kept = 0;
    for (Index k = 0; k < owned_[v]; ++k) {
      Vertex& other = vertex(own[k]);
      if (other.mark == stamp_) {
        --mine.vertices;
        --other.vertices;
      } else if (other.mark != kGone) {
        own[kept++] = own[k];
      }
    }
    owned_[v] = kept;
  }
}

// Takes absorbed elements off the list of a boundary vertex, and this vertex off the counts of those that remain.
template <class Index>
Index OrderingGraph<Index>::walk_elements(Index v) {
  Vertex& mine = vertex(v);
  Index* list = elements_of(v);
  Index kept = 0;
  for (Index k = 0; k < mine.cells; ++k) {
    Element& e = element(list[k]);
    if (e.size == 0) continue;
    list[kept++] = list[k];
    if (e.met != stamp_) {
      e.met = stamp_;
      e.outside = e.size;
    }
    --e.outside;
  }
  mine.cells = kept;
  return list[0];
}

template <class Index>
void OrderingGraph<Index>::push_element(Index v, Index e) {
  Vertex& mine = vertex(v);
  Index* list = elements_of(v);
  if (mine.cells == element_room(v)) {
    Index kept = 0;
    for (Index k = 0; k < mine.cells; ++k) {
      if (element(list[k]).size != 0) list[kept++] = list[k];
    }
    mine.cells = kept;
  }
  list[mine.cells++] = e;
  ++mine.elements;
}

// Eliminates the vertices that nothing but the new element touches. Of those that it leaves with the same single
// element the first is the prototype and goes to the end.
template <class Index>
typename OrderingGraph<Index>::Element OrderingGraph<Index>::purge(Index pivot, Index* boundary, Index size) {
  Index* const prototypes = boundary + size;
  Index count = 0;
  Index kept = 0;
  hubs_ = 0;
  for (Index b = 0; b < size; ++b) {
    const Index v = boundary[b];
    Vertex& mine = vertex(v);
    if (lists_.holds(v)) lists_.remove(v);
    if (mine.elements + mine.vertices == 0) {
      number(v);
      continue;
    }
    bool claims = false;
    if (mine.elements <= kWalked) {
      const Index single = walk_elements(v);
      if (mine.elements == 1 && mine.vertices == 0) {
        claims = element(single).claimed != stamp_;
        element(single).claimed = stamp_;
      }
    } else {
      ++hubs_;
    }
    push_element(v, pivot);
    if (claims) {
      prototypes[count++] = v;
    } else {
      boundary[kept++] = v;
    }
  }
  std::copy_n(prototypes, count, boundary + kept);
  const Index begin = static_cast<Index>(boundary - arena_);
  return {kGone, kept + count, begin, count, 0, 0, 0, 0};
}

template <class Index>
void OrderingGraph<Index>::update_degree(Index v, const Element& made) {
  Vertex& mine = vertex(v);
  if (mine.elements > kWalked + 1) {
    lists_.insert_newest(v, mine.degree, Known::bound);
    return;
  }
  const bool prototype = mine.elements == 2 && mine.vertices == 0;
  const Index* list = elements_of(v);
  Index most = 0;
  Index sum = 0;
  for (Index k = 0; k + 1 < mine.cells; ++k) {
    const Element& e = element(list[k]);
    if (e.claimed == stamp_ && !prototype) return;  // outmatched
    most = std::max(most, e.outside);
    sum += e.outside;
  }
  const Index base = made.size + mine.vertices;
  Index bound = mine.degree;
  if (most > hubs_) bound = std::max(bound, base + most - hubs_);
  lists_.insert_newest(v, bound, bound == base + sum ? Known::exact : Known::bound);
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
    if (made.size == 0) continue;
    arena_[top_] = pivot;
    top_ += made.size + 1;
    update_degrees(boundary, made, ordered_ - before);
  }
  for (Index k = 0; k < n_; ++k) inv_perm_[perm_[k]] = static_cast<i64>(k);
}

}  // namespace sm
