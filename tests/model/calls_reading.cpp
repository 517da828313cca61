// Elements, rows, blocks, diagonals and dense copies.
#include <bit>
#include <cmath>

#include "model/machine.hpp"

namespace sm::test {

namespace {

SmStatus want_element(const Model& x, Index row, Index col, double& value) {
  value = missing_value();
  if (x.empty()) {
    value = 0;
    return SM_NO_ELEMENT;
  }
  if (!x.closed()) return SM_NOT_CLOSED;
  if (row < 0 || col < 0 || row >= x.rows || col >= x.cols) return SM_OUTSIDE;
  if (x.packed() && col < row) {
    // The place is counted as for any pair; one outside the array is an index outside.
    const std::vector<double> array = array_of(x.kind, x.format, x.v);
    const Index n = x.rows;
    const Index at =
        x.format == SM_FORMAT_COLUMNS ? row + col * (col + 1) / 2 : (2 * n - row + 1) * row / 2 - row + col;
    if (at < 0 || at >= static_cast<Index>(array.size())) return SM_OUTSIDE;
    value = array[static_cast<std::size_t>(at)];
    return SM_OK;
  }
  if (x.symmetric_sparse() && (col < row || (x.state > SM_STATE_CLOSED && row != col))) return SM_NO_ELEMENT;
  value = x.diagonal() ? x.v(row, row) : x.at(row, col);
  return SM_OK;
}

}  // namespace

double element_read(const Model& x, Index row, Index col) {
  double value = 0;
  want_element(x, row, col, value);
  return value;
}

namespace {

void call_get(Machine& m) {
  Model* record = m.any();
  if (!record) return;
  const Index row = m.place(record->rows);
  const Index col = m.place(record->cols);
  double value = Wanted::kUntouched;
  double want = 0;
  m.begin("qxsmget", *record, row, col);
  const SmStatus got = m.fn().qxsmget(record->handle, row, col, &value);
  m.answer(got, want_element(*record, row, col, want));
  m.same(value, want, 0, "element");
  if (std::isnan(want) && !is_missing(value)) m.wrong("not the missing value");
}

}  // namespace

SmStatus want_row(const Model& x, Index row, Index start, Wanted& out) {
  if (const auto status = not_readable(x)) return *status;
  if (row < 0 || row >= x.rows) return SM_OUTSIDE;
  out.clear(x.cols);
  if (x.symmetric_sparse() && x.state > SM_STATE_ORDERED) return SM_REORDERED;
  start = std::max<Index>(start, 0);
  const bool moves = (x.general() && x.format == SM_FORMAT_ROWS) || (x.symmetric() && x.format == SM_FORMAT_COLUMNS);
  for (Index c = 0; c < x.cols; ++c) {
    if (!x.has(row, c)) continue;
    const bool in_block = x.symmetric() && x.format == SM_FORMAT_COLUMNS ? c <= row : x.general();
    const bool always = x.symmetric() ? (in_block ? false : c >= row) : x.diagonal();
    if (!always && c < start) continue;
    out.set(moves && in_block ? c - start : c, x.at(row, c));
  }
  return SM_OK;
}

namespace {

void call_row(Machine& m) {
  Model* record = m.any();
  if (!record) return;
  const Index row = m.place(record->rows);
  const Index start = m.random.chance(50) ? 0 : m.random.below(record->cols + 2) - 1;
  m.begin("qxsmrow", *record, row, start);
  std::vector<double> out = m.blank(record->cols + 2);
  Wanted want(record->cols + 2);
  const SmStatus got = qxsmrow(record->handle, row, out.data(), start);
  m.answer(got, want_row(*record, row, start, want));
  m.output(out.data(), want);
}

SmStatus want_upper_row(const Model& x, Index row, Wanted& out) {
  if (const auto status = not_readable(x)) return *status;
  out.clear(x.cols);
  if (!x.symmetric()) return SM_UNAVAILABLE;
  if (x.sparse() && x.state > SM_STATE_ORDERED) return SM_REORDERED;
  if (x.format == SM_FORMAT_COLUMNS) return SM_UNAVAILABLE;
  if (row < 0 || row >= x.rows) return SM_OUTSIDE;
  for (Index c = row; c < x.cols; ++c) out.set(c, x.at(row, c));
  return SM_OK;
}

void call_upper_row(Machine& m) {
  Model* record = m.random.chance(70) ? m.any([](const Model& x) { return x.symmetric(); }) : m.any();
  if (!record) return;
  const Index row = m.place(record->rows);
  m.begin("qxsmUpperRow", *record, row);
  std::vector<double> out = m.blank(record->cols + 2);
  Wanted want(record->cols + 2);
  const SmStatus got = qxsmUpperRow(record->handle, row, out.data());
  m.answer(got, want_upper_row(*record, row, want));
  m.output(out.data(), want);
}

struct Block {
  Index r0, r1, c0, c1;
  Index height() const { return r1 - r0 + 1; }
  Index width() const { return c1 - c0 + 1; }
  Index size() const { return height() > 0 && width() > 0 ? height() * width() : 0; }
};

SmStatus want_block(const Model& x, const Block& b, Wanted& out) {
  out.clear(b.size());
  if (const auto status = not_readable(x)) return *status;
  if (!x.symmetric_sparse()) return SM_UNAVAILABLE;
  if (x.state > SM_STATE_ORDERED) return SM_REORDERED;
  for (const Index i : {b.r0, b.r1, b.c0, b.c1})
    if (i < 0 || i >= x.rows) return SM_OUTSIDE;
  if (b.r0 > b.r1 || b.c0 > b.c1 || b.c0 < b.r0) return SM_OUTSIDE;
  for (Index i = b.r0; i <= b.r1; ++i)
    for (Index j = std::max(b.c0, i); j <= b.c1; ++j) {
      if (!x.stored(i, j)) continue;
      out.set((i - b.r0) * b.width() + j - b.c0, x.v(i, j));
      const Index mirrored = (j - b.c0) * b.width() + i - b.r0;
      if (i >= b.c0 && j > i && mirrored < b.size()) out.set(mirrored, x.v(i, j));
    }
  return SM_OK;
}

void call_upper_block(Machine& m) {
  Model* record = m.random.chance(80) ? m.any([](const Model& x) { return x.symmetric_sparse(); }) : m.any();
  if (!record) return;
  Block b{m.random.below(record->rows + 1) - (m.random.chance(3) ? 1 : 0), 0, 0, 0};
  b.r1 = b.r0 + m.random.below(m.random.chance(80) ? 4 : record->rows + 1) - (m.random.chance(5) ? 1 : 0);
  b.c0 = b.r0 + (m.random.chance(50) ? 0 : m.random.below(3)) - (m.random.chance(5) ? 1 : 0);
  b.c1 = b.c0 + m.random.below(4) - (m.random.chance(5) ? 1 : 0);
  m.begin("qxsmUpperSub", *record, b.r0, b.r1, b.c0, b.c1);
  std::vector<double> out = m.blank(b.size() + 2);
  Wanted want(b.size() + 2);
  const SmStatus got = qxsmUpperSub(record->handle, out.data(), b.r0, b.r1, b.c0, b.c1);
  m.answer(got, want_block(*record, b, want));
  m.output(out.data(), want);
}

SmStatus want_diagonal(const Model& x, Index first, Index last, Wanted& out) {
  if (const auto status = not_readable(x)) return *status;
  const Index n = std::min(x.rows, x.cols);
  if (first < 0 || last < first || last >= n) return SM_OUTSIDE;
  for (Index i = first; i <= last; ++i) out.set(i - first, x.at(i, i));
  return SM_OK;
}

void call_diagonal(Machine& m) {
  Model* record = m.any();
  if (!record) return;
  const Index first = m.random.below(record->rows + 1) - (m.random.chance(3) ? 1 : 0);
  const Index length = m.random.below(m.random.chance(70) ? 4 : record->rows + 2) - (m.random.chance(5) ? 1 : 0);
  const Index last = first + length;
  m.begin("qxsmdiag", *record, first, last);
  std::vector<double> out = m.blank(last - first + 3);
  Wanted want(last - first + 3);
  const SmStatus got = m.fn().qxsmdiag(record->handle, out.data(), first, last);
  m.answer(got, want_diagonal(*record, first, last, want));
  m.output(out.data(), want);
}

Index dense_size(const Model& x, int mode) {
  return mode == 2 || x.none() ? x.rows * x.cols : slots(x.kind, x.rows, x.cols);
}

SmStatus want_dense(const Model& x, int mode, Wanted& out) {
  if (const auto status = not_readable(x)) return *status;
  out.clear(dense_size(x, mode));
  if (mode < 0 || mode > 2 || (x.general() && mode != 2)) return SM_UNAVAILABLE;
  const std::int32_t format = mode == 0 ? SM_FORMAT_COLUMNS : SM_FORMAT_ROWS;
  for (Index r = 0; r < x.rows; ++r)
    for (Index c = 0; c < x.cols; ++c) {
      if (mode == 2) out.set(r * x.cols + c, x.at(r, c));
      if (mode != 2 && x.stored(r, c)) out.set(slot_of(x.kind, format, x.rows, x.cols, r, c), x.v(r, c));
    }
  return SM_OK;
}

void call_dense(Machine& m) {
  Model* record = m.any();
  if (!record) return;
  const int mode = static_cast<int>(m.random.chance(50) ? 2 : m.random.below(5) - 1);
  m.begin("qxsmdense", *record, mode);
  std::vector<double> out = m.blank(dense_size(*record, mode) + 2);
  Wanted want(dense_size(*record, mode) + 2);
  const SmStatus got = m.fn().qxsmdense(record->handle, out.data(), static_cast<std::int16_t>(mode));
  m.answer(got, want_dense(*record, mode, want));
  m.output(out.data(), want);
}

void call_is_diagonal(Machine& m) {
  Model* record = m.any();
  if (!record) return;
  const double tolerances[] = {0.0, kNan, 2.0, 100.0};
  const double tolerance = tolerances[m.random.below(4)];
  std::int16_t flag = 77;
  m.begin("qxsmIsDiag", *record, tolerance);
  const SmStatus got = m.fn().qxsmIsDiag(record->handle, &flag, tolerance);
  SmStatus want = SM_OK;
  std::int16_t diagonal = 0;
  if (record->diagonal()) {
    diagonal = !record->empty();
  } else if (!record->empty() && !record->closed()) {
    want = SM_NOT_CLOSED;
  } else if (!record->empty() && record->rows != record->cols) {
    want = SM_DIMENSION_MISMATCH;
  } else if (!record->empty()) {
    diagonal = 1;
    for (Index r = 0; r < record->rows; ++r)
      for (Index c = 0; c < record->cols; ++c)
        if (r != c && std::fabs(record->at(r, c)) > (std::isnan(tolerance) ? 0.0 : tolerance)) diagonal = 0;
  }
  m.answer(got, want);
  if (flag != diagonal) m.wrong("flag " + std::to_string(flag));
}

}  // namespace

namespace {

void read_rank(Machine& m, Model& x) {
  if (x.general() || x.state < SM_STATE_FACTORED) return;
  Index rank = 0;
  double log_det = 0;
  if (m.fn().qxsmrank(x.handle, &rank) != SM_OK || rank != x.rank) m.wrong("rank read back");
  if (m.fn().qxsmlogdet(x.handle, &log_det) != SM_OK) m.wrong("log-determinant read back");
  m.same(log_det, x.log_det, 1e-9 * (1 + std::fabs(x.log_det)), "log-determinant read back");
}

}  // namespace

void read_back(Machine& m, Model& x, Index which) {
  const Index n = std::min(x.rows, x.cols);
  const Index row = which % x.rows;
  Wanted want(x.rows * x.cols);
  std::vector<double> out = m.blank(want.size());
  SmStatus got = SM_OK;
  SmStatus expected = SM_OK;
  if (which % 5 == 0) {
    got = m.fn().qxsmdense(x.handle, out.data(), 2);
    expected = want_dense(x, 2, want);
  } else if (which % 5 == 1) {
    got = qxsmrow(x.handle, row, out.data(), 0);
    expected = want_row(x, row, 0, want);
  } else if (which % 5 == 2) {
    got = m.fn().qxsmdiag(x.handle, out.data(), 0, n - 1);
    expected = want_diagonal(x, 0, n - 1, want);
  } else if (which % 5 == 3) {
    double element = 0;
    expected = want_element(x, row, which % x.cols, element);
    want.set(0, element);
    got = m.fn().qxsmget(x.handle, row, which % x.cols, out.data());
  } else {
    read_rank(m, x);
  }
  if (got != expected) m.wrong("read back with the answer " + std::to_string(got));
  m.output(out.data(), want);
}

void add_reading_calls(std::vector<Call>& list) {
  list.insert(list.end(), {{call_get, 12},
                           {call_row, 10},
                           {call_upper_row, 6},
                           {call_upper_block, 8},
                           {call_diagonal, 6},
                           {call_dense, 8},
                           {call_is_diagonal, 5}});
}

}  // namespace sm::test
