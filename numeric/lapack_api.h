// The installed LAPACK and CBLAS prototypes (32-bit integers), with LAPACK's
// complex type mapped onto std::complex<double> so that Complex arrays pass
// straight through.
#pragma once

#include <complex>
#define lapack_complex_float std::complex<float>
#define lapack_complex_double std::complex<double>
#include <lapack.h>
#include <cblas.h>
