#include "cli/orderings.hpp"

#include <SuiteSparse_config.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <fstream>
#include <iostream>
#include <limits>
#include <set>

#include "cli/error.hpp"

namespace sm::cli {
namespace {

constexpr std::uint64_t kPlenty = std::uint64_t{1} << 40;
constexpr Ordering kFound[] = {Ordering::amd, Ordering::metis, Ordering::natural};

// The upper triangle of a pattern, the diagonal included.
struct Pattern {
  std::vector<std::int64_t> start{0};
  std::vector<std::int64_t> col;

  explicit Pattern(const std::vector<std::set<std::int64_t>>& rows) {
    for (const auto& row : rows) {
      col.insert(col.end(), row.begin(), row.end());
      start.push_back(static_cast<std::int64_t>(col.size()));
    }
  }
  UpperPattern upper() const {
    return {.n = static_cast<std::int64_t>(start.size()) - 1, .start = start.data(), .col = col.data()};
  }
};

// n rows with their diagonal, and edges between rows of which some have none.
Pattern scattered(std::int64_t n, std::int64_t edges, std::uint64_t seed) {
  std::vector<std::set<std::int64_t>> rows(static_cast<std::size_t>(n));
  for (std::int64_t i = 0; i < n; ++i) rows[static_cast<std::size_t>(i)].insert(i);
  const auto below = [&](std::int64_t limit) {
    seed = seed * 6364136223846793005u + 1442695040888963407u;
    return static_cast<std::int64_t>((seed >> 33) % static_cast<std::uint64_t>(limit));
  };
  for (std::int64_t e = 0; e < edges && n > 0; ++e) {
    const auto [i, j] = std::minmax({below(n), below(n)});
    rows[static_cast<std::size_t>(i)].insert(j);
  }
  return Pattern(rows);
}

// The first row and column full, and the diagonal.
Pattern arrowhead(std::int64_t n) {
  std::vector<std::set<std::int64_t>> rows(static_cast<std::size_t>(n));
  for (std::int64_t i = 0; i < n; ++i) rows[0].insert(i), rows[static_cast<std::size_t>(i)].insert(i);
  return Pattern(rows);
}

bool is_permutation(std::vector<std::int64_t> perm, std::int64_t n) {
  std::sort(perm.begin(), perm.end());
  for (std::size_t k = 0; k < perm.size(); ++k) {
    if (perm[k] != static_cast<std::int64_t>(k)) return false;
  }
  return static_cast<std::int64_t>(perm.size()) == n;
}

TEST(Orderings, place_every_row_once_and_print_nothing) {
  ::testing::internal::CaptureStdout();
  ::testing::internal::CaptureStderr();
  int wrong = 0;
  for (std::int64_t n = 0; n < 260; n += n < 12 ? 1 : 31) {
    for (const std::int64_t edges : {std::int64_t{0}, std::int64_t{1}, n / 4, n, 6 * n, n * n}) {
      for (std::uint64_t seed = 0; seed < 4; ++seed) {
        const Pattern pattern = scattered(n, edges, seed);
        for (const Ordering ordering : kFound) {
          wrong += is_permutation(find_order(ordering, pattern.upper(), kPlenty), n) ? 0 : 1;
        }
      }
    }
  }
  EXPECT_EQ(wrong, 0);
  EXPECT_EQ(::testing::internal::GetCapturedStdout(), "");
  EXPECT_EQ(::testing::internal::GetCapturedStderr(), "");
}

TEST(Orderings, amd_and_metis_keep_the_head_of_an_arrow_for_the_end_and_the_natural_one_does_not) {
  const Pattern arrow = arrowhead(40);
  for (const Ordering ordering : {Ordering::amd, Ordering::metis}) {
    const auto perm = find_order(ordering, arrow.upper(), kPlenty);
    const auto head = std::find(perm.begin(), perm.end(), 0) - perm.begin();
    EXPECT_GE(head, 38) << ordering_name(ordering) << ": at most one arm may come behind it";
  }
  EXPECT_EQ(find_order(Ordering::natural, arrow.upper(), kPlenty).front(), 0);
}

TEST(Orderings, have_a_name_each) {
  EXPECT_EQ(ordering_names(), (std::vector<std::string>{"md", "amd", "metis", "natural"}));
  for (const std::string& name : ordering_names()) {
    EXPECT_EQ(ordering_name(ordering_named(name)), name);
    EXPECT_EQ(std::string(ordering_text(ordering_named(name))).rfind(name + ", ", 0), 0u);
  }
}

TEST(Orderings, metis_is_refused_what_its_indices_do_not_hold) {
  constexpr std::int64_t kMost = std::numeric_limits<std::int32_t>::max() - 1;
  EXPECT_EQ(metis_refusal(kMost, kMost), "");
  EXPECT_EQ(metis_refusal(kMost + 1, 2),
            "METIS counts with 32 bits, which 2147483647 rows with 2 neighbours do not fit");
  EXPECT_NE(metis_refusal(2, kMost + 1), "");
  EXPECT_NE(metis_refusal(std::int64_t{1} << 40, std::int64_t{1} << 41), "");
}

TEST(Orderings, more_memory_than_there_may_be_is_not_asked_for) {
  const Pattern pattern = scattered(100, 300, 1);
  for (const Ordering ordering : {Ordering::amd, Ordering::metis}) {
    try {
      find_order(ordering, pattern.upper(), 1000);
      FAIL() << ordering_name(ordering);
    } catch (const CommandError& error) {
      EXPECT_EQ(error.problem().code, ExitCode::no_memory);
      EXPECT_NE(std::string(error.what()).find("out of memory: the graph for "), std::string::npos) << error.what();
    }
  }
}

TEST(Orderings, an_allocation_that_fails_inside_amd_is_told) {
  const Pattern pattern = scattered(100, 300, 1);
  const auto kept = SuiteSparse_config.malloc_func;
  SuiteSparse_config.malloc_func = [](std::size_t) -> void* { return nullptr; };
  Problem problem;
  try {
    find_order(Ordering::amd, pattern.upper(), kPlenty);
  } catch (const CommandError& error) {
    problem = error.problem();
  }
  SuiteSparse_config.malloc_func = kept;
  EXPECT_EQ(problem.code, ExitCode::no_memory);
  EXPECT_EQ(problem.what, "out of memory while ordering the matrix with AMD");
  EXPECT_NE(problem.advice.find("--ordering md"), std::string::npos);
  EXPECT_TRUE(is_permutation(find_order(Ordering::amd, pattern.upper(), kPlenty), 100)) << "afterwards it works again";
}

#ifndef QXSM_SANITIZED  // which needs the address space
// Leaves the process `more` bytes beyond what it has, orders, and ends with the exit code of what became of that.
[[noreturn]] void order_in_little_memory(const Pattern& pattern, std::uint64_t more) {
  std::uint64_t pages = 0;
  std::ifstream("/proc/self/statm") >> pages;
  const rlim_t limit = pages * static_cast<std::uint64_t>(sysconf(_SC_PAGESIZE)) + more;
  const rlimit room{limit, limit};
  setrlimit(RLIMIT_AS, &room);
  try {
    find_order(Ordering::metis, pattern.upper(), kPlenty);
  } catch (const CommandError& error) {
    std::cerr << error.what() << "\n";
    _exit(static_cast<int>(error.problem().code));
  }
  _exit(0);
}

TEST(OrderingsDeathTest, an_allocation_that_fails_inside_metis_is_told) {
  constexpr std::int64_t kRows = 90'000;  // of a grid, 300 points wide
  std::vector<std::set<std::int64_t>> rows(kRows);
  for (std::int64_t i = 0; i < kRows; ++i) rows[static_cast<std::size_t>(i)] = {i, std::min(i + 1, kRows - 1)};
  for (std::int64_t i = 300; i < kRows; ++i) rows[static_cast<std::size_t>(i - 300)].insert(i);
  const Pattern pattern(rows);
  EXPECT_EXIT(order_in_little_memory(pattern, 1'000'000'000), ::testing::ExitedWithCode(0), "");
  // The graph and the order take 2.5 MB of this, and METIS three times as much.
  EXPECT_EXIT(order_in_little_memory(pattern, 5'000'000), ::testing::ExitedWithCode(3),
              "out of memory while ordering the matrix with METIS");
}
#endif

}  // namespace
}  // namespace sm::cli
