// The squares that blocks share in the selected inversion, and the kernels that it has of its own.
#include "cholesky/inverse_fronts.hpp"

#include <gtest/gtest.h>

#include <algorithm>
#include <numeric>

#include "cholesky/cholesky_support.hpp"
#include "cholesky/tiles.hpp"

namespace sm::test {
namespace {

constexpr std::int64_t kCapacity = 40000;

class FrontStackTest : public ::testing::Test {
 protected:
  // A front with marks in its columns and values, as one that is new or the parent's one grown.
  Front filled(Front front, std::int64_t from, std::int64_t to, double mark) {
    for (std::int64_t i = from; i < to; ++i) front.column[i] = static_cast<std::int64_t>(mark) + i;
    for (std::int64_t i = 0; i < front.order; ++i)
      for (std::int64_t j = 0; j < front.order; ++j)
        if (i < to || j < to) front.z.row(i)[j] = mark + static_cast<double>(1000 * i + j);
    return front;
  }
  Front opened(std::int64_t order, double mark) {
    Front front{};
    EXPECT_TRUE(fronts_.open(order, front));
    EXPECT_EQ(front.order, order);
    EXPECT_GT(front.taken, order);
    return filled(front, 0, order, mark);
  }
  static void expect_marks(const Front& front, std::int64_t order, double mark) {
    ASSERT_EQ(front.order, order);
    for (std::int64_t i = 0; i < order; ++i) {
      ASSERT_EQ(front.column[i], static_cast<std::int64_t>(mark) + i);
      for (std::int64_t j = 0; j < order; ++j) ASSERT_EQ(front.z.row(i)[j], mark + static_cast<double>(1000 * i + j));
    }
  }

