// Roots of a polynomial with complex coefficients: zero roots and roots at
// infinity removed first, degree 1 and 2 in closed form, higher degrees one root
// at a time by a damped Newton iteration with step control, deflating after each
// root. The order in which roots are written is part of the estimators' output,
// so every step below runs in a fixed order.
//
// Sums, differences, negation and real scaling use std::complex's operators,
// which work part by part. Products, quotients and moduli are spelled out on
// (re, im) pairs, so that every one is formed the same way on every compiler:
// the library's product adds a NaN-recovery call, its quotient and modulus
// scale differently.

#include <algorithm>
#include <cmath>
#include <cstring>

#include "core/scalar.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

Complex Mul(Complex x, Complex y) {
  return {x.real() * y.real() - x.imag() * y.imag(), x.real() * y.imag() + x.imag() * y.real()};
}

double Abs(Complex x) { return std::hypot(x.real(), x.imag()); }  // no overflow of the squares
bool IsZero(Complex x) { return x.real() == 0.0 && x.imag() == 0.0; }

// num / den with numerator and divisor first divided through by the larger in
// magnitude of the divisor's parts, so that no intermediate square overflows.
Complex ScaledDivide(Complex num, Complex den) {
  const double s = std::max(std::fabs(den.real()), std::fabs(den.imag()));
  const double nr = num.real() / s;
  const double ni = num.imag() / s;
  const double dr = den.real() / s;
  const double di = den.imag() / s;
  const double d2 = dr * dr + di * di;
  return {(nr * dr + ni * di) / d2, (ni * dr - nr * di) / d2};
}

// p(z) = c[0] + c[1] z + ... + c[m] z^m by Horner's rule.
Complex EvalPoly(const Complex* c, ptrdiff_t m, Complex z) {
  Complex p = c[m];
  for (ptrdiff_t k = m - 1; k >= 0; --k) p = Mul(p, z) + c[k];
  return p;
}

// p'(z) by Horner's rule on the derivative coefficients k c[k].
Complex EvalDerivative(const Complex* c, ptrdiff_t m, Complex z) {
  Complex d = static_cast<double>(m) * c[m];
  for (ptrdiff_t k = m - 1; k >= 1; --k) d = Mul(d, z) + static_cast<double>(k) * c[k];
  return d;
}

// The step that replaces a failed or undefined Newton step: the remembered step
// turned and halved, (a + ib)(-0.4 - 0.3i).
Complex TurnHalf(Complex remembered) { return Mul(remembered, Complex(-0.4, -0.3)); }

// Degree 1: c[0] + c[1] z.
void SolveLinear(const Complex* c, Complex* roots, ptrdiff_t* written) {
  roots[(*written)++] = ScaledDivide(-c[0], c[1]);
}

// Degree 2: c[0] + c[1] z + c[2] z^2, in the cancellation-free form.
void SolveQuadratic(const Complex* coef, Complex* roots, ptrdiff_t* written) {
  const Complex a = coef[2];
  const Complex b = coef[1];
  const Complex c = coef[0];
  if (IsZero(c)) {
    roots[(*written)++] = Complex(0.0, 0.0);
    roots[(*written)++] = ScaledDivide(-b, a);
    return;
  }
  const Complex d = Mul(b, b) - 4.0 * Mul(a, c);
  double sr = 0.0;
  double si = 0.0;
  (void)ComplexSqrt(d.real(), d.imag(), &sr, &si);
  const Complex s(sr, si);
  Complex q = b + s;
  const Complex q_minus = b - s;
  if (AbsSquared(q_minus) > AbsSquared(q)) q = q_minus;
  roots[(*written)++] = ScaledDivide(-q, 2.0 * a);
  roots[(*written)++] = ScaledDivide(-2.0 * c, q);
}

