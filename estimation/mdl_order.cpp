// Model order by minimum description length: one reduced matrix pencil for the
// largest order, then for each candidate m the poles of its leading m x m block,
// the least-squares amplitudes and the fit error E, scored as
//   D(m) = n ln E + 10 m ln n.
// The lowest score below 10000 wins; the first order that fits to within
// machine precision ends the search at once.
//
// The full amplitude fit (ModeAmplitudes) costs O(n m^2) a candidate, which at
// large upper orders is most of the search. Each candidate is therefore first
// scored from the Vandermonde structure in O(n m + m^3) (see FastLook below),
// with a bound on how far that score can be from the full fit's; only the
// candidates whose decision that bound leaves open get the full fit. The chosen
// order is the full search's (MdlOrderFull*, kept for tests and benchmarks).
#include <algorithm>
#include <cassert>
#include <cfloat>
#include <cmath>
#include <cstddef>
#include <cstring>

#include "core/scalar.h"
#include "estimation/entry_checks.h"
#include "estimation/estimation.h"
#include "estimation/estimators.h"
#include "numeric/lapack_boundary.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

constexpr double kPenalty = 10.0;        // weight of m ln n
constexpr double kStartScore = 10000.0;  // a score must fall below this to be chosen
constexpr double kPerfectFit = 2.2e-16;  // |E| below this stops the search
constexpr double kEps = DBL_EPSILON;     // 2^-52

// ---- the fast look at one candidate -----------------------------------------------------
// With V the n-by-m Vandermonde matrix of the poles (V[t][i] = z_i^t), the
// least-squares fit leaves
//   n E = ||x||^2 - b^H G^-1 b,   G = V^H V,  b = V^H x.
// G's entries are geometric sums, G_ij = sum_t w^t with w = conj(z_i) z_j,
// which is (1 - conj(p_i) p_j) / (1 - w) with p = z^n, or, where 1 - w is
// below 1/n in modulus (the closed form would divide a cancelled difference by
// a small one), expm1(n u) / expm1(u) with u = log w; b is the record's
// z-transform at conj(z_i), by Horner's rule. G = R^H R (Cholesky), y = R^-H b,
// the amplitudes A = R^-1 y and n E = ||x||^2 - ||y||^2.
//
// The error bound. Every rounding above is folded into an effective
// perturbation of G (size eG, Frobenius) and of b (size eB):
//   - G's entries: w's own rounding moves a geometric sum by at most
//     n |dw| sum|w|^t <= 2 n eps a_i a_j (a_i = sqrt(G_ii), Cauchy-Schwarz);
//     the closed form adds p's powering error (relative (n + 1) eps, binary
//     powering, so (2n + 4) eps for conj(p_i) p_j) and the numerator's
//     rounding, divided by |1 - w|; the expm1 form a few eps of G_ij;
//   - Cholesky and the two triangular solves: (m + 1) eps trace(G) each;
//   - b: Horner's rule, 4 n eps sum_t |x_t| |z_i|^t <= 4 n eps ||x|| a_i.
// Then |b^H G^-1 b - ||y||^2| <= 2 eG ||A||^2 + 4 eB ||A|| + 3 eB^2 ||G^-1|| as long as
// eG ||G^-1|| <= 1/4 (the exact amplitudes are then within twice the computed
// ones); ||G^-1|| comes from LAPACK's condition estimate, taken ten times
// larger. Beyond that the look gives up.
//
// The full fit's own E is not the exact one either: its solve is backward
// stable (Householder QR folded over row blocks, SVD of R, one correction
// step: a backward error within a small multiple of n m eps, the classical
// bound for Householder QR), its Vandermonde columns are running products
// (relative error t eps in row t), and its residual is formed and summed in
// plain arithmetic. With rho the residual norm and kappa V's condition
// number, its residual is within
//   eF = (n + 4)(m + 4) eps (||x|| + ||V|| ||A|| + kappa rho) + 8 (m + 2) eps ||V|| ||A||
// of the exact one, so n E_full = rho^2 +- (2 rho eF + eF^2 + 2 n eps rho^2). The
// solve drops no singular value as long as kappa stays far below
// 1 / (max(n, m) eps), which the condition limit below makes sure of.
//
// Both bounds together, times kSafety, give an interval around the fast E that
// holds the full fit's E. The search needs two answers per candidate: does E
// fall below kPerfectFit (the stop), and does the score fall below the best so
// far. When the whole interval answers both with "no", the candidate is
// passed over, as the full search would; otherwise, and whenever anything in
// the look is not finite, G is not numerically positive definite or the bound
// is not small, the candidate gets the full fit and is decided exactly as the
// full search decides it. The best score is only ever set from a full fit, so
// it is bit for bit the full search's.
constexpr double kSafety = 8.0;
// Beyond this estimated condition number of G the look gives up.
constexpr double kMaxConditionG = 1e11;

