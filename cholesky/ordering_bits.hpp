// The boundaries of elements as bits, for the end of an elimination.
//
// There few vertices are left, and the boundary of an element takes in a good part of them. The union of some boundaries
// is then counted sooner word by word than by visiting their vertices: the more so in designs with long lists of large
// elements, such as animal models, whose last vertices would take as long as all others. Small boundaries,
// and those for which no memory is left, are still visited.
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
  void stop() { words_ = 0; }
  // Half of the vertices that were there have gone.
  bool outgrown(Index left) const { return in_use() && left <= least_; }
  static Index words_for(Index left) { return left / 64 + 1; }
  // A visit of a vertex takes as long as a few words: smaller boundaries have no row.
  static bool large(Index boundary, Index words) { return boundary >= words / kWordsPerVisit; }

  // For the `left` of n vertices, which are to be entered, and so many large boundaries. False when there is no memory
  // for these.
  bool start(Index n, Index left, Index boundaries) {
    const std::uint64_t names = (std::uint64_t{n} * sizeof(Index) + 7) / 8;
    const std::uint64_t words = words_for(left);
    words_ = 0;
    if (names + (1 + std::uint64_t{boundaries}) * words > words_of_memory_) return false;
    words_ = static_cast<Index>(words);
    least_ = words > kFew ? left / 2 : 0;
    place_ = reinterpret_cast<Index*>(memory_);
    union_ = memory_ + names;
    rows_ = static_cast<Index>(std::min<std::uint64_t>((words_of_memory_ - names) / words, static_cast<Index>(-1)));
    next_row_ = 1;
    next_bit_ = 0;
    return true;
  }
  void enter(Index vertex) { place_[vertex] = next_bit_++; }
  void add(Index element, const Index* boundary, Index size) {
    place_[element] = 0;
    if (!large(size, words_) || next_row_ == rows_) return;
    place_[element] = next_row_++;
    std::uint64_t* const bits = row(place_[element]);
    std::fill_n(bits, words_, std::uint64_t{0});
    set(bits, boundary, size);
  }

  void clear() { std::fill_n(union_, words_, std::uint64_t{0}); }
  void join(Index element, const Index* boundary, Index size) {
    if (place_[element] == 0) {
      set(union_, boundary, size);
      return;
    }
    const std::uint64_t* const bits = row(place_[element]);
    for (Index w = 0; w < words_; ++w) union_[w] |= bits[w];
  }
  Index count() const {
    Index sum = 0;
    for (Index w = 0; w < words_; ++w) sum += count_bits(union_[w]);
    return sum;
  }

 private:
  static constexpr Index kWordsPerVisit = 4;
  static constexpr std::uint64_t kFew = 4;  // words that are not worth starting again for

  std::uint64_t* row(Index number) const { return union_ + std::uint64_t{number} * words_; }
  void set(std::uint64_t* bits, const Index* boundary, Index size) const {
    for (Index b = 0; b < size; ++b) {
      const Index place = place_[boundary[b]];
      bits[place / 64] |= std::uint64_t{1} << place % 64;
    }
  }

  std::uint64_t* memory_;
  std::uint64_t words_of_memory_;
  Index words_ = 0;                 // a boundary
  Index least_ = 0;                 // vertices left, when it is time to start again
  Index* place_ = nullptr;          // of a vertex its bit, of an element its row, or 0
  std::uint64_t* union_ = nullptr;  // row 0
  Index rows_ = 0;
  Index next_row_ = 0;
  Index next_bit_ = 0;
};

}  // namespace sm
