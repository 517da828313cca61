#include "model/model.hpp"

#include <cmath>
#include <cstring>
#include <sstream>

namespace sm::test {

double missing_value() {
  const std::uint64_t bits = SM_MISSING_BITS;
  double value = 0;
  std::memcpy(&value, &bits, sizeof value);
  return value;
}

bool same_value(double a, double b) { return a == b || (std::isnan(a) && std::isnan(b)); }

Index Model::nnz() const {
  Index count = 0;
  for (Index r = 0; r < rows; ++r)
    for (Index c = 0; c < cols; ++c) count += stored(r, c) != 0;
  return count;
}

bool Model::has(Index r, Index c) const {
  if (r >= rows || c >= cols) return false;
  return symmetric() ? stored(std::min(r, c), std::max(r, c)) != 0 : stored(r, c) != 0;
}

double Model::at(Index r, Index c) const {
  if (!has(r, c)) return 0.0;
  return symmetric() ? v(std::min(r, c), std::max(r, c)) : v(r, c);
}

Values Model::full() const {
  Values out(rows, cols);
  for (Index r = 0; r < rows; ++r)
    for (Index c = 0; c < cols; ++c) out(r, c) = at(r, c);
  return out;
}

void Model::set(Index r, Index c, double value) {
  v(r, c) = value;
  stored(r, c) = 1;
  touched += 1;
}

void Model::leave_open(Index r, Index c) {
  if (stored(r, c)) return;
  if (open.rows() != rows || open.cols() != cols) open.reshape(rows, cols);
  open(r, c) = 1;
}

void Model::void_results() {
  rank = 0;
  log_det = missing_value();
  touched += 1;
}

void Model::changed() {
  void_results();
  if (!dense() || state < SM_STATE_FACTORED) return;
  if (separate) {
    separate = false;
    state = SM_STATE_CLOSED;
  } else {
    spoiled = true;
  }
}

Mask places(std::int32_t kind, Index rows, Index cols) {
  Mask mask(rows, cols);
  for (Index r = 0; r < rows; ++r)
    for (Index c = 0; c < cols; ++c)
      mask(r, c) = kind == SM_KIND_GENERAL || (kind == SM_KIND_SYMMETRIC && r <= c) || r == c;
  return mask;
}

Index slots(std::int32_t kind, Index rows, Index cols) {
  if (kind == SM_KIND_GENERAL) return rows * cols;
  return kind == SM_KIND_SYMMETRIC ? rows * (rows + 1) / 2 : rows;
}

Index slot_of(std::int32_t kind, std::int32_t format, Index rows, Index cols, Index r, Index c) {
  const bool by_columns = format == SM_FORMAT_COLUMNS;
  if (kind == SM_KIND_DIAGONAL) return r;
  if (kind == SM_KIND_GENERAL) return by_columns ? r + c * rows : c + r * cols;
  if (by_columns) return r + c * (c + 1) / 2;
  Index before = 0;
  for (Index i = 0; i < r; ++i) before += rows - i;
  return before + c - r;
}

std::vector<double> array_of(std::int32_t kind, std::int32_t format, const Values& v) {
  std::vector<double> out(static_cast<std::size_t>(slots(kind, v.rows(), v.cols())));
  const Mask mask = places(kind, v.rows(), v.cols());
  for (Index r = 0; r < v.rows(); ++r)
    for (Index c = 0; c < v.cols(); ++c)
      if (mask(r, c)) out[static_cast<std::size_t>(slot_of(kind, format, v.rows(), v.cols(), r, c))] = v(r, c);
  return out;
}

std::string describe(const Model& model) {
  std::ostringstream text;
  text.precision(17);
  text << "kind " << model.kind << " format " << model.format << " state " << model.state << " " << model.rows << "x"
       << model.cols << " nnz " << model.nnz() << (model.separate ? " separate" : "") << (model.lent ? " tied" : "")
       << (model.spoiled ? " spoiled" : "") << " {";
  for (Index r = 0; r < model.rows; ++r)
    for (Index c = 0; c < model.cols; ++c)
      if (model.stored(r, c)) text << "(" << r << "," << c << ")" << model.v(r, c) << " ";
  text << "}";
  return text.str();
}

}  // namespace sm::test
