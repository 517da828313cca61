// Reads Matrix Market files: coordinate and array, real, integer and pattern, general and symmetric, plain or gzip.
//
// The data pass through in batches; nothing is allocated for what the header announces, so memory follows what the
// file really holds. Method and names: R. Boisvert, R. Pozo, K. Remington, "The Matrix Market Exchange Formats: Initial
// Design", NIST IR 5935 (1996).
#pragma once

#include <cstdint>
#include <span>
#include <string>

#include "cli/bytes.hpp"

namespace sm::cli {

enum class Layout { coordinate, array };
enum class Field { real, integer, pattern };
enum class Symmetry { general, symmetric };

struct Header {
  Layout layout = Layout::coordinate;
  Field field = Field::real;
  Symmetry symmetry = Symmetry::general;
  std::int64_t rows = 0;
  std::int64_t cols = 0;
  std::int64_t entries = 0;    // data lines that must follow
  std::int64_t size_line = 0;  // where the three numbers above stand
};

// Zero-based. Of a symmetric file only the upper triangle is reported (row <= col): what stands below the diagonal is
// mirrored. A pattern entry has the value 1.
struct Entry {
  std::int64_t row;
  std::int64_t col;
  double value;
};

constexpr std::size_t kReadBuffer = 262'144;

class EntrySink {
 public:
  virtual ~EntrySink() = default;
  virtual void begin(const Header& header) = 0;
  // In file order. The span holds during the call only.
  virtual void take(std::span<const Entry> entries) = 0;
};

// Reads one matrix to the end of the source. Throws CommandError, naming `name` and the line, at the first thing that
// is not as it must be: a header of another kind, a wrong number of fields, an index outside the matrix, a value that
// is no finite number, entries on both sides of the diagonal of a symmetric file, too few or too many entries, a line
// that fills the buffer.
Header read_matrix_market(ByteSource& source, const std::string& name, EntrySink& sink,
                          std::size_t buffer = kReadBuffer);

}  // namespace sm::cli
