// Least-squares solves and pseudo-inverses. The real solve runs DGELSD except for
// very wide systems, which go through the SVD pseudo-inverse solve. The
// pseudo-inverse solves apply pinv(A) = V diag(1/S) U^H over the singular values
// above a threshold without forming it, tall systems through a QR factorization
// first; the pseudo-inverses are formed from the economy SVD A = U diag(S) V^H.

#include <algorithm>
#include <cmath>
#include <cstring>
#include <type_traits>

#include "core/call_record.h"
#include "numeric/lapack_boundary.h"
#include "numeric/mat_mul.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

constexpr double kEpsilon = 2.220446049250313e-16;

// Beyond these widths a real system goes to the SVD pseudo-inverse instead of
// DGELSD: one row and more than 739 columns, or more than 66m + 670 + (m-3)(m-2)
// columns for m >= 2 rows.
bool UsesPinvPath(int32_t m, int32_t n) {
  if (m == 1) return n > 739;
  const int64_t mm = m;
  return n > m && n > 66 * mm + 670 + (mm - 3) * (mm - 2);
}

template <typename T>
constexpr bool kIsComplex = !std::is_same_v<T, double>;

template <typename T>
StatusCode SvdOf(const T* A, int32_t m, int32_t n, T* U, double* S, T* V) {
  if constexpr (kIsComplex<T>) {
    return SvdComplex(A, m, n, U, S, V, 0);
  } else {
    return SvdReal(A, m, n, U, S, V, 0);
  }
}

// U (m-by-k) replaced in place by U^T, or U^H for complex (k-by-m).
template <typename T>
StatusCode AdjointInPlace(T* U, int32_t m, int32_t k) {
  if constexpr (kIsComplex<T>) {
    return ConjTransposeComplex(U, m, k, nullptr);
  } else {
    return TransposeReal(U, m, k, nullptr);
  }
}

// Column i of V (n-by-k) scaled by 1/S[i] when S[i] > threshold, else zeroed.
// Returns the number of columns kept. A complex element's parts are both
// multiplied by the same real factor.
template <typename T>
int32_t InvertKeptColumns(T* V, int32_t n, int32_t k, const double* S, double threshold) {
  int32_t kept = 0;
  for (int32_t i = 0; i < k; ++i) {
    const bool keep = S[i] > threshold;
    const double factor = keep ? 1.0 / S[i] : 0.0;
    for (int32_t r = 0; r < n; ++r) {
      T& v = V[int64_t{r} * k + i];
      v = keep ? v * factor : T(0.0);
    }
    kept += keep ? 1 : 0;
  }
  return kept;
}

// Storage of the economy factors: the real twin keeps U, S and V in one block of
// (m + n + 1)k values; the complex twin keeps U and V in one block of (m + n)k
// elements and S in a real block of its own.
template <typename T>
struct Factors {
  WorkArray<T> uv;
  WorkArray<double> s_block;
  T* U = nullptr;
  T* V = nullptr;
  double* S = nullptr;

  bool Allocate(int32_t m, int32_t n, int32_t k) {
    const int64_t mk = int64_t{m} * k;
    const int64_t nk = int64_t{n} * k;
    if constexpr (kIsComplex<T>) {
      uv = AllocWork<T>(static_cast<size_t>(mk + nk));
      if (!uv) return false;
      s_block = AllocWork<double>(static_cast<size_t>(k));
      if (!s_block) return false;
      U = uv.get();
      V = U + mk;
      S = s_block.get();
    } else {
      uv = AllocWork<T>(static_cast<size_t>(mk + k + nk));
      if (!uv) return false;
      U = uv.get();
      S = U + mk;
      V = S + k;
    }
    return true;
  }
};

// P (n-by-m) = V U^H from factors whose V columns are already scaled; U is
// overwritten by its adjoint on the way.
template <typename T>
StatusCode FormPinv(Factors<T>& f, int32_t m, int32_t n, int32_t k, T* P) {
  const StatusCode st = AdjointInPlace(f.U, m, k);
  if (st != status::kOk) return st;
  return MatMul<T>(f.V, f.U, n, k, m, P, false);
}

template <typename T>
int32_t HasNonFinite(const T* x, int64_t n) {
  if constexpr (kIsComplex<T>) {
    return HasNonFiniteComplex(x, n);
  } else {
    return HasNonFiniteReal(x, n);
  }
}

