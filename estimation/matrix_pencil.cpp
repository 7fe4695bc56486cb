// Matrix pencil: poles of a sum of M damped exponentials as the eigenvalues of
// the pencil Y1^+ Y2 reduced to Y1's M strongest singular components.
//
// Y1 (q x L, q = n - L): Y1[i][j] = x[i+L-1-j]   (row i: samples i..i+L-1, newest first)
// Y2 (q x L):            Y2[i][j] = x[i+L-j]     (Y1 advanced by one sample)
// With Y1 = U diag(s) V^H (r = min(q, L) components), the reduced pencil is
//   K = diag(1/s) U^H Y2 V   (r x r),
// whose eigenvalues are the signal poles when Y1 has rank >= M.
#include <cstddef>
#include <cstring>
#include <type_traits>

#include "estimation/estimation.h"
#include "estimation/twins.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

using namespace twin;

// ---- reduced pencil ---------------------------------------------------------------------
template <typename T>
StatusCode PencilMatrix(const T* x, int32_t n, int32_t L, int32_t M, T* K) {
  const int32_t q = n - L;
  const int32_t r = q < L ? q : L;
  const size_t qL = static_cast<size_t>(q) * static_cast<size_t>(L);
  auto y1 = AllocWork<T>(qL);
  auto y2 = AllocWork<T>(qL);
  auto backward = AllocWork<T>(qL);
  auto rhs = AllocWork<T>(static_cast<size_t>(q));
  auto y1copy = AllocWork<T>(qL);
  auto U = AllocWork<T>(static_cast<size_t>(q) * static_cast<size_t>(r));
  auto s = AllocWork<double>(static_cast<size_t>(r));
  auto V = AllocWork<T>(static_cast<size_t>(L) * static_cast<size_t>(r));
  auto Uh = AllocWork<T>(static_cast<size_t>(r) * static_cast<size_t>(q));
  auto T1 = AllocWork<T>(static_cast<size_t>(r) * static_cast<size_t>(L));
  auto full = AllocWork<T>(static_cast<size_t>(r) * static_cast<size_t>(r));
  if (!y1 || !y2 || !backward || !rhs || !y1copy || !U || !s || !V || !Uh || !T1 || !full) {
    return status::kNoMemory;
  }

  // Y1 is the forward prediction block; Y2 the backward block with each row reversed.
  StatusCode st = BuildForward(x, n, L, rhs.get(), y1.get());
  if (st != status::kOk) return st;
  st = BuildBackward(x, n, L, rhs.get(), backward.get());
  if (st != status::kOk) return st;
  for (int32_t i = 0; i < q; ++i) {
    const size_t row = static_cast<size_t>(i) * static_cast<size_t>(L);
    st = Reverse(backward.get() + row, y2.get() + row, L);
    if (st != status::kOk) return st;
  }

  // Economy SVD with U q x r and V L x r on both paths. A wide Y1 (q < L) is
  // decomposed as Y1^H = U' S V'^H, so that Y1 = V' S U'^H: the factors swap.
  if (q < L) {
    st = AdjointInto(y1.get(), q, L, y1copy.get());
    if (st != status::kOk) return st;
    st = Svd(y1copy.get(), L, q, V.get(), s.get(), U.get());
  } else {
    std::memcpy(y1copy.get(), y1.get(), qL * sizeof(T));
    st = Svd(y1copy.get(), q, L, U.get(), s.get(), V.get());
  }
  if (st != status::kOk) return st;

  // diag(1/s) U^H, unguarded: a zero singular value yields infinities.
  st = AdjointInto(U.get(), q, r, Uh.get());
  if (st != status::kOk) return st;
  st = ScaleRowsByInverse(Uh.get(), r, q, s.get());
  if (st != status::kOk) return st;
  st = MatMul(Uh.get(), y2.get(), r, q, L, T1.get());
  if (st != status::kOk) return st;
  st = MatMul(T1.get(), V.get(), r, L, r, full.get());
  if (st != status::kOk) return st;

  if (r >= M) {
    // Leading M x M block, row stride M.
    for (int32_t i = 0; i < M; ++i) {
      std::memcpy(K + static_cast<size_t>(i) * static_cast<size_t>(M),
                  full.get() + static_cast<size_t>(i) * static_cast<size_t>(r),
                  static_cast<size_t>(M) * sizeof(T));
    }
  } else {
    // Fewer components than modes: the whole r x r matrix, row stride r. The copy
    // runs once per row of the pencil, each time to the same place.
    const size_t whole = static_cast<size_t>(r) * static_cast<size_t>(r);
    for (int32_t pass = 0; pass < r; ++pass) std::memcpy(K, full.get(), whole * sizeof(T));
  }
  return status::kOk;
}

