// Run-time choice between the kernels' SSE2 and wide (AVX) variants.
#pragma once

namespace fftk {

// Whether the kernels take their wide variant: set at load when the processor
// has AVX. SetWideLanes(false) keeps them on SSE2 (tests and the benchmark
// compare the two); SetWideLanes(true) restores the default.
bool WideLanes();
void SetWideLanes(bool on);

}  // namespace fftk
