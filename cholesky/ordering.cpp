// Minimum-degree ordering of a closed symmetric sparse matrix.
//
// Method: Eisenstat, Gursky, Schultz, Sherman, "Yale Sparse Matrix Package I: the symmetric codes", Int. J. Numer.
// Methods Eng. 18 (1982) 1145-1151: the quotient graph in linear storage, elements in place of the vertices they
// eliminate, mass elimination of vertices that an element swallows, indistinguishable vertices merged behind one
// prototype, degrees updated by inclusion and exclusion.
//
// Everything is numbered from 1, so that 0 ends a list and signs carry meaning:
//   v, l      items: item s names v[s] (a neighbouring vertex, or an element) and is followed by item l[s]. Slots 1..n
//             are the list heads of the vertices, so that v[1..n] is free and serves as mark.
//   next[i]   >= 0: i is not eliminated, and next in its degree list; < 0: minus its place in the order
//   last[i]   not eliminated: before it in its degree list, or minus the degree when it is first, or 0 when it is in
//             none; during an elimination minus the element (degree wanted), 0 (merged) or the element that a
//             prototype shares with its duplicates. Eliminated: the size of the element's boundary.
//   mark[i]   vertex: the tag of the last visit. Element: its tag, or minus the number of vertices merged behind a
//             prototype while degrees are pending.
#include <algorithm>

#include "cholesky/ordering_steps.hpp"
#include "cholesky/steps.hpp"
#include "store/checks.hpp"

namespace sm {

namespace {

struct FromOne {
  i64* p;
  i64& operator[](i64 i) const { return p[i - 1]; }
};

class MinimumDegree {
 public:
  MinimumDegree(const SmMatrix& m, i64* work, i64 half, i64* last, i64* next)
      : n_(m.rows), half_(half), m_(m), v_{work}, l_{work + half}, head_{work + 2 * half}, last_{last}, next_{next} {}

  // False when the items do not fit.
  bool enter_graph();
  void eliminate_all();
  void number_from_zero();

 private:
  void enter_edge(i64 i, i64 j);
  void fill_degree_lists();
  void insert_in_degree_list(i64 vertex, i64 degree);
  void remove_from_degree_list(i64 vertex);
  i64 take_minimum();
  i64 form_element(i64 element);
  void purge(i64 element, i64 tail);
  i64 purge_list(i64 vertex, i64 tag);
  bool is_prototype(i64 vertex, i64 element);
  void update_degrees(i64 element);
  i64 degree_of(i64 vertex, i64 element, i64 tag);

  // v[1..n] under the name of its use.
  i64& mark(i64 i) const { return v_[i]; }

