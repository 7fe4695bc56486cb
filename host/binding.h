// Lazy binding to the host run-time. The library links to no host import
// library: the one host function it calls, NumericArrayResize, is looked up in
// the Graffel run-time module of the calling process on first use and
// remembered for the life of the process. Outside a Graffel process, or when
// the module lacks the function, the process ends with a fatal message.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>

#include "core/platform.h"
#include "qdm.h"

namespace host {

// One record per host function: the resolved address (null until first use)
// and the export name looked up.
//
// The address goes from null to resolved once. Threads that resolve at the same
// time each store the same address without a lock; the store and the load are
// relaxed atomics, which compile to the plain pointer-sized move this needs and
// keep the benign race defined for the language and for race detectors.
struct HostFunctionRecord {
  std::atomic<void*> address;
  const char name[24];
};

// The slot table: one record, for NumericArrayResize.
extern HostFunctionRecord g_host_functions[1];
inline HostFunctionRecord& NumericArrayResizeRecord() { return g_host_functions[0]; }

// The host's signature of NumericArrayResize.
using NumericArrayResizeFn = int32_t (*)(int32_t typeCode, int32_t numDims, QdmArrayHandle* handle,
                                         size_t count);

// Call stub: called exactly like the host function, resolving it on first use,
// and returns the host function's own result unchanged (0 or a host error).
int32_t NumericArrayResize(int32_t typeCode, int32_t numDims, QdmArrayHandle* handle, size_t count);

// The function address of a record, resolved if still null. Never returns
// null: a missing host or function ends the process.
void* ResolveHostFunction(HostFunctionRecord* record);

// The host run-time module, first hit wins: the module named by SetGFRTModule;
// the main executable if it exports "gGFRTVersion", then if it exports
// "AZNewHandle"; the already loaded run-time modules, in order. Nothing is
// loaded and nothing is cached. Null when no candidate matches.
platform::Module FindHostModule();

}  // namespace host
