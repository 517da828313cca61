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
// - An uneliminated neighbour is covered exactly if an element of the pivot leads to it; elements come first, so its
//   mark tells. Covered neighbours are dropped when both ends of the edge lie in a new boundary, where each end looks
//   through what it has left; but a long vertex (more than 32 neighbours) never looks: its short neighbours count for
//   it, and an edge between two long ones is looked for from its end of lower degree (an orientation that leaves any
//   vertex few edges of its own: Chiba and Nishizeki, "Arboricity and subgraph listing algorithms", SIAM J. Comput. 14
//   (1985) 210-223).
// - The hubs, up to 64 vertices of the highest degrees, are on no list: each vertex and each element has a bit for each
//   of them. Where the rows of the matrix ascend, lists descend, which says where among the others a hub belongs.
// - Absorbed elements stay on the lists, marked, until a list is walked for another reason or full. How many elements
//   of a vertex are left is counted while their boundaries are read, for the last time, into the new one.
// - The two counts tell what the plain road reads off a list: a vertex without any is interior, one with a single
//   element and nothing else is a prototype or a duplicate. So the list of a vertex in very many elements need not be
//   walked at all. Other lists are, to count for each of their elements how much of its boundary is outside the new one
//   (Amestoy, Davis, Duff, "An approximate minimum degree ordering algorithm", SIAM J. Matrix Anal. Appl. 17 (1996)
//   886-905). Every element knows which hubs are on its boundary, so that those passed over are counted all the same.
//   With k other vertices passed over the number may be too large by k.
// - An element whose boundary is contained in that of a newer one leads to nothing that the newer one does not lead to
//   before. It still counts as one, but is set apart from the list.
// - Degrees are bounded: from above by the sum of these numbers, from below by their maximum and by the former bound
//   less what has been eliminated since. Where the bounds meet the degree is known. Else the lower one enters the
//   degree lists, with the time when the degree was due, and the count waits until it is the least of all.
// - Late in an elimination degrees are counted by bits (ordering_bits.hpp), as long as there is much to count. Hardly any
//   list is walked then.
// - A vertex that a prototype outmatches has at least its degree and an earlier time, so that it is never taken before
//   the prototype, which touches it: whether it is in the lists makes no difference.
// - Once an element bounds all that is left, only the order of its boundary matters (ordering_finish.hpp).
//
// Everything is in one block, as small as can be, as what a visit costs is the lines of the cache that it brings in:
// - a node for each vertex (and the element that it becomes);
// - slots for its neighbours. Elements and vertices never take more than the slots of the edges that they replace, so a
//   short vertex has its elements at the beginning of the same slots. A long one has 3/2 cells for each neighbour
//   beside them, so that making room by dropping the absorbed ones is paid by what came before;
// - an arena for the boundaries, which fill at most one number an edge for the same reason, with their headers two;
//   three, and two a vertex for the boundary that is being made, keep the packing of the arena rare.
#pragma once

#include <algorithm>
#include <bit>
#include <cstddef>
#include <span>
#include <utility>

#include "cholesky/degree_lists.hpp"
#include "cholesky/ordering.hpp"
#include "cholesky/ordering_bits.hpp"
#include "frame/core.hpp"

namespace sm {

template <class Index>
struct GraphVertex {
  Index vertices;                // neighbours that no element covers
  Index elements;                // elements that it lies in, but for absorbed ones
  Index cells;                   // of its list of elements
  Index list;                    // where that list starts
  Index child, sibling, before;  // degree lists
  Index degree;                  // 1 + neighbours, or less while only a bound is known
};

template <class Index>
struct GraphElement {
  Index size;          // vertices on the boundary; 0: absorbed
  Index live;          // the same; 0 also when it is contained in a newer one
  Index begin;         // of the boundary, in the arena
  Index outside;       // boundary vertices that are not on that of the element `met` (more if hubs were passed over)
  Index met;           // stamp of the elimination that counts `outside`
  Index claimed;       // stamp of the elimination in which a prototype claimed it
  std::uint64_t hubs;  // bits of the hubs on the boundary
};

template <class Index>
union GraphNode {
  GraphVertex<Index> vertex;
  GraphElement<Index> element;
};

// What comes in the slots before the cells of a vertex; a short one has but the last three.
template <class Index>
struct GraphLists {
  Index start;   // of the neighbours of a long vertex; of a hub its number
  Index own;     // where the edges that a long vertex owns start
  Index owned;   // how many of them are left
  Index room;    // cells
  Index tail;    // cells at the end that are taken: before the neighbours the elements that are contained in newer ones
  Index listed;  // neighbours at the end, in their order: of a short vertex those that no element covers, but for hubs
};

template <class Index>
class OrderingGraph {
 public:
  // Bytes of memory that are enough, or with so many more numbers an edge for the boundaries.
  static std::uint64_t bytes(i64 vertices, const EdgeCount& count, i64 slack = 0);

  // perm holds the number of neighbours of every row, inv_perm is work memory. Both blocks start at a multiple of 8;
  // the spare one may be of any size.
  OrderingGraph(i64 vertices, const EdgeCount& count, std::span<std::byte> memory, std::span<std::byte> spare,
                i64* perm, i64* inv_perm);

  void enter(const SmMatrix& m);
  void eliminate_all();

