// Method: minimum degree with elements, mass elimination and indistinguishable vertices, as in Eisenstat, Gursky,
// Schultz, Sherman, "Yale Sparse Matrix Package I: the symmetric codes", IJNME 18 (1982) 1145-1151.
#include "cholesky/ordering_reference.hpp"

#include <gtest/gtest.h>

#include <algorithm>
#include <list>
#include <map>
#include <set>
#include <utility>

namespace sm::test {

namespace {

using Vertex = std::int64_t;

class MinimumDegree {
 public:
  explicit MinimumDegree(const Graph& graph);
  std::vector<Vertex> run();

 private:
  enum class Role { ordinary, skipped, prototype };
  struct Item {
    bool element;
    Vertex id;
  };

  void enter(Vertex i, Vertex j);
  void drop_from_degree_list(Vertex v);
  void insert_by_degree(Vertex v, std::int64_t degree);
  Vertex take_minimum();
  std::list<Vertex> form_element(Vertex vk);
  void purge(Vertex vk, std::list<Vertex>& boundary);
  void update_degrees(Vertex ek);
  // The degree of an ordinary vertex, or -1 when it is outmatched.
  std::int64_t ordinary_degree(Vertex v, Vertex ek);

  std::int64_t n_;
  std::vector<std::list<Item>> items_;       // of each vertex, most recent first
  std::vector<std::list<Vertex>> boundary_;  // of each element
  std::vector<bool> absorbed_;               // elements that are part of a later one
  std::vector<Role> role_;
  std::vector<Vertex> prototype_of_;        // the one element that a prototype lies in
  std::map<Vertex, std::int64_t> claimed_;  // such an element: vertices of the new element that lie in it, found so far
  std::map<std::int64_t, std::list<Vertex>> by_degree_;
  std::vector<std::int64_t> degree_;  // 0: in no list
  std::vector<Vertex> order_;
};

MinimumDegree::MinimumDegree(const Graph& graph)
    : n_(graph.n),
      items_(static_cast<std::size_t>(n_)),
      boundary_(static_cast<std::size_t>(n_)),
      absorbed_(static_cast<std::size_t>(n_), false),
      role_(static_cast<std::size_t>(n_), Role::skipped),
      prototype_of_(static_cast<std::size_t>(n_), -1),
      degree_(static_cast<std::size_t>(n_), 0) {
  for (const auto& [i, j] : graph.edges) enter(i, j);
  for (Vertex v = 0; v < n_; ++v)
    insert_by_degree(v, 1 + static_cast<std::int64_t>(items_[static_cast<std::size_t>(v)].size()));
}

void MinimumDegree::enter(Vertex i, Vertex j) {
  auto& mine = items_[static_cast<std::size_t>(i)];
  if (std::any_of(mine.begin(), mine.end(), [j](const Item& item) { return item.id == j; })) return;
  mine.push_front({false, j});
  items_[static_cast<std::size_t>(j)].push_front({false, i});
}

void MinimumDegree::insert_by_degree(Vertex v, std::int64_t degree) {
  by_degree_[degree].push_front(v);
  degree_[static_cast<std::size_t>(v)] = degree;
}

void MinimumDegree::drop_from_degree_list(Vertex v) {
  std::int64_t& degree = degree_[static_cast<std::size_t>(v)];
  if (degree == 0) return;
  by_degree_[degree].remove(v);
  if (by_degree_[degree].empty()) by_degree_.erase(degree);
  degree = 0;
}

Vertex MinimumDegree::take_minimum() {
  const Vertex v = by_degree_.begin()->second.front();
  drop_from_degree_list(v);
  return v;
}

std::list<Vertex> MinimumDegree::form_element(Vertex vk) {
  std::list<Vertex> boundary;
  std::set<Vertex> seen{vk};
  for (const Item& item : items_[static_cast<std::size_t>(vk)]) {
    if (!item.element) {
      EXPECT_TRUE(seen.insert(item.id).second) << "a neighbour met twice";
      boundary.push_back(item.id);
      continue;
    }
    for (const Vertex b : boundary_[static_cast<std::size_t>(item.id)])
      if (seen.insert(b).second) boundary.push_back(b);
    absorbed_[static_cast<std::size_t>(item.id)] = true;
  }
  return boundary;
}

void MinimumDegree::purge(Vertex vk, std::list<Vertex>& boundary) {
  const std::set<Vertex> inside(boundary.begin(), boundary.end());
  std::list<Vertex> prototypes;
  for (auto it = boundary.begin(); it != boundary.end();) {
    const Vertex v = *it;
    auto& mine = items_[static_cast<std::size_t>(v)];
    drop_from_degree_list(v);
    mine.remove_if([&](const Item& item) {
      return item.element ? absorbed_[static_cast<std::size_t>(item.id)] : item.id == vk || inside.count(item.id) > 0;
    });
    if (mine.empty()) {
      order_.push_back(v);
      it = boundary.erase(it);
      continue;
    }
    Role& role = role_[static_cast<std::size_t>(v)];
    role = Role::ordinary;
    bool moves = false;
    if (mine.size() == 1 && mine.front().element) {
      const Vertex e = mine.front().id;
      moves = claimed_.find(e) == claimed_.end();
      role = moves ? Role::prototype : Role::skipped;
      prototype_of_[static_cast<std::size_t>(v)] = e;
      ++claimed_[e];
    }
    mine.push_front({true, vk});
    if (moves) prototypes.push_back(v);
    it = moves ? boundary.erase(it) : std::next(it);
  }
  boundary.splice(boundary.end(), prototypes);
}

std::int64_t MinimumDegree::ordinary_degree(Vertex v, Vertex ek) {
  const auto& mine = items_[static_cast<std::size_t>(v)];
  const auto& own = boundary_[static_cast<std::size_t>(ek)];
  std::set<Vertex> reached(own.begin(), own.end());
  bool outmatched = false;
  for (auto it = std::next(mine.begin()); it != mine.end(); ++it) {
    if (it->element && claimed_.count(it->id) > 0) {
      ++claimed_[it->id];
      outmatched = true;
    } else if (!outmatched && it->element) {
      const auto& other = boundary_[static_cast<std::size_t>(it->id)];
      reached.insert(other.begin(), other.end());
    } else if (!outmatched) {
      EXPECT_TRUE(reached.insert(it->id).second) << "a neighbour reached by two ways";
    }
  }
  return outmatched ? -1 : static_cast<std::int64_t>(reached.size());
}

void MinimumDegree::update_degrees(Vertex ek) {
  const auto& boundary = boundary_[static_cast<std::size_t>(ek)];
  const auto size = static_cast<std::int64_t>(boundary.size());
  for (const Vertex v : boundary) {
    const Role role = role_[static_cast<std::size_t>(v)];
    if (role == Role::skipped) continue;
    std::int64_t degree = 0;
    if (role == Role::prototype) {
      const Vertex e = prototype_of_[static_cast<std::size_t>(v)];
      degree = size + static_cast<std::int64_t>(boundary_[static_cast<std::size_t>(e)].size()) - claimed_[e];
      claimed_.erase(e);
    } else {
      degree = ordinary_degree(v, ek);
    }
    if (degree > 0) insert_by_degree(v, degree);
  }
  EXPECT_TRUE(claimed_.empty());
}

std::vector<Vertex> MinimumDegree::run() {
  while (static_cast<std::int64_t>(order_.size()) < n_) {
    const std::int64_t degree = by_degree_.begin()->first;
    const Vertex vk = take_minimum();
    order_.push_back(vk);
    std::list<Vertex> boundary = form_element(vk);
    EXPECT_EQ(static_cast<std::int64_t>(boundary.size()), degree - 1) << "a degree was not exact";
    purge(vk, boundary);
    boundary_[static_cast<std::size_t>(vk)] = std::move(boundary);
    update_degrees(vk);
  }
  return order_;
}

}  // namespace

std::vector<std::int64_t> minimum_degree_reference(const Graph& graph) { return MinimumDegree(graph).run(); }

}  // namespace sm::test
