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
//   element and nothing else is a prototype or a duplicate. So the list of a vertex in very many elements need not be
//   walked at all. Other lists are, to count for each of their elements how much of its boundary is outside the new one
//   (Amestoy, Davis, Duff, "An approximate minimum degree ordering algorithm", SIAM J. Matrix Anal. Appl. 17 (1996)
//   886-905). Of the hubs, up to 64 vertices of the highest degrees, every element knows which are on its boundary, so
//   that those passed over are counted all the same. With k other vertices passed over the number may be too large by
//   k.
// - An element whose boundary is contained in that of a newer one leads to nothing that the newer one does not lead to
//   before. It still counts as one, but is set apart from the list.
// - Degrees are bounded: from above by the sum of these numbers, from below by their maximum and by the former bound
//   less what has been eliminated since. Where the bounds meet the degree is known. Else the lower one enters the
//   degree lists, with the time when the degree was due, and the count waits until it is the least of all.
// - A vertex that a prototype outmatches has at least its degree and an earlier time, so that it is never taken before
//   the prototype, which touches it: whether it is in the lists makes no difference.
// - Once an element bounds all that is left, only the order of its boundary matters (ordering_finish.hpp).
//
// Everything is in one block: a node for each vertex (and the element that it becomes), both directions of the edges,
// 3/2 cells for each neighbour of a vertex for its elements, so that making room by dropping the absorbed ones is paid
// by what came before, and an arena for the boundaries. Elements and vertices never take more than the slots of the
// edges that they replace, so boundaries fill at most one number an edge, with their headers two; three, and two a
// vertex for the boundary that is being made, keep the packing of the arena rare.
#pragma once

#include <algorithm>
#include <bit>
#include <utility>

#include "cholesky/degree_lists.hpp"
#include "frame/core.hpp"

namespace sm {

template <class Index>
struct GraphVertex {
  Index mark;                    // the stamp of the last visit; kGone once eliminated
  Index vertices;                // neighbours that no element covers
  Index elements;                // elements that it lies in, but for absorbed ones
  Index cells;                   // of its list of elements
  Index child, sibling, before;  // degree lists
  Index degree;                  // 1 + neighbours, or less while only a bound is known
};

template <class Index>
struct GraphElement {
  Index mark;        // kGone
  Index size;        // vertices on the boundary; 0: absorbed
  Index begin;       // of the boundary, in the arena
  Index prototypes;  // how many of them end the boundary
  Index outside;     // boundary vertices that are not on that of the element `met` (more if hubs were passed over)
  Index met;         // stamp of the elimination that counts `outside`
  Index claimed;     // stamp of the elimination in which a prototype claimed it
  Index contained;   // 1: in the boundary of a newer one
};

template <class Index>
union GraphNode {
  GraphVertex<Index> vertex;
  GraphElement<Index> element;
};

// Where a vertex has its lists.
template <class Index>
struct GraphPlaces {
  Index start;      // of its neighbours; that of its elements follows from it
  Index own_start;  // of the edges that it owns
  Index owned;      // how many of them are left
  Index contained;  // elements at the end of the room for its elements that are contained in newer ones
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
  using Places = GraphPlaces<Index>;
  static constexpr Index kGone = static_cast<Index>(-1);
  // Longer lists of elements are not walked at each elimination beside them, unless the boundary is twice as long.
  static constexpr Index kWalked = 32;
  static constexpr Index kHubs = 64;

  Vertex& vertex(Index v) const { return graph_[v].vertex; }
  Element& element(Index e) const { return graph_[e].element; }
  Index* elements_of(Index v) const { return elements_ + places_[v].start + places_[v].start / 2 + v; }
  Index element_room(Index v) const { return static_cast<Index>(elements_of(v + 1) - elements_of(v)); }
  bool is_walked(const Vertex& v) const { return v.cells <= walked_ || v.elements <= walked_; }

  void enter_edges(const SmMatrix& m, bool repeated);
  void own_edges();
  void find_hubs();
  std::uint64_t hub_bit(Index v) const;
  void next_stamp() {
    if (++stamp_ == kGone) restart_stamps();
  }
  void restart_stamps();
  Index take_minimum();
  Index count_degree(Index v, Index enough);
  void number(Index v) {
    vertex(v).mark = kGone;
    perm_[ordered_++] = static_cast<i64>(v);
  }
  Index* form_element(Index pivot, Index& size);
  void absorb(Element& e) {
    arena_[e.begin - 1] = n_ + e.size;
    e.size = 0;
  }
  void reserve(Index more);
  void cover_edges(const Index* boundary, Index size);
  Element purge(Index pivot, Index* boundary, Index size);
  template <class Visit>
  void walk_elements(Index v, Visit&& visit);
  void set_contained_apart(Index v, Index kept);
  Index single_element(Index v);
  void make_room(Index v);
  void push_element(Index v, Index e);
  void update_degrees(const Index* boundary, const Element& made, Index eliminated);
  void update_degree(Index v, const Element& made);