  i64 n_;
  i64 half_;
  const SmMatrix& m_;
  FromOne v_, l_, head_, last_, next_;
  i64 free_slot_ = 0;
  i64 tag_ = 0;
  i64 ordered_ = 0;
  i64 least_ = 1;
};

bool MinimumDegree::enter_graph() {
  if (half_ < n_) return false;
  for (i64 i = 1; i <= n_; ++i) mark(i) = 1, l_[i] = 0, head_[i] = 0, next_[i] = 0;
  free_slot_ = n_ + 1;
  for (i64 i = 1; i <= n_; ++i) {
    for (i64 p = m_.row_start[i - 1]; p < m_.row_start[i]; ++p) {
      const i64 j = m_.col_index[p] + 1;
      if (j <= i || next_[j] == i) continue;  // next remembers the row that met j last: an edge counts once
      if (free_slot_ >= half_) return false;  // the second item of the edge may take the last slot, half
      next_[j] = i;
      enter_edge(i, j);
      enter_edge(j, i);
    }
  }
  fill_degree_lists();
  return true;
}

void MinimumDegree::enter_edge(i64 i, i64 j) {
  ++mark(i);
  v_[free_slot_] = j;
  l_[free_slot_] = l_[i];
  l_[i] = free_slot_++;
}

void MinimumDegree::fill_degree_lists() {
  for (i64 i = 1; i <= n_; ++i) {
    insert_in_degree_list(i, mark(i));
    mark(i) = 0;
  }
}

void MinimumDegree::insert_in_degree_list(i64 vertex, i64 degree) {
  next_[vertex] = head_[degree];
  head_[degree] = vertex;
  last_[vertex] = -degree;
  if (next_[vertex] > 0) last_[next_[vertex]] = vertex;
}

void MinimumDegree::remove_from_degree_list(i64 vertex) {
  const i64 before = last_[vertex];
  if (before == 0) return;
  if (before > 0) {
    next_[before] = next_[vertex];
  } else {
    head_[-before] = next_[vertex];
  }
  if (next_[vertex] > 0) last_[next_[vertex]] = before;
}

// Ties go to the vertex that entered its list last. The vertex becomes the element of the same number.
i64 MinimumDegree::take_minimum() {
  while (head_[least_] <= 0) ++least_;
  const i64 vertex = head_[least_];
  remove_from_degree_list(vertex);
  next_[vertex] = -++ordered_;
  last_[vertex] = least_ - 1;
  tag_ += last_[vertex];
  mark(vertex) = tag_;
  return vertex;
}

// Chains the uneliminated neighbours of the element, its own and those of the elements it absorbs, behind it; their
// items are reused. Returns the last item.
i64 MinimumDegree::form_element(i64 element) {
  i64 tail = element;
  const auto append = [&](i64 item) {
    mark(v_[item]) = tag_;
    l_[tail] = item;
    tail = item;
  };
  for (i64 rest = l_[element]; rest;) {
    const i64 item = rest;
    rest = l_[item];
    const i64 other = v_[item];
    if (next_[other] >= 0) {
      append(item);
      continue;
    }
    i64 boundary = l_[other];
    for (i64 left = last_[other]; left > 0; --left) {
      const i64 b = boundary;
      boundary = l_[b];
      if (mark(v_[b]) < tag_) append(b);
    }
    mark(other) = tag_;  // absorbed
  }
  l_[tail] = 0;
  return tail;
}

// Removes from a boundary vertex's list what the new element covers: absorbed elements, and vertices of the boundary.
// Returns the last slot freed; there is one, since something on the list led to the element.
i64 MinimumDegree::purge_list(i64 vertex, i64 tag) {
  i64 freed = 0;
  for (i64 item = vertex; l_[item];) {
    const i64 following = l_[item];
    if (mark(v_[following]) < tag) {
      item = following;
    } else {
      freed = following;
      l_[item] = l_[following];
    }
  }
  return freed;
}

// Settles last of a boundary vertex whose list is not empty, and answers whether it is a prototype. A vertex whose one
// remaining item is an element has the same neighbours as every other one that is left with the same element.
bool MinimumDegree::is_prototype(i64 vertex, i64 element) {
  const i64 item = l_[vertex];
  const i64 shared = v_[item];
  if (l_[item] || next_[shared] >= 0) {
    last_[vertex] = -element;
    return false;
  }
  if (mark(shared) < 0) {
    last_[vertex] = 0;
    --mark(shared);
    return false;
  }
  last_[vertex] = shared;
  mark(shared) = -1;
  return true;
}

void MinimumDegree::purge(i64 element, i64 tail) {
  const i64 tag = mark(element);
  i64 before = element;
  for (i64 left = last_[element]; left > 0; --left) {
    const i64 item = l_[before];
    const i64 vertex = v_[item];
    remove_from_degree_list(vertex);
    const i64 freed = purge_list(vertex, tag);
    if (!l_[vertex]) {  // interior: nothing but this element touches it
      l_[before] = l_[item];
      next_[vertex] = -++ordered_;
      --last_[element];
      continue;
    }
    if (is_prototype(vertex, element)) {  // to the end: its degree wants the count of its duplicates
      l_[tail] = item;
      tail = item;
      l_[before] = l_[item];
    } else {
      before = item;
    }
    v_[freed] = element;
    l_[freed] = l_[vertex];
    l_[vertex] = freed;
  }
  l_[tail] = 0;
}

// 1 + the number of neighbours of an ordinary boundary vertex; 0 when a prototype's neighbours are among its own, so
// that it cannot come first and needs no degree yet.
i64 MinimumDegree::degree_of(i64 vertex, i64 element, i64 tag) {
  i64 degree = last_[element];
  for (i64 item = l_[l_[vertex]]; item; item = l_[item]) {
    const i64 other = v_[item];
    if (next_[other] >= 0) {
      mark(other) = tag;
      ++degree;
    } else if (mark(other) < 0) {
      for (; item; item = l_[item]) {
        if (mark(v_[item]) < 0) --mark(v_[item]);
      }
      return 0;
    } else {
      i64 b = other;
      for (i64 left = last_[other]; left > 0; --left) {
        b = l_[b];
        if (mark(v_[b]) >= tag) continue;
        mark(v_[b]) = tag;
        ++degree;
      }
    }
  }
  return degree;
}

// The tags used here lie between that of the element before its boundary was counted and its own: no other use has
// them.
void MinimumDegree::update_degrees(i64 element) {
  i64 tag = mark(element) - last_[element];
  i64 item = element;
  for (i64 left = last_[element]; left > 0; --left) {
    item = l_[item];
    const i64 vertex = v_[item];
    if (last_[vertex] == 0) continue;
    i64 degree = 0;
    if (last_[vertex] < 0) {
      degree = degree_of(vertex, element, ++tag);
      if (degree == 0) {
        last_[vertex] = 0;
        continue;
      }
    } else {
      const i64 shared = last_[vertex];
      degree = last_[element] + last_[shared] + mark(shared);
      mark(shared) = 0;
    }
    insert_in_degree_list(vertex, degree);
    least_ = std::min(least_, degree);
  }
}

void MinimumDegree::eliminate_all() {
  while (ordered_ < n_) {
    const i64 element = take_minimum();
    const i64 tail = form_element(element);
    purge(element, tail);
    update_degrees(element);
  }
}

void MinimumDegree::number_from_zero() {
  for (i64 i = 1; i <= n_; ++i) {
    const i64 place = -next_[i];
    last_[place] = i - 1;
    next_[i] = place - 1;
  }
}

SmStatus order_in_workspace(SmMatrix& m, i64* perm, i64* inv_perm) {
  for (;;) {
    SM_TRY(grow_workspace(m));
    const i64 half = (m.factor_block * m.work_capacity - m.rows) / 2;
    MinimumDegree graph(m, m.work, half, perm, inv_perm);
    if (!graph.enter_graph()) continue;
    graph.eliminate_all();
    graph.number_from_zero();
    return SM_OK;
  }
}

}  // namespace

SmStatus order(SmMatrix& m) {
  SM_PASS(may_order(m));
  SM_TRY(need_pool(m));
  Scratch<i64> perm;
  Scratch<i64> inv_perm;
  if (!m.perm) SM_TRY(perm.take(m.pool, m.rows));
  if (!m.inv_perm) SM_TRY(inv_perm.take(m.pool, m.rows));
  SM_TRY(order_in_workspace(m, m.perm ? m.perm : perm.data(), m.inv_perm ? m.inv_perm : inv_perm.data()));
  if (!m.perm) m.perm = perm.release();
  if (!m.inv_perm) m.inv_perm = inv_perm.release();
  m.state = SM_STATE_ORDERED;
  return SM_OK;
}

}  // namespace sm