// A system with at least this many rows per column is solved through a QR
// factorization first: the SVD is then taken of the small n-by-n R only.
bool IsTall(int32_t m, int32_t n) { return int64_t{m} >= 2 * int64_t{n}; }

// Rows of A per QR step of a tall solve: about 512 KiB of W = [R; block] for
// N = n + nrhs columns, and at least 4N rows so that R's own rows stay a small
// part of each step; the whole of A when it is no taller than that.
template <typename T>
int32_t BlockRows(int32_t m, int32_t N) {
  const int64_t fit = (int64_t{512} * 1024 / static_cast<int64_t>(sizeof(T))) / N - N;
  const int64_t c = std::max<int64_t>(fit, 4 * int64_t{N});
  return static_cast<int32_t>(std::min<int64_t>(c, m));
}

// One step of the fold: W (ld) holds R, `top` rows (none on the first step),
// above h - top new rows, and is factored in place. The twins differ on
// purpose: the real one runs the compact-WY kernels, and past the first step
// the triangular-pentagonal one, which skips R's zeros; the complex ones run
// slower than the unblocked geqrf on a few dozen columns, so the complex twin
// clears R's lower part and factors the stacked block with geqrf.
StatusCode FoldStep(double* W, int32_t ld, int32_t top, int32_t h, int32_t N, double*) {
  if (top == 0) return lapack::Geqrt(h, N, W, ld);
  return lapack::Tpqrt(h - top, N, W, ld, W + top, ld);
}
StatusCode FoldStep(Complex* W, int32_t ld, int32_t top, int32_t h, int32_t N, Complex* tau) {
  for (int32_t j = 0; j < top; ++j) {
    for (int32_t i = j + 1; i < top; ++i) W[int64_t{j} * ld + i] = Complex(0.0, 0.0);
  }
  return lapack::Geqrf(h, N, W, ld, tau);
}

// Where a solve takes its system from. Fill(W, ld, top, r0, h) writes rows
// r0 .. r0+h-1 of [A B] into rows top .. top+h-1 of the column-major W;
// NonFiniteA(m) and NonFiniteB(m) screen A's and B's m rows; kDense says
// whether A and B exist as arrays (a Hankel system is only ever folded).
template <typename T>
struct RowMajorRows {  // A (m-by-n) and B (m-by-nrhs), both row-major
  static constexpr bool kDense = true;
  const T* A;
  const T* B;
  int32_t n, nrhs;
  bool NonFiniteA(int32_t m) const { return HasNonFinite(A, int64_t{m} * n) != 0; }
  bool NonFiniteB(int32_t m) const { return HasNonFinite(B, int64_t{m} * nrhs) != 0; }
  // A[i][j] and the first right-hand side's b[i].
  T At(int32_t i, int32_t j) const { return A[int64_t{i} * n + j]; }
  T Rhs(int32_t i) const { return B[int64_t{i} * nrhs]; }
  // Tiles of kTile rows: a tile of A is read from cache once per column, and
  // each column of W is written in runs of kTile.
  void operator()(T* W, int32_t ld, int32_t top, int32_t r0, int32_t h) const {
    constexpr int32_t kTile = 16;
    for (int32_t i0 = 0; i0 < h; i0 += kTile) {
      const int32_t i1 = std::min(h, i0 + kTile);
      for (int32_t j = 0; j < n; ++j) {
        T* col = W + int64_t{j} * ld + top;
        for (int32_t i = i0; i < i1; ++i) col[i] = A[int64_t{r0 + i} * n + j];
      }
      for (int32_t j = 0; j < nrhs; ++j) {
        T* col = W + int64_t{n + j} * ld + top;
        for (int32_t i = i0; i < i1; ++i) col[i] = B[int64_t{r0 + i} * nrhs + j];
      }
    }
  }
};
// The forward prediction block of x, A[i][j] = x[i + n - 1 - j], each column a
// run of x; with `rhs`, also b[i] = x[i + n], one more run.
template <typename T>
struct HankelRows {
  static constexpr bool kDense = false;
  const T* x;
  int32_t n;
  bool rhs;
  bool NonFiniteA(int32_t m) const { return HasNonFinite(x, int64_t{m} + n - 1) != 0; }
  bool NonFiniteB(int32_t m) const { return HasNonFinite(x + n, m) != 0; }
  T At(int32_t i, int32_t j) const { return x[int64_t{i} + n - 1 - j]; }
  T Rhs(int32_t i) const { return x[int64_t{i} + n]; }
  void operator()(T* W, int32_t ld, int32_t top, int32_t r0, int32_t h) const {
    const size_t bytes = static_cast<size_t>(h) * sizeof(T);
    for (int32_t j = 0; j < n; ++j) {
      std::memcpy(static_cast<void*>(W + int64_t{j} * ld + top), x + int64_t{r0} + n - 1 - j, bytes);
    }
    if (rhs) std::memcpy(static_cast<void*>(W + int64_t{n} * ld + top), x + int64_t{r0} + n, bytes);
  }
};

