// What the steps of the selected inversion share: Z where it is kept, work memory, and the dense steps on one block.
#pragma once

#include "cholesky/block_tree.hpp"
#include "cholesky/tiles.hpp"

namespace sm {

inline constexpr i64 kInversePanel = 120;    // a multiple of every tile
inline constexpr i64 kMostFrontOrder = 384;  // larger ones are worked on in panels
inline constexpr i64 kMostFrontColumns = 40000;

// Z on the pattern of U, rows as in factor_values, and its diagonal.
struct InverseRows {
  const NumericArrays& u;
  const BlockTree& tree;
  double* values;
  double* diag;

  Block at(i64 first) const {
    Block b = tree.at(first);
    b.values = values + u.iu[first];
    return b;
  }
};

// A dense matrix by rows.
struct Square {
  double* first;
  i64 step;

  double* row(i64 r) const { return first + r * step; }
};

struct InverseWork {
  double panel[kInversePanel * kInversePanel];
  double turned[kInversePanel * kMostBlockRows];
  double coefficient[kMostBlockRows * kInversePanel];
  double turned_coefficient[kMostBlockRows * kInversePanel];
  double square[kMostBlockRows * kMostBlockRows];
  i64 place[2 * kMostFrontOrder];
  i64 front_column[kMostFrontColumns];
  // Z on the last short tail that was asked for: leaves that follow each other often have the same.
  const i64* tail;
  i64 tail_length;
  double behind[kMostSmallTail * kMostSmallTail];
};

// place[j - begin] <- where column[j] is in the rows of block b, for ascending columns that are all there.
void find_places(const Block& b, const i64* column, i64 begin, i64 end, i64* place);

// A part of Z that is dense on rows [begin, end) and columns [from, to) of the list `column`: both the same, or columns
// behind the rows. place: room for to - from words.
struct DensePart {
  const i64* column;
  i64 begin, end, from, to;
};
void gather(const InverseRows& z, const DensePart& part, const Square& out, i64* place);

// Completes Z on a block's own rows and columns [0, order) of them in a full square, which holds Z behind the block's
// own columns, and in the block's rows what columns from `order` on add. place: where the columns of the tail are
// behind its own ones when there are others between them, or null.
void solve_square(const Block& u, const double* diag, const Square& z, i64 order, const i64* place, InverseWork& work);

// Z of a block, from finished rows, in panels.
void invert_in_panels(const InverseRows& z, i64 first, InverseWork& work);

// The factor's row is used as zeros where its pivot is not positive: dropped, or spoiled by a negative scale.
inline bool is_accepted(double reciprocal) { return reciprocal > 0.0; }

// -U of `rows` rows of a block from row r on, the last one first, in its columns [begin, end), as coefficients of a
// strip; answers where they end.
double* strip_coefficients(const Block& u, const double* diag, i64 r, i64 rows, i64 begin, i64 end, double* out);
// The coefficients among themselves of the same rows, for Finish::solve.
void triangle_coefficients(const Block& u, const double* diag, i64 r, i64 rows, double* out);

}  // namespace sm