  struct Stack {
    Index* items;
    Index count;
    void push(Index v) { items[count++] = v; }
  };
  void finish(Index all);
  void absorb_elements(Index pivot, Index all, Stack& gone, Stack& single);
  void sort_singles(Stack& singles, const Stack& fresh, i64& place);
  Index other_element(Index v, Index all) const;

  Index n_;
  Index edges_;
  Node* graph_;
  Index* head_;
  Places* places_;
  Index* neighbours_;  // in the order of entry, the latest first
  Index* own_;         // neighbours of higher degree
  Index* elements_;
  Index* arena_;  // boundaries, each behind the number of its element, or n + its length when that is absorbed
  Index arena_size_;
  Index top_ = 0;
  i64* perm_;
  i64* inv_perm_;  // until the end: of a vertex its time in the degree lists, of an element the hubs on its boundary
  DegreeLists<Index, Node> lists_;
  Index ordered_ = 0;
  Index stamp_ = kGone - 1000;  // so that no ordering of some size goes without the restart
  Index marked_ = kGone;        // the element whose whole boundary bears the mark marked_stamp_
  Index marked_stamp_ = 0;
  Index hub_degree_ = 0;
  Index hub_count_ = 0;
  Index hubs_[kHubs];
  // While an element is formed:
  Index walked_ = 0;  // the longest list that is walked
  std::uint64_t its_hubs_ = 0;
  std::uint64_t passed_hubs_ = 0;  // of them, those whose elements are not walked
  Index passed_others_ = 0;        // vertices of the boundary whose elements are not walked, but for these
};

template <class Index>
std::uint64_t OrderingGraph<Index>::bytes(i64 vertices, i64 edges) {
  const auto n = static_cast<std::uint64_t>(vertices);
  const auto e = static_cast<std::uint64_t>(edges);
  return sizeof(Index) * (8 * n + (n + 1) + 4 * (n + 1) + 2 * e + e + (3 * e + n) + (3 * e + 2 * n));
}

template <class Index>
OrderingGraph<Index>::OrderingGraph(i64 vertices, i64 edges, void* memory, i64* perm, i64* inv_perm)
    : n_(static_cast<Index>(vertices)),
      edges_(static_cast<Index>(edges)),
      graph_(static_cast<Node*>(memory)),
      head_(reinterpret_cast<Index*>(graph_ + n_)),
      places_(reinterpret_cast<Places*>(head_ + n_ + 1)),
      neighbours_(reinterpret_cast<Index*>(places_ + n_ + 1)),
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
    places_[v] = {start, 0, 0, 0};
    const Index degree = static_cast<Index>(perm_[v]);
    start += degree;
    // While the edges are entered, mark is the row that met v last and cells where its next neighbour goes.
    vertex(v) = {kGone, degree, 0, start, 0, 0, lists_.kOutside, 0};
  }
  places_[n_] = {start, 0, 0, 0};
  enter_edges(m, repeated);
  own_edges();
  find_hubs();
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
    Places& place = places_[v];
    place.own_start = end;
    const Index degree = vertex(v).vertices;
    for (Index k = place.start; k < places_[v + 1].start; ++k) {
      const Index w = neighbours_[k];
      const Index other = vertex(w).vertices;
      if (other > degree || (other == degree && w > v)) own_[end++] = w;
    }
    place.owned = end - place.own_start;
  }
}

// At most 64 vertices of the highest degrees, one bit each: which of them an element has on its boundary is kept.
template <class Index>
void OrderingGraph<Index>::find_hubs() {
  for (hub_degree_ = kWalked;; hub_degree_ *= 2) {
    hub_count_ = 0;
    for (Index v = 0; v < n_ && hub_count_ <= kHubs; ++v) {
      if (vertex(v).vertices <= hub_degree_) continue;
      if (hub_count_ < kHubs) hubs_[hub_count_] = v;
      ++hub_count_;
    }
    if (hub_count_ <= kHubs) return;
  }
}

template <class Index>
std::uint64_t OrderingGraph<Index>::hub_bit(Index v) const {
  if (places_[v + 1].start - places_[v].start <= hub_degree_) return 0;
  return std::uint64_t{1} << (std::lower_bound(hubs_, hubs_ + hub_count_, v) - hubs_);
}

}  // namespace sm

#include "cholesky/ordering_elimination.hpp"
#include "cholesky/ordering_finish.hpp"
