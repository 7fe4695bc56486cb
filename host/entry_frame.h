// The sequence every analysis entry point runs, written once. An entry point
// contributes only tables (its argument checks, its outputs in resize order,
// its out doubles) and the call of its estimator; RunEntry does the rest:
//
//   1. the argument checks (estimation/entry_checks.h, shared with the plain
//      face); the first that fails is the status;
//   2. the resizes, in table order, through the host's NumericArrayResize;
//   3. the counts the entry point knows;
//   4. the estimator, on aligned copies (below);
//   5. results into the host blocks, mode counts, out doubles;
//   6. on failure: every output resized to 0 elements with its type code
//      (results ignored), every count 0, the listed out doubles 0.0, and the
//      status mapped to the host numbering.
//
// Host memory. The host's array elements start at byte 4 of a block whose
// start is 8-aligned, so they sit at 4 mod 8 and a double* or Complex* into
// them would be misaligned: undefined behaviour in C++, and code the compiler
// may vectorise on the assumption of alignment. So no typed pointer to host
// memory is ever formed. The input is copied with memcpy into an aligned work
// array at the boundary, the estimator writes into aligned work arrays, and the
// results are copied into the host blocks with memcpy afterwards. Counts and out
// doubles take the same path through aligned locals. Everything below the entry
// points therefore sees only aligned memory. The copies cost O(n + outputs),
// small beside any estimator.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>

#include "estimation/estimation.h"
#include "core/types.h"
#include "qdm.h"

namespace host {

// Host status for an internal status: argument errors (s > 0) become
// -42400 - s; success and the negative numeric codes pass unchanged. The same
// rule maps a non-zero result of NumericArrayResize.
constexpr int32_t MapStatus(StatusCode s) { return s > 0 ? -42400 - s : s; }

// Count field of a host block (byte 0), read and written with memcpy.
int32_t BlockCount(QdmArrayHandle handle);
void SetBlockCount(QdmArrayHandle handle, int32_t count);
// First element of a host block (byte 4). Only ever used with memcpy.
void* BlockElements(QdmArrayHandle handle);

// Doubles per element of a host type code.
constexpr size_t DoublesPerElement(int32_t typeCode) {
  return typeCode == QDM_TYPE_COMPLEX ? 2 : 1;
}

// ---- tables an entry point supplies -------------------------------------------------

// Who writes an output's count: the entry point (its length, before the
// estimator runs) or the estimator (the number of modes it reports, written to
// every such output after a successful call).
enum class CountSource : uint8_t { kLength, kModes };

struct OutputArray {
  QdmArrayHandle handle;
  int32_t typeCode;  // QDM_TYPE_DOUBLE or QDM_TYPE_COMPLEX
  int32_t length;    // elements asked of the resize
  CountSource count;
};

// What an out double receives on success, and whether failure zeroes it.
enum class OutDoubleRole : uint8_t {
  kEstimator,    // written by the estimator; 0.0 on failure
  kSpectrumF0,   // the spectrum record's first value; 0.0 on failure
  kSpectrumDf,   // the spectrum record's second value; 0.0 on failure
  kPassThrough,  // handed to the estimator and left as it leaves it, on every path
};

struct OutDouble {
  double* host;
  OutDoubleRole role;
};

// What a failed resize does: run the failure path, or (two real-data entry
// points) return the mapped host error at once, outputs left as they are.
enum class ResizeFailure : uint8_t { kEmptyOutputs, kReturnAtOnce };

inline constexpr int kMaxOutputs = 4;
inline constexpr int kMaxOutDoubles = 3;

struct EntryPlan {
  QdmArrayHandle input;
  int32_t inputType;
  int32_t n;                              // the input block's count, read once per call
  StatusCode check;                       // the first failed argument check, 0 if all pass
  std::span<const OutputArray> outputs;   // in resize order, at most kMaxOutputs
  std::span<const OutDouble> outDoubles;  // at most kMaxOutDoubles
  ResizeFailure onResizeFailure = ResizeFailure::kEmptyOutputs;
};

// ---- what the estimator sees -------------------------------------------------------

// Aligned stand-ins for the host memory of one call. `n` is the input block's
// count as the entry point read it (once, into EntryPlan::n); outputs[i] belongs to
// entry.outputs[i] (zero-filled, `length` elements); outDoubles[j] to
// entry.outDoubles[j]; `modes` is the count for CountSource::kModes outputs;
// `spectrum` is the record handed to the spectrum estimators.
struct EntryCall {
  const void* input;
  int32_t n;
  void* outputs[kMaxOutputs];
  double outDoubles[kMaxOutDoubles];
  int32_t modes;
  SpectrumResult spectrum;

  const double* RealInput() const { return static_cast<const double*>(input); }
  const Complex* ComplexInput() const { return static_cast<const Complex*>(input); }
  double* RealOutput(int i) const { return static_cast<double*>(outputs[i]); }
  Complex* ComplexOutput(int i) const { return static_cast<Complex*>(outputs[i]); }
};

// Type-erased estimator call, so that the sequence is compiled once.
struct EstimatorCall {
  StatusCode (*invoke)(const void* estimator, EntryCall& call);
  const void* estimator;
};

int32_t RunEntry(const EntryPlan& entry, EstimatorCall estimate);

template <typename Estimator>
int32_t RunEntry(const EntryPlan& entry, const Estimator& estimator) {
  const EstimatorCall call{[](const void* e, EntryCall& c) -> StatusCode {
                             return (*static_cast<const Estimator*>(e))(c);
                           },
                           &estimator};
  return RunEntry(entry, call);
}

// ---- the MDL pair ------------------------------------------------------------------
// A failed check returns its host code (-42401, -42414, -42415) and leaves the
// result untouched; the estimator gets the aligned input and an aligned order;
// a failed estimator sets the result to 0.
using MdlEstimator = StatusCode (*)(const void* x, int32_t n, int32_t L, int32_t minOrder,
                                    int32_t* order);
int32_t RunMdlEntry(QdmArrayHandle data, int32_t inputType, int32_t n, StatusCode check, int32_t L,
                    int32_t minOrder, int32_t* order, MdlEstimator estimate);

}  // namespace host
