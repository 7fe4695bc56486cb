// End-to-end harness: the host side of examples/host_loader.h, plus the
// built library loaded once (QDM_LIBRARY_PATH) and the emulated host's resize
// log.
#pragma once

#include "host_loader.h"

namespace qdmtest {

using namespace qdmhost;

#if defined(QDM_LIBRARY_PATH)
// The built library, loaded on first use and kept for the life of the process.
inline const QdmApi& Qdm() {
  static const QdmApi api = LoadQdm(QDM_LIBRARY_PATH);
  return api;
}
#endif

// ---- resize calls -----------------------------------------------------------------------------

struct ResizeCall {
  int32_t typeCode;
  int32_t numDims;
  size_t count;
  bool operator==(const ResizeCall&) const = default;
};

// Marks the current point in the emulated host's resize log.
inline int64_t ResizeMark() { return EmuResizeCalls(); }

// Every NumericArrayResize call made since `mark`, in order.
inline std::vector<ResizeCall> ResizesSince(int64_t mark) {
  std::vector<ResizeCall> calls;
  const int64_t last = EmuResizeCalls();
  for (int64_t call = mark + 1; call <= last; ++call) {
    ResizeCall c{};
    if (EmuResizeAt(call, &c.typeCode, &c.numDims, &c.count) != 0) calls.push_back(c);
  }
  return calls;
}

// ---- host status codes -----------------------------------------------------------------------

// Host status of an estimator argument error code (1, 11..18).
constexpr int32_t HostCode(int32_t internalCode) { return -42400 - internalCode; }
constexpr int32_t kHostNoMemory = -20001;

}  // namespace qdmtest
