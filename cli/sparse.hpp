// The entries that the command keeps of a matrix, as compressed rows, and what can be asked of them.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "cli/matrix_market.hpp"

namespace sm::cli {

// Row i holds positions start[i] .. start[i+1] - 1, columns ascending, no column twice.
struct CompressedRows {
  std::int64_t rows = 0;
  std::int64_t cols = 0;
  std::vector<std::int64_t> start;
  std::vector<std::int64_t> col;
  std::vector<double> value;

  std::int64_t size() const { return static_cast<std::int64_t>(col.size()); }
};

// Where an entry stands in the compressed rows, if it does.
std::optional<std::int64_t> find_entry(const CompressedRows& rows, std::int64_t row, std::int64_t col);

// Bytes that the command may take in one piece; a larger need ends it with exit code 3 before it is asked for.
// `what` says what the memory is for: "the rows of a matrix of order 10".
void require_memory(double bytes, std::uint64_t limit, const std::string& what);

// Collects entries as they come, in chunks, so that nothing is copied while it grows, and nothing is taken on the word
// of a header.
class EntryStore : public EntrySink {
 public:
  void begin(const Header& header) override;
  void take(std::span<const Entry> entries) override;

  const Header& header() const { return header_; }
  std::int64_t size() const { return size_; }

  // Entries at one position are added together, in file order. Zeros of an array are no entries. `limit` as in
  // require_memory. The store is empty afterwards. Throws CommandError, naming `name`, when a sum overflows.
  CompressedRows compress(const std::string& name, std::uint64_t limit);

 private:
  static constexpr std::size_t kChunk = 65'536;
  void scatter(CompressedRows& rows);

  Header header_;
  std::int64_t size_ = 0;
  std::vector<std::vector<Entry>> chunks_;
};

// How a general square matrix compares with its transpose. The first pair is the first in row order for which the
// values differ (an absent entry counts as 0).
struct SymmetryCheck {
  bool pattern = true;  // every stored (i, j) has a stored (j, i)
  bool values = true;
  std::int64_t row = -1;  // the first pair, row > col
  std::int64_t col = -1;
  double below = 0.0;
  double above = 0.0;
};
SymmetryCheck check_symmetry(const CompressedRows& full);

// Keeps the entries with col >= row, in place.
void keep_upper_triangle(CompressedRows& full);

// A symmetric matrix, given by its upper triangle. Vectors have `rows` elements.
void multiply_symmetric(const CompressedRows& upper, const double* x, double* y);
double infinity_norm_symmetric(const CompressedRows& upper);

}  // namespace sm::cli