// The tall A (m-by-n, m >= 2n) and B (m-by-nrhs, nrhs >= 0) folded into R
// (n-by-n, upper triangular with zeros below) and y = (Q^H B)[0:n]
// (n-by-nrhs), both column-major with leading dimension n, where A = QR. B
// rides along as extra columns: the QR of [A B] has R in its leading n columns
// and Q^H B in the first n rows of the others, so no reflector is applied a
// second time. Row blocks are folded in one at a time: W holds [R; next block]
// column-major (ld = N + c) and is factored in place. A block of c rows keeps
// W in cache, and no column-major copy of the whole of A is made. Many
// right-hand sides make this costly (they are factored too); the solves here
// have one.
template <typename T, typename Rows>
StatusCode FoldQr(const Rows& rows, int32_t m, int32_t n, int32_t nrhs, T* R, T* y) {
  const int32_t N = n + nrhs;
  const int32_t c = BlockRows<T>(m, N);
  const int32_t ld = N + c;
  const int64_t w_count = int64_t{ld} * N;
  WorkArray<T> block = AllocWorkUninit<T>(static_cast<size_t>(w_count + N));
  if (!block) return status::kNoMemory;
  T* W = block.get();
  T* tau = W + w_count;
  for (int32_t r0 = 0; r0 < m; r0 += c) {
    // From the second step on, R's N rows sit above the block (c >= N).
    const int32_t top = r0 == 0 ? 0 : N;
    const int32_t h = std::min(c, m - r0);
    rows(W, ld, top, r0, h);
    const StatusCode st = FoldStep(W, ld, top, top + h, N, tau);
    if (st != status::kOk) return st;
  }
  for (int32_t j = 0; j < n; ++j) {
    for (int32_t i = 0; i < n; ++i) R[int64_t{j} * n + i] = i > j ? T(0.0) : W[int64_t{j} * ld + i];
  }
  for (int32_t j = 0; j < nrhs; ++j) {
    std::memcpy(static_cast<void*>(y + int64_t{j} * n), W + int64_t{n + j} * ld,
                static_cast<size_t>(n) * sizeof(T));
  }
  // Finite A and B of extreme magnitude can overflow in the reflectors. The
  // drivers that take R next must never see a NaN or an infinity (LAPACK's own
  // scaling then reports an illegal argument, and the reference xerbla ends
  // the process), so such a fold is refused like such an input.
  if (HasNonFinite(R, int64_t{n} * n) != 0 || HasNonFinite(y, int64_t{n} * nrhs) != 0) {
    return status::kNonFinite;
  }
  return status::kOk;
}

// ---- refinement of an ill-conditioned complex solve -----------------------------------
// The fold rounds R's entries once per row block, so on a long record its
// error grows with the number of blocks, and on an ill-conditioned system the
// solution carries it amplified. One correction step on the semi-normal
// equations, R^H R dw = A^H (b - A w), with the residual and A^H r formed in
// twice the working precision, takes the solution back to the accuracy the
// data allow, and further than an unfolded QR gets. The products and sums are
// error-free transformations in plain double arithmetic, so every machine
// gives the same bits.

// s + e = a + b exactly.
inline void TwoSum(double a, double b, double& s, double& e) {
  s = a + b;
  const double bb = s - a;
  e = (a - (s - bb)) + (b - bb);
}

// hi + lo = a, each half with at most 26 significant bits.
inline void Split(double a, double& hi, double& lo) {
  const double c = 134217729.0 * a;  // 2^27 + 1
  hi = c - (c - a);
  lo = a - hi;
}

// p + e = a b exactly (barring overflow and underflow), a and b given with
// their halves.
inline void TwoProd(double a, double ah, double al, double b, double bh, double bl, double& p,
                    double& e) {
  p = a * b;
  e = ((ah * bh - p) + ah * bl + al * bh) + al * bl;
}

