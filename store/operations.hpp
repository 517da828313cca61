// The operations of the store, behind the C boundary.
#pragma once

#include "store/checks.hpp"

namespace sm {

[[nodiscard]] SmStatus make(SmInstance& instance, SmMatrix*& matrix, std::int32_t kind, std::int32_t format);
[[nodiscard]] SmStatus make_sized(SmInstance& instance, SmMatrix*& matrix, std::int32_t kind, std::int32_t format,
                                  i64 rows, i64 cols);
void reset(SmMatrix& m);
[[nodiscard]] SmStatus resize(SmMatrix& m, i64 rows, i64 cols);
[[nodiscard]] SmStatus tie(SmMatrix& m, double* data, i64 rows, i64 cols, std::int32_t kind, std::int32_t format);

[[nodiscard]] SmStatus assign(SmMatrix& m, i64 row, i64 col, bool add, double value);
[[nodiscard]] SmStatus get(SmMatrix& m, i64 row, i64 col, double& value);
[[nodiscard]] SmStatus set_all(SmMatrix& m, double value);
[[nodiscard]] SmStatus add_outer(SmMatrix& m, const double* z, const i64* index, i64 length, double weight);
[[nodiscard]] SmStatus remove(SmMatrix& m, i64 row, i64 col);

[[nodiscard]] SmStatus close(SmMatrix& m, double tolerance);

[[nodiscard]] SmStatus row(SmMatrix& m, i64 row, double* out, i64 start);
[[nodiscard]] SmStatus upper_row(SmMatrix& m, i64 row, double* out);
[[nodiscard]] SmStatus upper_block(SmMatrix& m, double* out, i64 r0, i64 r1, i64 c0, i64 c1);
[[nodiscard]] SmStatus diagonal(SmMatrix& m, double* out, i64 first, i64 last);
[[nodiscard]] SmStatus dense(SmMatrix& m, double* out, std::int16_t mode);
[[nodiscard]] SmStatus is_diagonal(SmMatrix& m, std::int16_t& flag, double tolerance);

// What the operations that do not answer for an empty matrix first ask of an operand: an empty symmetric sparse one has
// no compressed rows to look for.
inline bool is_closed_or_empty(const SmMatrix& m) { return m.nnz < 1 ? m.state >= SM_STATE_CLOSED : is_closed(m); }
[[nodiscard]] SmStatus clone(SmMatrix& source, SmMatrix& target, bool reassemble);
[[nodiscard]] SmStatus convert(SmMatrix& source, SmMatrix& target, bool reassemble);
[[nodiscard]] SmStatus load(const double* values, SmMatrix& m, i64 rows, i64 cols, std::int32_t kind,
                            std::int32_t format);

}  // namespace sm
