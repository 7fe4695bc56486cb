// out (n-by-m) = the transpose of the m-by-n A, conjugated when `conjugate` is
// set (complex only), in cache-sized tiles; out does not overlap A. This is also
// the column-major copy of a row-major A (lda = m).
template <typename T>
void TransposeTo(const T* A, int32_t m, int32_t n, T* out, bool conjugate);

// The common worker behind MatMulReal and MatMulComplex: C (m-by-n) = A B, C
// not overlapping A or B. Instantiated for double and Complex.
#pragma once

#include <cstdint>

#include "core/types.h"

template <typename T>
[[nodiscard]] StatusCode MatMul(const T* A, const T* B, int32_t m, int32_t k, int32_t n, T* C);