struct Look {
  bool fullFit = true;  // the candidate needs the full fit
};

// expm1 of the complex a + ib, accurate for small arguments.
Complex Expm1(double a, double b) {
  const double s = std::sin(0.5 * b);
  return Complex(std::expm1(a) * std::cos(b) - 2.0 * s * s, std::exp(a) * std::sin(b));
}

// sum_{t<n} w^t for 1 - w = d with n |d| < 1: expm1(n u) / expm1(u), u = log w.
Complex GeometricSumNearOne(double wr, double wi, int32_t n) {
  const double t = (wr - 1.0) * (wr + 1.0) + wi * wi;  // |w|^2 - 1; wr - 1 is exact here
  const double ur = 0.5 * std::log1p(t);
  const double ui = std::atan2(wi, wr);
  if (ur == 0.0 && ui == 0.0) return Complex(static_cast<double>(n), 0.0);
  const double nn = static_cast<double>(n);
  return Expm1(nn * ur, nn * ui) / Expm1(ur, ui);
}

// z^n by binary powering.
Complex PowerN(Complex z, int32_t n) {
  Complex result(1.0, 0.0);
  Complex base = z;
  for (uint32_t e = static_cast<uint32_t>(n); e != 0; e >>= 1) {
    if (e & 1u) result *= base;
    if (e > 1) base *= base;
  }
  return result;
}

bool Finite(double v) { return std::isfinite(v); }

