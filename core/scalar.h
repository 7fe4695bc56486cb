// The two element types every real/complex routine is written over, double and
// Complex, and what their templates share: whether T is complex, its real
// type, and the few scalar operations whose real form is a no-op (conjugate,
// imaginary part) or a plain square. A routine is one template over T; where
// the twins deliberately differ it says so with `if constexpr (kIsComplex<T>)`.
#pragma once

#include <complex>

#include "core/types.h"

namespace scalar_detail {
template <typename T>
struct Traits {
  static_assert(sizeof(T) == 0, "element types are double and Complex only");
};
template <>
struct Traits<double> {
  static constexpr bool kComplex = false;
  using Real = double;
};
template <>
struct Traits<Complex> {
  static constexpr bool kComplex = true;
  using Real = double;
};
}  // namespace scalar_detail

// True for Complex, false for double; any other type does not compile.
template <typename T>
inline constexpr bool kIsComplex = scalar_detail::Traits<T>::kComplex;

// The real type of T (double for both).
template <typename T>
using RealOf = typename scalar_detail::Traits<T>::Real;

// The conjugate; the value itself for real data.
template <typename T>
inline T Conj(const T& v) {
  if constexpr (kIsComplex<T>) {
    return std::conj(v);
  } else {
    return v;
  }
}

// Real and imaginary parts; the imaginary part of real data is 0.
template <typename T>
inline double RealPart(const T& v) {
  if constexpr (kIsComplex<T>) {
    return v.real();
  } else {
    return v;
  }
}
template <typename T>
inline double ImagPart(const T& v) {
  if constexpr (kIsComplex<T>) {
    return v.imag();
  } else {
    (void)v;
    return 0.0;
  }
}

// |v|^2 as re*re + im*im (v*v for real data): no scaling, no square root.
template <typename T>
inline double AbsSquared(const T& v) {
  if constexpr (kIsComplex<T>) {
    return v.real() * v.real() + v.imag() * v.imag();
  } else {
    return v * v;
  }
}

// The element re + i im; real data keep re alone.
template <typename T>
inline T MakeScalar(double re, double im) {
  if constexpr (kIsComplex<T>) {
    return T(re, im);
  } else {
    (void)im;
    return re;
  }
}
