// Rows of a few entries and of any lengths, as those of pedigrees, for the passes of passes.hpp. Included behind
// passes_body.hpp, in the same namespace.
//
// Row by row, the processor guesses the end of nearly every second such row wrongly, and a wrong guess costs as much as
// ten entries. So a batch of rows is cut into pieces of at most eight entries first, without a branch on the length of
// a row, and then the pieces of a length follow each other.
//
// Deliberately without an include guard.

constexpr i64 kBatchRows = 256;      // at most
constexpr i64 kLeastBatch = 32;      // rows that are worth it
constexpr i64 kBatchEntries = 16;    // of a row, on average, at most: those of a batch are counted in 16 bits
constexpr i64 kRemembered = 32'768;  // rows, about: of fewer the processor remembers the lengths from pass to pass
constexpr i64 kPiece = 8;
constexpr i64 kWhole = kPiece + 1;  // where rows of more than two pieces are listed
constexpr i64 kLengths = kWhole + 1;

// Row and first entry of a piece, counted from those of the batch.
struct __attribute__((may_alias)) Piece {
  std::uint16_t row;
  std::uint16_t entry;
};
constexpr i64 kPiecesInWord = sizeof(i64) / sizeof(Piece);

// The pieces of a batch by their length.
struct Pieces {
  i64 rows;
  i64 reach;  // the last column
  i64 count[kLengths];
  Piece of[kLengths][2 * kBatchRows];
};

// A batch, wherever its pieces are kept.
struct Batch {
  i64 i;
  i64 rows;
  i64 reach;
  const i64* count;
  const Piece* of[kLengths];
};

// How many rows from row i on are a batch; 0 when there are too few or too many entries in them, when most are long, or
// when most are as long as the row before or one shorter, which the processor guesses.
SM_PASS_INLINE i64 batch_rows(const UpperRows& a, i64 i, i64 until) {
  const i64* start = a.row_start + i;
  i64 rows = std::min(until - i, kBatchRows);
  while (rows >= kLeastBatch && start[rows] - start[0] > kBatchEntries * rows) rows /= 2;
  if (rows < kLeastBatch) return 0;
  i64 uneven = 0, few = 0;
  for (i64 r = 1; r < kLeastBatch; ++r) {
    const i64 length = start[r + 1] - start[r];
    const i64 more = length - (start[r] - start[r - 1]);
    uneven += more != 0 && more != -1;
    few += length <= kPiece;
  }
  return 4 * uneven > kLeastBatch && 2 * few > kLeastBatch ? rows : 0;
}

// Whether a product finds batches that are worth cutting each time, judged by a few places.
SM_PASS_INLINE bool is_uneven(const UpperRows& a) {
  constexpr i64 looks = 8;
  if (!a.is_ascending || a.rows < kRemembered) return false;
  i64 found = 0;
  for (i64 k = 0; k < looks; ++k) found += batch_rows(a, k * (a.rows / looks), a.rows) > 0;
  return 4 * found >= looks;
}

// What becomes of a diagonal, which is no part of a piece, while its row is cut.
struct LeaveDiagonal {
  SM_PASS_INLINE void operator()(i64, i64) const {}
};
struct AddDiagonal {
  const double* value;
  const double* x;
  double* y;
  SM_PASS_INLINE void operator()(i64 i, i64 p) const { y[i] += value[p] * x[i]; }
};

// Rows that have entries off the diagonal first, then those by length: two short loops without surprises.
template <class Diagonal>
SM_PASS_TARGET __attribute__((noinline)) void cut_rows(const UpperRows& a, i64 i, i64 rows, const Diagonal& diagonal,
                                                       Pieces& to) {
  struct {
    i64 row, entry;
  } listed[kBatchRows];
  const i64* __restrict start = a.row_start + i;
  const i64* __restrict column = a.col_index;
  const i64 first = start[0];
  i64 reach = 0, count = 0;
  for (i64 r = 0, p = first; r < rows; ++r) {
    const i64 end = start[r + 1];
    if (p == end) continue;
    fetch_entries(a, p);
    reach = std::max(reach, column[end - 1]);
    if (column[p] == i + r) diagonal(i + r, p++);
    listed[count] = {r, p - first};
    count += p < end;
    p = end;
  }
  std::fill_n(to.count, kLengths, i64{0});
  for (i64 k = 0; k < count; ++k) {
    const auto row = static_cast<std::uint16_t>(listed[k].row);
    i64 entry = listed[k].entry;
    const i64 left = start[row + 1] - first - entry;
    const bool whole = left > 2 * kPiece;
    const bool two = left > kPiece && !whole;
    const i64 rest = whole ? kWhole : two ? left - kPiece : left;
    to.of[kPiece][to.count[kPiece]] = {row, static_cast<std::uint16_t>(entry)};
    to.count[kPiece] += two;
    entry += two ? kPiece : 0;
    to.of[rest][to.count[rest]++] = {row, static_cast<std::uint16_t>(entry)};
  }
  to.rows = rows;
  to.reach = reach;
}

