// Complex scalar operations on (re, im) pairs: polar form, division, square root.

#include <cmath>

#include "numeric/numeric.h"

StatusCode ComplexToPolar(double re, double im, double* magnitude, double* angle) {
  if (re == 0.0 && im == 0.0) {
    *magnitude = 0.0;
    *angle = 0.0;
    return status::kOk;
  }
  // Unscaled: the squares may overflow for values near the largest double.
  *magnitude = std::sqrt(re * re + im * im);
  *angle = std::atan2(im, re);
  return status::kOk;
}

// Smith's method: the ratio of the divisor's smaller to its larger part keeps
// the intermediate products in range. A zero divisor is not checked.
StatusCode ComplexDivide(double a, double b, double c, double d, double* re, double* im) {
  if (std::fabs(c) >= std::fabs(d)) {
    const double r = d / c;
    const double den = c + r * d;
    *re = (a + r * b) / den;
    *im = (b - r * a) / den;
  } else {
    const double r = c / d;
    const double den = r * c + d;
    *re = (r * a + b) / den;
    *im = (r * b - a) / den;
  }
  return status::kOk;
}

// Principal root through the polar form: half the angle, root of the modulus.
// The branch cut is the negative real axis; the real part is never negative.
StatusCode ComplexSqrt(double re, double im, double* outRe, double* outIm) {
  const double s = re * re + im * im;
  if (s == 0.0) {
    *outRe = 0.0;
    *outIm = 0.0;
    return status::kOk;
  }
  const double rho = std::sqrt(std::sqrt(s));
  const double theta = std::atan2(im, re) / 2.0;
  *outRe = rho * std::cos(theta);
  *outIm = rho * std::sin(theta);
  return status::kOk;
}
