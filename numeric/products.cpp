// Matrix products over CBLAS, the dot product, element-wise vector helpers, the
// finiteness screen in front of every LAPACK call, and the transposes between
// row-major storage and LAPACK's column-major storage.

#include <algorithm>
#include <bit>
#include <cfloat>
#include <cmath>
#include <cstring>
#include <limits>

#include "numeric/lapack_boundary.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

constexpr uint64_t kSignBit = uint64_t{1} << 63;

// Row blocking of tall real products: one dgemm call handles at most this many
// rows of A and C when all three extents exceed their thresholds.
constexpr int32_t kBlockRows = 1530;
constexpr int32_t kBlockMinInner = 256;  // k must exceed this
constexpr int32_t kBlockMinCols = 2;     // n must exceed this

// Lower bound of the finiteness screen: every value at or below it is rejected.
// It lies slightly above -DBL_MAX, so a short interval at the negative end of the
// range is rejected while at the positive end only DBL_MAX itself is.
constexpr double kLowerLimit = std::bit_cast<double>(uint64_t{0xFFEFFFFFFFFFFFB0});
static_assert(kLowerLimit == -1.7976931348623e308);

inline double FlipSign(double v) {
  return std::bit_cast<double>(std::bit_cast<uint64_t>(v) ^ kSignBit);
}

// The k = 0 fill; for complex elements both parts are NaN.
template <typename T>
void FillQuietNaN(T* C, int64_t count) {
  const double nan = std::numeric_limits<double>::quiet_NaN();
  const T value = MakeScalar<T>(nan, nan);
  for (int64_t i = 0; i < count; ++i) C[i] = value;
}

// C = A * B into storage that does not overlap A or B.
template <typename T>
void GemmInto(const T* A, const T* B, int32_t m, int32_t k, int32_t n, T* C) {
  // A single column is a matrix-vector product: gemm would pack all of A first.
  if (n == 1) {
    lapack::Gemv(m, k, A, B, C);
    return;
  }
  if constexpr (!kIsComplex<T>) {
    // Only the real product is blocked.
    if (m > kBlockRows && k > kBlockMinInner && n > kBlockMinCols) {
      const int32_t blocks = m / kBlockRows;
      for (int32_t b = 0; b < blocks; ++b) {
        lapack::Gemm(kBlockRows, n, k, A + int64_t{b} * kBlockRows * k, B,
                     C + int64_t{b} * kBlockRows * n);
      }
      const int32_t rest = m - blocks * kBlockRows;
      if (rest > 0) {
        lapack::Gemm(rest, n, k, A + int64_t{blocks} * kBlockRows * k, B,
                     C + int64_t{blocks} * kBlockRows * n);
      }
      return;
    }
  }
  lapack::Gemm(m, n, k, A, B, C);
}

}  // namespace

// ---- products ----------------------------------------------------------------------

template <typename T>
StatusCode MatMul(const T* A, const T* B, int32_t m, int32_t k, int32_t n, T* C) {
  if (m < 0 || k < 0 || n < 0) return status::kNegativeDim;
  if (m == 0 || n == 0) return status::kOk;
  if (k == 0) {
    // A product over an empty inner dimension is reported as NaN, not zeros.
    FillQuietNaN(C, int64_t{m} * n);
    return status::kOk;
  }
  // beta = 0: the BLAS writes every element of C without reading it.
  GemmInto(A, B, m, k, n, C);
  return status::kOk;
}

template StatusCode MatMul(const double*, const double*, int32_t, int32_t, int32_t, double*);
template StatusCode MatMul(const Complex*, const Complex*, int32_t, int32_t, int32_t, Complex*);

StatusCode MatMulReal(const double* A, const double* B, int32_t m, int32_t k, int32_t n,
                      double* C) {
  return MatMul(A, B, m, k, n, C);
}

StatusCode MatMulComplex(const Complex* A, const Complex* B, int32_t m, int32_t k, int32_t n,
                         Complex* C) {
  return MatMul(A, B, m, k, n, C);
}

template <typename T>
StatusCode AdjointMatMul(const T* A, const T* B, int32_t k, int32_t m, int32_t n, T* C) {
  if (m < 0 || k < 0 || n < 0) return status::kNegativeDim;
  if (m == 0 || n == 0) return status::kOk;
  if (k == 0) {
    std::fill(C, C + int64_t{m} * n, T(0.0));
    return status::kOk;
  }
  lapack::Gemm(m, n, k, A, B, C, true);
  return status::kOk;
}
template StatusCode AdjointMatMul(const double*, const double*, int32_t, int32_t, int32_t, double*);
template StatusCode AdjointMatMul(const Complex*, const Complex*, int32_t, int32_t, int32_t,
                                  Complex*);

// ---- Hankel products -------------------------------------------------------------------
// H is formed a block of rows at a time, each row a run of the reversed record:
// H[i][j] = x[i + cols - 1 - j] = reversed[rows - 1 - i + j].
template <typename T>
StatusCode HankelProduct(const T* x, int32_t rows, int32_t cols, const T* V, int32_t k, T* Z) {
  if (rows < 1 || cols < 1 || k < 1) return status::kBadSize;
  const int64_t span = int64_t{rows} + cols - 1;
  const int32_t block = std::min(rows, 256);
  WorkArray<T> reversed = AllocWorkUninit<T>(static_cast<size_t>(span));
  WorkArray<T> H = AllocWorkUninit<T>(static_cast<size_t>(int64_t{block} * cols));
  if (!reversed || !H) return status::kNoMemory;
  for (int64_t t = 0; t < span; ++t) reversed[t] = x[span - 1 - t];
  for (int32_t r0 = 0; r0 < rows; r0 += block) {
    const int32_t h = std::min(block, rows - r0);
    for (int32_t i = 0; i < h; ++i) {
      std::memcpy(static_cast<void*>(H.get() + int64_t{i} * cols),
                  reversed.get() + (rows - 1 - r0 - i), static_cast<size_t>(cols) * sizeof(T));
    }
    GemmInto(H.get(), V, h, cols, k, Z + int64_t{r0} * k);
  }
  return status::kOk;
}
template StatusCode HankelProduct(const double*, int32_t, int32_t, const double*, int32_t, double*);
template StatusCode HankelProduct(const Complex*, int32_t, int32_t, const Complex*, int32_t,
                                  Complex*);

