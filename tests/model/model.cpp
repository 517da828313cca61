#include "model/model.hpp"

#include <algorithm>
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
}

void Model::void_results() {
  rank = 0;
  log_det = missing_value();
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

namespace {

struct Observed {
  Values v;
  Mask stored;
  std::string broken;  // what is wrong with the storage itself
  void put(Index r, Index c, double value) {
    if (r < 0 || c < 0 || r >= v.rows() || c >= v.cols() || stored(r, c)) {
      broken = "an entry outside, or one that is stored twice";
      return;
    }
    v(r, c) = value;
    stored(r, c) = 1;
  }
};

void walk_trees(const SmMatrix& m, std::uint64_t* roots, Observed& out) {
  for (Index r = 0; roots && r < m.rows; ++r) {
    if (roots[r] == 0) continue;
    Index last = -1;
    for (const NonzeroNode* node = m.tree->first(m.tree, roots + r); node; node = sm_node_next(node)) {
      if (node->key <= last) out.broken = "a row that does not ascend";
      last = node->key;
      out.put(r, node->key, node->value);
    }
  }
}

void walk_rows(const SmMatrix& m, Observed& out) {
  if (m.row_start[0] != 0 || m.row_start[m.rows] != m.nnz) out.broken = "row offsets";
  for (Index r = 0; r < m.rows; ++r) {
    if (m.col_index[m.row_start[r]] != r) out.broken = "a row that does not begin with its diagonal";
    for (Index p = m.row_start[r]; p < m.row_start[r + 1]; ++p) {
      const Index c = m.col_index[p];
      if (m.state < SM_STATE_REORDERED && p > m.row_start[r] && c <= m.col_index[p - 1]) out.broken = "columns";
      out.put(std::min(r, c), std::max(r, c), m.nz_values[p]);
    }
  }
}

void read_array(const Model& model, const double* array, Observed& out) {
  out.stored = places(model.kind, model.rows, model.cols);
  for (Index r = 0; r < model.rows; ++r)
    for (Index c = 0; c < model.cols; ++c)
      if (out.stored(r, c)) out.v(r, c) = array[slot_of(model.kind, model.format, model.rows, model.cols, r, c)];
}

Observed observe(const Model& model) {
  const SmMatrix& m = *model.handle;
  Observed out{Values(model.rows, model.cols), Mask(model.rows, model.cols), ""};
  if (model.none() || model.rows < 1) return out;
  if (model.general_sparse())
    walk_trees(m, m.row_roots, out);
  else if (model.symmetric_sparse() && model.compressed && m.row_start)
    walk_rows(m, out);
  else if (model.symmetric_sparse())
    walk_trees(m, m.sym_roots, out);
  else if (m.values)
    read_array(model, m.values, out);
  return out;
}

bool agree(double got, double want, double slack) {
  return same_value(got, want) || (slack > 0 && std::fabs(got - want) <= slack);
}

std::string compare_values(const Values& got, const Values& want, double slack, const char* of) {
  for (Index r = 0; r < want.rows(); ++r)
    for (Index c = 0; c < want.cols(); ++c)
      if (!agree(got(r, c), want(r, c), slack)) {
        std::ostringstream text;
        text.precision(17);
        text << of << " (" << r << ", " << c << ") is " << got(r, c) << ", not " << want(r, c) << " within " << slack;
        return text.str();
      }
  return "";
}

SparseFactor decode(const SmMatrix& m) {
  SparseFactor f{Values(m.rows, m.rows), {}};
  for (Index k = 0; k < m.rows; ++k) {
    f.reciprocal.push_back(m.factor_diag[k]);
    f.u(k, k) = 1;
    for (Index p = m.factor_iu[k]; p < m.factor_iu[k + 1]; ++p)
      f.u(k, m.factor_ju[m.factor_iju[k] + p - m.factor_iu[k]]) = -m.factor_values[p];
  }
  return f;
}

std::string compare_factor(Model& model) {
  const SparseFactor got = decode(*model.handle);
  for (std::size_t k = 0; k < got.reciprocal.size(); ++k)
    if (!agree(got.reciprocal[k], model.factor.reciprocal[k], model.factor_slack)) return "a reciprocal pivot differs";
  std::string text = compare_values(got.u, model.factor.u, model.factor_slack, "element of U");
  model.factor = got;
  model.reads_factor = false;
  return text;
}

std::string compare_elements(Model& model) {
  const Observed seen = observe(model);
  if (!seen.broken.empty()) return seen.broken;
  for (Index r = 0; r < model.rows; ++r)
    for (Index c = 0; c < model.cols; ++c)
      if ((seen.stored(r, c) != 0) != (model.stored(r, c) != 0))
        return "stored or not: (" + std::to_string(r) + ", " + std::to_string(c) + ")";
  std::string text = compare_values(seen.v, model.v, model.slack, "element");
  model.v = seen.v;
  model.slack = 0;
  return text;
}

std::string compare_separate(Model& model) {
  const SmMatrix& m = *model.handle;
  if (!model.dense() || model.empty()) return "";
  // Below state 5 nothing promises whether an array that a refused factorization took is still there.
  if (model.state < SM_STATE_FACTORED) {
    model.separate = m.dense_factor != nullptr;
    model.w = model.v;
    return "";
  }
  if ((m.dense_factor != nullptr) != model.separate) return "the separate array is there, or is not";
  if (!model.separate) return "";
  Observed seen{Values(model.rows, model.cols), Mask(model.rows, model.cols), ""};
  read_array(model, m.dense_factor, seen);
  std::string text = compare_values(seen.v, model.w, model.separate_slack, "element of the separate array");
  model.w = seen.v;
  model.separate_slack = 0;
  return text;
}

std::string compare_fields(Model& model) {
  const SmMatrix& m = *model.handle;
  std::ostringstream text;
  const auto field = [&](const char* name, auto got, auto want) {
    if (got != want) text << name << " is " << got << ", not " << want << "; ";
  };
  field("kind", m.kind, model.kind);
  field("format", m.format, model.format);
  field("state", m.state, model.state);
  field("rows", m.rows, model.rows);
  field("cols", m.cols, model.cols);
  field("nnz", m.nnz, model.nnz());
  if (model.takes_cached) {
    model.rank = m.rank;
    model.log_det = m.log_det;
    model.takes_cached = false;
  }
  field("rank", m.rank, model.rank);
  if (model.definite == kUnknown) model.definite = m.definite;
  field("definite", m.definite, model.definite);
  if (!agree(m.log_det, model.log_det, 1e-9 * (1 + std::fabs(model.log_det))))
    text << "log_det is " << m.log_det << ", not " << model.log_det << "; ";
  if (std::isnan(model.log_det) && std::memcmp(&m.log_det, &model.log_det, sizeof(double)) != 0)
    text << "log_det is another NaN than the missing value; ";
  model.log_det = m.log_det;
  if (model.lent && m.values != model.lent) text << "the tied array is not the matrix's; ";
  if (model.dense() && !model.empty() && (m.owns_values != 0) != (model.lent == nullptr)) text << "ownership; ";
  return text.str();
}

}  // namespace

std::string difference(Model& model) {
  if (!model.handle) return "";
  std::string text = compare_fields(model);
  if (text.empty()) text = compare_elements(model);
  if (text.empty()) text = compare_separate(model);
  if (text.empty() && model.reads_factor) text = compare_factor(model);
  return text;
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
