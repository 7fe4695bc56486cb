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
QDM_CHILD_EXPORT int32_t NumericArrayResize(int32_t typeCode, int32_t numDims,
                                            QdmArrayHandle* handle, size_t count) {
  if (numDims != 1 || (typeCode != 10 && typeCode != 13)) return 1;
  const size_t bytes = 8 + count * (typeCode == 13 ? 16 : 8);
  void* block = std::realloc(**handle, bytes);
  if (block == nullptr) return 2;
  **handle = static_cast<QdmArrayBlock*>(block);
  return 0;
}
#endif

namespace {

#if defined(_WIN32)
// Windows: the message boxes the library shows are made readable. The DLL's
// imported MessageBoxA (its import address table entry) is redirected to a
// function that writes "<caption>: <text>" to stderr, as the POSIX build writes
// its fatal messages, and then calls the real MessageBoxA. An owner other than
// null or a style other than 0x2010 (task-modal, error icon, OK) is reported on
// a line of its own first, so that it shows in a test comparing the first line.
using MessageBoxFn = int(WINAPI*)(HWND, LPCSTR, LPCSTR, UINT);

MessageBoxFn& RealMessageBox() {
  static MessageBoxFn real = nullptr;
  return real;
}

int WINAPI ReportingMessageBox(HWND owner, LPCSTR text, LPCSTR caption, UINT style) {
  if (owner != nullptr || style != 0x2010)
    std::fprintf(stderr, "MessageBoxA owner %p style 0x%x\n", static_cast<void*>(owner), style);
  std::fprintf(stderr, "%s: %s\n", caption, text);
  std::fflush(stderr);
  return RealMessageBox() ? RealMessageBox()(owner, text, caption, style) : IDOK;
}

// The import address table slot through which `module` calls dll!function, or
// null when the module does not import it by name.
ULONG_PTR* ImportSlot(HMODULE module, const char* dll, const char* function) {
  auto* base = reinterpret_cast<unsigned char*>(module);
  const auto* dos = reinterpret_cast<const IMAGE_DOS_HEADER*>(base);
  const auto* nt = reinterpret_cast<const IMAGE_NT_HEADERS*>(base + dos->e_lfanew);
  const IMAGE_DATA_DIRECTORY& imports =
      nt->OptionalHeader.DataDirectory[IMAGE_DIRECTORY_ENTRY_IMPORT];
  if (imports.VirtualAddress == 0) return nullptr;
  for (auto* entry = reinterpret_cast<IMAGE_IMPORT_DESCRIPTOR*>(base + imports.VirtualAddress);
       entry->Name != 0; ++entry) {
    if (_stricmp(reinterpret_cast<const char*>(base + entry->Name), dll) != 0) continue;
    auto* names = reinterpret_cast<IMAGE_THUNK_DATA*>(base + entry->OriginalFirstThunk);
    auto* slots = reinterpret_cast<IMAGE_THUNK_DATA*>(base + entry->FirstThunk);
    for (; names->u1.AddressOfData != 0; ++names, ++slots) {
      if (IMAGE_SNAP_BY_ORDINAL(names->u1.Ordinal)) continue;
      const auto* byName =
          reinterpret_cast<const IMAGE_IMPORT_BY_NAME*>(base + names->u1.AddressOfData);
      if (std::strcmp(reinterpret_cast<const char*>(byName->Name), function) == 0)
        return &slots->u1.Function;
    }
  }
  return nullptr;
}

// Returns false when the module does not import MessageBoxA from user32.
bool ReportMessageBoxes(void* module) {
  ULONG_PTR* slot = ImportSlot(static_cast<HMODULE>(module), "user32.dll", "MessageBoxA");
  if (slot == nullptr) return false;
  DWORD protection = 0;
  if (!VirtualProtect(slot, sizeof *slot, PAGE_READWRITE, &protection)) return false;
  RealMessageBox() = reinterpret_cast<MessageBoxFn>(*slot);
  *slot = reinterpret_cast<ULONG_PTR>(&ReportingMessageBox);
  VirtualProtect(slot, sizeof *slot, protection, &protection);
  return true;
}
#endif

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
  if (!ReportMessageBoxes(library)) return Fail("no MessageBoxA import to watch");
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
