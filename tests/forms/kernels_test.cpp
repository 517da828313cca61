// The vector kernels: a scaled sum, a dot product, a largest magnitude, and when the BLAS is called for them.
#include "forms/kernels.hpp"

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <vector>

#include "forms/forms_support.hpp"

namespace {

// What the last calls of the BLAS were given.
struct Called {
  int times = 0;
  int n = 0;
  int strides = 0;
  double a = 0.0;
};
Called daxpy_called;
Called ddot_called;

// A piece of a call that is only counted, because no machine of ours holds vectors of that length.
struct Piece {
  const double* x;
  const double* y;
  std::int64_t n;
};
std::vector<Piece>* counted_pieces = nullptr;

template <class Function>
Function real(const char* name) {
  void* symbol = dlsym(RTLD_NEXT, name);
  Function function = nullptr;
  std::memcpy(&function, &symbol, sizeof function);
  return function;
}

}  // namespace

// These stand before the library's, so that the calls can be counted, and hand on to them.
extern "C" {
void daxpy_(const int* n, const double* a, const double* x, const int* incx, double* y, const int* incy);
double ddot_(const int* n, const double* x, const int* incx, const double* y, const int* incy);

void daxpy_(const int* n, const double* a, const double* x, const int* incx, double* y, const int* incy) {
  daxpy_called = {daxpy_called.times + 1, *n, *incx * 100 + *incy, *a};
  if (counted_pieces) {
    counted_pieces->push_back({x, y, *n});
    return;
  }
  real<decltype(&daxpy_)>("daxpy_")(n, a, x, incx, y, incy);
}

double ddot_(const int* n, const double* x, const int* incx, const double* y, const int* incy) {
  ddot_called = {ddot_called.times + 1, *n, *incx * 100 + *incy, 0.0};
  if (counted_pieces) {
    counted_pieces->push_back({x, y, *n});
    return *n;
  }
  return real<decltype(&ddot_)>("ddot_")(n, x, incx, y, incy);
}
}