// s + c += sign a b, c gathering every rounding error of s.
inline void AddProd(double& s, double& c, double a, double ah, double al, double b, double bh,
                    double bl, double sign) {
  double p = 0.0, e = 0.0, t = 0.0;
  TwoProd(a, ah, al, b, bh, bl, p, e);
  TwoSum(s, sign * p, s, t);
  c += t + sign * e;
}

// Doubles of scratch Gradient needs for n columns.
int64_t GradientScratch(int32_t n) { return 10 * int64_t{n}; }

// g = A^H (b - A w) for one right-hand side: each row's residual is summed
// compensated and rounded once, and its products with the row are summed
// compensated per column. `scratch` holds GradientScratch(n) doubles.
template <typename Rows>
void Gradient(const Rows& rows, int32_t m, int32_t n, const Complex* w, Complex* g,
              double* scratch) {
  double* wv = scratch;        // w: re, im, then their high and low halves
  double* wh = wv + 2 * n;
  double* wl = wh + 2 * n;
  double* gs = wl + 2 * n;     // per column: re, im sums and their corrections
  double* gc = gs + 2 * n;
  for (int32_t j = 0; j < n; ++j) {
    wv[2 * j] = w[j].real();
    wv[2 * j + 1] = w[j].imag();
  }
  for (int32_t j = 0; j < 2 * n; ++j) {
    Split(wv[j], wh[j], wl[j]);
    gs[j] = 0.0;
    gc[j] = 0.0;
  }
  for (int32_t i = 0; i < m; ++i) {
    const Complex bi = rows.Rhs(i);
    double rs = bi.real(), rc = 0.0, is = bi.imag(), ic = 0.0;
    for (int32_t j = 0; j < n; ++j) {
      const Complex a = rows.At(i, j);
      const double ar = a.real(), ai = a.imag();
      double arh = 0.0, arl = 0.0, aih = 0.0, ail = 0.0;
      Split(ar, arh, arl);
      Split(ai, aih, ail);
      const int32_t re = 2 * j, im = 2 * j + 1;
      AddProd(rs, rc, ar, arh, arl, wv[re], wh[re], wl[re], -1.0);
      AddProd(rs, rc, ai, aih, ail, wv[im], wh[im], wl[im], 1.0);
      AddProd(is, ic, ar, arh, arl, wv[im], wh[im], wl[im], -1.0);
      AddProd(is, ic, ai, aih, ail, wv[re], wh[re], wl[re], -1.0);
    }
    const double rr = rs + rc, ri = is + ic;
    double rrh = 0.0, rrl = 0.0, rih = 0.0, ril = 0.0;
    Split(rr, rrh, rrl);
    Split(ri, rih, ril);
    for (int32_t j = 0; j < n; ++j) {
      const Complex a = rows.At(i, j);
      const double ar = a.real(), ai = a.imag();
      double arh = 0.0, arl = 0.0, aih = 0.0, ail = 0.0;
      Split(ar, arh, arl);
      Split(ai, aih, ail);
      // conj(a) r
      AddProd(gs[2 * j], gc[2 * j], ar, arh, arl, rr, rrh, rrl, 1.0);
      AddProd(gs[2 * j], gc[2 * j], ai, aih, ail, ri, rih, ril, 1.0);
      AddProd(gs[2 * j + 1], gc[2 * j + 1], ar, arh, arl, ri, rih, ril, 1.0);
      AddProd(gs[2 * j + 1], gc[2 * j + 1], ai, aih, ail, rr, rrh, rrl, -1.0);
    }
  }
  for (int32_t j = 0; j < n; ++j) g[j] = Complex(gs[2 * j] + gc[2 * j], gs[2 * j + 1] + gc[2 * j + 1]);
}

// Systems at least this ill-conditioned (largest over smallest kept singular
// value) get the correction step; better conditioned ones lose nothing worth
// its cost to the fold.
constexpr double kRefineCondition = 1e4;

