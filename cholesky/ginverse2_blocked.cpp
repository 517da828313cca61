// The blocked road of ginverse2, band after band in slabs, with the tile kernels of the sparse factorization:
//   A -> R    left-looking: a band takes the updates of all rows above it, is factored, and its rows are solved for.
//   R -> M    M = R'^-, a lower triangle, by forward substitution: the rows of band B of M need of R only the columns
//             of band B, whose place they take.
//   M -> M'M  the generalized inverse: band S adds M(S, i)'M(S, j) to the bands before it, then becomes its own part.
// A dropped pivot has a row of zeros in R and in M.
//
// Blocked Cholesky and its inverse: Anderson et al., "LAPACK Users' Guide", 3rd ed., SIAM (1999). Panels for each level
// of the cache: Goto and van de Geijn, "Anatomy of high-performance matrix multiplication", ACM TOMS 34(3) (2008).
#include <cstdint>

#include "cholesky/band_solver.hpp"
#include "cholesky/ginverse2.hpp"
#include "frame/memory.hpp"

namespace sm {

namespace {

constexpr i64 kDepth = 2 * kBand;  // rows whose coefficients for a band fit in half the second-level cache

class DenseWork {
 public:
  // `coefficients`: as many doubles as `coefficient_count` says.
  DenseWork(const Slabs& slabs, double* coefficients) : slabs_(slabs), coefficient_(coefficients), solver_(tiles_) {}
  static i64 coefficient_count(i64 n, bool inverse) {
    const i64 order = Slabs::rounded(n);
    const i64 width = std::min(kBand, order);
    // The inverse keeps a whole band and its diagonal block, the factor what lies above a band, kDepth rows at a time.
    return width * (inverse ? order + width : std::min(kDepth, order - width));
  }

  [[nodiscard]] SmStatus factor(const PackedPivots& pivots);
  void invert();
  void multiply();

 private:
  void update(const Band& band);
  void invert(const Band& band);
  void add_band(const Band& target, const Band& s);
  void multiply(const Band& s);
  void add_products(const Band& s, const Band& rows);