// One root of the degree-m polynomial c[0..m] (m >= 3) by the damped Newton
// iteration. At most maxIterations iterations (Newton steps and failed trials).
StatusCode NewtonRoot(const Complex* c, ptrdiff_t m, int32_t max_iterations, Complex* root) {
  // Start point: half the smallest of 1 and |c0/ck|^(1/k), in the direction of
  // the first Newton step from the origin, -c0/c1.
  double r = 1.0;
  for (ptrdiff_t k = 1; k <= m; ++k) {
    if (IsZero(c[k])) continue;
    const double term =
        std::pow(AbsSquared(ScaledDivide(c[0], c[k])), 0.5 / static_cast<double>(k));
    r = std::min(r, term);
  }
  r *= 0.5;
  Complex u(1.0, 0.0);
  if (!IsZero(c[1])) {
    const Complex w = ScaledDivide(-c[0], c[1]);
    const double len = Abs(w);
    if (len > 0.0 && std::isfinite(len)) u = Complex(w.real() / len, w.imag() / len);
  }
  Complex z = r * u;
  Complex pz = EvalPoly(c, m, z);
  double f = Abs(pz);
  // |p| = 0 exactly is a root wherever it is met, the start point included.
  if (f == 0.0) {
    *root = z;
    return status::kOk;
  }

  // Convergence level for |p|: rounding noise of the evaluation near a root.
  const double level = 16.0 * static_cast<double>(static_cast<int32_t>(m - 1)) * Abs(c[0]) * 1e-10;
  Complex remembered = u;  // the previous step, turned and halved on failure
  double last_move = r;    // the start point counts as the first move, from 0
  int64_t iterations = 0;

  for (;;) {
    // Newton step, or the turned and halved previous step where p' vanishes.
    if (++iterations > max_iterations) return status::kNoConvergence;
    const Complex dp = EvalDerivative(c, m, z);
    if (std::isnan(dp.real()) || std::isnan(dp.imag())) return status::kRootNaN;
    Complex dz = IsZero(dp) ? TurnHalf(remembered) : ScaledDivide(-pz, dp);
    // Step-length limit: at most three times the last move, and turned so that
    // a bounded step does not keep heading along a bad direction.
    const double limit = 3.0 * last_move;
    const double len = Abs(dz);
    if (len > limit) dz = (limit / len) * Mul(dz, Complex(0.8, 0.6));

    Complex best;
    double f_best = 0.0;
    for (;;) {
      const Complex z1 = z + dz;
      const double f1 = Abs(EvalPoly(c, m, z1));
      if (f1 < f) {
        // Keep going along dz while |p| falls: a root of multiplicity j is
        // reached near z + j dz.
        best = z1;
        f_best = f1;
        for (ptrdiff_t j = 2; j <= m; ++j) {
          const Complex zj = z + static_cast<double>(j) * dz;
          const double fj = Abs(EvalPoly(c, m, zj));
          if (!(fj < f_best)) break;
          best = zj;
          f_best = fj;
        }
        break;
      }
      // Overshoot: shorter and turned steps from the same point.
      const Complex trials[3] = {0.5 * dz, 0.25 * dz, Mul(dz, Complex(0.2, 0.15))};
      bool accepted = false;
      for (const Complex& t : trials) {
        const Complex zt = z + t;
        const double ft = Abs(EvalPoly(c, m, zt));
        if (ft < f) {
          best = zt;
          f_best = ft;
          accepted = true;
          break;
        }
      }
      if (accepted) break;
      // No point decreased |p|: replace the step from the remembered one. Both
      // remembered components take the new step's real part, so a further
      // failure turns (re, re) rather than the step just tried.
      dz = TurnHalf(remembered);
      remembered = Complex(dz.real(), dz.real());
      // The failed iteration leaves the iterate, and so |p|, unchanged: at or
      // below the convergence level that stagnation is a root (rounding noise
      // hides any further decrease, typically near a multiple root).
      if (f <= level) {
        *root = z;
        return status::kOk;
      }
      if (++iterations > max_iterations) return status::kNoConvergence;
    }

    // Accepted move.
    // An accepted move always lowers |p| strictly, so here only |p| = 0 and
    // the relative move length can end the iteration.
    remembered = dz;
    const Complex z_prev = z;
    z = best;
    f = f_best;
    pz = EvalPoly(c, m, z);
    last_move = Abs(z - z_prev);
    if (f == 0.0 || last_move < 1e-10 * Abs(z)) {
      *root = z;
      return status::kOk;
    }
  }
}

// Divides c[0..m] by (z - root), highest coefficient first, drops the remainder
// and moves the quotient down to c[0..m-1].
void Deflate(Complex* c, ptrdiff_t m, Complex root) {
  for (ptrdiff_t k = m - 1; k >= 0; --k) c[k] = c[k] + Mul(root, c[k + 1]);
  std::memmove(c, c + 1, static_cast<size_t>(m) * sizeof(Complex));
}

}  // namespace

StatusCode PolyRootsComplex(const Complex* coefficients, int32_t n, int32_t maxIterations,
                            Complex* roots) {
  if (n < 1) return status::kBadSize;
  const size_t count = static_cast<size_t>(n);

  // Roots written over the coefficients: read them from a private copy.
  WorkArray<Complex> alias_copy;
  const Complex* source = coefficients;
  if (static_cast<const void*>(roots) == static_cast<const void*>(coefficients)) {
    alias_copy = AllocWork<Complex>(count);
    if (!alias_copy) return status::kNoMemory;
    std::memcpy(alias_copy.get(), coefficients, count * sizeof(Complex));
    source = alias_copy.get();
  }
  WorkArray<Complex> work = AllocWork<Complex>(count);
  if (!work) return status::kNoMemory;
  Complex* c = work.get();

  // NaN screening while copying; infinities pass.
  for (size_t k = 0; k < count; ++k) {
    if (std::isnan(source[k].real()) || std::isnan(source[k].imag())) {
      return status::kBadPolynomial;
    }
    c[k] = source[k];
  }

  // Vanishing highest coefficients: roots at infinity, not reported.
  ptrdiff_t len = n;
  while (len > 0 && IsZero(c[len - 1])) --len;

  // Zero roots first: divide by z while the constant term is zero.
  ptrdiff_t written = 0;
  while (len > 1 && IsZero(c[0])) {
    roots[written++] = Complex(0.0, 0.0);
    std::memmove(c, c + 1, static_cast<size_t>(len - 1) * sizeof(Complex));
    --len;
  }
  if (len < 2) return written > 0 ? status::kOk : status::kBadPolynomial;

  while (len > 3) {
    const ptrdiff_t m = len - 1;
    Complex root;
    const StatusCode st = NewtonRoot(c, m, maxIterations, &root);
    if (st != status::kOk) return st;
    roots[written++] = root;
    Deflate(c, m, root);
    --len;
  }
  if (len == 3) {
    SolveQuadratic(c, roots, &written);
  } else {
    SolveLinear(c, roots, &written);
  }
  return status::kOk;
}
