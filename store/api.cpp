// The C boundary of the store.
#include "store/operations.hpp"

extern "C" SmStatus qxsmnew(SmInstance* instance, SmMatrix** matrix, int32_t kind, int32_t format) {
  return sm::make(*instance, *matrix, kind, format);
}

extern "C" SmStatus qxsmnewss(SmInstance* instance, SmMatrix** matrix, int64_t n) {
  return sm::make_sized(*instance, *matrix, SM_KIND_SYMMETRIC, SM_FORMAT_SPARSE, n, n);
}

extern "C" SmStatus qxsmnewds(SmInstance* instance, SmMatrix** matrix, int64_t n) {
  return sm::make_sized(*instance, *matrix, SM_KIND_SYMMETRIC, SM_FORMAT_COLUMNS, n, n);
}

extern "C" SmStatus qxsmnewsg(SmInstance* instance, SmMatrix** matrix, int64_t rows, int64_t cols) {
  return sm::make_sized(*instance, *matrix, SM_KIND_GENERAL, SM_FORMAT_SPARSE, rows, cols);
}

extern "C" SmStatus qxsmnewsd(SmInstance* instance, SmMatrix** matrix, int64_t n) {
  return sm::make_sized(*instance, *matrix, SM_KIND_DIAGONAL, SM_FORMAT_ROWS, n, n);
}

extern "C" SmStatus qxsmresize(SmMatrix* matrix, int64_t rows, int64_t cols) { return sm::resize(*matrix, rows, cols); }

extern "C" SmStatus qxsmdelete(SmMatrix* matrix) {
  if (matrix) sm::reset(*matrix);
  return SM_OK;
}

extern "C" SmStatus qxsmDestroyMatrix(SmInstance* instance, SmMatrix** matrix) {
  if (!matrix) return SM_OK;
  if (SmMatrix* record = *matrix) {
    const SmInstance* own = record->instance ? record->instance : instance;
    if (own->functions && own->functions->qxsmdelete) own->functions->qxsmdelete(record);
    own->pool->free(own->pool, record);
  }
  *matrix = nullptr;
  return SM_OK;
}

extern "C" SmStatus qxsmtie(SmMatrix* matrix, double* data, int64_t rows, int64_t cols, int32_t kind, int32_t format) {
  return sm::tie(*matrix, data, rows, cols, kind, format);
}

extern "C" SmStatus qxsmremove(SmMatrix* matrix, int64_t row, int64_t col) { return sm::remove(*matrix, row, col); }

extern "C" SmStatus qxsmassign(SmMatrix* matrix, int64_t row, int64_t col, int32_t add, double value) {
  return sm::assign(*matrix, row, col, add != 0, value);
}

extern "C" SmStatus qxsmget(SmMatrix* matrix, int64_t row, int64_t col, double* value) {
  return sm::get(*matrix, row, col, *value);
}

extern "C" SmStatus qxsmsetee(SmMatrix* matrix, double value) { return sm::set_all(*matrix, value); }

extern "C" SmStatus qxsmzscp(SmMatrix* matrix, const double* z, const int64_t* index, int64_t length, double weight) {
  return sm::add_outer(*matrix, z, index, length, weight);
}

extern "C" SmStatus qxsmclose(SmMatrix* matrix, double tolerance) { return sm::close(*matrix, tolerance); }

extern "C" SmStatus qxsmrow(SmMatrix* matrix, int64_t row, double* out, int64_t start) {
  return sm::row(*matrix, row, out, start);
}

extern "C" SmStatus qxsmUpperRow(SmMatrix* matrix, int64_t row, double* out) {
  return sm::upper_row(*matrix, row, out);
}

extern "C" SmStatus qxsmUpperSub(SmMatrix* matrix, double* out, int64_t r0, int64_t r1, int64_t c0, int64_t c1) {
  return sm::upper_block(*matrix, out, r0, r1, c0, c1);
}

extern "C" SmStatus qxsmdiag(SmMatrix* matrix, double* out, int64_t first, int64_t last) {
  return sm::diagonal(*matrix, out, first, last);
}

extern "C" SmStatus qxsmdense(SmMatrix* matrix, double* out, int16_t mode) { return sm::dense(*matrix, out, mode); }

extern "C" SmStatus qxsmIsDiag(SmMatrix* matrix, int16_t* flag, double tolerance) {
  return sm::is_diagonal(*matrix, *flag, tolerance);
}

extern "C" SmStatus qxsmclone(SmMatrix* source, SmMatrix* target, int32_t reassemble) {
  return sm::clone(*source, *target, reassemble != 0);
}

extern "C" SmStatus qxsmconvert(SmMatrix* source, SmMatrix* target, int32_t flag) {
  return sm::convert(*source, *target, flag != 0);
}

extern "C" SmStatus qxsmcopyv(const double* values, SmMatrix* matrix, int64_t rows, int64_t cols, int32_t kind,
                              int32_t format) {
  return sm::load(values, *matrix, rows, cols, kind, format);
}
