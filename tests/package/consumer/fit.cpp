// A semidefinite fit from C++, its operations called by name. Exits 0 when every number is right.
#include <qxesm/qxesm.h>
#include <qxhost/qxhost.h>

#include <array>
#include <cmath>
#include <cstdio>
#include <memory>

namespace {

struct Entry {
  std::int64_t row, col;
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

const char* fit(SmInstance* instance) {
  SmMatrix* a = nullptr;
  if (qxsmnewss(instance, &a, 3) != SM_OK) return "no matrix";
  for (const auto& [row, col, value] : kEntries) {
    if (qxsmassign(a, row, col, 1, value) != SM_OK) return "assign";
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
  const std::unique_ptr<QxHost, void (*)(QxHost*)> host(qxhost_create(nullptr), qxhost_destroy);
  auto* extension = static_cast<SmExtension*>(qxhost_load_extension(host.get(), L"qxesm", 5));
  SmInstance* instance = extension ? CreateInstance(extension) : nullptr;
  if (!instance) {
    std::fprintf(stderr, "fit: no instance: %s\n", qxhost_last_error(host.get()));
    return 1;
  }
  const char* wrong = fit(instance);
  qxsmDestroyInstance(&instance);
  qxsmDestroyExtension(extension);
  if (wrong) {
    std::fprintf(stderr, "fit: %s\n", wrong);
    return 1;
  }
  std::puts("fit: rank 2, A x = b");
  return 0;
}
