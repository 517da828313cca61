// The dense kernels of the blocked factorization: sums of products on strips of a few rows, in register tiles.
//
// One set of kernels is chosen when the module is loaded, by what the CPU has. They use fused multiply-adds at the
// widest vector there is: results differ between the sets in the last bits, and only there.
#pragma once

#include "frame/core.hpp"

namespace sm {

struct Block;
class Pivots;

inline constexpr int kMostStripRows = 8;  // of any set
inline constexpr i64 kMostSmallRows = 8;
inline constexpr i64 kMostSmallColumns = 32;  // of a small block, its own ones included
inline constexpr i64 kMostSmallTail = kMostSmallColumns - kMostSmallRows;
inline constexpr i64 kMostSharedColumns = 16;

// Rows of doubles that are read together. Row s + 1 begins `step` behind row s, and the step falls by `shrink` from row
// to row: 1 for rows of U where they stand, 0 for a packed panel. Tile t of the columns begins t * tile_step behind the
// first.
struct TileSource {
  const double* first;
  i64 step;
  i64 shrink;
  i64 tile_step;
};

enum class Finish {
  store,  // targets = sums
  add,    // targets += sums
  // targets += sums, and then each row of the strip also takes the ones above it: coefficients behind those of the
  // source rows, row q of the strip standing for source row depth + q.
  solve,
};

// Neighbouring columns that stay neighbours: column `from` + x of a source is at `to` + x in the rows of a target.
struct Run {
  std::int32_t from;
  std::int32_t to;
  std::int32_t length;
};

struct TileKernels {
  const char* name;
  i64 strip_rows;    // rows of a full strip
  i64 tile_columns;  // columns of a full tile
  // target[i][j] gets sum over s < depth of coefficient[s * strip_rows + i] * source(s, j), for i < rows, j < columns.
  void (*strip)(int rows, i64 depth, const double* coefficient, const TileSource& source, i64 columns,
                double* const* target, Finish finish);
  // Columns [0, columns) of the source's rows, tile by tile, each tile's rows one behind the other; the last tile's
  // missing columns as zeros.
  void (*pack)(i64 depth, const double* first, i64 step, i64 columns, double* panel);
  // y[c] <- sum over i < rows of v[i] * first[place[i] * step + c], c < columns.
  void (*multiply_rows)(i64 rows, const i64* place, const double* v, const double* first, i64 step, i64 columns,
                        double* y);
  // out[c * step + i] <- row[i][c] for i < strip_rows, c < columns.
  void (*turn)(const double* const* row, i64 columns, double* out, i64 step);
  // A row on the columns of another one, as a row of a packed panel: tile by tile, tile_step apart, values where `own`
  // has the column, zeros elsewhere and behind the last. own: the row's columns, `own_count` of them, all of which are
  // among `column` or behind its last. Answers how many have been found.
  i64 (*expand)(const i64* column, i64 columns, const i64* own, i64 own_count, const double* value, double* panel,
                i64 tile_step);
  // target[i][to + x] += sums[i * sums_step + from + x - first] for i < rows over the runs, what is before `first` of
  // them left out.
  void (*spread)(int rows, const double* sums, i64 sums_step, i64 first, const Run* run, const Run* end,
                 double* const* target);
  // A small block; diag: of its first row. With a square to add to, as add_square too.
  SmStatus (*factor_small)(const Block& block, double* diag, Pivots& pivots, double* square);
  // The square of kMostSharedColumns += -V' D V of the tail of a finished block, on and above the diagonal; what is
  // below is spoiled. The tail is left as multipliers.
  void (*add_square)(const Block& block, const double* pivot, double* square);
  // The inverse in the rows of a small block with a tail of at most kMostSmallTail columns. behind: the inverse on the
  // tail, rows kMostSmallTail apart, to the end of the last vector of each. out: where the rows go, null for nowhere.
  void (*invert_small)(const Block& u, const double* diag, const double* behind, const Block* out, double* out_diag);
};

enum class TileSet { portable, avx2, avx512 };

const TileKernels& tile_kernels();
// For tests. False, and nothing changed, where the CPU does not have it.
bool use_tiles(TileSet set);
TileSet chosen_tiles();

// null where the build is for another processor.
extern const TileKernels* const kPortableTiles;
extern const TileKernels* const kAvx2Tiles;
extern const TileKernels* const kAvx512Tiles;

}  // namespace sm
