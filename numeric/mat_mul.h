// The common worker behind MatMulReal and MatMulComplex. With copyInputs set, A
// and B are copied to scratch and the product is formed in scratch before it is
// copied to C, so that C may alias A or B. Instantiated for double and Complex.
#pragma once

#include <cstdint>

#include "core/types.h"

template <typename T>
[[nodiscard]] StatusCode MatMul(const T* A, const T* B, int32_t m, int32_t k, int32_t n, T* C,
                                bool copyInputs);
