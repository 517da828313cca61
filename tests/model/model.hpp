// A plain model of one matrix record: what it is, and its elements as a dense table with a mask of what is stored. It
// is written from the headers and knows nothing of the module's sources; only observation.cpp looks into a record.
#pragma once

#include <qxesm/qxesm.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <optional>
#include <string>
#include <vector>

namespace sm::test {

using Index = std::int64_t;
constexpr double kNan = std::numeric_limits<double>::quiet_NaN();

double missing_value();
bool same_value(double a, double b);  // equal, or both NaN

// A dense table of any element, by rows.
template <class T>
class Table {
 public:
  Table() = default;
  Table(Index rows, Index cols) : rows_(rows), cols_(cols), v_(static_cast<std::size_t>(rows * cols)) {}
  Index rows() const { return rows_; }
  Index cols() const { return cols_; }
  T& operator()(Index r, Index c) { return v_[static_cast<std::size_t>(r * cols_ + c)]; }
  const T& operator()(Index r, Index c) const { return v_[static_cast<std::size_t>(r * cols_ + c)]; }
  // Keeps what both shapes have.
  void reshape(Index rows, Index cols) {
    Table next(rows, cols);
    for (Index r = 0; r < std::min(rows, rows_); ++r)
      for (Index c = 0; c < std::min(cols, cols_); ++c) next(r, c) = (*this)(r, c);
    *this = next;
  }

 private:
  Index rows_ = 0;
  Index cols_ = 0;
  std::vector<T> v_;
};
using Values = Table<double>;
using Mask = Table<char>;

// The factor of a symmetric sparse matrix: rows of U and reciprocal pivots in the new order.
struct SparseFactor {
  Values u;
  std::vector<double> reciprocal;
};

constexpr int kUnknown = -2;  // definiteness that nothing promises

struct Model {
  SmMatrix* handle = nullptr;  // the module's record, or null
  std::int32_t kind = SM_KIND_NONE;
  std::int32_t format = SM_FORMAT_NONE;
  std::int32_t state = SM_STATE_OPEN;
  Index rows = 0;
  Index cols = 0;
  Index rank = -1;
  double log_det = missing_value();
  int definite = -1;
  Index word = 0;           // the user word of the iterative solver
  Values v;                 // zero where nothing is stored; of a symmetric matrix the upper triangle
  Mask stored;              // of a dense matrix: the places that it has
  bool compressed = false;  // symmetric sparse: compressed rows are there
  bool separate = false;    // dense and diagonal: a separate factor or inverse array is there
  Values w;                 // its elements
  bool leftover = false;    // below state 5 such an array may be there: a factorization was refused
  double* lent = nullptr;   // the caller's array that is tied
  std::vector<Index> perm;  // symmetric sparse, state 2 and above
  SparseFactor factor;      // symmetric sparse, state 5
  // The values replaced by a factor or inverse, and changed since: what they mean then is left to the caller, and only
  // calls that read values as values are made.
  bool spoiled = false;
  // How far the elements (of v and of w) may be from the prediction where the order of arithmetic is free; 0: to the
  // bit.
  double slack = 0;
  double separate_slack = 0;
  bool reads_factor = false;  // the call has left a new sparse factor: compared within factor_slack, then taken over
  double factor_slack = 0;
  bool takes_cached = false;  // nothing is promised about rank and log-determinant after this answer: take them over
  Mask open;                  // places of a sparse matrix that may hold a rounded zero or nothing: taken over
  bool unsure = false;        // a pivot fell too near a limit for a prediction
  Index touched = 0;          // grows whenever entries, size or type change

  bool none() const { return kind == SM_KIND_NONE; }
  bool general() const { return kind == SM_KIND_GENERAL; }
  bool symmetric() const { return kind == SM_KIND_SYMMETRIC; }
  bool diagonal() const { return kind == SM_KIND_DIAGONAL; }
  bool sparse() const { return format == SM_FORMAT_SPARSE; }
  bool dense() const { return !none() && !sparse(); }
  bool general_sparse() const { return general() && sparse(); }
  bool symmetric_sparse() const { return symmetric() && sparse(); }
  bool packed() const { return symmetric() && !sparse(); }
  Index nnz() const;
  bool empty() const { return nnz() < 1; }
  // Readable: a closed state, and compressed rows where they are needed.
  bool closed() const { return state >= SM_STATE_CLOSED && (!symmetric_sparse() || compressed || empty()); }
  bool in_place() const { return dense() && state >= SM_STATE_FACTORED && !separate; }
  double at(Index r, Index c) const;                         // both triangles of a symmetric matrix
  bool has(Index r, Index c) const;                          // likewise
  Values full() const;                                       // rows x cols
  const Values& second() const { return separate ? w : v; }  // where a factor or an inverse is
  void set(Index r, Index c, double value);                  // stores; the caller has made sure that it fits
  void leave_open(Index r, Index c);                         // may be stored, as a rounded zero, or not
  void void_results();
  void changed();  // values changed: what becomes of rank, log-determinant and factor of any record
};

// The places that a dense or diagonal matrix has.
Mask places(std::int32_t kind, Index rows, Index cols);
// The slot of a stored element in the array of a dense or diagonal matrix, and the number of slots.
Index slot_of(std::int32_t kind, std::int32_t format, Index rows, Index cols, Index r, Index c);
Index slots(std::int32_t kind, Index rows, Index cols);
// The array that a dense or diagonal matrix would have for these elements.
std::vector<double> array_of(std::int32_t kind, std::int32_t format, const Values& v);

// Compares a record with its model; takes over what was compared within a slack. Empty when nothing differs.
std::string difference(Model& model);
std::string describe(const Model& model);
// The model of a record as it is found, for a record whose last call was refused memory; nothing when it has lost the
// storage of its type, so that only a reset or a new size leads on.
std::optional<Model> found(const Model& before, SmMatrix* handle);
// Whether the elements of `now` are those of `before`, or those that were predicted instead.
bool kept(const Model& now, const Model& before, const Model& predicted);

}  // namespace sm::test
