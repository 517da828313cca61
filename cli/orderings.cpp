// The only file that meets the two libraries.
//   AMD: P. Amestoy, T. Davis, I. Duff, "An approximate minimum degree ordering algorithm", SIMAX 17 (1996) 886-905.
//   METIS: G. Karypis, V. Kumar, "A fast and high quality multilevel scheme for partitioning irregular graphs", SISC 20
//   (1998) 359-392.
#include "cli/orderings.hpp"

#include <amd.h>
#include <fmt/core.h>
#include <metis.h>

#include <algorithm>
#include <array>
#include <limits>
#include <numeric>
#include <type_traits>

#include "cli/error.hpp"
#include "cli/sparse.hpp"

namespace sm::cli {
namespace {

static_assert(std::is_same_v<SuiteSparse_long, std::int64_t>, "AMD reads the rows of the module as they are");

struct Naming {
  Ordering ordering;
  const char* name;
  const char* text;
};
constexpr std::array kNamings{Naming{Ordering::md, "md", "md, the module's minimum degree"},
                              Naming{Ordering::amd, "amd", "amd, approximate minimum degree"},
                              Naming{Ordering::metis, "metis", "metis, nested dissection"},
                              Naming{Ordering::natural, "natural", "natural, as in the file"}};

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

const Naming& naming_of(Ordering ordering) {
  return *std::find_if(kNamings.begin(), kNamings.end(), [&](const Naming& n) { return n.ordering == ordering; });
}

[[noreturn]] void refuse_memory(const char* library) {
  throw CommandError({.code = ExitCode::no_memory,
                      .what = fmt::format("out of memory while ordering the matrix with {}", library),
                      .advice = "use --ordering md, or a machine with more memory"});
}

[[noreturn]] void refuse_status(const char* library, std::int64_t status) {
  throw CommandError({.code = ExitCode::no_memory,
                      .what = fmt::format("{} ended with the unexpected status {}", library, status),
                      .advice = "use --ordering md, and please report this, with the matrix"});
}

std::int64_t count_neighbours(const UpperPattern& upper) {
  std::int64_t count = 0;
  for (std::int64_t i = 0; i < upper.n; ++i) {
    for (std::int64_t p = upper.start[i]; p < upper.start[i + 1]; ++p) count += upper.col[p] == i ? 0 : 2;
  }
  return count;
}

std::vector<std::int64_t> order_naturally(std::int64_t n) {
  std::vector<std::int64_t> perm(at(n));
  std::iota(perm.begin(), perm.end(), 0);
  return perm;
}

std::vector<std::int64_t> order_by_amd(const UpperPattern& upper, std::uint64_t limit) {
  // As its manual counts: a copy of the graph with a fifth to spare, and nine words a row.
  const double words = 1.2 * static_cast<double>(count_neighbours(upper)) + 10.0 * static_cast<double>(upper.n);
  require_memory(8.0 * words, limit, "the graph for AMD and its work");
  std::vector<std::int64_t> perm(at(upper.n));
  const std::int64_t status = amd_l_order(upper.n, upper.start, upper.col, perm.data(), nullptr, nullptr);
  if (status == AMD_OUT_OF_MEMORY) refuse_memory("AMD");
  if (status != AMD_OK) refuse_status("AMD", status);
  return perm;
}

// The graph as METIS wants it: the neighbours of each vertex, itself left out.
struct Graph {
  std::vector<idx_t> start;
  std::vector<idx_t> neighbour;
};

Graph graph_of(const UpperPattern& upper, std::int64_t neighbours) {
  Graph graph{.start = std::vector<idx_t>(at(upper.n) + 1), .neighbour = std::vector<idx_t>(at(neighbours))};
  const auto for_each_edge = [&](auto visit) {
    for (std::int64_t i = 0; i < upper.n; ++i) {
      for (std::int64_t p = upper.start[i]; p < upper.start[i + 1]; ++p) {
        if (upper.col[p] != i) visit(i, upper.col[p]);
      }
    }
  };
  for_each_edge([&](std::int64_t i, std::int64_t j) {
    ++graph.start[at(i) + 1];
    ++graph.start[at(j) + 1];
  });
  std::partial_sum(graph.start.begin(), graph.start.end(), graph.start.begin());
  std::vector<idx_t> next(graph.start.begin(), graph.start.end() - 1);
  for_each_edge([&](std::int64_t i, std::int64_t j) {
    graph.neighbour[at(next[at(i)]++)] = static_cast<idx_t>(j);
    graph.neighbour[at(next[at(j)]++)] = static_cast<idx_t>(i);
  });
  return graph;
}

std::vector<std::int64_t> order_by_metis(const UpperPattern& upper, std::uint64_t limit) {
  const std::int64_t neighbours = count_neighbours(upper);
  // METIS is not made for graphs without an edge, where every order is as good.
  if (neighbours == 0) return order_naturally(upper.n);
  if (const std::string why = metis_refusal(upper.n, neighbours); !why.empty()) {
    throw CommandError({.what = why, .advice = "use --ordering amd or --ordering md"});
  }
  // The graph and the order; beside them METIS was measured to take five words a neighbour and as many a row on grids.
  const double words = 9.0 * static_cast<double>(upper.n) + 6.0 * static_cast<double>(neighbours);
  require_memory(static_cast<double>(sizeof(idx_t)) * words, limit, "the graph for METIS and its work");
  Graph graph = graph_of(upper, neighbours);
  auto n = static_cast<idx_t>(upper.n);
  std::vector<idx_t> perm(at(upper.n));
  std::vector<idx_t> place(at(upper.n));
  const int status =
      METIS_NodeND(&n, graph.start.data(), graph.neighbour.data(), nullptr, nullptr, perm.data(), place.data());
  if (status == METIS_ERROR_MEMORY) refuse_memory("METIS");
  if (status != METIS_OK) refuse_status("METIS", status);
  return {perm.begin(), perm.end()};
}

}  // namespace

std::vector<std::string> ordering_names() {
  std::vector<std::string> names;
  names.reserve(kNamings.size());
  for (const Naming& naming : kNamings) names.emplace_back(naming.name);
  return names;
}

Ordering ordering_named(const std::string& name) {
  return std::find_if(kNamings.begin(), kNamings.end(), [&](const Naming& n) { return n.name == name; })->ordering;
}

const char* ordering_name(Ordering ordering) { return naming_of(ordering).name; }
const char* ordering_text(Ordering ordering) { return naming_of(ordering).text; }

std::string metis_refusal(std::int64_t rows, std::int64_t neighbours) {
  constexpr std::int64_t kLargest = std::numeric_limits<idx_t>::max() - 1;
  if (rows <= kLargest && neighbours <= kLargest) return {};
  return fmt::format("METIS counts with {} bits, which {} rows with {} neighbours do not fit", 8 * sizeof(idx_t), rows,
                     neighbours);
}

std::vector<std::int64_t> find_order(Ordering ordering, const UpperPattern& upper, std::uint64_t limit) {
  if (upper.n < 2) return order_naturally(upper.n);
  if (ordering == Ordering::amd) return order_by_amd(upper, limit);
  if (ordering == Ordering::metis) return order_by_metis(upper, limit);
  return order_naturally(upper.n);
}

}  // namespace sm::cli
