// Copies, conversions and loading.
#include "model/machine.hpp"

namespace sm::test {

namespace {

bool same_type(const Model& a, const Model& b) { return a.kind == b.kind && a.format == b.format; }

void copy_factored(const Model& source, Model& target) {
  SmMatrix* handle = target.handle;
  const Index touched = target.touched + 1;
  target = source;
  target.handle = handle;
  target.touched = touched;
}

SmStatus model_clone(const Model& source, Model& target, bool reassemble) {
  if (source.none()) return SM_UNTYPED;
  if (!source.closed()) return SM_NOT_CLOSED;
  target.word = source.word;
  const SmStatus sized = model_resize(target, source.rows, source.cols);
  if (sized != SM_OK) return sized;
  if (source.empty()) {
    if (source.symmetric_sparse() && !reassemble) target.state = source.state;
    return SM_OK;
  }
  if (!same_type(source, target)) return SM_KIND_MISMATCH;
  if (source.symmetric_sparse() && !reassemble) {
    copy_factored(source, target);
    return SM_OK;
  }
  target.v = source.v;
  target.stored = source.stored;
  target.touched += 1;
  return SM_OK;
}

void call_clone(Machine& m) {
  Model* source = m.any();
  if (!source) return;
  Model* target = m.random.chance(80) ? m.any([&](const Model& x) { return same_type(x, *source); }) : m.any();
  if (!target) return;
  // Which state an empty symmetric sparse target takes from an empty source of another type is left out.
  if (source->empty() && !source->symmetric_sparse() && target->symmetric_sparse()) return;
  const bool reassemble = m.random.chance(40);
  m.begin("qxsmclone", *source, *target, reassemble);
  const SmStatus got = m.fn().qxsmclone(source->handle, target->handle, reassemble);
  m.answer(got, source == target ? SM_OK : model_clone(*source, *target, reassemble));
}

bool convertible(const Model& source, const Model& target) {
  if (source.general()) return target.general();
  return source.diagonal() || !target.diagonal();
}

}  // namespace

SmStatus model_convert(const Model& source, Model& target, bool flag) {
  if (source.none()) return SM_UNTYPED;
  if (!source.closed()) return SM_NOT_CLOSED;
  if (same_type(source, target)) return model_clone(source, target, flag);
  const SmStatus sized = model_resize(target, source.rows, source.cols);
  if (sized != SM_OK) return sized;
  if (!convertible(source, target)) return SM_UNAVAILABLE;
  for (Index r = 0; r < source.rows; ++r)
    for (Index c = 0; c < source.cols; ++c)
      if (source.has(r, c) && (target.general() || c >= r)) target.set(r, c, source.at(r, c));
  if (target.symmetric_sparse()) model_close(target, 0.0);
  return SM_OK;
}

namespace {

void call_convert(Machine& m) {
  Model* source = m.any();
  Model* target = m.any();
  if (!source || !target) return;
  const bool flag = m.random.chance(50);
  m.begin("qxsmconvert", *source, *target, flag);
  const SmStatus got = m.fn().qxsmconvert(source->handle, target->handle, flag);
  m.answer(got, source == target ? SM_OK : model_convert(*source, *target, flag));
}

SmStatus model_load(Model& m, const double* values, Index rows, Index cols, std::int32_t kind, std::int32_t format) {
  if (!values) return SM_OK;
  if (format == SM_FORMAT_SPARSE) return SM_UNAVAILABLE;
  const bool fits = m.kind == kind && m.format == format && m.rows == rows && m.cols == cols;
  if (!fits) {
    if (m.none()) return SM_UNTYPED;
    model_new(m, SM_KIND_NONE, SM_FORMAT_NONE);
    if (kind != SM_KIND_GENERAL && kind != SM_KIND_SYMMETRIC && kind != SM_KIND_DIAGONAL) return SM_UNAVAILABLE;
    if (format != SM_FORMAT_COLUMNS && format != SM_FORMAT_ROWS) return SM_BAD_FORMAT;
    model_new(m, kind, format);
    const SmStatus sized = model_resize(m, rows, cols);
    if (sized != SM_OK) return sized;
  }
  for (Index r = 0; r < rows; ++r)
    for (Index c = 0; c < cols; ++c)
      if (m.stored(r, c)) m.v(r, c) = values[slot_of(kind, format, rows, cols, r, c)];
  m.void_results();
  m.definite = kUnknown;  // nothing is said about it when only values change
  if (m.in_place()) m.spoiled = true;
  return SM_OK;
}

void call_load(Machine& m) {
  Model* record = m.any();
  if (!record) return;
  const std::int32_t kinds[] = {SM_KIND_GENERAL, SM_KIND_SYMMETRIC, SM_KIND_DIAGONAL, 5};
  std::int32_t kind = kinds[m.random.below(m.random.chance(5) ? 4 : 3)];
  std::int32_t format = static_cast<std::int32_t>(22 + m.random.below(2) - (m.random.chance(10) ? 1 : 0));
  if (m.random.chance(4)) format = 24;
  // Shapes without elements are left out: whether they fit cannot be told from the values.
  Index rows = 1 + m.order();
  Index cols = kind == SM_KIND_GENERAL && m.random.chance(50) ? 1 + m.order() : rows;
  if (m.random.chance(4)) cols += 1;
  if (m.random.chance(3)) rows = -1;
  if (record->dense() && !record->empty() && m.random.chance(50))
    kind = record->kind, format = record->format, rows = record->rows, cols = record->cols;
  const std::vector<double> values = m.dyadics((kLargestOrder + 2) * (kLargestOrder + 2));
  const double* data = m.random.chance(4) ? nullptr : values.data();
  m.begin("qxsmcopyv", *record, data != nullptr, rows, cols, kind, format);
  m.asks_for(kind, format);
  const SmStatus got = qxsmcopyv(data, record->handle, rows, cols, kind, format);
  m.answer(got, model_load(*record, data, rows, cols, kind, format));
}

}  // namespace

void add_copying_calls(std::vector<Call>& list) {
  list.insert(list.end(), {{call_clone, 10}, {call_convert, 14}, {call_load, 5}});
}

}  // namespace sm::test