  std::vector<double> values_ = std::vector<double>(kCapacity);
  std::vector<std::int64_t> columns_ = std::vector<std::int64_t>(kMostFrontColumns);
  FrontStack fronts_{values_.data(), kCapacity, columns_.data()};
};

TEST_F(FrontStackTest, has_the_front_of_the_parent_until_a_block_above_is_asked_for) {
  Front a = opened(20, 1e6);
  fronts_.keep(a, 90, false);
  Front b = opened(10, 2e6);
  fronts_.keep(b, 70, false);
  ASSERT_NE(fronts_.find(70), nullptr);
  expect_marks(*fronts_.find(70), 10, 2e6);
  ASSERT_NE(fronts_.find(90), nullptr);
  expect_marks(*fronts_.find(90), 20, 1e6);
  EXPECT_EQ(fronts_.find(70), nullptr);
  EXPECT_EQ(fronts_.find(-1), nullptr);
  EXPECT_EQ(fronts_.find(90), nullptr);
}

TEST_F(FrontStackTest, grows_before_what_is_there_and_forgets_that_for_the_next_child) {
  Front a = opened(40, 1e6);
  const std::int64_t room = a.room;
  ASSERT_GE(room, 10);
  fronts_.keep(a, 90, false);
  Front b = FrontStack::grown(*fronts_.find(90), 3);
  EXPECT_EQ(b.order, 43);
  EXPECT_EQ(b.room, room - 3);
  EXPECT_EQ(b.z.row(3) + 3, a.z.first);
  EXPECT_EQ(b.column + 3, a.column);
  b = filled(b, 0, 3, 2e6);
  fronts_.keep(b, 70, false);
  Front c = opened(12, 3e6);
  fronts_.keep(c, 50, false);
  expect_marks(*fronts_.find(50), 12, 3e6);
  EXPECT_EQ(fronts_.find(70)->order, 43);
  expect_marks(*fronts_.find(90), 40, 1e6);
  EXPECT_EQ(fronts_.find(90)->room, room);
}

// One front after the other takes the place of the one before, for longer than all of them together would have room.
TEST_F(FrontStackTest, gives_the_room_of_a_front_to_its_last_child) {
  Front a = opened(30, 1e6);
  fronts_.keep(a, 1000, false);
  for (std::int64_t k = 1; k < 200; ++k) {
    const double mark = 1e6 + 1e5 * static_cast<double>(k);
    Front b = opened(20 + k % 12, mark);
    fronts_.keep(b, 1000 - k, true);
    ASSERT_EQ(fronts_.find(1000 - k)->block, 1000 - k);
    expect_marks(*fronts_.find(1000 - k), 20 + k % 12, mark);
    if (k % 3 == 0) {
      Front shared = FrontStack::grown(*fronts_.find(1000 - k), 1);
      fronts_.keep(shared, 1000 - k, true);
      ASSERT_EQ(fronts_.find(1000 - k)->order, 21 + k % 12);
    }
  }
  EXPECT_EQ(fronts_.find(2000), nullptr);
  Front whole{};
  EXPECT_TRUE(fronts_.open(150, whole));
}

TEST_F(FrontStackTest, refuses_what_it_has_no_room_for) {
  Front front{};
  EXPECT_FALSE(fronts_.open(kCapacity / 100, front));
  std::int64_t count = 0;
  for (; fronts_.open(60, front); ++count) fronts_.keep(front, 1000 - count, false);
  EXPECT_EQ(count, kCapacity / FrontStack::size(60));
  EXPECT_NE(fronts_.find(1000 - count + 2), nullptr);
  EXPECT_TRUE(fronts_.open(60, front));
}

TEST_F(FrontStackTest, has_no_place_for_endlessly_many_fronts) {
  Front front = opened(40, 1e6);
  fronts_.keep(front, 100000, false);
  std::int64_t count = 1;
  for (; fronts_.has_place(); ++count) {
    ASSERT_LT(count, kCapacity);
    Front same = FrontStack::grown(*fronts_.find(100001 - count), 0);
    fronts_.keep(same, 100000 - count, false);
  }
  EXPECT_FALSE(fronts_.open(1, front));
  EXPECT_NE(fronts_.find(100001 - count + 1), nullptr);
  EXPECT_TRUE(fronts_.has_place());
  EXPECT_TRUE(fronts_.open(1, front));
}

TEST(FindPlaces, finds_few_and_many_columns_of_a_front) {
  for (std::uint64_t seed = 0; seed < 400; ++seed) {
    Random random(seed);
    Indices all, some, want;
    const std::int64_t order = 1 + random.below(120);
    const std::int64_t percent = 1 + random.below(100);
    for (std::int64_t i = 0, c = 0; i < order; ++i) {
      all.push_back(c += 1 + random.below(seed % 2 == 0 ? 2 : 50));
      if (!random.chance(percent)) continue;
      some.push_back(c);
      want.push_back(i);
    }
    Front front{};
    front.column = all.data();
    front.order = order;
    Indices place(some.size() + 1, -1);
    find_places(front, some.data(), static_cast<std::int64_t>(some.size()), place.data());
    EXPECT_EQ(place.back(), -1);
    place.pop_back();
    ASSERT_EQ(place, want) << "seed " << seed;
  }
}

class InverseKernelTest : public ::testing::TestWithParam<TileSet> {
 protected:
  void SetUp() override {
    if (!use_tiles(GetParam())) GTEST_SKIP() << "this CPU does not have it";
  }
  void TearDown() override {
    if (!use_tiles(TileSet::avx512) && !use_tiles(TileSet::avx2)) use_tiles(TileSet::portable);
  }
};
INSTANTIATE_TEST_SUITE_P(Sets, InverseKernelTest, ::testing::Values(TileSet::avx512, TileSet::avx2, TileSet::portable));

TEST_P(InverseKernelTest, turns_strips_of_any_length) {
  const TileKernels& tiles = tile_kernels();
  for (std::int64_t columns = 0; columns < 40; ++columns)
    for (const std::int64_t step : {tiles.strip_rows, tiles.strip_rows + 3}) {
      std::vector<std::vector<double>> rows;
      std::vector<const double*> row;
      for (std::int64_t i = 0; i < tiles.strip_rows; ++i) {
        rows.emplace_back(at(columns) + 1);
        std::iota(rows.back().begin(), rows.back().end(), static_cast<double>(100 * i));
      }
      for (const std::vector<double>& r : rows) row.push_back(r.data());
      std::vector<double> out(at(columns * step), -1.0);
      tiles.turn(row.data(), columns, out.data(), step);
      for (std::int64_t c = 0; c < columns; ++c)
        for (std::int64_t i = 0; i < step; ++i)
          ASSERT_EQ(out[at(c * step + i)], i < tiles.strip_rows ? static_cast<double>(100 * i + c) : -1.0);
    }
}

TEST_P(InverseKernelTest, multiplies_any_number_of_rows_at_places) {
  Random random(3);
  for (std::int64_t rows = 0; rows < 14; ++rows)
    for (std::int64_t columns = 0; columns < 30; ++columns) {
      const std::int64_t step = columns + random.below(5);
      const std::vector<double> z = random.vector(3 * rows * step + 1), v = random.vector(rows);
      Indices place;
      for (std::int64_t i = 0; i < rows; ++i) place.push_back(3 * i + random.below(3));
      std::vector<double> y(at(columns + 1), -7.0), want(at(columns), 0.0);
      tile_kernels().multiply_rows(rows, place.data(), v.data(), z.data(), step, columns, y.data());
      for (std::int64_t c = 0; c < columns; ++c)
        for (std::int64_t i = 0; i < rows; ++i) want[at(c)] += v[at(i)] * z[at(place[at(i)] * step + c)];
      EXPECT_EQ(y.back(), -7.0);
      y.pop_back();
      for (std::int64_t c = 0; c < columns; ++c) ASSERT_NEAR(y[at(c)], want[at(c)], 1e-11) << rows << " " << columns;
    }
}

}  // namespace
}  // namespace sm::test
