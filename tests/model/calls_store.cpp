// Creation, sizes, reset, ties, closing.
#include <bit>
#include <cmath>

#include "model/machine.hpp"

namespace sm::test {

void model_new(Model& m, std::int32_t kind, std::int32_t format) {
  SmMatrix* handle = m.handle;
  const Index touched = m.touched + 1;
  m = Model();
  m.handle = handle;
  m.touched = touched;
  m.kind = kind;
  m.format = format;
}

void model_reset(Model& m) {
  model_new(m, SM_KIND_NONE, SM_FORMAT_NONE);
  m.definite = kUnknown;
}

SmStatus model_resize(Model& m, Index rows, Index cols) {
  if (m.none()) return SM_UNTYPED;
  if (rows < 0 || cols < 0 || (rows == 0) != (cols == 0)) return SM_BAD_SIZE;
  m.void_results();
  m.definite = -1;
  m.state = SM_STATE_CLOSED;
  if (!m.general() && rows != cols) {
    m.spoiled = false;
    m.leftover = m.leftover || m.separate;
    m.perm.clear();
    return SM_NOT_SQUARE;
  }
  if (m.rows != rows || m.cols != cols) m.lent = nullptr;
  m.rows = rows;
  m.cols = cols;
  m.v = Values(rows, cols);
  m.stored = m.sparse() ? Mask(rows, cols) : places(m.kind, rows, cols);
  m.separate = m.compressed = m.spoiled = m.leftover = false;
  m.w = Values();
  m.open = Mask();
  m.perm.clear();
  if (m.symmetric_sparse()) {
    m.state = SM_STATE_OPEN;
    for (Index i = 0; i < rows; ++i) m.set(i, i, 0.0);
  }
  return SM_OK;
}

SmStatus model_close(Model& m, double tolerance) {
  if (m.empty()) {
    m.state = SM_STATE_CLOSED;
    return SM_OK;
  }
  if (m.state > SM_STATE_OPEN) return SM_OK;
  const double least = tolerance < 0 ? std::bit_cast<double>(SM_DROP_TOLERANCE_BITS) : tolerance;
  for (Index r = 0; r < m.rows; ++r)
    for (Index c = 0; c < m.cols; ++c) {
      if (m.symmetric_sparse() && r == c) m.stored(r, c) = 1;
      if (!m.stored(r, c) || !(std::fabs(m.v(r, c)) <= least)) continue;
      m.v(r, c) = 0.0;
      if (m.sparse() && !(m.symmetric() && r == c)) m.stored(r, c) = 0;
    }
  m.compressed = m.symmetric_sparse();
  m.state = SM_STATE_CLOSED;
  return SM_OK;
}

namespace {

SmStatus type_status(std::int32_t kind, std::int32_t format) {
  const bool known = kind == SM_KIND_GENERAL || kind == SM_KIND_SYMMETRIC || kind == SM_KIND_DIAGONAL;
  if (!known) return SM_UNAVAILABLE;
  const bool array = format == SM_FORMAT_COLUMNS || format == SM_FORMAT_ROWS;
  return array || (format == SM_FORMAT_SPARSE && kind != SM_KIND_DIAGONAL) ? SM_OK : SM_BAD_FORMAT;
}

// Each record has a type that it mostly takes, so that the pool has some of every type.
std::array<std::int32_t, 2> draw_type(Machine& m, const Model& record) {
  const Index usual = m.number(record) % static_cast<Index>(kTypes.size());
  auto type = kTypes[static_cast<std::size_t>(m.random.chance(70) ? usual : m.random.below(8))];
  if (m.random.chance(3)) type[0] = static_cast<std::int32_t>(m.random.below(8));
  if (m.random.chance(3)) type[1] = static_cast<std::int32_t>(20 + m.random.below(5));
  return type;
}

// A record to be typed: a new one, or one that was reset. A typed one would lose what it holds.
Model* untyped(Machine& m) {
  Model* record = m.random.chance(50) ? m.vacant() : m.only([](const Model& x) { return x.none(); });
  return record;
}

void call_new(Machine& m) {
  Model* record = untyped(m);
  if (!record) return;
  const auto [kind, format] = draw_type(m, *record);
  m.begin("qxsmnew", *record, kind, format);
  m.asks_for(kind, format);
  const SmStatus want = type_status(kind, format);
  SmMatrix* handle = record->handle;
  m.answer(m.fn().qxsmnew(m.instance(), &handle, kind, format), want);
  if (want != SM_OK) {
    if (handle != record->handle) m.wrong("a refused creation has stored a handle");
    if (record->handle) model_new(*record, SM_KIND_NONE, SM_FORMAT_NONE);
    return;
  }
  record->handle = handle;
  model_new(*record, kind, format);
}

void call_new_sized(Machine& m) {
  Model* record = untyped(m);
  if (!record) return;
  const Index n = m.random.chance(4) ? -1 : m.order();
  const Index k = m.random.chance(40) ? n : m.order();
  const Index which = m.random.below(4);
  const char* names[] = {"qxsmnewss", "qxsmnewds", "qxsmnewsg", "qxsmnewsd"};
  const std::size_t types[] = {3, 4, 0, 7};
  const auto type = kTypes[types[which]];
  m.begin(names[which], *record, n, k);
  m.asks_for(type[0], type[1]);
  SmStatus got = SM_OK;
  if (which == 0) got = m.fn().qxsmnewss(m.instance(), &record->handle, n);
  if (which == 1) got = m.fn().qxsmnewds(m.instance(), &record->handle, n);
  if (which == 2) got = m.fn().qxsmnewsg(m.instance(), &record->handle, n, k);
  if (which == 3) got = m.fn().qxsmnewsd(m.instance(), &record->handle, n);
  model_new(*record, type[0], type[1]);
  m.answer(got, model_resize(*record, n, which == 2 ? k : n));
}

void call_resize(Machine& m) {
  Model* record = m.any();
  if (!record) return;
  Index rows = m.order();
  Index cols = (record->general() && m.random.chance(50)) || m.random.chance(3) ? m.order() : rows;
  if (m.random.chance(25)) rows = record->rows, cols = record->cols;
  if (m.random.chance(3)) rows = -1;
  m.begin("qxsmresize", *record, rows, cols);
  m.answer(m.fn().qxsmresize(record->handle, rows, cols), model_resize(*record, rows, cols));
}

void call_delete(Machine& m) {
  Model* record = m.any();
  if (!record) return;
  m.begin("qxsmdelete", *record);
  m.answer(m.fn().qxsmdelete(record->handle), SM_OK);
  model_reset(*record);
}

void call_destroy(Machine& m) {
  Model* record = m.any();
  if (!record) return;
  m.begin("qxsmDestroyMatrix", *record);
  m.answer(m.fn().qxsmDestroyMatrix(m.instance(), &record->handle), SM_OK);
  if (record->handle) m.wrong("the handle is still there");
  *record = Model();
}

SmStatus model_tie(Model& m, double* data, Index rows, Index cols, std::int32_t kind, std::int32_t format) {
  if ((!data && (rows > 0 || cols >= 1)) || rows < 0 || cols < 0) return SM_BAD_ARGUMENT;
  model_resize(m, 0, 0);
  const bool known = kind == SM_KIND_GENERAL || kind == SM_KIND_SYMMETRIC || kind == SM_KIND_DIAGONAL;
  if (!known) return SM_UNAVAILABLE;
  if (kind != SM_KIND_GENERAL && rows != cols) return SM_NOT_SQUARE;
  if (format != SM_FORMAT_COLUMNS && format != SM_FORMAT_ROWS) return SM_UNAVAILABLE;
  m.kind = kind;
  m.format = format;
  m.rows = rows;
  m.cols = cols;
  m.lent = data;
  m.v = Values(rows, cols);
  m.stored = places(kind, rows, cols);
  for (Index r = 0; r < rows; ++r)
    for (Index c = 0; c < cols; ++c)
      if (m.stored(r, c)) m.v(r, c) = data[slot_of(kind, format, rows, cols, r, c)];
  return SM_OK;
}

void call_tie(Machine& m) {
  Model* record = m.random.chance(35) ? m.any([](const Model& x) { return x.none(); }) : m.any();
  if (!record) return;
  const auto [kind, format] = draw_type(m, *record);
  const Index rows = m.order();
  Index cols = (kind == SM_KIND_GENERAL && m.random.chance(50)) || m.random.chance(3) ? m.order() : rows;
  if (m.random.chance(3)) cols = -1;
  double* data = m.random.chance(4) ? nullptr : m.lend(m.dyadics(kLargestOrder * kLargestOrder));
  m.begin("qxsmtie", *record, data != nullptr, rows, cols, kind, format);
  m.asks_for(kind, format);
  const SmStatus got = qxsmtie(record->handle, data, rows, cols, kind, format);
  m.answer(got, model_tie(*record, data, rows, cols, kind, format));
}

void call_close(Machine& m) {
  Model* record = m.random.chance(70) ? m.any([](const Model& x) { return x.state == SM_STATE_OPEN; }) : m.any();
  if (!record) return;
  const double tolerances[] = {0.0, -1.0, kNan, 0.5, 2.0};
  const double tolerance = tolerances[m.random.below(5)];
  m.begin("qxsmclose", *record, tolerance);
  m.answer(m.fn().qxsmclose(record->handle, tolerance), model_close(*record, tolerance));
}

}  // namespace

void add_store_calls(std::vector<Call>& list) {
  list.insert(list.end(), {{call_new, 8},
                           {call_new_sized, 10},
                           {call_resize, 10},
                           {call_delete, 5},
                           {call_destroy, 3},
                           {call_tie, 8},
                           {call_close, 25}});
}

}  // namespace sm::test
