#include <cmath>
#include <cstring>
#include <sstream>

#include "model/model.hpp"

namespace sm::test {

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
  model.open = Mask();
  return text;
}

// Whether an open place is stored is taken over from a record of the same shape.
void settle_open_places(Model& model) {
  const SmMatrix& m = *model.handle;
  if (model.open.rows() == 0) return;
  if (m.kind != model.kind || m.format != model.format || m.rows != model.rows || m.cols != model.cols) return;
  const Observed seen = observe(model);
  for (Index r = 0; r < std::min(model.rows, model.open.rows()); ++r)
    for (Index c = 0; c < std::min(model.cols, model.open.cols()); ++c)
      if (model.open(r, c)) model.stored(r, c) = seen.stored(r, c);
}

std::string compare_separate(Model& model) {
  const SmMatrix& m = *model.handle;
  if (!model.dense() || model.empty()) return "";
  // Below state 5 nothing promises whether an array that a refused factorization took is still there; no other is.
  if (model.state < SM_STATE_FACTORED) {
    if (m.dense_factor && !model.leftover) return "a separate array below state 5";
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
  field("solver_word", m.solver_word, model.word);
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
  settle_open_places(model);
  std::string text = compare_fields(model);
  if (text.empty()) text = compare_elements(model);
  if (text.empty()) text = compare_separate(model);
  if (text.empty() && model.reads_factor) text = compare_factor(model);
  return text;
}

namespace {

bool has_storage(const SmMatrix& m) {
  if (m.kind == SM_KIND_NONE) return true;
  if (m.format != SM_FORMAT_SPARSE) return m.values != nullptr || slots(m.kind, m.rows, m.cols) == 0;
  if (!m.tree) return false;
  if (m.rows == 0) return true;
  if (m.kind == SM_KIND_GENERAL) return m.row_roots && m.spare_node;
  if (m.state == SM_STATE_OPEN) return m.sym_roots && m.spare_node;
  return m.row_start && m.col_index && m.nz_values;
}

}  // namespace

std::optional<Model> found(const Model& before, SmMatrix* handle) {
  const SmMatrix& m = *handle;
  if (!has_storage(m)) return std::nullopt;
  Model now;
  now.handle = handle;
  now.kind = m.kind;
  now.format = m.format;
  now.state = m.state;
  now.rows = m.rows;
  now.cols = m.cols;
  now.rank = m.rank;
  now.log_det = m.log_det;
  now.definite = m.definite;
  now.word = m.solver_word;
  now.compressed = now.symmetric_sparse() && m.row_start != nullptr;
  now.separate = now.leftover = now.dense() && m.dense_factor != nullptr;
  if (now.dense() && m.values && m.values == before.lent) now.lent = before.lent;
  const Observed seen = observe(now);
  now.v = seen.v;
  now.stored = seen.stored;
  if (now.separate) {
    Observed second{Values(now.rows, now.cols), Mask(now.rows, now.cols), ""};
    read_array(now, m.dense_factor, second);
    now.w = second.v;
  }
  now.spoiled = now.in_place();
  if (now.symmetric_sparse() && now.state >= SM_STATE_ORDERED) now.perm.assign(m.perm, m.perm + m.rows);
  if (now.symmetric_sparse() && now.state == SM_STATE_FACTORED) now.factor = decode(m);
  return now;
}

bool kept(const Model& now, const Model& before, const Model& predicted) {
  if (now.kind != before.kind || now.format != before.format) return false;
  if (now.rows != before.rows || now.cols != before.cols) return false;
  // Inverting in place takes a separate factor for the values before it asks for work.
  if (before.separate && !now.separate && compare_values(now.v, before.w, 0, "").empty()) return true;
  return compare_values(now.full(), before.full(), 0, "").empty() ||
         compare_values(now.full(), predicted.full(), predicted.slack, "").empty();
}

}  // namespace sm::test