// ---- vector helpers ----------------------------------------------------------------

StatusCode DotReal(const double* x, const double* y, int32_t n, double* result) {
  if (n < 1) return status::kBadSize;
  *result = cblas_ddot(n, x, 1, y, 1);
  return status::kOk;
}

template <typename T>
StatusCode VecSub(const T* a, const T* b, int32_t n, T* out) {
  if (n < 1) return status::kBadSize;
  for (int32_t i = 0; i < n; ++i) out[i] = a[i] - b[i];
  return status::kOk;
}
template StatusCode VecSub(const double*, const double*, int32_t, double*);
template StatusCode VecSub(const Complex*, const Complex*, int32_t, Complex*);

StatusCode VecSubReal(const double* a, const double* b, int32_t n, double* out) {
  return VecSub(a, b, n, out);
}

// ---- finiteness screen ---------------------------------------------------------------

// A value is accepted exactly when kLowerLimit < v < DBL_MAX; NaN fails both
// comparisons. The test runs in chunks with no exit inside them, so that they
// vectorize: the quiet comparisons (std::isgreater, std::isless) may be
// evaluated together where ordered ones may not, and a rejected element turns
// `accepted` to 0 without a branch.
int32_t HasNonFiniteReal(const double* x, int64_t n) {
  constexpr int64_t kChunk = 256;
  for (int64_t i0 = 0; i0 < n; i0 += kChunk) {
    const int64_t i1 = std::min(n, i0 + kChunk);
    double accepted = 1.0;
    for (int64_t i = i0; i < i1; ++i) {
      const int in_range = static_cast<int>(std::isgreater(x[i], kLowerLimit)) &
                           static_cast<int>(std::isless(x[i], DBL_MAX));
      accepted = in_range != 0 ? accepted : 0.0;
    }
    if (accepted == 0.0) return 1;
  }
  return 0;
}

// A complex array is the array of its 2n parts, real part first.
template <typename T>
int32_t HasNonFinite(const T* x, int64_t n) {
  if constexpr (kIsComplex<T>) {
    return HasNonFiniteReal(reinterpret_cast<const double*>(x), 2 * n);
  } else {
    return HasNonFiniteReal(x, n);
  }
}
template int32_t HasNonFinite(const double*, int64_t);
template int32_t HasNonFinite(const Complex*, int64_t);

int32_t HasNonFiniteComplex(const Complex* x, int64_t n) { return HasNonFinite(x, n); }

// ---- transposes ----------------------------------------------------------------------

// Tiles of kTile x kTile elements keep both the rows read and the rows written
// in cache; a plain column-by-column copy would stream the whole of A once per
// column. Complex imaginary parts are conjugated by a sign-bit flip.
template <typename T>
void TransposeTo(const T* A, int32_t m, int32_t n, T* out, bool conjugate) {
  constexpr int32_t kTile = 32;
  for (int32_t i0 = 0; i0 < m; i0 += kTile) {
    const int32_t i1 = std::min(m, i0 + kTile);
    for (int32_t j0 = 0; j0 < n; j0 += kTile) {
      const int32_t j1 = std::min(n, j0 + kTile);
      for (int32_t i = i0; i < i1; ++i) {
        const T* row = A + int64_t{i} * n;
        for (int32_t j = j0; j < j1; ++j) {
          T v = row[j];
          if constexpr (kIsComplex<T>) {
            if (conjugate) v.imag(FlipSign(v.imag()));
          }
          out[int64_t{j} * m + i] = v;
        }
      }
    }
  }
}

template void TransposeTo(const double*, int32_t, int32_t, double*, bool);
template void TransposeTo(const Complex*, int32_t, int32_t, Complex*, bool);

// The adjoint in `out`, or back over A (through scratch) when out is null or
// is A itself.
template <typename T>
StatusCode Adjoint(T* A, int32_t m, int32_t n, T* out) {
  if (m < 1 || n < 1) return status::kBadSize;
  if (out != nullptr && out != A) {
    TransposeTo(A, m, n, out, kIsComplex<T>);
    return status::kOk;
  }
  const int64_t count = int64_t{m} * n;
  void* raw = nullptr;
  const StatusCode st = NumAlloc(&raw, static_cast<size_t>(count) * sizeof(T));
  if (st != status::kOk) return st;
  T* scratch = static_cast<T*>(raw);
  TransposeTo(A, m, n, scratch, kIsComplex<T>);
  std::memcpy(static_cast<void*>(A), scratch, static_cast<size_t>(count) * sizeof(T));
  return MergeStatus(status::kOk, NumFree(raw));
}
template StatusCode Adjoint(double*, int32_t, int32_t, double*);
template StatusCode Adjoint(Complex*, int32_t, int32_t, Complex*);

StatusCode TransposeReal(double* A, int32_t m, int32_t n, double* out) {
  return Adjoint(A, m, n, out);
}

StatusCode ConjTransposeComplex(Complex* A, int32_t m, int32_t n, Complex* out) {
  return Adjoint(A, m, n, out);
}
