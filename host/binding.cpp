#include "host/binding.h"

#include <cstdio>

namespace host {

HostFunctionRecord g_host_functions[1] = {{{nullptr}, "NumericArrayResize"}};

namespace {
// Module named by SetGFRTModule; null selects the automatic lookup. Written
// only by SetGFRTModule, read whenever a record is still unresolved.
std::atomic<platform::Module> g_module_override{nullptr};

constexpr const char* kExecutableProbes[] = {"gGFRTVersion", "AZNewHandle"};
}  // namespace

platform::Module FindHostModule() {
  if (platform::Module named = g_module_override.load(std::memory_order_relaxed)) return named;
  const platform::Module exe = platform::MainExecutable();
  for (const char* probe : kExecutableProbes) {
    if (platform::Symbol(exe, probe) != nullptr) return exe;
  }
  if (platform::Module loaded = platform::LoadedModule(platform::kRuntimeModuleNames[0])) {
    return loaded;
  }
  return platform::LoadedModule(platform::kRuntimeModuleNames[1]);
}

void* ResolveHostFunction(HostFunctionRecord* record) {
  const platform::Module module = FindHostModule();
  if (module == nullptr) platform::Fatal("graffel.lib was not called from a Graffel process.");
  void* address = record->address.load(std::memory_order_relaxed);
  if (address == nullptr) {
    address = platform::Symbol(module, record->name);
    record->address.store(address, std::memory_order_relaxed);
  }
  if (address == nullptr) {
    char text[256];
    std::snprintf(text, sizeof text, "graffel.lib could not locate \"%s\".", record->name);
    platform::Fatal(text);
  }
  return address;
}

int32_t NumericArrayResize(int32_t typeCode, int32_t numDims, QdmArrayHandle* handle,
                           size_t count) {
  HostFunctionRecord& record = NumericArrayResizeRecord();
  void* address = record.address.load(std::memory_order_relaxed);
  if (address == nullptr) address = ResolveHostFunction(&record);
  return reinterpret_cast<NumericArrayResizeFn>(address)(typeCode, numDims, handle, count);
}

}  // namespace host

extern "C" QDM_API void SetGFRTModule(void* module) {
  host::g_module_override.store(module, std::memory_order_relaxed);
}
