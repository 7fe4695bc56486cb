// Hankel products by FFT and the leading singular triplets over them.
//
// Products. With X the length-N DFT of x[0 .. rows+cols-2] (zero padded,
// N >= rows + cols - 1):
//   (H v)_i   = sum_j x[i+cols-1-j] v_j          = (x * v)[i + cols - 1],
//   (H^H u)_j = sum_i conj(x[i+cols-1-j]) u_i    = c[cols - 1 - j],
//               c[k] = sum_i conj(x[i+k]) u_i     = DFT(DFT(u) . conj(X))[k] / N.
// Every index that these sums reach stays below N, so the circular products of
// length N give them exactly, with no wrap-around. The inverse DFT is the
// forward one between conjugations: idft(P) = conj(dft(conj(P))) / N.
//
// Triplets. Golub-Kahan-Lanczos with thick restarts (Baglama and Reichel's
// augmented form): after k steps H V_k = U_k B_k and
// H^H U_k = V_k B_k^H + beta v_k e_k^T, with B_k upper triangular (bidiagonal
// before the first restart, with one arrow column after each). Every entry of
// B is taken from the reorthogonalization itself, B = U^H H V, so the restart
// needs no special case: keeping the l best Ritz pairs makes B diagonal in its
// first l columns, and the next step's projections fill in the arrow.
// The SVD of the small B = P diag(s) Q^H gives the Ritz triplets
// (s_i, U p_i, V q_i), whose residual ||H^H u - s v|| is beta |P[k-1][i]|.
#include <algorithm>
#include <cmath>
#include <complex>
#include <cstring>

#include "core/scalar.h"
#include "fft/fft.h"
#include "numeric/krylov.h"
#include "numeric/lapack_boundary.h"
#include "numeric/work.h"

