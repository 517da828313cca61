// The boundaries of elements as bits, for the end of an elimination.
//
// There few vertices are left, and the boundary of an element takes in a good part of them. The union of some boundaries
// is then counted sooner word by word than by visiting their vertices: the more so in designs with long lists of large
// elements, such as animal models, whose last vertices would take as long as all others.
#pragma once

#include <algorithm>
#include <cstddef>
#include <span>

#include "frame/core.hpp"

namespace sm {

// Without an instruction that older processors lack, and without a call.
inline unsigned count_bits(std::uint64_t bits) {
  bits -= bits >> 1 & 0x5555555555555555U;
  bits = (bits & 0x3333333333333333U) + (bits >> 2 & 0x3333333333333333U);
  bits = (bits + (bits >> 4)) & 0x0F0F0F0F0F0F0F0FU;
  return static_cast<unsigned>(bits * 0x0101010101010101U >> 56);
}

template <class Index>
class BoundaryBits {
 public:
  explicit BoundaryBits(std::span<std::byte> memory)
      : memory_(reinterpret_cast<std::uint64_t*>(memory.data())),
        words_of_memory_(memory.size() / sizeof(std::uint64_t)) {}

  bool in_use() const { return words_ != 0; }
  // Half of the vertices have gone, and with them the room for new elements.
  bool outgrown(Index left) const { return in_use() && left <= least_; }

  // For the `left` of n vertices, which are to be entered, and so many elements. False when there is not enough memory.
  bool start(Index n, Index left, Index elements) {
    const std::uint64_t words = (std::uint64_t{left} + 63) / 64;
    const std::uint64_t names = (std::uint64_t{n} * sizeof(Index) + 7) / 8;
    const Index least = words > kFew ? left / 2 : 0;
    const std::uint64_t rows = 1 + std::uint64_t{elements} + (left - least);  // an elimination makes one at most
    words_ = 0;
    if (names + rows * words > words_of_memory_) return false;
    words_ = static_cast<Index>(words);
    least_ = least;
    place_ = reinterpret_cast<Index*>(memory_);
    union_ = memory_ + names;
    next_row_ = 1;
    next_bit_ = 0;
    return true;
  }
  void enter(Index vertex) { place_[vertex] = next_bit_++; }
  void add(Index element, const Index* boundary, Index size) {
    const Index number = next_row_++;
    place_[element] = number;
    std::uint64_t* const bits = row(number);
    std::fill_n(bits, words_, std::uint64_t{0});
    for (Index b = 0; b < size; ++b) {
      const Index place = place_[boundary[b]];
      bits[place / 64] |= std::uint64_t{1} << place % 64;
    }
  }

  void clear() { std::fill_n(union_, words_, std::uint64_t{0}); }
  void join(Index element) {
    const std::uint64_t* const bits = row(place_[element]);
    for (Index w = 0; w < words_; ++w) union_[w] |= bits[w];
  }
  Index count() const {
    Index sum = 0;
    for (Index w = 0; w < words_; ++w) sum += count_bits(union_[w]);
    return sum;
  }

 private:
  static constexpr std::uint64_t kFew = 4;  // words that are not worth starting again for

  std::uint64_t* row(Index number) const { return union_ + std::uint64_t{number} * words_; }

  std::uint64_t* memory_;
  std::uint64_t words_of_memory_;
  Index words_ = 0;                 // a boundary
  Index least_ = 0;                 // vertices left, before it is time to start again
  Index* place_ = nullptr;          // of a vertex its bit, of an element its row
  std::uint64_t* union_ = nullptr;  // row 0
  Index next_row_ = 0;
  Index next_bit_ = 0;
};

}  // namespace sm
