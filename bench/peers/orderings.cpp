#include "bench/peers/orderings.hpp"

#include <amd.h>
#include <metis.h>

#include <stdexcept>

namespace sm::bench {
namespace {

static_assert(sizeof(idx_t) == sizeof(int), "METIS with 32-bit indices");

std::size_t at(int i) { return static_cast<std::size_t>(i); }

}  // namespace

void order_by_amd(const UpperRows& rows, std::vector<int>& order) {
  order.resize(at(rows.n));
  const int status = amd_order(rows.n, rows.start.data(), rows.col.data(), order.data(), nullptr, nullptr);
  if (status != AMD_OK) throw std::runtime_error("AMD failed");
}

Graph::Graph(const UpperRows& rows) : start(at(rows.n) + 1) {
  const auto each = [&](auto&& edge) {
    for (int i = 0; i < rows.n; ++i) {
      for (int p = rows.start[at(i)]; p < rows.start[at(i) + 1]; ++p) {
        if (rows.col[at(p)] == i) continue;
        edge(i, rows.col[at(p)]);
        edge(rows.col[at(p)], i);
      }
    }
  };
  each([&](int i, int) { ++start[at(i) + 1]; });
  for (std::size_t i = 1; i < start.size(); ++i) start[i] += start[i - 1];
  neighbour.resize(at(start.back()));
  std::vector<int> next(start.begin(), start.end() - 1);
  each([&](int i, int j) { neighbour[at(next[at(i)]++)] = j; });
}

void order_by_metis(Graph& graph, std::vector<int>& order) {
  int n = static_cast<int>(graph.start.size()) - 1;
  order.resize(at(n));
  std::vector<int> place(at(n));
  const int status =
      METIS_NodeND(&n, graph.start.data(), graph.neighbour.data(), nullptr, nullptr, order.data(), place.data());
  if (status != METIS_OK) throw std::runtime_error("METIS failed");
}

std::string permutation_fault(const std::vector<int>& order, int n) {
  if (order.size() != at(n)) return "the order has another length";
  std::vector<bool> seen(at(n));
  for (const int i : order) {
    if (i < 0 || i >= n || seen[at(i)]) return "the order is not a permutation";
    seen[at(i)] = true;
  }
  return "";
}

}  // namespace sm::bench
