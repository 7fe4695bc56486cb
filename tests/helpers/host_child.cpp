// A small host process for the run-time binding tests: loads the library given
// on the command line, optionally names a host module, makes one call that
// resizes an output, prints the status and exits 0. Paths that find no host
// function never return: the library prints its fatal message and exits 1.
//
// Built three ways (see tests/cmake/host.cmake):
//   qdm_child_nohost  links no host run-time;
//   qdm_child_host    links the emulated host run-time (probe "gGFRTVersion");
//   qdm_child_azhost  exports its own "AZNewHandle" and NumericArrayResize.
//
// usage: child <library> [none | module <path> | reset <path> | loaded <path>]
//   module: SetGFRTModule(<path> loaded)        reset: the same, then SetGFRTModule(null)
//   loaded: <path> loaded (local scope) before the call, nothing named
#if defined(_WIN32)
#include <windows.h>

#include "support/message_box_hook.h"
#define QDM_CHILD_EXPORT extern "C" __declspec(dllexport)
#else
#include <dlfcn.h>
#include <unistd.h>
#define QDM_CHILD_EXPORT extern "C" __attribute__((visibility("default")))
#endif

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "qdm.h"

#if defined(QDM_CHILD_OWN_HOST)
// The process's own host functions, found through the "AZNewHandle" probe of
// the executable.
QDM_CHILD_EXPORT void* AZNewHandle(int32_t bytes) {
  return std::malloc(static_cast<size_t>(bytes));
}
QDM_CHILD_EXPORT int32_t NumericArrayResize(
    int32_t typeCode, int32_t numDims, QdmArrayHandle* handle, size_t count) {
  if (numDims != 1 || (typeCode != 10 && typeCode != 13)) return 1;
  const size_t bytes = 8 + count * (typeCode == 13 ? 16 : 8);
  void* block = std::realloc(**handle, bytes);
  if (block == nullptr) return 2;
  **handle = static_cast<QdmArrayBlock*>(block);
  return 0;
}
#endif

namespace {

int Fail(const char* what) {
#if defined(_WIN32)
  const std::string why = "error " + std::to_string(GetLastError());
#else
  const std::string why = dlerror();
#endif
  std::fprintf(stderr, "child: %s: %s\n", what, why.c_str());
  return 2;
}

void* Open(const char* path) {
#if defined(_WIN32)
  return reinterpret_cast<void*>(LoadLibraryA(path));
#else
  return dlopen(path, RTLD_NOW | RTLD_LOCAL);
#endif
}

void* Symbol(void* module, const char* name) {
#if defined(_WIN32)
  return reinterpret_cast<void*>(GetProcAddress(static_cast<HMODULE>(module), name));
#else
  return dlsym(module, name);
#endif
}

}  // namespace

int main(int argc, char** argv) {
  if (argc < 2) return 2;
  void* library = Open(argv[1]);
  if (library == nullptr) return Fail("cannot load the library");
  auto set_module = reinterpret_cast<decltype(&SetGFRTModule)>(Symbol(library, "SetGFRTModule"));
  auto covariance =
      reinterpret_cast<decltype(&QdmReCovarianceH)>(Symbol(library, "QdmReCovarianceH"));
  if (set_module == nullptr || covariance == nullptr) return Fail("missing export");
#if defined(_WIN32)
  // The fatal message boxes show nothing without a display: their caption and
  // text go to stderr as well.
  if (!qdmtest::ReportMessageBoxes(library)) return Fail("no MessageBoxA import to watch");
#endif

  const char* mode = argc > 2 ? argv[2] : "none";
  if (std::strcmp(mode, "none") != 0) {
    if (argc < 4) return 2;
    void* module = Open(argv[3]);
    if (module == nullptr) return Fail("cannot load the module");
    if (std::strcmp(mode, "module") == 0 || std::strcmp(mode, "reset") == 0) set_module(module);
    if (std::strcmp(mode, "reset") == 0) set_module(nullptr);
  }

  // Six samples, order 2: the checks pass and the first resize follows.
  alignas(8) unsigned char input[4 + 6 * sizeof(double)];
  const int32_t n = 6;
  const double x[6] = {1.0, 0.5, -0.25, -0.6, 0.1, 0.4};
  std::memcpy(input, &n, 4);
  std::memcpy(input + 4, x, sizeof x);
  QdmArrayBlock* data_block = reinterpret_cast<QdmArrayBlock*>(input);
  QdmArrayBlock* coefficients_block = nullptr;
  QdmArrayBlock* poles_block = nullptr;
  double variance = 0;
  const int32_t st = covariance(&data_block, 2, &coefficients_block, &poles_block, &variance);
  std::printf("status %d\n", st);
  std::fflush(stdout);
  _exit(0);  // the host owns the output blocks; nothing to release here
}