SM_PASS_INLINE Batch batch_of(i64 i, const Pieces& pieces) {
  Batch b = {i, pieces.rows, pieces.reach, pieces.count, {}};
  for (i64 length = 0; length < kLengths; ++length) b.of[length] = pieces.of[length];
  return b;
}

// Rows, reach and counts in a word each, and then the pieces. Answers where they end.
SM_PASS_INLINE i64* write_batch(const Batch& b, i64* list) {
  *list++ = b.rows;
  *list++ = b.reach;
  list = std::copy_n(b.count, kLengths, list);
  Piece* const first = reinterpret_cast<Piece*>(list);
  Piece* to = first;
  for (i64 length = 0; length < kLengths; ++length) to = std::copy_n(b.of[length], b.count[length], to);
  return list + (to - first + kPiecesInWord - 1) / kPiecesInWord;
}
SM_PASS_INLINE const i64* read_batch(const i64* list, i64 i, Batch& b) {
  b = {i, list[0], list[1], list + 2, {}};
  list += 2 + kLengths;
  const Piece* const first = reinterpret_cast<const Piece*>(list);
  const Piece* from = first;
  for (i64 length = 0; length < kLengths; ++length) {
    b.of[length] = from;
    from += b.count[length];
  }
  return list + (from - first + kPiecesInWord - 1) / kPiecesInWord;
}

template <int kCount>
SM_PASS_INLINE double exchange_piece(const i64* __restrict column, const double* __restrict value, double t,
                                     const double* x, double* y) {
  double part[kPiece] = {};
#pragma GCC unroll 8
  for (int e = 0; e < kCount; ++e) {
    const i64 k = column[e];
    part[e] = value[e] * x[k];
    y[k] += value[e] * t;
  }
  double sum = part[0];
  if constexpr (kCount > 1) sum += part[1];
  if constexpr (kCount == 3) sum += part[2];
  if constexpr (kCount > 3) sum += part[2] + part[3];
  if constexpr (kCount == 5) sum += part[4];
  if constexpr (kCount == 6) sum += part[4] + part[5];
  if constexpr (kCount == 7) sum += (part[4] + part[5]) + part[6];
  if constexpr (kCount == 8) sum += (part[4] + part[5]) + (part[6] + part[7]);
  return sum;
}

// All pieces of a length. Answers the sum of what they give their rows, each times the row's element of x.
template <int kCount>
SM_PASS_INLINE double exchange_length(const UpperRows& a, const Batch& b, const double* x, double* y) {
  const i64 first = a.row_start[b.i];
  const double* const xi = x + b.i;
  double* const yi = y + b.i;
  double form = 0.0;
  const Piece* const end = b.of[kCount] + b.count[kCount];
  for (const Piece* piece = b.of[kCount]; piece < end; ++piece) {
    const i64 p = first + piece->entry;
    const double t = xi[piece->row];
    const double sum = exchange_piece<kCount>(a.col_index + p, a.values + p, t, x, y);
    yi[piece->row] += sum;
    form += t * sum;
  }
  return form;
}

// What is off the diagonal.
template <bool kForm>
SM_PASS_TARGET __attribute__((noinline)) void exchange_batch(const UpperRows& a, const Batch& b, const double* x,
                                                             double* y, Sums& form) {
  Sums part{};
  part[0] = exchange_length<1>(a, b, x, y);
  part[1] = exchange_length<2>(a, b, x, y);
  part[2] = exchange_length<3>(a, b, x, y);
  part[3] = exchange_length<4>(a, b, x, y);
  part[4] = exchange_length<5>(a, b, x, y);
  part[5] = exchange_length<6>(a, b, x, y);
  part[6] = exchange_length<7>(a, b, x, y);
  part[7] = exchange_length<8>(a, b, x, y);
  for (i64 k = 0; k < b.count[kWhole]; ++k) {
    const Piece piece = b.of[kWhole][k];
    const i64 i = b.i + piece.row;
    const double sum = exchange_row(a, a.row_start[b.i] + piece.entry, a.row_start[i + 1], x[i], x, y);
    y[i] += sum;
    if constexpr (kForm) part[0] += x[i] * sum;
  }
  if constexpr (kForm) form += 2.0 * part;
}

// Its diagonal. Entries are fetched here: pieces take them out of order.
template <bool kForm>
SM_PASS_TARGET __attribute__((noinline)) void exchange_diagonals(const UpperRows& a, const Batch& b, const double* x,
                                                                 double* y, Sums& form) {
  double part = 0.0;
  for (i64 i = b.i; i < b.i + b.rows; ++i) {
    const i64 p = a.row_start[i];
    if (p == a.row_start[i + 1]) continue;
    fetch_entries(a, p);
    if (a.col_index[p] != i) continue;
    const double diagonal = a.values[p] * x[i];
    y[i] += diagonal;
    if constexpr (kForm) part += diagonal * x[i];
  }
  if constexpr (kForm) form[0] += part;
}