// One correction of the solution w (n values) of a tall system with one
// right-hand side: w += V diag(1/S^2) V^H A^H (b - A w) over the kept singular
// values, which keeps w in their span (the minimum-norm solution of the same
// rank). V is n-by-k, row-major. A non-finite correction is not applied.
// `scratch` holds 2n + k + GradientScratch(n) elements' worth of Complex.
template <typename Rows>
void Refine(const Rows& rows, int32_t m, int32_t n, int32_t k, const Complex* V, const double* S,
            double threshold, Complex* w, Complex* scratch) {
  Complex* g = scratch;
  Complex* t = g + n;
  Complex* dw = t + k;
  Gradient(rows, m, n, w, g, reinterpret_cast<double*>(dw + n));
  lapack::Gemm(k, 1, n, V, g, t, true);
  for (int32_t i = 0; i < k; ++i) t[i] = S[i] > threshold ? t[i] / (S[i] * S[i]) : Complex(0.0, 0.0);
  lapack::Gemm(n, 1, k, V, t, dw);
  if (HasNonFiniteComplex(dw, n) != 0) return;
  for (int32_t j = 0; j < n; ++j) w[j] += dw[j];
}

template <typename Rows>
void Refine(const Rows&, int32_t, int32_t, int32_t, const double*, const double*, double, double*,
            double*) {}

// Which singular values a solve keeps: those above max(m, n) S[0] e (relative),
// or those above the midpoint threshold of TruncationThreshold for `keep`
// components (absolute, no warning).
struct Cut {
  bool relative;
  double e;
  int32_t keep;
};

// X = V diag(1/S) U^H B over the kept singular values of A = U diag(S) V^H. A
// tall A is first factored as A = QR (Householder QR over row blocks, B
// folded along as extra columns) and the SVD taken of R = U_R diag(S) V_R^H, whose
// singular values are those of A; then X = V_R diag(1/S) U_R^H (Q^H B)[0:n]. Neither U
// of the tall matrix nor the pseudo-inverse itself is ever formed. *kept is the
// number of singular values kept. nrhs < 1 (possible from the complex solve
// only) factors A for its statuses and writes nothing.
template <typename T, typename Rows>
StatusCode SvdSolve(const Rows& system, int32_t m, int32_t n, int32_t nrhs, T* X, Cut cut,
                    int32_t* kept) {
  const int32_t k = std::min(m, n);
  const bool tall = IsTall(m, n) && nrhs > 0;
  const int32_t rows = tall ? n : m;  // rows of the matrix decomposed

  Factors<T> f;
  if (!f.Allocate(rows, n, k)) return status::kNoMemory;
  WorkArray<T> qr;
  WorkArray<T> y;
  const T* base = nullptr;  // the right-hand sides U^H is applied to
  StatusCode st = status::kOk;
  if (tall) {
    if (system.NonFiniteA(m)) return status::kNonFinite;
    const int64_t nn = int64_t{n} * n;
    const int64_t nr = int64_t{n} * nrhs;
    qr = AllocWorkUninit<T>(static_cast<size_t>(2 * nn + nr));
    y = AllocWorkUninit<T>(static_cast<size_t>(nr));
    if (!qr || !y) return status::kNoMemory;
    T* r_col = qr.get();
    T* r = r_col + nn;
    T* y_col = r + nn;
    st = FoldQr(system, m, n, nrhs, r_col, y_col);
    if (st != status::kOk) return st;
    TransposeTo(r_col, n, n, r, false);
    TransposeTo(y_col, nrhs, n, y.get(), false);
    st = SvdOf(r, n, n, f.U, f.S, f.V);
    base = y.get();
  } else if constexpr (Rows::kDense) {
    st = SvdOf(system.A, m, n, f.U, f.S, f.V);
    base = system.B;
  } else {
    return status::kBadSize;  // never reached: a Hankel system comes only tall
  }
  if (st != status::kOk) return st;

  const double threshold = cut.relative ? std::max(m, n) * f.S[0] * cut.e
                                        : TruncationThreshold(f.S, k, cut.keep);
  int32_t count = 0;
  for (int32_t i = 0; i < k; ++i) count += f.S[i] > threshold ? 1 : 0;
  *kept = count;
  if (nrhs < 1) return nrhs < 0 ? status::kNegativeDim : status::kOk;

  // z = diag(1/S) U^H base (k-by-nrhs), rows of dropped values zero; then V z.
  const int64_t kr = int64_t{k} * nrhs;
  const bool refine = kIsComplex<T> && tall && nrhs == 1 && cut.relative && count > 0 &&
                      f.S[0] > kRefineCondition * f.S[count - 1];
  // Room for the correction: g, V^H g, dw and the gradient's scratch.
  const int64_t extra = refine ? 2 * int64_t{n} + k + (GradientScratch(n) + 1) / 2 : 0;
  WorkArray<T> z = AllocWorkUninit<T>(static_cast<size_t>(kr + int64_t{n} * nrhs + extra));
  if (!z) return status::kNoMemory;
  lapack::Gemm(k, nrhs, rows, f.U, base, z.get(), true);
  for (int32_t i = 0; i < k; ++i) {
    const bool keep = f.S[i] > threshold;
    const double factor = keep ? 1.0 / f.S[i] : 0.0;
    T* row = z.get() + int64_t{i} * nrhs;
    for (int32_t j = 0; j < nrhs; ++j) row[j] = keep ? row[j] * factor : T(0.0);
  }
  T* solution = z.get() + kr;
  lapack::Gemm(n, nrhs, k, f.V, z.get(), solution);
  if (refine) Refine(system, m, n, k, f.V, f.S, threshold, solution, solution + n);
  std::memcpy(static_cast<void*>(X), solution, static_cast<size_t>(int64_t{n} * nrhs) * sizeof(T));
  return status::kOk;
}