  const Slabs& slabs_;
  double* coefficient_;
  SlabTiles tiles_;
  BandSolver solver_;
};

// The rows of the band, from its diagonal on, less their products with the rows above.
void DenseWork::update(const Band& band) {
  const i64 height = tiles_.height;
  for (i64 first = 0; first < band.first; first += kDepth) {
    const i64 depth = std::min(kDepth, band.first - first);
    for (i64 r = 0; r < band.width; r += height) {
      tiles_.pack(band.upper(first, band.first + r), depth, -1.0, coefficient_ + r * depth);
    }
    for (i64 c = band.first; c < slabs_.order(); c += kSlab) {
      double* slab = slabs_.upper(0, c);
      const i64 rows = std::min(band.width, c + kSlab - band.first);
      for (i64 r = 0; r < rows; r += height) {
        tiles_.strip(coefficient_ + r * depth, depth, slab + first * kSlab, slab + (band.first + r) * kSlab,
                     Finish::add);
      }
    }
  }
}

SmStatus DenseWork::factor(const PackedPivots& pivots) {
  for (i64 first = 0; first < slabs_.order(); first += kBand) {
    const Band band = slabs_.band(first);
    update(band);
    SM_TRY(solver_.factor(band, pivots));
    for (i64 c = band.end(); c < slabs_.order(); c += kSlab) solver_.solve(slabs_.upper(first, c), 0);
  }
  return SM_OK;
}

// What band s of M gives to the rows of a later one.
void DenseWork::add_band(const Band& target, const Band& s) {
  const i64 height = tiles_.height;
  const double* coefficient = coefficient_ + s.first * target.width;
  for (i64 c = 0; c < s.end(); c += kSlab) {
    const i64 from = std::max<i64>(0, c - s.first);  // M is 0 before its diagonal
    const double* source = s.lower(s.first + from, c);
    double* to = target.lower(target.first, c);
    for (i64 r = 0; r < target.width; r += height) {
      tiles_.strip(coefficient + r * s.width + from * height, s.width - from, source, to + r * kSlab, Finish::add);
    }
  }
}

void DenseWork::invert(const Band& band) {
  for (i64 first = 0; first < band.first; first += kBand) {
    for (i64 r = 0; r < band.width; r += tiles_.height) {
      tiles_.pack(band.upper(first, band.first + r), kBand, -1.0, coefficient_ + first * band.width + r * kBand);
    }
  }
  solver_.prepare(band);
  std::fill_n(band.data, band.size(), 0.0);
  for (i64 k = band.first; k < band.end(); ++k) *band.lower(k, k) = 1.0;
  for (i64 first = 0; first < band.first; first += kBand) add_band(band, slabs_.band(first));
  for (i64 c = 0; c < band.end(); c += kSlab) {
    solver_.solve(band.lower(band.first, c), std::max<i64>(0, c - band.first));
  }
}

void DenseWork::invert() {
  for (i64 first = 0; first < slabs_.order(); first += kBand) invert(slabs_.band(first));
}

// The products of band s of M that belong to the rows of `rows` and the columns before s.
void DenseWork::add_products(const Band& s, const Band& rows) {
  for (i64 c = rows.first; c < s.first; c += kSlab) {
    const double* source = s.lower(s.first, c);
    const i64 end = std::min(rows.end(), c + kSlab);
    double* slab = slabs_.upper(0, c);
    for (i64 i = rows.first; i < end; i += tiles_.height) {
      tiles_.strip(coefficient_ + i * s.width, s.width, source, slab + i * kSlab, Finish::add);
    }
  }
}

void DenseWork::multiply(const Band& s) {
  const i64 height = tiles_.height;
  for (i64 i = 0; i < s.end(); i += height) {
    tiles_.pack(s.lower(s.first, i), s.width, 1.0, coefficient_ + i * s.width);
  }
  for (i64 first = 0; first < s.first; first += kBand) add_products(s, slabs_.band(first));
  double* own = coefficient_ + s.size();  // M(s, s), since its place is taken
  std::copy_n(s.lower(s.first, s.first), s.width * s.width, own);
  for (i64 c = s.first; c < s.end(); c += kSlab) {
    const i64 from = c - s.first;
    const double* source = own + from * s.width + from * kSlab;
    for (i64 i = 0; i < c + kSlab; i += height) {
      tiles_.strip(coefficient_ + i * s.width + from * height, s.width - from, source, s.upper(i, c), Finish::store);
    }
  }
}

void DenseWork::multiply() {
  for (i64 first = 0; first < slabs_.order(); first += kBand) multiply(slabs_.band(first));
}

}  // namespace

SmStatus ginverse2_in_slabs(MemoryPool* pool, const PackedJob& job, PackedReport& report) {
  constexpr i64 kLine = 64 / sizeof(double);
  const i64 size = Slabs::size(job.n);
  Scratch<double> work;
  const i64 coefficients = DenseWork::coefficient_count(job.n, job.mode != kPackedFactor);
  SM_TRY(work.take(pool, size + coefficients + kLine));
  const auto past = static_cast<i64>(reinterpret_cast<std::uintptr_t>(work.data()) / sizeof(double)) % kLine;
  double* data = work.data() + (kLine - past) % kLine;  // vectors that cross no cache line
  const Slabs slabs(data, job.n);
  DenseWork dense(slabs, data + size);
  slabs.load(job.array, job.format);
  if (job.mode != kPackedFactorToInverse) SM_TRY(dense.factor(PackedPivots(job)));
  for (i64 k = 0; k < job.n; ++k) report.take(*slabs.upper(k, k));
  if (job.mode != kPackedFactor) {
    dense.invert();
    dense.multiply();
  }
  slabs.store(job.array, job.format);
  return SM_OK;
}

}  // namespace sm