// Decides whether candidate m, with poles z, may be passed over without its
// full fit (look->fullFit false), or needs it. xx is ||x||^2, best the best
// score so far, c the penalty per order. Statuses: only kNoMemory.
template <typename T>
StatusCode FastLook(const T* x, int32_t n, double xx, const Complex* z, int32_t m, double best,
                    double c, Look* look) {
  look->fullFit = true;
  for (int32_t i = 0; i < m; ++i) {
    if (!Finite(z[i].real()) || !Finite(z[i].imag())) return status::kOk;
  }
  const size_t mm = static_cast<size_t>(m);
  WorkArray<Complex> cwork = AllocWorkUninit<Complex>(mm * mm + 3 * mm);
  WorkArray<double> dwork = AllocWorkUninit<double>(7 * mm);
  if (!cwork || !dwork) return status::kNoMemory;
  Complex* G = cwork.get();  // column-major, upper triangle
  Complex* p = G + mm * mm;  // z^n
  Complex* y = p + mm;       // b, then R^-H b
  Complex* A = y + mm;       // R^-1 y
  double* a = dwork.get();   // sqrt(G_ii)
  double* colSum = a + mm;   // column sums of |G|
  double* accRe = colSum + mm;
  double* accIm = accRe + mm;
  double* wRe = accIm + mm;
  double* wIm = wRe + mm;
  double* absP = wIm + mm;  // |p_i|

  const double nn = static_cast<double>(n);
  for (size_t i = 0; i < mm; ++i) {
    p[i] = PowerN(z[i], n);
    absP[i] = std::sqrt(AbsSquared(p[i]));
    colSum[i] = 0.0;
  }
  // G, its entries' error bounds (squared, summed over both triangles) and
  // column sums. The diagonal first: its square roots weigh the others' bounds.
  double errG2 = 0.0;
  double trace = 0.0;
  for (size_t i = 0; i < mm; ++i) {
    const double w = AbsSquared(z[i]);
    const double d = 1.0 - w;
    double g = 0.0;
    double e = 0.0;
    if (nn * std::fabs(d) >= 1.0) {
      const double pp = AbsSquared(p[i]);
      g = (1.0 - pp) / d;
      e = ((2.0 * nn + 4.0) * pp + 3.0) / std::fabs(d) + 4.0 * g;
    } else {
      g = GeometricSumNearOne(w, 0.0, n).real();
      e = 8.0 * g;
    }
    e += 2.0 * nn * g;
    G[i * mm + i] = Complex(g, 0.0);
    a[i] = std::sqrt(g);
    errG2 += e * e;
    trace += g;
    colSum[i] += std::fabs(g);
  }
  // Off the diagonal, plain real arithmetic: |1 - w| >= 1/n keeps the
  // division's denominator away from underflow, and a non-finite entry shows
  // in the summed bounds.
  for (size_t j = 0; j < mm; ++j) {
    const double zjr = z[j].real(), zji = z[j].imag();
    const double pjr = p[j].real(), pji = p[j].imag();
    for (size_t i = 0; i < j; ++i) {
      const double zir = z[i].real(), zii = z[i].imag();
      const double wr = zir * zjr + zii * zji;
      const double wi = zir * zji - zii * zjr;
      const double dr = 1.0 - wr, di = -wi;
      const double dd = dr * dr + di * di;
      double gr = 0.0, gi = 0.0, e = 0.0;
      if (nn * nn * dd >= 1.0) {
        const double pir = p[i].real(), pii = p[i].imag();
        const double nr = 1.0 - (pir * pjr + pii * pji);  // 1 - conj(p_i) p_j
        const double ni = -(pir * pji - pii * pjr);
        gr = (nr * dr + ni * di) / dd;
        gi = (ni * dr - nr * di) / dd;
        const double ad = std::sqrt(dd);
        e = ((2.0 * nn + 4.0) * absP[i] * absP[j] + 3.0) / ad + 4.0 * std::sqrt(gr * gr + gi * gi);
      } else {
        const Complex g = GeometricSumNearOne(wr, wi, n);
        gr = g.real();
        gi = g.imag();
        e = 8.0 * std::sqrt(gr * gr + gi * gi);
      }
      e += 2.0 * nn * a[i] * a[j];
      G[j * mm + i] = Complex(gr, gi);
      errG2 += 2.0 * e * e;
      const double ag = std::sqrt(gr * gr + gi * gi);
      colSum[i] += ag;
      colSum[j] += ag;
    }
  }
  double normG1 = 0.0;
  double total = 0.0;  // NaN passes std::max by, not a sum
  for (size_t j = 0; j < mm; ++j) {
    normG1 = std::max(normG1, colSum[j]);
    total += colSum[j];
  }
  if (!Finite(errG2) || !Finite(trace) || !Finite(total)) return status::kOk;

  // b_i = sum_t x_t conj(z_i)^t, Horner's rule from the last sample, all
  // poles a sample at a time.
  for (size_t i = 0; i < mm; ++i) {
    wRe[i] = z[i].real();
    wIm[i] = -z[i].imag();
    accRe[i] = 0.0;
    accIm[i] = 0.0;
  }
  for (int32_t t = n - 1; t >= 0; --t) {
    const double xr = RealPart(x[t]), xi = ImagPart(x[t]);
    for (size_t i = 0; i < mm; ++i) {
      const double re = accRe[i] * wRe[i] - accIm[i] * wIm[i] + xr;
      const double im = accRe[i] * wIm[i] + accIm[i] * wRe[i] + xi;
      accRe[i] = re;
      accIm[i] = im;
    }
  }
  for (size_t i = 0; i < mm; ++i) {
    if (!Finite(accRe[i]) || !Finite(accIm[i])) return status::kOk;
    y[i] = Complex(accRe[i], accIm[i]);
  }

  lapack_int notDefinite = 0;
  StatusCode st = lapack::Potrf(m, G, m, &notDefinite);
  if (st == status::kNoMemory) return st;
  if (st != status::kOk || notDefinite != 0) return status::kOk;
  double rcond = 0.0;
  st = lapack::Pocon(m, G, m, normG1, &rcond);
  if (st == status::kNoMemory) return st;
  if (st != status::kOk || !(rcond * kMaxConditionG >= 1.0)) return status::kOk;

  lapack::TrsvUpper(true, m, G, m, y);
  std::memcpy(static_cast<void*>(A), y, mm * sizeof(Complex));
  lapack::TrsvUpper(false, m, G, m, A);
  double q = 0.0;
  double amp2 = 0.0;
  for (size_t i = 0; i < mm; ++i) {
    q += AbsSquared(y[i]);
    amp2 += AbsSquared(A[i]);
  }
  const double amp = std::sqrt(amp2);
  const double normV = std::sqrt(trace);  // ||V||_F
  const double normX = std::sqrt(xx);
  const double md = static_cast<double>(m);

  // The fast fit's error, in units of n E.
  const double eG = kEps * std::sqrt(errG2) + 3.0 * (md + 1.0) * kEps * trace;
  const double eB = 4.0 * nn * kEps * normX * normV;
  const double inverseG = 10.0 / (rcond * normG1);  // >= ||G^-1||_2, estimated
  if (!(eG * inverseG <= 0.25)) return status::kOk;
  const double nE = xx - q;
  const double fastError = 2.0 * eG * amp2 + 4.0 * eB * amp + 3.0 * eB * eB * inverseG +
                           4.0 * kEps * xx + 2.0 * md * kEps * q;
  // The full fit's distance from the exact residual.
  const double rho = std::sqrt(std::max(nE + fastError, 0.0));
  const double kappa = std::sqrt(trace * inverseG);
  const double eF = (nn + 4.0) * (md + 4.0) * kEps * (normX + 2.0 * normV * amp + kappa * rho) +
                    8.0 * (md + 2.0) * kEps * normV * amp;
  const double fullError = 2.0 * rho * eF + eF * eF + 2.0 * nn * kEps * rho * rho;
  const double spread = kSafety * (fastError + fullError);

  const double lo = (nE - spread) / nn;
  if (!Finite(lo) || !Finite(spread) || !(lo >= kPerfectFit)) return status::kOk;
  const double scoreLo = nn * std::log(lo) + md * c;
  const double margin = 64.0 * kEps * (std::fabs(nn * std::log(lo)) + md * c + std::fabs(best));
  if (!Finite(scoreLo) || !(scoreLo - margin >= best)) return status::kOk;
  look->fullFit = false;
  return status::kOk;
}