// X = pinv(A) B, with singular values at or below max(m, n) S[0] e dropped,
// e = rcond when positive, machine epsilon otherwise.
template <typename T, typename Rows>
StatusCode PinvSolve(const Rows& system, int32_t m, int32_t n, int32_t nrhs, T* X, double rcond) {
  if constexpr (kIsComplex<T>) {
    // Deliberately narrower than the real twin: nrhs is not checked (a negative
    // count gives -20004 once A is factored), and only B is screened here; A
    // is screened by its factorization.
    if (m < 1 || n < 1) return status::kBadSize;
    if (system.NonFiniteB(m)) return status::kNonFinite;
  } else {
    if (m < 1 || n < 1 || nrhs < 1) return status::kBadSize;
    if (system.NonFiniteA(m) || system.NonFiniteB(m)) return status::kNonFinite;
  }
  int32_t kept = 0;
  const StatusCode st =
      SvdSolve(system, m, n, nrhs, X, Cut{true, rcond > 0.0 ? rcond : kEpsilon, 0}, &kept);
  if (st != status::kOk) return st;
  return kept == std::min(m, n) ? status::kOk : status::kRankDeficient;
}

template <typename T>
StatusCode TruncatedSolve(const T* A, int32_t m, int32_t n, const T* B, int32_t nrhs, T* X,
                          int32_t keep) {
  if (m < 1 || n < 1 || nrhs < 1) return status::kBadSize;
  if (HasNonFinite(A, int64_t{m} * n) != 0 || HasNonFinite(B, int64_t{m} * nrhs) != 0) {
    return status::kNonFinite;
  }
  int32_t kept = 0;
  return SvdSolve(RowMajorRows<T>{A, B, n, nrhs}, m, n, nrhs, X, Cut{false, 0.0, keep}, &kept);
}

// pinv(A) into out, or over A when out is null. tol < 0 selects
// max(m, n) S[0] eps; any other tol (NaN included) is used as given.
template <typename T>
StatusCode PseudoInverse(T* A, int32_t m, int32_t n, double tol, T* out) {
  if (m < 1 || n < 1) return status::kBadSize;
  const int32_t k = std::min(m, n);
  const int64_t mn = int64_t{m} * n;

  Factors<T> f;
  if (!f.Allocate(m, n, k)) return status::kNoMemory;
  WorkArray<T> result = AllocWork<T>(static_cast<size_t>(mn));
  if (!result) return status::kNoMemory;

  StatusCode st = SvdOf(A, m, n, f.U, f.S, f.V);
  if (st != status::kOk) return st;
  if (tol < 0.0) tol = std::max(m, n) * f.S[0] * kEpsilon;
  (void)InvertKeptColumns(f.V, n, k, f.S, tol);
  st = FormPinv(f, m, n, k, result.get());
  if (st != status::kOk) return st;

  T* dst = out != nullptr ? out : A;
  std::memcpy(static_cast<void*>(dst), result.get(), static_cast<size_t>(mn) * sizeof(T));
  return status::kOk;
}

}  // namespace

// ---- DGELSD ------------------------------------------------------------------------

