// Moving the stored rows of a symmetric sparse matrix into the factor's order, and back.
#pragma once

#include "cholesky/index_width.hpp"
#include "frame/core.hpp"

namespace sm {

// Moves the rows as closing left them, diagonal first and columns ascending, into the factor's order, by way of copies
// of the entries that change rows. False, with nothing changed, where there is no border of a few long rows that hold a
// good part of the entries, where a row is different, or where the workspace has no room.
bool reorder_border(SmMatrix& m);

// The same for whatever rows there are, in the rows + nnz words of workspace that an ordered matrix has at least. Half
// words hold nnz.
void reorder_rows(SmMatrix& m, IndexWidth width);

// Undoes reorder in the workspace that ordering left: upper triangle, columns ascending. Allocates nothing.
void restore_order(SmMatrix& m);

// place[p] <- which entry is at p, counted as they were when closing wrote the rows.
void find_closing_places(const SmMatrix& m, i64* place, i64* scratch);
inline i64 closing_places_scratch(const SmMatrix& m) { return m.rows + 1 + 2 * m.nnz; }

// The same in the record's reserved factor word, unless it has them already.
[[nodiscard]] SmStatus need_closing_places(SmMatrix& m);

}  // namespace sm