// ||x||^2, compensated.
template <typename T>
double SquaredNorm(const T* x, int32_t n) {
  double sum = 0.0, carry = 0.0;
  for (int32_t t = 0; t < n; ++t) {
    const double v = AbsSquared(x[t]);
    const double next = sum + v;
    carry += std::fabs(sum) >= std::fabs(v) ? (sum - next) + v : (v - next) + sum;
    sum = next;
  }
  return sum + carry;
}

template <typename T>
StatusCode MdlOrder(const T* x, int32_t n, int32_t L, int32_t minOrder, bool fast, int32_t* order) {
  assert(checks::Mdl(n, L, minOrder, checks::Bound::kWide) == status::kOk);

  // A pencil parameter of exactly n/2 is moved one below it.
  const int32_t Lp = (L == n / 2) ? L - 1 : L;
  const int32_t r = (n - Lp) < Lp ? (n - Lp) : Lp;

  // The real form builds the pencil with parameter and order r; the complex form
  // with L' for both, which yields the same r x r size (the leading L' x L' block
  // when r = L', the whole r x r matrix when n - L' < L'), but from a pencil with
  // L' columns rather than r.
  int32_t pencilL = r;
  if constexpr (kIsComplex<T>) pencilL = Lp;

  const size_t rr = static_cast<size_t>(r > 0 ? r : 0);
  auto K = AllocWork<T>(static_cast<size_t>(pencilL > 0 ? pencilL : 0) *
                        static_cast<size_t>(pencilL > 0 ? pencilL : 0));
  auto block = AllocWork<T>(rr * rr);
  auto poles = AllocWork<Complex>(rr);
  auto amplitudes = AllocWork<Complex>(rr);
  if (!K || !block || !poles || !amplitudes) return status::kNoMemory;

  StatusCode st = PencilMatrix(x, n, pencilL, pencilL, K.get());
  if (st != status::kOk) return st;

  const double xx = fast ? SquaredNorm(x, n) : 0.0;
  double best = kStartScore;
  const double c = kPenalty * std::log(static_cast<double>(n));
  for (int32_t m = minOrder; m <= r; ++m) {
    // Leading m x m block of K (row stride r), packed.
    for (int32_t i = 0; i < m; ++i) {
      std::memcpy(block.get() + static_cast<size_t>(i) * static_cast<size_t>(m),
                  K.get() + static_cast<size_t>(i) * rr, static_cast<size_t>(m) * sizeof(T));
    }
    st = EigGeneral(block.get(), m, 0, poles.get(), static_cast<Complex*>(nullptr));
    if (st != status::kOk) return st;
    if (fast) {
      Look look;
      st = FastLook(x, n, xx, poles.get(), m, best, c, &look);
      if (st != status::kOk) return st;
      if (!look.fullFit) continue;
    }
    double E = 0.0;
    st = ModeAmplitudes(x, n, poles.get(), m, amplitudes.get(), &E);
    if (st != status::kOk) return st;
    if (std::fabs(E) < kPerfectFit) {
      *order = m;
      break;
    }
    const double D = static_cast<double>(n) * std::log(E) + static_cast<double>(m) * c;
    if (D < best) {  // strict: ties keep the smaller order, NaN never wins
      best = D;
      *order = m;
    }
  }
  return status::kOk;
}

}  // namespace

StatusCode MdlOrderReal(const double* x, int32_t n, int32_t L, int32_t minOrder, int32_t* order) {
  return MdlOrder<double>(x, n, L, minOrder, true, order);
}
StatusCode MdlOrderComplex(const Complex* x, int32_t n, int32_t L, int32_t minOrder,
                           int32_t* order) {
  return MdlOrder<Complex>(x, n, L, minOrder, true, order);
}
StatusCode MdlOrderFullReal(const double* x, int32_t n, int32_t L, int32_t minOrder,
                            int32_t* order) {
  return MdlOrder<double>(x, n, L, minOrder, false, order);
}
StatusCode MdlOrderFullComplex(const Complex* x, int32_t n, int32_t L, int32_t minOrder,
                               int32_t* order) {
  return MdlOrder<Complex>(x, n, L, minOrder, false, order);
}