namespace {

// A negative or NaN rcond selects machine epsilon; zero stays zero. DGELSD
// takes it times max(m, n).
double GelsdRcond(int32_t m, int32_t n, double rcond) {
  return std::max(m, n) * (rcond >= 0.0 ? rcond : kEpsilon);
}

// DGELSD on R and (Q^H B)[0:n] of the tall A = QR: the same singular values,
// rank and minimum-norm solution as on A itself, RCOND unchanged.
template <typename Rows>
StatusCode GelsdFolded(const Rows& system, int32_t m, int32_t n, int32_t nrhs, double* X,
                       double rcond) {
  const int64_t nn = int64_t{n} * n;
  WorkArray<double> small = AllocWorkUninit<double>(static_cast<size_t>(nn + int64_t{n} * nrhs + n));
  if (!small) return status::kNoMemory;
  double* R = small.get();
  double* y = R + nn;
  double* sv = y + int64_t{n} * nrhs;
  StatusCode st = FoldQr(system, m, n, nrhs, R, y);
  if (st != status::kOk) return st;
  lapack_int rank = 0;
  st = lapack::Gelsd(n, n, nrhs, R, n, y, n, sv, GelsdRcond(m, n, rcond), &rank);
  if (st != status::kOk) return st;
  for (int32_t j = 0; j < nrhs; ++j) lapack::Copy(n, y + int64_t{j} * n, 1, X + j, nrhs);
  return rank < n ? status::kRankDeficient : status::kOk;
}

StatusCode GelsdDense(const double* A, int32_t m, int32_t n, const double* B, int32_t nrhs,
                      double* X, double rcond) {
  const int32_t k = std::min(m, n);
  const double lapack_rcond = GelsdRcond(m, n, rcond);
  lapack_int rank = 0;
  const int32_t ldb = std::max(m, n);
  // Column-major right-hand sides; rows m..ldb-1 of each column are DGELSD's
  // room for the solution of a wide system.
  WorkArray<double> rhs = AllocWorkUninit<double>(static_cast<size_t>(int64_t{ldb} * nrhs));
  if (!rhs) return status::kNoMemory;
  for (int32_t j = 0; j < nrhs; ++j) lapack::Copy(m, B + j, nrhs, rhs.get() + int64_t{j} * ldb, 1);

  // A^T row-major is A column-major with lda = m.
  WorkArray<double> a_col = AllocWorkUninit<double>(static_cast<size_t>(int64_t{m} * n));
  if (!a_col) return status::kNoMemory;
  TransposeTo(A, m, n, a_col.get(), false);
  WorkArray<double> sv = AllocWorkUninit<double>(static_cast<size_t>(k));
  if (!sv) return status::kNoMemory;

  StatusCode st = lapack::Gelsd(m, n, nrhs, a_col.get(), m, rhs.get(), ldb, sv.get(),
                                lapack_rcond, &rank);
  if (st != status::kOk) return st;

  st = rank < k ? status::kRankDeficient : status::kOk;
  for (int32_t j = 0; j < nrhs; ++j) lapack::Copy(n, rhs.get() + int64_t{j} * ldb, 1, X + j, nrhs);
  return st;
}

template <typename Rows>
StatusCode GelsdSolve(const Rows& system, int32_t m, int32_t n, int32_t nrhs, double* X,
                      double rcond) {
  if (m < 1 || n < 1 || nrhs < 1) return status::kBadSize;
  if (system.NonFiniteA(m) || system.NonFiniteB(m)) return status::kNonFinite;
  if (IsTall(m, n)) return GelsdFolded(system, m, n, nrhs, X, rcond);
  if constexpr (Rows::kDense) {
    if (UsesPinvPath(m, n)) return LeastSquaresPinvReal(system.A, m, n, system.B, nrhs, X, rcond);
    return GelsdDense(system.A, m, n, system.B, nrhs, X, rcond);
  } else {
    return status::kBadSize;  // never reached: a Hankel system comes only tall
  }
}

}  // namespace

StatusCode LeastSquaresReal(const double* A, int32_t m, int32_t n, const double* B, int32_t nrhs,
                            double* X, double rcond) {
  const StatusCode st = GelsdSolve(RowMajorRows<double>{A, B, n, nrhs}, m, n, nrhs, X, rcond);
  call_record::Note(st);
  return st;
}

// ---- pseudo-inverse solves and pseudo-inverses ------------------------------------------

StatusCode LeastSquaresPinvReal(const double* A, int32_t m, int32_t n, const double* B,
                                int32_t nrhs, double* X, double rcond) {
  const StatusCode st = PinvSolve(RowMajorRows<double>{A, B, n, nrhs}, m, n, nrhs, X, rcond);
  call_record::Note(st);
  return st;
}