namespace {

// The smallest 2^a 3^b 5^c not below n (the FFT engine's fastest lengths), or
// 0 when none fits in int32.
int32_t FastLength(int64_t n) {
  int64_t best = INT64_MAX;
  for (int64_t p5 = 1; p5 < 2 * n && p5 <= INT32_MAX; p5 *= 5) {
    for (int64_t p35 = p5; p35 < 2 * n && p35 <= INT32_MAX; p35 *= 3) {
      int64_t v = p35;
      while (v < n) v *= 2;
      best = std::min(best, v);
    }
  }
  return best <= INT32_MAX ? static_cast<int32_t>(best) : 0;
}

// ---- the operator ---------------------------------------------------------------------

// The DFT of the record and the scratch of one product.
struct HankelFft {
  int32_t rows = 0, cols = 0, N = 0;
  FftPlan* plan = nullptr;
  WorkArray<Complex> X, a, b;
  HankelFft() = default;
  HankelFft(const HankelFft&) = delete;
  HankelFft& operator=(const HankelFft&) = delete;
  // The record's DFT and the scratch, once no more products are needed.
  void Release() {
    X.reset();
    a.reset();
    b.reset();
  }
  ~HankelFft() { FftPlanRelease(plan); }
};

StatusCode Dft(const HankelFft& h, const Complex* in, Complex* out) {
  const double* i = reinterpret_cast<const double*>(in);
  double* o = reinterpret_cast<double*>(out);
  return FftComplex(h.plan, i, i + 1, o, o + 1, 2, 2, h.N);
}

template <typename T>
StatusCode Setup(HankelFft& h, const T* x, int32_t rows, int32_t cols) {
  if (rows < 1 || cols < 1) return status::kBadSize;
  const int64_t span = int64_t{rows} + cols - 1;
  h.rows = rows;
  h.cols = cols;
  h.N = FastLength(span);
  if (h.N == 0) return status::kBadSize;
  const size_t N = static_cast<size_t>(h.N);
  h.X = AllocWork<Complex>(N);
  h.a = AllocWork<Complex>(N);
  h.b = AllocWork<Complex>(N);
  if (!h.X || !h.a || !h.b) return status::kNoMemory;
  h.plan = FftPlanAcquire(h.N);
  if (h.plan == nullptr) return status::kNoMemory;
  if constexpr (!kIsComplex<T>) {
    // Real records take the real transform: X in packed half-complex order in
    // the first N doubles of h.X.
    double* a = reinterpret_cast<double*>(h.a.get());
    std::copy(x, x + span, a);
    std::fill(a + span, a + h.N, 0.0);
    return FftReal(h.plan, a, reinterpret_cast<double*>(h.X.get()), 1, 1, h.N);
  }
  for (int64_t t = 0; t < span; ++t) h.a[t] = Complex(RealPart(x[t]), ImagPart(x[t]));
  return Dft(h, h.a.get(), h.X.get());
}

// The real form of Product below: the same two steps on the real transform
// and its inverse, with the spectral product taken in packed half-complex
// order (element k holds Re, element N - k Im, of frequency k).
StatusCode ProductReal(HankelFft& h, const double* in, int64_t is, double* out, int64_t os,
                       bool adjoint) {
  double* a = reinterpret_cast<double*>(h.a.get());
  double* b = reinterpret_cast<double*>(h.b.get());
  const double* X = reinterpret_cast<const double*>(h.X.get());
  const int32_t N = h.N;
  const int32_t count = adjoint ? h.rows : h.cols;
  for (int32_t j = 0; j < count; ++j) a[j] = in[j * is];
  std::fill(a + count, a + N, 0.0);
  StatusCode st = FftReal(h.plan, a, b, 1, 1, N);
  if (st != status::kOk) return st;
  // B X for H v (a convolution); conj(B) X for H^T u (the correlation
  // c[k] = sum_i x[i+k] u_i, read backwards).
  const double sign = adjoint ? -1.0 : 1.0;
  a[0] = b[0] * X[0];
  for (int32_t k = 1; k < N - k; ++k) {
    const double br = b[k], bi = sign * b[N - k], xr = X[k], xi = X[N - k];
    a[k] = br * xr - bi * xi;
    a[N - k] = br * xi + bi * xr;
  }
  if (N % 2 == 0) a[N / 2] = b[N / 2] * X[N / 2];
  st = FftHalfComplexToReal(h.plan, a, b, 1, 1, N);
  if (st != status::kOk) return st;
  const double scale = 1.0 / N;
  const int32_t outCount = adjoint ? h.cols : h.rows;
  for (int32_t i = 0; i < outCount; ++i) {
    out[i * os] = b[adjoint ? h.cols - 1 - i : i + h.cols - 1] * scale;
  }
  return status::kOk;
}

// out = H in (adjoint false: cols values in, rows out) or H^H in (rows in, cols
// out), strides is and os. Both are two DFTs of the zero-padded input with a
// spectral step between: conj(B X) for H v (the inverse DFT between
// conjugations, so the output is conjugated back), B conj(X) for H^H u (a
// correlation, read backwards).
template <typename T>
StatusCode Product(HankelFft& h, const T* in, int64_t is, T* out, int64_t os, bool adjoint) {
  if constexpr (!kIsComplex<T>) return ProductReal(h, in, is, out, os, adjoint);
  Complex* a = h.a.get();
  Complex* b = h.b.get();
  const int32_t count = adjoint ? h.rows : h.cols;
  for (int32_t j = 0; j < count; ++j) a[j] = Complex(RealPart(in[j * is]), ImagPart(in[j * is]));
  std::fill(a + count, a + h.N, Complex(0.0, 0.0));
  StatusCode st = Dft(h, a, b);
  if (st != status::kOk) return st;
  // The spectral step in plain arithmetic (std::complex's product checks for
  // NaN parts element by element), on interleaved doubles.
  const double* B = reinterpret_cast<const double*>(b);
  const double* X = reinterpret_cast<const double*>(h.X.get());
  double* A = reinterpret_cast<double*>(a);
  const double sign = adjoint ? 1.0 : -1.0;  // B conj(X), or conj(B X)
  for (int64_t f = 0; f < 2 * int64_t{h.N}; f += 2) {
    const double br = B[f], bi = B[f + 1], xr = X[f], xi = X[f + 1];
    A[f] = br * xr + sign * (bi * xi);
    A[f + 1] = sign * (bi * xr) - br * xi;
  }
  st = Dft(h, a, b);
  if (st != status::kOk) return st;
  const double scale = 1.0 / h.N, imag = adjoint ? scale : -scale;
  const int32_t outCount = adjoint ? h.cols : h.rows;
  for (int32_t i = 0; i < outCount; ++i) {
    const Complex& c = b[adjoint ? h.cols - 1 - i : i + h.cols - 1];
    out[i * os] = MakeScalar<T>(c.real() * scale, c.imag() * imag);
  }
  return status::kOk;
}

template <typename T>
StatusCode ProductFft(const T* x, int32_t rows, int32_t cols, const T* V, int32_t k, T* Z,
                      bool adjoint) {
  if (k < 1) return status::kBadSize;
  HankelFft h;
  StatusCode st = Setup(h, x, rows, cols);
  for (int32_t c = 0; c < k && st == status::kOk; ++c) {
    st = Product(h, V + c, k, Z + c, k, adjoint);
  }
  return st;
}

// The operators the bidiagonalization runs over: their two dimensions, and
// out = A in (adjoint false: Cols() values in, Rows() out) or A^H in (Rows()
// in, Cols() out) on contiguous vectors.

// A = H of x.
template <typename T>
struct HankelOperator {
  HankelFft h;
  int32_t Rows() const { return h.rows; }
  int32_t Cols() const { return h.cols; }
  StatusCode Init(const T* x, int32_t rows, int32_t cols) { return Setup(h, x, rows, cols); }
  StatusCode Apply(const T* in, T* out, bool adjoint) { return Product(h, in, 1, out, 1, adjoint); }
  void Release() { h.Release(); }
};

// A = [F; Bk] (2q x p, q = n - p), the forward-backward prediction matrix of
// the n samples x: F[i][j] = x[i+p-1-j], Bk[i][j] = conj(x[i+1+j]). With G the
// (q+1) x p Hankel G[i][j] = x[i+p-1-j] (all of x), F is G's first q rows, and
// G's last q rows hold x[i+p-j] = Bk's entries in reversed column order,
// unconjugated: Bk = conj(G[1:q+1]) J, J the column reversal. So
//   F v    = (G v)[0:q],               Bk v    = conj(G conj(J v))[1:q+1],
//   F^H u  = G^H [u; 0],               Bk^H u  = J conj(G^H [0; conj(u)]),
// four products with the one G, whose record DFT serves both blocks.
template <typename T>
struct ForwardBackwardOperator {
  HankelFft h;
  int32_t q = 0, p = 0;
  WorkArray<T> s, t;  // max(q + 1, p) values each
  int32_t Rows() const { return 2 * q; }
  int32_t Cols() const { return p; }
  StatusCode Init(const T* x, int32_t n, int32_t order) {
    if (order < 1 || order >= n) return status::kBadSize;
    q = n - order;
    p = order;
    const size_t len = static_cast<size_t>(std::max(q + 1, p));
    s = AllocWorkUninit<T>(len);
    t = AllocWorkUninit<T>(len);
    if (!s || !t) return status::kNoMemory;
    return Setup(h, x, q + 1, p);
  }
  void Release() {
    h.Release();
    s.reset();
    t.reset();
  }
  StatusCode Apply(const T* in, T* out, bool adjoint) {
    T* a = s.get();
    T* b = t.get();
    if (!adjoint) {
      StatusCode st = Product(h, in, 1, b, 1, false);
      if (st != status::kOk) return st;
      std::copy(b, b + q, out);
      for (int32_t j = 0; j < p; ++j) a[j] = Conj(in[p - 1 - j]);
      st = Product(h, a, 1, b, 1, false);
      if (st != status::kOk) return st;
      for (int32_t i = 0; i < q; ++i) out[q + i] = Conj(b[i + 1]);
      return status::kOk;
    }
    std::copy(in, in + q, a);
    a[q] = T(0.0);
    StatusCode st = Product(h, a, 1, out, 1, true);
    if (st != status::kOk) return st;
    a[0] = T(0.0);
    for (int32_t i = 0; i < q; ++i) a[i + 1] = Conj(in[q + i]);
    st = Product(h, a, 1, b, 1, true);
    if (st != status::kOk) return st;
    for (int32_t j = 0; j < p; ++j) out[j] += Conj(b[p - 1 - j]);
    return status::kOk;
  }
};

// ---- the Lanczos bidiagonalization ------------------------------------------------------

// A deterministic start (or breakdown) vector: a fixed pseudo-random sequence,
// so that every run gives the same numbers.
template <typename T>
void Scatter(T* v, int64_t stride, int32_t n, uint64_t seed) {
  uint64_t s = seed * 0x9E3779B97F4A7C15ull + 0x632BE59BD9B4E019ull;
  auto next = [&s] {
    s += 0x9E3779B97F4A7C15ull;
    uint64_t z = s;
    z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9ull;
    z = (z ^ (z >> 27)) * 0x94D049BB133111EBull;
    z ^= z >> 31;
    return static_cast<double>(z >> 11) * 0x1.0p-53 - 0.5;
  };
  for (int32_t i = 0; i < n; ++i) {
    const double re = next();
    v[i * stride] = MakeScalar<T>(re, kIsComplex<T> ? next() : 0.0);
  }
}

// ||w||: the square root of w^H w, which streams w once at full speed, or the
// BLAS's scaled norm when the sum of squares leaves the safe range.
template <typename T>
double Norm(int32_t dim, const T* w) {
  double part[4] = {0.0, 0.0, 0.0, 0.0};  // four chains keep the adds in flight
  int32_t i = 0;
  for (; i + 4 <= dim; i += 4) {
    for (int32_t l = 0; l < 4; ++l) {
      part[l] += RealPart(w[i + l]) * RealPart(w[i + l]) + ImagPart(w[i + l]) * ImagPart(w[i + l]);
    }
  }
  for (; i < dim; ++i) part[0] += RealPart(w[i]) * RealPart(w[i]) + ImagPart(w[i]) * ImagPart(w[i]);
  const double sum = (part[0] + part[1]) + (part[2] + part[3]);
  if (sum > 0x1p-900 && sum < 0x1p900) return std::sqrt(sum);
  return lapack::Nrm2(dim, w);
}

// w minus its projection on the first `count` columns of the column-major
// basis Q (dim rows, contiguous columns) by classical Gram-Schmidt, repeated
// once when the first pass cancelled more than 1 - 1/sqrt(2) of w's norm
// (`norm`, before projection): "twice is enough". The coefficients Q^H w
// (before projection) into c. Returns the norm of what is left.
template <typename T>
double Orthogonalize(const T* Q, int32_t dim, int32_t count, T* w, double norm, T* c, T* c2) {
  if (count == 0) return norm;
  const T one = MakeScalar<T>(1.0, 0.0), zero = MakeScalar<T>(0.0, 0.0),
          minus = MakeScalar<T>(-1.0, 0.0);
  lapack::GemvCol(true, dim, count, one, Q, dim, w, zero, c);
  lapack::GemvCol(false, dim, count, minus, Q, dim, c, one, w);
  const double left = Norm(dim, w);
  if (left > 0.7071067811865476 * norm) return left;
  lapack::GemvCol(true, dim, count, one, Q, dim, w, zero, c2);
  lapack::GemvCol(false, dim, count, minus, Q, dim, c2, one, w);
  for (int32_t i = 0; i < count; ++i) c[i] += c2[i];
  return Norm(dim, w);
}

// Column `col` of the basis = w / norm, or, when w has vanished (the Krylov
// space is invariant), a fresh direction orthogonal to the basis. Returns the
// norm kept in B: 0 after a breakdown.
template <typename T>
double Extend(T* Q, int32_t dim, int32_t col, T* w, double norm, double scale, T* c, T* c2,
              uint64_t seed) {
  constexpr double kBreakdown = 1e-14;
  double kept = norm;
  for (int attempt = 0; !(norm > kBreakdown * scale) && attempt < 3; ++attempt) {
    Scatter(w, 1, dim, seed + 7919u * static_cast<uint64_t>(attempt + 1));
    norm = Orthogonalize(Q, dim, col, w, Norm(dim, w), c, c2);
    kept = 0.0;
  }
  const double inv = norm > 0.0 ? 1.0 / norm : 0.0;
  T* q = Q + int64_t{col} * dim;
  for (int32_t i = 0; i < dim; ++i) q[i] = w[i] * inv;
  return kept;
}

// Q[:, 0:keep] = Q[:, 0:m] C (column-major, C m-by-keep with leading dimension
// m), a block of rows at a time through `tmp` (kRows x keep): the row blocking
// bounds the scratch, and each block is read once.
constexpr int32_t kRows = 256;
template <typename T>
void Rotate(T* Q, int32_t dim, int32_t m, const T* C, int32_t keep, T* tmp) {
  for (int32_t r0 = 0; r0 < dim; r0 += kRows) {
    const int32_t h = std::min(kRows, dim - r0);
    lapack::GemmCol(h, keep, m, Q + r0, dim, C, m, tmp, h);
    for (int32_t j = 0; j < keep; ++j) {
      std::memcpy(static_cast<void*>(Q + int64_t{j} * dim + r0), tmp + int64_t{j} * h,
                  static_cast<size_t>(h) * sizeof(T));
    }
  }
}

// The leading triplets of op's matrix M (rows x cols), set up; count is in
// range.
template <typename T, typename Op>
StatusCode SvdLeadingOf(Op& op, int32_t count, double* S, T* U, T* V) {
  const int32_t rows = op.Rows(), cols = op.Cols();
  const int32_t dim = std::min(rows, cols);
  const int32_t k = std::min(dim, std::max(2 * count + 8, count + 16));
  const size_t kk = static_cast<size_t>(k) * static_cast<size_t>(k);
  StatusCode st = status::kOk;

  // The bidiagonalization runs on A = M, or on A = M^H when M is wide, so that
  // the starting side is the smaller one: after dim steps its basis is
  // complete, the residual vanishes and the triplets are exact. A's right
  // vectors are then M's left ones.
  const bool flip = rows < cols;
  const int32_t vn = flip ? rows : cols, un = flip ? cols : rows;
  // Column-major bases, one contiguous vector per column, touched only as far
  // as the bidiagonalization gets: V holds one vector more, the residual
  // direction.
  WorkArray<T> Vb = AllocWorkUninit<T>(static_cast<size_t>(int64_t{vn} * (k + 1)));
  WorkArray<T> Ub = AllocWorkUninit<T>(static_cast<size_t>(int64_t{un} * k));
  WorkArray<T> wu = AllocWorkUninit<T>(static_cast<size_t>(un));
  WorkArray<T> wv = AllocWorkUninit<T>(static_cast<size_t>(vn));
  WorkArray<T> c = AllocWorkUninit<T>(static_cast<size_t>(int64_t{k} + 1));
  WorkArray<T> c2 = AllocWorkUninit<T>(static_cast<size_t>(int64_t{k} + 1));
  WorkArray<T> B = AllocWork<T>(kk);
  WorkArray<T> Bw = AllocWorkUninit<T>(kk);
  WorkArray<T> P = AllocWorkUninit<T>(kk);
  WorkArray<T> Qh = AllocWorkUninit<T>(kk);
  WorkArray<T> C = AllocWorkUninit<T>(kk);
  WorkArray<double> s = AllocWorkUninit<double>(static_cast<size_t>(k));
  WorkArray<T> tmp = AllocWorkUninit<T>(static_cast<size_t>(kRows) * static_cast<size_t>(k));
  if (!Vb || !Ub || !wu || !wv || !c || !c2 || !B || !Bw || !P || !Qh || !C || !s || !tmp) {
    return status::kNoMemory;
  }
  T* Vq = Vb.get();
  T* Uq = Ub.get();

  Scatter(wv.get(), 1, vn, 1);
  double scale = 0.0;  // largest norm met so far, a lower bound of s_1
  (void)Extend(Vq, vn, 0, wv.get(), Norm(vn, wv.get()), 1.0, c.get(), c2.get(), 2);
  int32_t kept = 0;
  double beta = 0.0;
  for (int32_t restart = 0;; ++restart) {
    // Steps kept .. k-1; from `count` columns on, the Ritz triplets of the
    // leading m x m block of B are tested after every step, so a subspace
    // with a clear gap stops long before k.
    int32_t m = kept;
    bool converged = false;
    while (m < k && !converged) {
      const int32_t j = m;
      // u_j = A v_j minus its components along u_0 .. u_{j-1}: column j of B.
      st = op.Apply(Vq + int64_t{j} * vn, wu.get(), flip);
      if (st != status::kOk) return st;
      const double au = Norm(un, wu.get());
      scale = std::max(scale, au);
      const double alpha = Orthogonalize(Uq, un, j, wu.get(), au, c.get(), c2.get());
      for (int32_t i = 0; i < j; ++i) B[i + size_t(j) * k] = c[i];
      B[j + size_t(j) * k] = MakeScalar<T>(
          Extend(Uq, un, j, wu.get(), alpha, scale, c.get(), c2.get(), 3 + 2 * uint64_t(j)), 0.0);
      // v_{j+1} = A^H u_j minus its components along v_0 .. v_j.
      st = op.Apply(Uq + int64_t{j} * un, wv.get(), !flip);
      if (st != status::kOk) return st;
      const double b =
          Orthogonalize(Vq, vn, j + 1, wv.get(), Norm(vn, wv.get()), c.get(), c2.get());
      scale = std::max(scale, b);
      beta = Extend(Vq, vn, j + 1, wv.get(), b, scale, c.get(), c2.get(), 4 + 2 * uint64_t(j));
      m = j + 1;
      if (m < count) continue;
      // B[0:m, 0:m] = P diag(s) Q^H, column-major with leading dimension m.
      for (int32_t col = 0; col < m; ++col) {
        std::memcpy(static_cast<void*>(Bw.get() + size_t(col) * m), B.get() + size_t(col) * k,
                    static_cast<size_t>(m) * sizeof(T));
      }
      st = lapack::Gesdd('S', m, m, Bw.get(), m, s.get(), P.get(), m, Qh.get(), m);
      if (st != status::kOk) return st;
      converged = true;
      for (int32_t i = 0; i < count; ++i) {
        converged =
            converged && beta * std::abs(P[(m - 1) + size_t(i) * m]) <= kKrylovTolerance * s[0];
      }
    }
    const int32_t keep = converged ? count : std::min(k - 1, count + (k - count) / 2);
    if (!converged && restart >= kKrylovMaxRestarts) return status::kKrylovNoConvergence;
    // V[:, 0:keep] = V Q[:, 0:keep] (C[j][i] = conj(Qh[i][j]), column-major),
    // U[:, 0:keep] = U P[:, 0:keep], and the residual direction v_m moved next
    // to them.
    for (int32_t i = 0; i < keep; ++i) {
      for (int32_t j = 0; j < m; ++j) C[j + size_t(i) * m] = Conj(Qh[i + size_t(j) * m]);
    }
    Rotate(Vq, vn, m, C.get(), keep, tmp.get());
    Rotate(Uq, un, m, P.get(), keep, tmp.get());
    if (converged) break;
    std::memcpy(static_cast<void*>(Vq + int64_t{keep} * vn), Vq + int64_t{m} * vn,
                static_cast<size_t>(vn) * sizeof(T));
    std::fill(B.get(), B.get() + kk, T(0.0));
    for (int32_t i = 0; i < keep; ++i) B[i + size_t(i) * k] = MakeScalar<T>(s[i], 0.0);
    kept = keep;
  }

  for (int32_t i = 0; i < count; ++i) S[i] = s[i];
  // A's right vectors (Vq, vn rows) and left ones (Uq, un rows), row-major
  // out. Each basis is released once copied, and the FFT buffers before
  // either: the outputs never add to the bidiagonalization's peak memory.
  op.Release();
  auto copy = [count](T* to, WorkArray<T>& from, int32_t n) {
    if (to != nullptr) {
      for (int32_t i = 0; i < count; ++i) {
        const T* col = from.get() + int64_t{i} * n;
        for (int32_t r = 0; r < n; ++r) to[int64_t{r} * count + i] = col[r];
      }
    }
    from.reset();
  };
  copy(flip ? U : V, Vb, vn);
  copy(flip ? V : U, Ub, un);
  return status::kOk;
}

}  // namespace

