// Boundaries as bits against sets.
#include "cholesky/ordering_bits.hpp"

#include <gtest/gtest.h>

#include <algorithm>
#include <set>
#include <span>
#include <vector>

#include "support/random_matrices.hpp"

namespace sm::test {
namespace {

template <class Index>
class OrderingBitsTest : public ::testing::Test {
 protected:
  struct Boundary {
    Index name;
    std::vector<Index> vertices;
  };

  // Some of n vertices are left, the others are names for elements.
  void choose(Random& random, Index n) {
    n_ = n;
    const std::vector<std::int64_t> all = random.permutation(static_cast<std::int64_t>(n));
    const auto left = all.begin() + 1 + random.below(static_cast<std::int64_t>(n) - 1);
    vertices_.assign(all.begin(), left);
    for (auto name = left; name != all.end(); ++name) {
      Boundary boundary{static_cast<Index>(*name), {}};
      const std::int64_t percent = random.below(101);
      for (const Index v : vertices_) {
        if (random.chance(percent)) boundary.vertices.push_back(v);
      }
      boundaries_.push_back(boundary);
    }
  }

  Index count_large() const {
    const Index words = BoundaryBits<Index>::words_for(static_cast<Index>(vertices_.size()));
    Index count = 0;
    for (const Boundary& b : boundaries_) count += BoundaryBits<Index>::large(size(b), words);
    return count;
  }
  static Index size(const Boundary& b) { return static_cast<Index>(b.vertices.size()); }

  void enter_all(BoundaryBits<Index>& bits) const {
    for (const Index v : vertices_) bits.enter(v);
    for (const Boundary& b : boundaries_) bits.add(b.name, b.vertices.data(), size(b));
  }

  void expect_unions(Random& random, BoundaryBits<Index>& bits) const {
    for (int trial = 0; trial < 20; ++trial) {
      std::set<Index> all;
      bits.clear();
      for (const Boundary& b : boundaries_) {
        if (random.chance(70)) continue;
        all.insert(b.vertices.begin(), b.vertices.end());
        bits.join(b.name, b.vertices.data(), size(b));
      }
      EXPECT_EQ(bits.count(), all.size());
    }
  }

  // Memory of so many words, with more behind it that must stay as it is.
  class Memory {
   public:
    explicit Memory(std::uint64_t words) : words_(words), all_(words + 64, kUntouched) {}
    [[nodiscard]] std::span<std::byte> bytes() { return std::as_writable_bytes(std::span(all_).first(words_)); }
    [[nodiscard]] bool overrun() const {
      return std::any_of(all_.end() - 64, all_.end(), [](std::uint64_t word) { return word != kUntouched; });
    }

   private:
    static constexpr std::uint64_t kUntouched = 0x5A5A5A5A5A5A5A5AU;
    std::uint64_t words_;
    std::vector<std::uint64_t> all_;
  };

  Index n_ = 0;
  std::vector<Index> vertices_;
  std::vector<Boundary> boundaries_;
};
using Widths = ::testing::Types<std::uint32_t, std::uint64_t>;
TYPED_TEST_SUITE(OrderingBitsTest, Widths);

TYPED_TEST(OrderingBitsTest, counts_unions_with_room_for_every_large_boundary_or_more_than_that) {
  for (std::uint64_t seed = 0; seed < 60; ++seed) {
    Random random(seed);
    this->vertices_.clear();
    this->boundaries_.clear();
    this->choose(random, static_cast<TypeParam>(2 + random.below(700)));
    const auto left = static_cast<TypeParam>(this->vertices_.size());
    const TypeParam large = this->count_large();
    const std::uint64_t least = (std::uint64_t{this->n_} * sizeof(TypeParam) + 7) / 8 +
                                (std::uint64_t{large} + 1) * BoundaryBits<TypeParam>::words_for(left);
    for (const std::uint64_t more : {std::uint64_t{0}, std::uint64_t{1}, std::uint64_t{5000}}) {
      typename TestFixture::Memory memory(least + more);
      BoundaryBits<TypeParam> bits(memory.bytes());
      EXPECT_FALSE(bits.in_use());
      ASSERT_TRUE(bits.start(this->n_, left, large));
      EXPECT_TRUE(bits.in_use());
      this->enter_all(bits);
      this->expect_unions(random, bits);
      EXPECT_FALSE(memory.overrun());
    }
    if (this->HasFailure()) FAIL() << "seed " << seed;
  }
}

// Those that come when all rows are taken are visited.
TYPED_TEST(OrderingBitsTest, counts_unions_of_boundaries_that_no_row_is_left_for) {
  Random random(3);
  this->choose(random, TypeParam{600});
  const auto left = static_cast<TypeParam>(this->vertices_.size());
  const std::uint64_t least = (600 * sizeof(TypeParam) + 7) / 8 + 3 * BoundaryBits<TypeParam>::words_for(left);
  typename TestFixture::Memory memory(least);
  BoundaryBits<TypeParam> bits(memory.bytes());
  ASSERT_TRUE(bits.start(this->n_, left, 2));
  this->enter_all(bits);
  this->expect_unions(random, bits);
  EXPECT_FALSE(memory.overrun());
}

TYPED_TEST(OrderingBitsTest, does_not_start_without_memory_and_can_be_stopped) {
  std::vector<std::uint64_t> memory(1000 * sizeof(TypeParam) / 8 + 4 * 11 - 1);
  BoundaryBits<TypeParam> bits(std::as_writable_bytes(std::span(memory)));
  EXPECT_FALSE(bits.start(1000, 640, 3));
  EXPECT_FALSE(bits.in_use());
  EXPECT_TRUE(bits.start(1000, 640, 2));
  EXPECT_FALSE(bits.start(1000, 640, 3));  // also in place of what there was
  EXPECT_FALSE(bits.in_use());
  EXPECT_TRUE(bits.start(1000, 640, 2));
  bits.stop();
  EXPECT_FALSE(bits.in_use());
  EXPECT_FALSE(bits.outgrown(0));
  BoundaryBits<TypeParam> none({});
  EXPECT_FALSE(none.start(1, 1, 0));
}

TYPED_TEST(OrderingBitsTest, is_outgrown_by_half_of_many_vertices_and_never_by_few) {
  std::vector<std::uint64_t> memory(5000);
  BoundaryBits<TypeParam> bits(std::as_writable_bytes(std::span(memory)));
  EXPECT_FALSE(bits.outgrown(0));
  ASSERT_TRUE(bits.start(1000, 901, 1));
  EXPECT_FALSE(bits.outgrown(451));
  EXPECT_TRUE(bits.outgrown(450));
  ASSERT_TRUE(bits.start(1000, 200, 1));
  EXPECT_FALSE(bits.outgrown(1));
}

}  // namespace
}  // namespace sm::test
