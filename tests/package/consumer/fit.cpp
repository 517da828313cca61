// A semidefinite fit from C++: handles from the host's header, operations by name. Exits 0 when every number is right.
#include <qxesm/qxesm.h>

#include <array>
#include <cmath>
#include <cstdio>
#include <qxhost/qxhost.hpp>

namespace {

struct Entry {
  std::size_t row, col;
  double value;
};

// X'X of a mean and two groups that add up to it: rank 2.
constexpr std::array<Entry, 5> kEntries = {{{0, 0, 2.0}, {0, 1, 1.0}, {0, 2, 1.0}, {1, 1, 1.0}, {2, 2, 1.0}}};

std::array<double, 3> multiply(const std::array<double, 3>& x) {
  std::array<double, 3> y = {};
  for (const auto& [row, col, value] : kEntries) {
    y.at(row) += value * x.at(col);
    if (row != col) y.at(col) += value * x.at(row);
  }
  return y;
}

// What went wrong, or null.
const char* fit(qxhost::Instance& instance) {
  const auto a = qxhost::Matrix::symmetric_sparse(instance, 3);
  if (!a) return "no matrix";
  for (const auto& [row, col, value] : kEntries) {
    const auto i = static_cast<std::int64_t>(row);
    const auto j = static_cast<std::int64_t>(col);
    if (qxsmassign(a, i, j, 1, value) != SM_OK) return "assign";
  }
  if (qxsmclose(a, -1.0) != SM_OK) return "close";
  const std::array<double, 3> b = multiply({1.0, 2.0, 3.0});
  std::array<double, 3> x = {};
  std::int64_t rank = 0;
  if (qxsmsoldirect(a, b.data(), x.data(), 1) != SM_OK) return "solve";
  if (qxsmrank(a, &rank) != SM_OK || rank != 2) return "rank is not 2";
  const std::array<double, 3> again = multiply(x);
  for (std::size_t i = 0; i < 3; ++i) {
    if (!(std::fabs(again.at(i) - b.at(i)) <= 1e-13)) return "A x is not b";
  }
  return nullptr;
}

}  // namespace

int main() {
  qxhost::Host host;
  const char* wrong = nullptr;
  {
    qxhost::Extension extension(host);
    qxhost::Instance instance(extension);
    wrong = instance ? fit(instance) : host.last_error();
  }
  if (!wrong && host.usage().pools_live != 0) wrong = "a pool is left";
  if (wrong) {
    std::fprintf(stderr, "fit: %s\n", wrong);
    return 1;
  }
  std::puts("fit: rank 2, A x = b");
  return 0;
}