template <typename T>
StatusCode HankelSvdLeading(const T* x, int32_t rows, int32_t cols, int32_t count, double* S, T* U,
                            T* V) {
  if (rows < 1 || cols < 1 || count < 1 || count > std::min(rows, cols)) {
    return status::kBadSize;
  }
  HankelOperator<T> op;
  const StatusCode st = op.Init(x, rows, cols);
  if (st != status::kOk) return st;
  return SvdLeadingOf(op, count, S, U, V);
}

template <typename T>
StatusCode ForwardBackwardSvdLeading(const T* x, int32_t n, int32_t p, int32_t count, double* S,
                                     T* U, T* V) {
  if (p < 1 || p >= n || count < 1 || count > std::min(int64_t{2} * (n - p), int64_t{p})) {
    return status::kBadSize;
  }
  ForwardBackwardOperator<T> op;
  const StatusCode st = op.Init(x, n, p);
  if (st != status::kOk) return st;
  return SvdLeadingOf(op, count, S, U, V);
}

template StatusCode HankelSvdLeading(const double*, int32_t, int32_t, int32_t, double*, double*,
                                     double*);
template StatusCode HankelSvdLeading(const Complex*, int32_t, int32_t, int32_t, double*, Complex*,
                                     Complex*);
template StatusCode ForwardBackwardSvdLeading(const double*, int32_t, int32_t, int32_t, double*,
                                              double*, double*);
template StatusCode ForwardBackwardSvdLeading(const Complex*, int32_t, int32_t, int32_t, double*,
                                              Complex*, Complex*);

template <typename T>
StatusCode HankelProductFft(const T* x, int32_t rows, int32_t cols, const T* V, int32_t k, T* Z) {
  return ProductFft(x, rows, cols, V, k, Z, false);
}
template <typename T>
StatusCode HankelAdjointProductFft(const T* x, int32_t rows, int32_t cols, const T* U, int32_t k,
                                   T* W) {
  return ProductFft(x, rows, cols, U, k, W, true);
}
template StatusCode HankelProductFft(const double*, int32_t, int32_t, const double*, int32_t,
                                     double*);
template StatusCode HankelProductFft(const Complex*, int32_t, int32_t, const Complex*, int32_t,
                                     Complex*);
template StatusCode HankelAdjointProductFft(const double*, int32_t, int32_t, const double*, int32_t,
                                            double*);
template StatusCode HankelAdjointProductFft(const Complex*, int32_t, int32_t, const Complex*,
                                            int32_t, Complex*);