StatusCode LeastSquaresComplex(const Complex* A, int32_t m, int32_t n, const Complex* B,
                               int32_t nrhs, Complex* X, double rcond) {
  const StatusCode st = PinvSolve(RowMajorRows<Complex>{A, B, n, nrhs}, m, n, nrhs, X, rcond);
  call_record::Note(st);
  return st;
}

// The forward prediction problem of x, solved as LeastSquaresReal and
// LeastSquaresComplex solve it formed (the same screens, in the same order, and
// the same statuses). A tall one is folded straight from x.
namespace {
template <typename T>
StatusCode ForwardSolve(const T* x, int32_t n, int32_t p, T* w, double rcond) {
  const int32_t m = n - p;
  if (m < 1 || p < 1 || !IsTall(m, p)) {
    const int64_t mp = int64_t{std::max(m, 0)} * std::max(p, 0);
    WorkArray<T> A = AllocWorkUninit<T>(static_cast<size_t>(mp));
    if (!A) return status::kNoMemory;
    for (int32_t i = 0; i < m; ++i) {
      for (int32_t j = 0; j < p; ++j) A[int64_t{i} * p + j] = x[i + p - 1 - j];
    }
    if constexpr (kIsComplex<T>) {
      return LeastSquaresComplex(A.get(), m, p, x + p, 1, w, rcond);
    } else {
      return LeastSquaresReal(A.get(), m, p, x + p, 1, w, rcond);
    }
  }
  const HankelRows<T> system{x, p, true};
  StatusCode st = status::kOk;
  if constexpr (kIsComplex<T>) {
    st = PinvSolve(system, m, p, 1, w, rcond);
  } else {
    st = GelsdSolve(system, m, p, 1, w, rcond);
  }
  call_record::Note(st);
  return st;
}
}  // namespace

StatusCode ForwardLeastSquaresReal(const double* x, int32_t n, int32_t p, double* w,
                                   double rcond) {
  return ForwardSolve<double>(x, n, p, w, rcond);
}

StatusCode ForwardLeastSquaresComplex(const Complex* x, int32_t n, int32_t p, Complex* w,
                                      double rcond) {
  return ForwardSolve<Complex>(x, n, p, w, rcond);
}

StatusCode LeastSquaresTruncatedReal(const double* A, int32_t m, int32_t n, const double* B,
                                     int32_t nrhs, double* X, int32_t keep) {
  return TruncatedSolve<double>(A, m, n, B, nrhs, X, keep);
}

StatusCode LeastSquaresTruncatedComplex(const Complex* A, int32_t m, int32_t n, const Complex* B,
                                        int32_t nrhs, Complex* X, int32_t keep) {
  return TruncatedSolve<Complex>(A, m, n, B, nrhs, X, keep);
}

double TruncationThreshold(const double* S, int32_t count, int32_t keep) {
  if (keep == count) return S[keep - 1] * 0.5;
  if (keep >= 1 && keep < count) return (S[keep - 1] + S[keep]) * 0.5;
  return 0.0;
}

template <typename T>
StatusCode QrReduceHankel(const T* x, int32_t m, int32_t n, T* R) {
  if (m < 1 || n < 1 || m < n) return status::kBadSize;
  WorkArray<T> col = AllocWorkUninit<T>(static_cast<size_t>(int64_t{n} * n));
  if (!col) return status::kNoMemory;
  const StatusCode st = FoldQr(HankelRows<T>{x, n, false}, m, n, 0, col.get(), static_cast<T*>(nullptr));
  if (st != status::kOk) return st;
  TransposeTo(col.get(), n, n, R, false);
  return status::kOk;
}

StatusCode QrReduceHankelReal(const double* x, int32_t m, int32_t n, double* R) {
  return QrReduceHankel<double>(x, m, n, R);
}

StatusCode QrReduceHankelComplex(const Complex* x, int32_t m, int32_t n, Complex* R) {
  return QrReduceHankel<Complex>(x, m, n, R);
}

StatusCode PseudoInverseReal(double* A, int32_t m, int32_t n, double tol, double* out) {
  return PseudoInverse<double>(A, m, n, tol, out);
}

StatusCode PseudoInverseComplex(Complex* A, int32_t m, int32_t n, double tol, Complex* out) {
  return PseudoInverse<Complex>(A, m, n, tol, out);
}