namespace sm::test {
namespace {

// Around every length of a block of lanes, and around the lengths from which the BLAS is called.
const std::vector<std::int32_t> kLengths = [] {
  std::vector<std::int32_t> lengths;
  for (std::int32_t n = 1; n <= 70; ++n) lengths.push_back(n);
  for (const std::int32_t n : {127, 128, 129, 248, 249, 250, 251, 256, 498, 499, 500, 501, 512, 1000, 4099}) {
    lengths.push_back(n);
  }
  return lengths;
}();

// n elements at an offset from where an allocation begins, with nothing behind them.
struct Shifted {
  Shifted(Random& random, std::int32_t n, std::size_t by)
      : v(random.vector(n + static_cast<std::int32_t>(by))), shift(by) {}
  const double* data() const { return v.data() + shift; }
  double operator[](std::int32_t i) const { return v[shift + at(i)]; }
  std::vector<double> v;
  std::size_t shift;
};

TEST(ScaledSum, every_length_and_alignment_adds_a_multiple_of_the_second_vector_to_the_first) {
  Random random(1);
  for (const std::int32_t n : kLengths)
    for (std::size_t shift = 0; shift < 4; ++shift) {
      const Shifted x(random, n, shift);
      const Shifted y(random, n, 3 - shift);
      const double a = random.dyadic();
      std::vector<double> want;
      for (std::int32_t i = 0; i < n; ++i) want.push_back(x[i] + a * y[i]);
      Output z(n);
      hzvaxpy(z.data(), x.data(), y.data(), n, a);
      EXPECT_TRUE(same(z.values(), want)) << n;
      Output in_place(std::vector<double>(x.data(), x.data() + n));
      hzvaxpy(in_place.data(), in_place.data(), y.data(), n, a);
      EXPECT_TRUE(same(in_place.values(), want)) << n << ", in place";
    }
}

TEST(ScaledSum, a_length_below_1_touches_nothing) {
  const std::vector<double> x(4, 1.0);
  for (const std::int32_t n : {0, -1, -250, -1000, INT32_MIN}) {
    Output z(4);
    hzvaxpy(z.data(), x.data(), x.data(), n, 2.0);
    EXPECT_TRUE(z.untouched()) << n;
    hzvaxpy(z.data(), z.data(), x.data(), n, 2.0);
    EXPECT_TRUE(z.untouched()) << n << ", in place";
  }
  hzvaxpy(nullptr, nullptr, nullptr, 0, 2.0);
}

TEST(ScaledSum, the_product_is_rounded_before_it_is_added) {
  const double e = std::ldexp(1.0, -30);
  for (const std::int32_t n : {1, 7, 8, 16, 33, 249, 250, 1000}) {
    const std::vector<double> x(at(n), -1.0);
    const std::vector<double> y(at(n), 1.0 - e);
    Output z(n);
    hzvaxpy(z.data(), x.data(), y.data(), n, 1.0 + e);
    EXPECT_TRUE(same(z.values(), std::vector<double>(at(n), 0.0))) << n << ": (1 + e)(1 - e) rounds to 1";
  }
}

TEST(ScaledSum, infinities_and_nans_pass_through_also_by_a_scale_of_0) {
  for (const std::int32_t n : {1, 9, 249}) {
    std::vector<double> x(at(n), 1.0);
    std::vector<double> y(at(n), 2.0);
    x[0] = kInfinity;
    y[at(n - 1)] = -kInfinity;
    Output z(n);
    hzvaxpy(z.data(), x.data(), y.data(), n, 0.0);
    EXPECT_TRUE(std::isnan(z.values()[at(n - 1)])) << "0 times an infinity";
    hzvaxpy(z.data(), x.data(), y.data(), n, 3.0);
    EXPECT_EQ(z.values()[0] == kInfinity, n > 1);
    EXPECT_EQ(z.values()[at(n - 1)] == -kInfinity, n > 1);
    y[0] = kNan;
    hzvaxpy(z.data(), x.data(), y.data(), n, 3.0);
    EXPECT_TRUE(std::isnan(z.values()[0]));
  }
}

TEST(ScaledSum, the_blas_takes_vectors_of_250_and_more_in_place_and_no_others) {
  for (const std::int32_t n : {1, 100, 249, 250, 251, 1000}) {
    std::vector<double> x(at(n), 1.0);
    const std::vector<double> y(at(n), 2.0);
    std::vector<double> z(at(n));
    const int before = daxpy_called.times;
    hzvaxpy(z.data(), x.data(), y.data(), n, 0.5);
    EXPECT_EQ(daxpy_called.times, before) << n << " with three arrays";
    hzvaxpy(x.data(), x.data(), y.data(), n, 0.5);
    EXPECT_EQ(daxpy_called.times, before + (n >= 250 ? 1 : 0)) << n << " in place";
    EXPECT_EQ(x, std::vector<double>(at(n), 2.0));
    if (n < 250) continue;
    EXPECT_EQ(daxpy_called.n, n);
    EXPECT_EQ(daxpy_called.a, 0.5);
    EXPECT_EQ(daxpy_called.strides, 101);
  }
}

TEST(DotProduct, every_length_and_alignment_is_summed_exactly_where_that_is_possible) {
  Random random(2);
  for (const std::int32_t n : kLengths)
    for (std::size_t shift = 0; shift < 4; ++shift) {
      const Shifted x(random, n, shift);
      const Shifted y(random, n, 3 - shift);
      double want = 0.0;
      for (std::int32_t i = 0; i < n; ++i) want += x[i] * y[i];
      EXPECT_EQ(hzvdot11(x.data(), y.data(), n), want) << n;
    }
}

TEST(DotProduct, sums_that_round_agree_with_longer_ones) {
  Random random(3);
  for (const std::int32_t n : {100, 499, 500, 4099}) {
    std::vector<double> x;
    std::vector<double> y;
    long double want = 0.0L;
    for (std::int32_t i = 0; i < n; ++i) {
      x.push_back(1.0 / random.dyadic());
      y.push_back(1.0 / (10.0 + random.dyadic()));
      want += static_cast<long double>(x.back()) * y.back();
    }
    EXPECT_NEAR(hzvdot11(x.data(), y.data(), n), static_cast<double>(want), 1e-12 * n) << n;
  }
}

TEST(DotProduct, a_length_below_1_gives_0) {
  const double one = 1.0;
  for (const std::int64_t n : {std::int64_t{0}, std::int64_t{-1}, std::int64_t{-500}, -kHuge - 1}) {
    EXPECT_EQ(bits(hzvdot11(&one, &one, n)), 0U) << n;
  }
  EXPECT_EQ(bits(hzvdot11(nullptr, nullptr, 0)), 0U);
}

TEST(DotProduct, a_vector_may_meet_itself_and_infinities_and_nans_show) {
  for (const std::int32_t n : {1, 8, 17, 499, 500}) {
    std::vector<double> x(at(n), 2.0);
    EXPECT_EQ(hzvdot11(x.data(), x.data(), n), 4.0 * n);
    std::vector<double> y(at(n), 0.0);
    for (const std::int32_t place : {0, n / 2, n - 1}) {
      x[at(place)] = kInfinity;
      EXPECT_TRUE(std::isnan(hzvdot11(x.data(), y.data(), n))) << n << ' ' << place;
      x[at(place)] = kNan;
      EXPECT_TRUE(std::isnan(hzvdot11(y.data(), x.data(), n))) << n << ' ' << place;
      x[at(place)] = 2.0;
    }
  }
}

TEST(DotProduct, the_blas_takes_vectors_of_500_and_more) {
  const std::vector<double> x(1000, 0.5);
  for (const std::int64_t n : {1, 250, 499, 500, 501, 1000}) {
    const int before = ddot_called.times;
    EXPECT_EQ(hzvdot11(x.data(), x.data(), n), 0.25 * static_cast<double>(n));
    EXPECT_EQ(ddot_called.times, before + (n >= 500 ? 1 : 0)) << n;
    if (n < 500) continue;
    EXPECT_EQ(ddot_called.n, n);
    EXPECT_EQ(ddot_called.strides, 101);
  }
}

constexpr std::int64_t kMost = std::numeric_limits<std::int32_t>::max();
constexpr std::int64_t kBeyond[] = {
    kMost - 1, kMost, kMost + 1, kMost + 500, 2 * kMost, 2 * kMost + 7, std::int64_t{1} << 34};

// Pieces of n elements of two vectors, each as long as the BLAS can count, and what is left over.
void expect_pieces(const std::vector<Piece>& pieces, const double* x, const double* y, std::int64_t n) {
  const auto address = [](const double* first, std::int64_t i) {
    return reinterpret_cast<std::uintptr_t>(first) + static_cast<std::uintptr_t>(i) * sizeof(double);
  };
  std::int64_t done = 0;
  for (const Piece& piece : pieces) {
    EXPECT_EQ(reinterpret_cast<std::uintptr_t>(piece.x), address(x, done)) << n;
    EXPECT_EQ(reinterpret_cast<std::uintptr_t>(piece.y), address(y, done)) << n;
    EXPECT_EQ(piece.n, std::min(kMost, n - done)) << n;
    done += piece.n;
  }
  EXPECT_EQ(done, n);
}

TEST(DotProduct, a_vector_that_is_longer_than_the_blas_can_count_is_handed_over_in_pieces) {
  const double x = 1.0;
  const double y = 1.0;
  for (const std::int64_t n : kBeyond) {
    std::vector<Piece> pieces;
    counted_pieces = &pieces;
    const double sum = hzvdot11(&x, &y, n);
    counted_pieces = nullptr;
    EXPECT_EQ(sum, static_cast<double>(n));
    expect_pieces(pieces, &x, &y, n);
  }
}

TEST(Multiple, a_vector_that_is_longer_than_the_blas_can_count_is_handed_over_in_pieces) {
  double z = 1.0;
  const double y = 1.0;
  for (const std::int64_t n : kBeyond) {
    std::vector<Piece> pieces;
    counted_pieces = &pieces;
    add_multiple(&z, &y, n, -2.5);
    counted_pieces = nullptr;
    EXPECT_EQ(daxpy_called.a, -2.5);
    EXPECT_EQ(daxpy_called.strides, 101);
    expect_pieces(pieces, &y, &z, n);
  }
}

TEST(Multiple, every_length_is_added_in_place_and_one_below_1_touches_nothing) {
  Random random(5);
  for (const std::int32_t n : kLengths) {
    const std::vector<double> y = random.vector(n);
    const std::vector<double> before = random.vector(n);
    std::vector<double> want(before);
    for (std::size_t i = 0; i < want.size(); ++i) want[i] += -0.75 * y[i];
    Output z(before);
    const int called = daxpy_called.times;
    add_multiple(z.data(), y.data(), n, -0.75);
    EXPECT_TRUE(same(z.values(), want)) << n;
    EXPECT_EQ(daxpy_called.times, called + (n >= 250 ? 1 : 0)) << n;
  }
  for (const std::int64_t n : {std::int64_t{0}, std::int64_t{-1}, -kHuge - 1}) add_multiple(nullptr, nullptr, n, 2.0);
}

TEST(LargestMagnitude, it_is_found_at_every_place_of_every_length) {
  for (const std::int32_t n : kLengths) {
    if (n > 130 && n != 500) continue;
    for (std::int32_t place = 0; place < n; ++place)
      for (const double value : {7.5, -7.5}) {
        std::vector<double> x(at(n), 0.25);
        x[at(place / 2)] = -1.0;
        x[at(place)] = value;
        EXPECT_EQ(zvamx(x.data(), n), 7.5) << n << ' ' << place;
      }
  }
}

TEST(LargestMagnitude, of_random_vectors_it_is_the_largest) {
  Random random(4);
  for (const std::int32_t n : kLengths) {
    const std::vector<double> x = random.vector(n);
    double want = 0.0;
    for (const double v : x) want = std::fabs(v) > want ? std::fabs(v) : want;
    EXPECT_EQ(zvamx(x.data(), n), want) << n;
  }
}

TEST(LargestMagnitude, one_element_gives_its_magnitude_and_none_gives_0) {
  for (const double v : {3.0, -3.0, kInfinity, -kInfinity, 5e-324, -5e-324}) EXPECT_EQ(zvamx(&v, 1), std::fabs(v));
  const double negative_zero = -0.0;
  EXPECT_EQ(bits(zvamx(&negative_zero, 1)), 0U) << "the sign goes";
  const double one = 1.0;
  for (const std::int64_t n : {std::int64_t{0}, std::int64_t{-1}, -kHuge - 1}) EXPECT_EQ(bits(zvamx(&one, n)), 0U);
  EXPECT_EQ(bits(zvamx(nullptr, 0)), 0U);
  const double negative[] = {-1.0, -9.0, -2.0};
  EXPECT_EQ(zvamx(negative, 3), 9.0);
}

TEST(LargestMagnitude, a_nan_takes_the_place_of_what_came_before_and_gives_way_to_what_follows) {
  const double nan_then_small[] = {100.0, kNan, 0.5};
  EXPECT_EQ(zvamx(nan_then_small, 3), 0.5);
  const double small_then_larger[] = {100.0, kNan, 0.5, -2.0, 1.0};
  EXPECT_EQ(zvamx(small_then_larger, 5), 2.0);
  const double last[] = {100.0, 0.5, -kNan};
  EXPECT_TRUE(std::isnan(zvamx(last, 3)));
  EXPECT_FALSE(std::signbit(zvamx(last, 3)));
  const double first[] = {-kNan, -4.0, 3.0};
  EXPECT_EQ(zvamx(first, 3), 4.0);
  for (const std::int32_t n : {9, 40, 129}) {
    for (std::int32_t place = 0; place < n; ++place) {
      std::vector<double> x(at(n), 8.0);
      for (std::int32_t i = place + 1; i < n; ++i) x[at(i)] = 0.5;
      x[at(place)] = kNan;
      const double got = zvamx(x.data(), n);
      EXPECT_TRUE(place + 1 < n ? got == 0.5 : std::isnan(got)) << n << ' ' << place;
    }
  }
}

}  // namespace
}  // namespace sm::test