 private:
  using Node = GraphNode<Index>;
  using Vertex = GraphVertex<Index>;
  using Element = GraphElement<Index>;
  using Lists = GraphLists<Index>;
  static constexpr Index kShortHead = 3;
  static constexpr Index kLongHead = 6;
  static constexpr Index kGone = static_cast<Index>(-1);
  // Longer lists of elements are not walked at each elimination beside them, unless the boundary is eight times as
  // long; nor, where counting goes by bits, longer ones than the second.
  static constexpr Index kWalked = 32;
  static constexpr Index kWalkedBesideBits = 8;
  static constexpr Index kHubs = 64;

  Vertex& vertex(Index v) const { return graph_[v].vertex; }
  Element& element(Index e) const { return graph_[e].element; }
  Index* elements_of(const Vertex& v) const { return slots_ + v.list; }
  Lists& lists_of(const Vertex& v) const { return reinterpret_cast<Lists*>(slots_ + v.list)[-1]; }
  bool is_walked(const Vertex& v) const { return v.cells <= walked_ || v.elements <= walked_; }
  bool is_long(const Vertex& v) const { return v.list > long_lists_; }
  bool is_hub(const Vertex& v) const { return v.list > hub_lists_; }
  std::uint64_t hub_bit(Index v) const { return is_hub(vertex(v)) ? std::uint64_t{1} << lists_of(vertex(v)).start : 0; }

  void find_hubs();
  static i64 slots(i64 vertices, const EdgeCount& count);
  Index lay_out();
  void close_list(Index v);
  void enter_row(const SmMatrix& m, Index i);
  void enter_hub(const SmMatrix& m, Index i);
  void join_hubs();
  void enter_untidy(const SmMatrix& m);
  void own_edges(Index end);
  void next_stamp() {
    if (++stamp_ == kGone) restart_stamps();
  }
  void restart_stamps();
  Index take_minimum();
  void fetch_next(Index degree) const;
  Index count_degree(Index v, Index enough);
  Index count_by_bits(Index v);
  bool bits_due(Index boundary);
  void use_bits();
  void number(Index v) {
    mark_[v] = kGone;
    perm_[ordered_++] = static_cast<i64>(v);
  }
  Index* form_element(Index pivot, Index& size);
  Index* add_elements(const Vertex& pivot, Index* end);
  Index* add_neighbours(Index pivot, Index* end);
  Index* add_hub_neighbours(Index pivot, Index* end);
  void absorb(Element& e) {
    arena_[e.begin - 1] = n_ + e.size;
    e.size = e.live = 0;
  }
  void reserve(Index more);
  void find_passed(const Index* boundary, Index size);
  void cover_edges(const Index* boundary, Index size);
  void cover_own(Vertex& v);
  void cover_list(Vertex& v);
  void cover_hubs(std::uint64_t bits, Index times);
  Element purge(Index pivot, Index* boundary, Index size);
  template <class Visit>
  void walk_elements(Vertex& v, Visit&& visit);
  void set_contained_apart(Vertex& v);
  Index single_element(Vertex& v);
  void make_room(Vertex& v);
  void push_element(Vertex& v, Index e);
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
  Index other_element(const Vertex& v, Index all) const;

  Index n_;
  EdgeCount count_;
  Node* graph_;             // one more than vertices, for the degree lists
  i64* time_;               // when the degree of a vertex was due
  std::uint64_t* hubs_of_;  // bits of the neighbours that are hubs; null without any
  Index* slots_;            // of every vertex its neighbours, the latest first, and its elements; then owned edges
  Index* arena_;  // boundaries, each behind the number of its element, or n + its length when that is absorbed
  Index arena_size_;
  Index top_ = 0;
  i64* perm_;
  // In the memory of the answer inv_perm, until the end:
  Index* mark_;  // of a vertex the stamp of the last visit; kGone once eliminated
  Index* head_;  // of the degree lists; of a wide index elsewhere
  DegreeLists<Index, Node> lists_;
  BoundaryBits<Index> bits_;
  Index half_left_;  // vertices left when it is asked whether bits still pay
  i64 visits_due_;   // vertices that are to be seen in counting before bits are thought of
  i64 visits_ = 0;   // those that were, since then
  Index ordered_ = 0;
  Index stamp_ = kGone - 1000;  // so that no ordering of some size goes without the restart
  Index marked_ = kGone;        // the element whose whole boundary bears the mark marked_stamp_
  Index marked_stamp_ = 0;
  Index long_lists_ = 0;     // where the slots of long vertices start: their lists are further on
  Index hub_lists_ = kGone;  // and of hubs
  Index hub_count_ = 0;
  Index hubs_[kHubs];  // ascending
  // While an element is formed:
  Index walked_ = 0;  // the longest list that is walked
  std::uint64_t its_hubs_ = 0;
  std::uint64_t passed_hubs_ = 0;  // of them, those whose elements are not walked
  Index prototypes_ = 0;
  Index passed_others_ = 0;  // vertices of the boundary whose elements are not walked, but for these
};

}  // namespace sm

#include "cholesky/ordering_degrees.hpp"
#include "cholesky/ordering_elimination.hpp"
#include "cholesky/ordering_entry.hpp"
#include "cholesky/ordering_finish.hpp"
