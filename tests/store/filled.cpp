#include "store/filled.hpp"

#include <algorithm>
#include <cmath>

#include "cholesky/cholesky_support.hpp"

namespace sm::test {

namespace {

constexpr double kMark = -98765.4375;

bool has_place(Shape shape, std::int64_t r, std::int64_t c) {
  if (shape.kind == SM_KIND_DIAGONAL) return r == c;
  return shape.kind == SM_KIND_GENERAL || r <= c;
}

Dense dense_of(Shape shape, std::int64_t rows, std::int64_t cols, const Nonzeros& elements) {
  Dense a(rows, cols);
  for (const auto& [place, value] : elements) {
    a(place.first, place.second) = value;
    if (shape.kind == SM_KIND_SYMMETRIC) a(place.second, place.first) = value;
  }
  return a;
}

}  // namespace

SmMatrix* sized(Session& session, Shape shape, std::int64_t rows, std::int64_t cols) {
  SmMatrix* m = nullptr;
  EXPECT_EQ(session.fn().qxsmnew(session.instance(), &m, shape.kind, shape.format), SM_OK) << name_of(shape);
  EXPECT_EQ(session.fn().qxsmresize(m, rows, cols), SM_OK) << name_of(shape);
  return m;
}

Filled filled_with(Session& session, Shape shape, std::int64_t rows, std::int64_t cols, const Nonzeros& elements) {
  SmMatrix* m = sized(session, shape, rows, cols);
  Nonzeros stored = elements;
  for (std::int64_t r = 0; r < rows; ++r)
    for (std::int64_t c = 0; c < cols; ++c)
      if (has_place(shape, r, c) && (!is_sparse(shape) || (shape.kind == SM_KIND_SYMMETRIC && r == c))) {
        stored.try_emplace({r, c}, 0.0);
      }
  for (const auto& [place, value] : stored) {
    EXPECT_EQ(session.fn().qxsmassign(m, place.first, place.second, 0, value), SM_OK) << name_of(shape);
  }
  EXPECT_EQ(session.fn().qxsmclose(m, kNan), SM_OK);
  EXPECT_EQ(m->nnz, static_cast<std::int64_t>(stored.size()));
  EXPECT_EQ(m->state, SM_STATE_CLOSED);
  return {shape, m, dense_of(shape, rows, cols, stored), stored};
}

Filled filled(Session& session, Shape shape, std::int64_t rows, std::int64_t cols, Random& random) {
  Nonzeros elements;
  for (std::int64_t r = 0; r < rows; ++r)
    for (std::int64_t c = 0; c < cols; ++c) {
      const bool last = r == rows - 1 && c == cols - 1;
      if (!has_place(shape, r, c) || (is_sparse(shape) && !last && random.chance(50))) continue;
      elements[{r, c}] = random.chance(10) ? 0.0 : random.dyadic();
    }
  return filled_with(session, shape, rows, cols, elements);
}

Filled filled_definite(Session& session, Shape shape, std::int64_t n, Random& random) {
  Nonzeros elements;
  for (const Entry& e : positive_definite(random_graph(random, n, 40), random).upper) {
    if (has_place(shape, e.row, e.col)) elements[{e.row, e.col}] = e.value;
  }
  return filled_with(session, shape, n, n, elements);
}

Unclosed unclosed(Session& session, Shape shape) {
  Unclosed open;
  if (is_sparse(shape)) {
    open.matrix = sized(session, shape, 3, 3);
    EXPECT_EQ(session.fn().qxsmassign(open.matrix, 0, 1, 0, 1.5), SM_OK);
    open.matrix->state = SM_STATE_OPEN;  // where a symmetric one is anyway
  } else {
    open.data.assign(9, 1.5);
    open.matrix = new_open_tied(session, open.data, 3, 3, shape.kind, shape.format);
  }
  return open;
}

SmMatrix* without_rows(Session& session, std::int64_t n) {
  SmMatrix* m = sized(session, kSymmetricSparse, n, n);
  EXPECT_EQ(session.fn().qxsmresize(m, n, n + 1), SM_NOT_SQUARE);
  EXPECT_EQ(m->state, SM_STATE_CLOSED);
  EXPECT_EQ(m->row_start, nullptr);
  return m;
}

SmMatrix* untyped(Session& session, bool entries) {
  SmMatrix* m = new_untyped(session);
  if (entries) m->nnz = 1;
  return m;
}

Nonzeros contents(SmMatrix* m) {
  if (m->kind == SM_KIND_GENERAL && m->format == SM_FORMAT_SPARSE) return walk(m, m->row_roots);
  if (m->format == SM_FORMAT_SPARSE) return m->sym_roots ? walk(m, m->sym_roots) : compressed(m);
  const Shape shape{m->kind, m->format};
  Nonzeros out;
  for (std::int64_t r = 0; r < m->rows; ++r)
    for (std::int64_t c = 0; c < m->cols; ++c) {
      if (!has_place(shape, r, c)) continue;
      std::int64_t slot = m->format == SM_FORMAT_COLUMNS ? r + c * m->rows : c + r * m->cols;
      if (m->kind == SM_KIND_SYMMETRIC) slot = packed_position(m->rows, m->format, r, c);
      if (m->kind == SM_KIND_DIAGONAL) slot = r;
      out[{r, c}] = m->values[slot];
    }
  EXPECT_EQ(static_cast<std::int64_t>(out.size()), m->nnz);
  return out;
}

Dense dense_contents(SmMatrix* m) { return dense_of({m->kind, m->format}, m->rows, m->cols, contents(m)); }

std::vector<double> row_major(const Dense& a) {
  std::vector<double> v;
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = 0; c < a.cols(); ++c) v.push_back(static_cast<double>(a(r, c)));
  return v;
}

::testing::AssertionResult same(const Dense& got, const Dense& want) { return near(got, want, 0.0); }

std::vector<double> row_from(Shape shape, const Dense& a, std::int64_t row, std::int64_t start) {
  std::vector<double> out(at(a.cols()), 0.0);
  const std::int64_t s = std::max<std::int64_t>(start, 0);
  const auto element = [&](std::int64_t c) { return static_cast<double>(a(row, c)); };
  for (std::int64_t c = 0; c < a.cols(); ++c) {
    if (shape.kind == SM_KIND_DIAGONAL) {
      if (c == row) out[at(c)] = element(c);
    } else if (shape.kind == SM_KIND_GENERAL) {
      if (c >= s) out[at(shape.format == SM_FORMAT_ROWS ? c - s : c)] = element(c);
    } else if (shape.format == SM_FORMAT_COLUMNS) {
      if (c > row) out[at(c)] = element(c);
      if (c >= s && c <= row) out[at(c - s)] = element(c);
    } else if (c >= row || c >= s) {
      out[at(c)] = element(c);
    }
  }
  return out;
}

Output::Output(std::int64_t n) : words_(at(n) + 2 * static_cast<std::size_t>(kGuard), kMark) {}

Output::~Output() {
  for (std::size_t k = 0; k < static_cast<std::size_t>(kGuard); ++k) {
    EXPECT_EQ(words_[k], kMark) << "before the output";
    EXPECT_EQ(words_[words_.size() - 1 - k], kMark) << "behind the output";
  }
}

bool Output::untouched() const {
  return std::all_of(words_.begin(), words_.end(), [](double v) { return v == kMark; });
}

bool Output::cleared() const {
  const std::vector<double> v = values();
  return std::all_of(v.begin(), v.end(), [](double x) { return bits(x) == 0; });
}

}  // namespace sm::test
