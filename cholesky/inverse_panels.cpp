// Selected inversion of the rows of a block with a long tail: Z on the tail is collected in panels, each of them used
// for the rows and for the columns that it stands for.
#include <algorithm>

#include "cholesky/inverse_work.hpp"

namespace sm {

namespace {

class PanelInversion {
 public:
  PanelInversion(const InverseRows& z, i64 first, InverseWork& work)
      : z_(z),
        u_(z.tree.at(first)),
        out_(z.at(first)),
        diag_(z.u.diag + first),
        work_(work),
        tiles_(tile_kernels()),
        height_(tiles_.strip_rows) {}
  void run();

 private:
  i64 last_strip() const { return (u_.width - 1) / height_ * height_; }
  i64 rows_of(i64 r) const { return std::min(height_, u_.width - r); }
  void turn();
  void find_coefficients(i64 begin, i64 end, double* out) const;
  void add_product(const double* coefficient, i64 depth, const double* panel, i64 to, i64 columns);
  void multiply_tail();
  void solve_tail();
  void solve_own();
  void store_own();

  const InverseRows& z_;
  const Block u_;
  const Block out_;
  const double* diag_;
  InverseWork& work_;
  const TileKernels& tiles_;
  i64 height_;
};

// A full panel.
void PanelInversion::turn() {
  const double* row[kMostStripRows];
  for (i64 i = 0; i < kInversePanel; i += height_) {
    for (i64 s = 0; s < height_; ++s) row[s] = work_.panel + (i + s) * kInversePanel;
    tiles_.turn(row, kInversePanel, work_.turned + i, kInversePanel);
  }
}

// -U in tail columns [begin, end), strip by strip.
void PanelInversion::find_coefficients(i64 begin, i64 end, double* out) const {
  for (i64 r = 0; r < u_.width; r += height_) {
    out = strip_coefficients(u_, diag_, r, rows_of(r), u_.width + begin, u_.width + end, out);
  }
}

// The rows' places from `to` on += the coefficients times the panel.
void PanelInversion::add_product(const double* coefficient, i64 depth, const double* panel, i64 to, i64 columns) {
  const TileSource source = {panel, kInversePanel, 0, tiles_.tile_columns};
  for (i64 r = 0; r < u_.width; r += height_, coefficient += depth * height_) {
    const int rows = static_cast<int>(rows_of(r));
    double* target[kMostStripRows];
    for (int i = 0; i < rows; ++i) target[i] = out_.row(r + rows - 1 - i) + u_.width + to;
    tiles_.strip(rows, depth, coefficient, source, columns, target, Finish::add);
  }
}

// -U times Z on the tail.
void PanelInversion::multiply_tail() {
  const i64 tail = u_.tail_length();
  for (i64 r = 0; r < u_.width; ++r) std::fill_n(out_.row(r) + u_.width, tail, 0.0);
  const Square panel = {work_.panel, kInversePanel};
  for (i64 a = 0; a < tail; a += kInversePanel) {
    const i64 a_end = std::min(a + kInversePanel, tail);
    find_coefficients(a, a_end, work_.coefficient);
    for (i64 b = a; b < tail; b += kInversePanel) {
      const i64 b_end = std::min(b + kInversePanel, tail);
      gather(z_, {u_.tail, a, a_end, b, b_end}, panel, work_.place);
      add_product(work_.coefficient, a_end - a, work_.panel, b, b_end - b);
      if (a == b) continue;
      turn();
      find_coefficients(b, b_end, work_.turned_coefficient);
      add_product(work_.turned_coefficient, b_end - b, work_.turned, a, a_end - a);
    }
  }
}

// Each row takes the ones below it, a few columns at a time that stay in the second-level cache for all strips.
void PanelInversion::solve_tail() {
  const i64 places = u_.length + 1;
  for (i64 begin = u_.width; begin < places; begin += 2 * kInversePanel) {
    const i64 end = std::min(begin + 2 * kInversePanel, places);
    for (i64 r = last_strip(); r >= 0; r -= height_) {
      const int rows = static_cast<int>(rows_of(r));
      const i64 below = r + rows;
      double* own = strip_coefficients(u_, diag_, r, rows, below, u_.width, work_.coefficient);
      triangle_coefficients(u_, diag_, r, rows, own);
      double* target[kMostStripRows];
      for (int i = 0; i < rows; ++i) target[i] = out_.row(below - 1 - i) + begin;
      const TileSource source = {out_.row(below) + begin, u_.length - below - 1, 1, tiles_.tile_columns};
      tiles_.strip(rows, u_.width - below, work_.coefficient, source, end - begin, target, Finish::solve);
    }
  }
}

// The block's own square: what the tail adds, panel by panel, and then as any square.
void PanelInversion::solve_own() {
  const Square own = {work_.square, kMostBlockRows};
  for (i64 r = 0; r < u_.width; ++r) std::fill_n(own.row(r), u_.width, 0.0);
  const i64 tail = u_.tail_length();
  for (i64 a = 0; a < tail; a += kInversePanel) {
    const i64 end = std::min(a + kInversePanel, tail);
    for (i64 s = 0; s < u_.width; ++s) {
      const double* from = out_.row(s) + u_.width + a;
      for (i64 k = 0; k < end - a; ++k) work_.turned[k * kMostBlockRows + s] = from[k];
    }
    for (i64 r = 0; r < u_.width; r += height_) {
      const int rows = static_cast<int>(rows_of(r));
      strip_coefficients(u_, diag_, r, rows, u_.width + a, u_.width + end, work_.coefficient);
      double* target[kMostStripRows];
      for (int i = 0; i < rows; ++i) target[i] = own.row(r + rows - 1 - i) + r;
      const TileSource source = {work_.turned + r, kMostBlockRows, 0, tiles_.tile_columns};
      tiles_.strip(rows, end - a, work_.coefficient, source, u_.width - r, target, Finish::add);
    }
  }
  solve_square(u_, diag_, own, u_.width, nullptr, work_);
}

void PanelInversion::store_own() {
  for (i64 r = 0; r < u_.width; ++r) {
    const double* from = work_.square + r * kMostBlockRows;
    std::copy(from + r + 1, from + u_.width, out_.row(r) + r + 1);
    z_.diag[u_.first + r] = from[r];
  }
}

void PanelInversion::run() {
  if (u_.tail_length() > 0) {
    multiply_tail();
    solve_tail();
  }
  solve_own();
  store_own();
}

}  // namespace

void invert_in_panels(const InverseRows& z, i64 first, InverseWork& work) { PanelInversion(z, first, work).run(); }

}  // namespace sm
