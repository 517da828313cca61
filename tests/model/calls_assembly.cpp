// Values put in, changed and taken out one by one or all at once.
#include "model/machine.hpp"

namespace sm::test {

namespace {

void put(Model& m, Index r, Index c, bool add, double value) {
  m.set(r, c, add && m.stored(r, c) ? m.v(r, c) + value : value);
}

void grow(Model& m, Index rows, Index cols) {
  m.rows = std::max(m.rows, rows);
  m.cols = std::max(m.cols, cols);
  m.v.reshape(m.rows, m.cols);
  m.stored.reshape(m.rows, m.cols);
}

SmStatus assign_sparse(Model& m, Index row, Index col, bool add, double value) {
  if (m.symmetric()) {
    if (m.state != SM_STATE_OPEN) return SM_ALREADY_CLOSED;
    grow(m, std::max(row, col) + 1, std::max(row, col) + 1);
  } else {
    grow(m, row + 1, col + 1);
  }
  put(m, row, col, add, value);
  m.changed();
  return SM_OK;
}

}  // namespace

SmStatus model_assign(Model& m, Index row, Index col, bool add, double value) {
  if (m.rows < 1) return SM_OK;
  if (row < 0 || col < 0) return SM_BAD_ARGUMENT;
  if (m.general() && m.dense()) {
    // The position decides, so that an index past one dimension reaches another element.
    constexpr Index kFar = Index{1} << 31;
    if (row >= kFar || col >= kFar) return SM_BAD_ARGUMENT;
    const bool by_columns = m.format == SM_FORMAT_COLUMNS;
    const Index position = by_columns ? col * m.rows + row : col + row * m.cols;
    if (position >= m.rows * m.cols) return SM_BAD_ARGUMENT;
    row = by_columns ? position % m.rows : position / m.cols;
    col = by_columns ? position / m.rows : position % m.cols;
  } else if (m.diagonal()) {
    if (row >= m.rows || row != col) return SM_BAD_ARGUMENT;
  } else if (m.symmetric()) {
    if (col < row) return SM_OUTSIDE;
    if (m.dense() && col >= m.cols) return SM_BAD_ARGUMENT;
  }
  if (m.sparse()) return assign_sparse(m, row, col, add, value);
  put(m, row, col, add, value);
  m.changed();
  return SM_OK;
}

namespace {

void call_assign(Machine& m) {
  // A closed symmetric sparse matrix refuses everything: it is not asked as often.
  Model* record = m.any([&](const Model& x) {
    return x.rows > 0 && (!x.symmetric_sparse() || x.state == SM_STATE_OPEN || m.random.chance(10));
  });
  if (!record) return;
  for (Index count = 1 + m.random.below(5); count > 0 && !m.loose(); --count) {
    Index row = m.random.below(std::max<Index>(record->rows, 1));
    Index col = m.random.below(std::max<Index>(record->cols, 1));
    if (!record->general() && row > col && m.random.chance(90)) std::swap(row, col);
    if (record->diagonal() && m.random.chance(90)) col = row;
    // A sparse matrix grows to what it is given, so that far indices are for the others.
    if (m.random.chance(3)) row = record->sparse() ? m.random.below(9) - 1 : m.place(record->rows);
    if (m.random.chance(3)) col = record->sparse() ? m.random.below(9) - 1 : m.place(record->cols);
    // Large diagonals make some matrices definite, so that factors are met as well as refusals.
    double value = m.dyadic();
    if (row == col && m.random.chance(70)) value = 24 + value;
    const bool add = m.random.chance(50);
    m.begin("qxsmassign", *record, row, col, add, value);
    const SmStatus got = m.fn().qxsmassign(record->handle, row, col, add ? 7 : 0, value);
    m.answer(got, model_assign(*record, row, col, add, value));
  }
}

void call_setee(Machine& m) {
  Model* record = m.any();
  if (!record) return;
  const double value = m.dyadic();
  m.begin("qxsmsetee", *record, value);
  const SmStatus got = m.fn().qxsmsetee(record->handle, value);
  if (record->empty()) return m.answer(got, SM_OK);
  if (!record->closed()) return m.answer(got, SM_NOT_CLOSED);
  m.answer(got, SM_OK);
  for (Index r = 0; r < record->rows; ++r)
    for (Index c = 0; c < record->cols; ++c)
      if (record->stored(r, c)) record->v(r, c) = value;
  record->changed();
  if (record->symmetric_sparse() && record->state == SM_STATE_FACTORED) record->state = SM_STATE_SYMBOLIC;
}

SmStatus model_zscp(Model& m, const std::vector<double>& z, bool given, const Index* index, double weight) {
  const Index length = static_cast<Index>(z.size());
  if (m.empty()) return SM_OK;
  if (length > m.rows || (!given && length > 0)) return SM_BAD_ARGUMENT;
  if (!m.symmetric()) return SM_UNAVAILABLE;
  if (m.sparse() && m.state != SM_STATE_OPEN) return SM_ALREADY_CLOSED;
  for (Index i = 0; i < length; ++i)
    for (Index j = i; j < length; ++j) {
      const double zi = z[static_cast<std::size_t>(i)];
      const double zj = z[static_cast<std::size_t>(j)];
      if (!index && (zi == 0 || zj == 0)) continue;
      const Index row = index ? std::min(index[i], index[j]) : i;
      const Index col = index ? std::max(index[i], index[j]) : j;
      const SmStatus status = model_assign(m, row, col, true, weight == 1.0 ? zj * zi : zj * zi * weight);
      if (status != SM_OK) return status;
    }
  return SM_OK;
}

void call_zscp(Machine& m) {
  Model* record = m.random.chance(60) ? m.any([](const Model& x) { return x.symmetric() && x.state < 2; }) : m.any();
  if (!record) return;
  const Index length = m.random.below(record->rows + 1) + (m.random.chance(4) ? 1 : 0);
  const std::vector<double> z = m.dyadics(length);
  std::vector<Index> index(static_cast<std::size_t>(length) + 1);
  for (Index& i : index) i = m.random.chance(3) ? m.random.below(9) - 1 : m.random.below(record->rows + 1);
  for (Index& i : index)
    if (i == record->rows && m.random.chance(90)) i = 0;
  const bool plain = m.random.chance(40);
  const double weights[] = {1.0, 0.5, -1.0, 2.0};
  const double weight = weights[m.random.below(4)];
  const bool given = !m.random.chance(2);
  m.begin("qxsmzscp", *record, given, plain, length, weight);
  const Index* rows = plain ? nullptr : index.data();
  const SmStatus got = m.fn().qxsmzscp(record->handle, given ? z.data() : nullptr, rows, length, weight);
  m.answer(got, model_zscp(*record, z, given, rows, weight));
}

void call_remove(Machine& m) {
  Model* record = m.random.chance(80) ? m.any([](const Model& x) { return x.general_sparse(); }) : m.any();
  if (!record) return;
  const Index row = m.place(record->rows);
  const Index col = m.place(record->cols);
  m.begin("qxsmremove", *record, row, col);
  const SmStatus got = qxsmremove(record->handle, row, col);
  if (record->empty()) return m.answer(got, SM_OK);
  if (row < 0 || col < 0 || row >= record->rows || col >= record->cols) return m.answer(got, SM_OUTSIDE);
  if (!record->general_sparse()) return m.answer(got, SM_UNAVAILABLE);
  m.answer(got, SM_OK);
  record->v(row, col) = 0;
  record->stored(row, col) = 0;
  record->touched += 1;
}

}  // namespace

void add_assembly_calls(std::vector<Call>& list) {
  list.insert(list.end(), {{call_assign, 40}, {call_setee, 3}, {call_zscp, 12}, {call_remove, 6}});
}

}  // namespace sm::test
