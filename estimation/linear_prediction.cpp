// Linear-prediction building blocks shared by the AR estimators: the forward
// and backward prediction blocks, array reversal and the complex difference.
//
// With q = n - p equations, the forward block predicts each sample from the p
// samples before it (nearest first), the backward block each sample from the
// p samples after it (nearest first). Neither conjugates anything; the callers
// that need a conjugated backward block do that themselves.
#include <cstddef>
#include <cstring>

#include "estimation/estimation.h"
#include "estimation/estimators.h"
#include "numeric/numeric.h"

// One prediction block, q = n - p rows: b[i] = x[i + bAt], A[i][j] =
// x[i + aAt + aStep * j]. Every element is written: no clearing pass first.
template <typename T>
StatusCode BuildBlock(const T* x, int32_t n, int32_t p, ptrdiff_t bAt, ptrdiff_t aAt,
                      ptrdiff_t aStep, T* b, T* A) {
  const ptrdiff_t rows = static_cast<ptrdiff_t>(n) - p;
  const ptrdiff_t cols = p;
  if (rows <= 0 || cols <= 0) return status::kOk;
  for (ptrdiff_t i = 0; i < rows; ++i) {
    b[i] = x[i + bAt];
    T* row = A + i * cols;
    const T* first = x + i + aAt;
    for (ptrdiff_t j = 0; j < cols; ++j) row[j] = first[aStep * j];
  }
  return status::kOk;
}

// Forward block: b[i] = x[i+p], A[i][j] = x[i+p-1-j], i < q, j < p.
template <typename T>
StatusCode BuildForwardMatrix(const T* x, int32_t n, int32_t p, T* b, T* A) {
  return BuildBlock(x, n, p, p, ptrdiff_t{p} - 1, -1, b, A);
}

// Backward block: b[i] = x[i], A[i][j] = x[i+1+j], i < q, j < p.
template <typename T>
StatusCode BuildBackwardMatrix(const T* x, int32_t n, int32_t p, T* b, T* A) {
  return BuildBlock(x, n, p, 0, 1, 1, b, A);
}

// In place (src == dst) works too: the ends are swapped towards the middle.
template <typename T>
StatusCode Reverse(const T* src, T* dst, int32_t count) {
  if (src == dst) {
    for (ptrdiff_t lo = 0, hi = static_cast<ptrdiff_t>(count) - 1; lo < hi; ++lo, --hi) {
      const T t = dst[lo];
      dst[lo] = dst[hi];
      dst[hi] = t;
    }
    return status::kOk;
  }
  for (ptrdiff_t k = 0; k < count; ++k) dst[k] = src[count - 1 - k];
  return status::kOk;
}

template StatusCode BuildForwardMatrix(const double*, int32_t, int32_t, double*, double*);
template StatusCode BuildForwardMatrix(const Complex*, int32_t, int32_t, Complex*, Complex*);
template StatusCode BuildBackwardMatrix(const double*, int32_t, int32_t, double*, double*);
template StatusCode BuildBackwardMatrix(const Complex*, int32_t, int32_t, Complex*, Complex*);
template StatusCode Reverse(const double*, double*, int32_t);
template StatusCode Reverse(const Complex*, Complex*, int32_t);

StatusCode BuildForwardMatrixReal(const double* x, int32_t n, int32_t p, double* b, double* A) {
  return BuildForwardMatrix(x, n, p, b, A);
}
StatusCode BuildForwardMatrixComplex(const Complex* x, int32_t n, int32_t p, Complex* b,
                                     Complex* A) {
  return BuildForwardMatrix(x, n, p, b, A);
}
StatusCode BuildBackwardMatrixReal(const double* x, int32_t n, int32_t p, double* b, double* A) {
  return BuildBackwardMatrix(x, n, p, b, A);
}
StatusCode BuildBackwardMatrixComplex(const Complex* x, int32_t n, int32_t p, Complex* b,
                                      Complex* A) {
  return BuildBackwardMatrix(x, n, p, b, A);
}

StatusCode ReverseReal(const double* src, double* dst, int32_t count) {
  return Reverse(src, dst, count);
}
StatusCode ReverseComplex(const Complex* src, Complex* dst, int32_t count) {
  return Reverse(src, dst, count);
}

// No check of count: a count below 1 simply writes nothing (where VecSub
// refuses it).
StatusCode VecSubComplex(const Complex* u, const Complex* v, int32_t count, Complex* out) {
  if (count < 1) return status::kOk;
  return VecSub(u, v, count, out);
}