// Row i times 1/s[i], with no threshold.
template <typename T>
StatusCode ScaleRows(T* A, int32_t rows, int32_t cols, const double* s) {
  for (int32_t i = 0; i < rows; ++i) {
    T* row = A + static_cast<size_t>(i) * static_cast<size_t>(cols);
    if constexpr (kIsComplex<T>) {
      // Reciprocal of s_i + 0i by Smith's division, then a plain complex product
      // (no special handling of infinite or NaN parts).
      double fr = 0.0, fi = 0.0;
      ComplexDivide(1.0, 0.0, s[i], 0.0, &fr, &fi);
      for (int32_t j = 0; j < cols; ++j) {
        const double ar = row[j].real(), ai = row[j].imag();
        row[j] = Complex(ar * fr - ai * fi, ar * fi + ai * fr);
      }
    } else {
      const double f = 1.0 / s[i];
      for (int32_t j = 0; j < cols; ++j) row[j] *= f;
    }
  }
  return status::kOk;
}

// ---- estimator ------------------------------------------------------------------------------
template <typename T>
StatusCode MatrixPencil(const T* x, int32_t n, int32_t L, int32_t M, double fs,
                        int32_t realFlag, double* amp, double* phase, double* damp, double* freq,
                        double* mse, int32_t* count) {
  if (n < 1) return status::kEmptyInput;
  if (L < 0 || L > MaxOrder(n)) return status::kBadOrder;
  if (M < 1) return status::kBadCount;
  if (M > L) return status::kCountAboveOrder;
  if (0.0 >= fs) return status::kBadSampleRate;  // ordered test: NaN passes

  const int32_t q = n - L;
  int32_t order = q < L ? q : L;
  if (M < order) order = M;
  auto K = AllocWork<T>(static_cast<size_t>(M) * static_cast<size_t>(M));
  auto poles = AllocWork<Complex>(static_cast<size_t>(order));
  auto amplitudes = AllocWork<Complex>(static_cast<size_t>(order));
  if (!K || !poles || !amplitudes) return status::kNoMemory;

  StatusCode st = PencilMatrix(x, n, L, M, K.get());
  if (st != status::kOk) return st;
  st = EigenvaluesOf(K.get(), order, poles.get());
  if (st != status::kOk) return st;
  st = ModeAmplitudes(x, n, poles.get(), order, amplitudes.get(), mse);
  if (st != status::kOk) return st;
  return ModeParameters(amplitudes.get(), order, poles.get(), order, fs, realFlag, amp, phase,
                        damp, freq, count);
}

}  // namespace

StatusCode PencilMatrixReal(const double* x, int32_t n, int32_t L, int32_t M, double* K) {
  return PencilMatrix<double>(x, n, L, M, K);
}
StatusCode PencilMatrixComplex(const Complex* x, int32_t n, int32_t L, int32_t M, Complex* K) {
  return PencilMatrix<Complex>(x, n, L, M, K);
}
StatusCode ScaleRowsByInverseReal(double* A, int32_t rows, int32_t cols, const double* s) {
  return ScaleRows<double>(A, rows, cols, s);
}
StatusCode ScaleRowsByInverseComplex(Complex* A, int32_t rows, int32_t cols, const double* s) {
  return ScaleRows<Complex>(A, rows, cols, s);
}
StatusCode MatrixPencilReal(const double* x, int32_t n, int32_t L, int32_t M, double fs,
                            int32_t realFlag, double* amp, double* phase, double* damp,
                            double* freq, double* mse, int32_t* count) {
  return MatrixPencil<double>(x, n, L, M, fs, realFlag, amp, phase, damp, freq, mse, count);
}
// Complex data have no conjugate pairs to fold: every mode is reported (flag 0).
StatusCode MatrixPencilComplex(const Complex* x, int32_t n, int32_t L, int32_t M, double fs,
                               double* amp, double* phase, double* damp, double* freq,
                               double* mse, int32_t* count) {
  return MatrixPencil<Complex>(x, n, L, M, fs, 0, amp, phase, damp, freq, mse, count);
}
