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
