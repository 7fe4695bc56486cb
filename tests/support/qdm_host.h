// End-to-end harness: loads the built library the way the host does and calls
// it only through its exports, with array handles owned by the emulated host
// run-time (libgfrtemu.so / gfrtemu.dll).
//
//   const qdmtest::QdmApi& qdm = qdmtest::Qdm();       // QDM_LIBRARY_PATH, loaded once
//   auto x = qdmtest::HostArray::Real({1, 2, 3, 4});
//   auto a = qdmtest::HostArray::Empty(QDM_TYPE_DOUBLE), r = ...;
//   double v = 0;
//   int32_t st = qdm.QdmReCovarianceH(x, 2, a, r, &v);
//   std::vector<double> coefficients = a.Reals();       // Count() elements
//
// Host elements sit at byte 4 of their block (4 mod 8): read and write them
// only through HostArray, which copies with memcpy.
#pragma once

#include <complex>
#include <cstdint>
#include <cstring>
#include <initializer_list>
#include <span>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#if defined(_WIN32)
#include <windows.h>
#else
#include <dlfcn.h>
#endif

#include "emuhost.h"
#include "qdm.h"

namespace qdmtest {

// ---- modules ---------------------------------------------------------------------------
// The one place that knows how a module is loaded and searched on each platform.

using Module = void*;

// Loads a shared library (its own symbols stay local, as with a host plug-in);
// null on failure, with the loader's message in *error.
inline Module OpenModule(const std::string& path, std::string* error = nullptr) {
#if defined(_WIN32)
  Module m = reinterpret_cast<Module>(LoadLibraryA(path.c_str()));
  if (m == nullptr && error != nullptr) *error = "LoadLibrary failed: " + path;
#else
  Module m = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
  if (m == nullptr && error != nullptr) *error = dlerror();
#endif
  return m;
}

inline void* ModuleSymbol(Module module, const char* name) {
#if defined(_WIN32)
  return reinterpret_cast<void*>(GetProcAddress(static_cast<HMODULE>(module), name));
#else
  return dlsym(module, name);
#endif
}

// The module of the emulated host run-time that this process links, as the
// library should be told about it, or null when the library's own lookup
// finds it. On POSIX the lookup probes the executable's global scope, which
// includes libgfrtemu.so; on Windows GetProcAddress on the executable sees only
// the executable's own exports, so gfrtemu.dll must be named.
inline Module EmulatedHostModule() {
#if defined(_WIN32)
  return reinterpret_cast<Module>(GetModuleHandleA("gfrtemu.dll"));
#else
  return nullptr;
#endif
}

// ---- the exports -------------------------------------------------------------------------

#define QDM_TEST_EXPORTS(X)                                                          \
  X(SetGFRTModule) X(QdmReCovarianceH) X(QdmCxCovarianceH) X(QdmRePCARH) X(QdmCxPCARH) \
  X(QdmRePronyH) X(QdmCxPronyH) X(QdmReMatrixPencilH) X(QdmCxMatrixPencilH)          \
  X(QdmReMinDescriptLenH) X(QdmCxMinDescriptLenH) X(QdmReCovPowerSpectrH)            \
  X(QdmCxCovPowerSpectrH) X(QdmRePCARPowerSpectrumH) X(QdmCxPCARPowerSpectrumH)

// Typed pointers to the fifteen exports, named as the exports are.
struct QdmApi {
  Module module = nullptr;
#define QDM_TEST_MEMBER(name) decltype(&::name) name = nullptr;
  QDM_TEST_EXPORTS(QDM_TEST_MEMBER)
#undef QDM_TEST_MEMBER
};

// Loads the library at `path` and resolves every export; throws
// std::runtime_error naming what is missing. With `nameHost` the emulated host
// module is named through SetGFRTModule where the platform needs it.
inline QdmApi LoadQdm(const std::string& path, bool nameHost = true) {
  QdmApi api;
  std::string error;
  api.module = OpenModule(path, &error);
  if (api.module == nullptr) throw std::runtime_error("cannot load " + path + ": " + error);
#define QDM_TEST_RESOLVE(name)                                                    \
  api.name = reinterpret_cast<decltype(api.name)>(ModuleSymbol(api.module, #name)); \
  if (api.name == nullptr) throw std::runtime_error(path + " does not export " #name);
  QDM_TEST_EXPORTS(QDM_TEST_RESOLVE)
#undef QDM_TEST_RESOLVE
  if (nameHost && EmulatedHostModule() != nullptr) api.SetGFRTModule(EmulatedHostModule());
  return api;
}

#if defined(QDM_LIBRARY_PATH)
// The built library, loaded on first use and kept for the life of the process.
inline const QdmApi& Qdm() {
  static const QdmApi api = LoadQdm(QDM_LIBRARY_PATH);
  return api;
}
#endif

// ---- host arrays -----------------------------------------------------------------------------

// One host array handle owned by the emulated host; freed on destruction.
// Converts to QdmArrayHandle, so it can be passed to an export directly.
class HostArray {
 public:
  // A type-10 array holding `values`, count set.
  static HostArray Real(std::span<const double> values) {
    return HostArray(EmuMakeHandle(QDM_TYPE_DOUBLE, static_cast<int32_t>(values.size()),
                                   values.data()));
  }
  static HostArray Real(std::initializer_list<double> values) {
    return Real(std::span<const double>(values.begin(), values.size()));
  }
  // A type-13 array holding `values`, count set.
  static HostArray Complex(std::span<const std::complex<double>> values) {
    return HostArray(EmuMakeHandle(QDM_TYPE_COMPLEX, static_cast<int32_t>(values.size()),
                                   reinterpret_cast<const double*>(values.data())));
  }
  // An array of `count` elements of the type code, every double equal to `fill`:
  // an output with stale contents.
  static HostArray Filled(int32_t typeCode, int32_t count, double fill) {
    const size_t doubles = static_cast<size_t>(count) * (typeCode == QDM_TYPE_COMPLEX ? 2 : 1);
    std::vector<double> values(doubles, fill);
    return HostArray(EmuMakeHandle(typeCode, count, values.data()));
  }
  // An array with no elements.
  static HostArray Empty(int32_t typeCode) { return HostArray(EmuMakeHandle(typeCode, 0, nullptr)); }

  HostArray(HostArray&& other) noexcept : handle_(std::exchange(other.handle_, nullptr)) {}
  HostArray& operator=(HostArray&& other) noexcept {
    std::swap(handle_, other.handle_);
    return *this;
  }
  HostArray(const HostArray&) = delete;
  HostArray& operator=(const HostArray&) = delete;
  ~HostArray() { EmuFreeHandle(handle_); }

  QdmArrayHandle get() const { return handle_; }
  operator QdmArrayHandle() const { return handle_; }

  // The count field, and the number of elements the last resize provided.
  int32_t Count() const { return EmuCount(handle_); }
  size_t Capacity() const { return EmuCapacity(handle_); }
  // Byte address of the first element (for alignment checks only).
  uintptr_t ElementAddress() const { return reinterpret_cast<uintptr_t>(EmuElements(handle_)); }

  // The first Count() elements (or `count` when given), copied out.
  std::vector<double> Reals() const { return Reals(Count()); }
  std::vector<double> Reals(int32_t count) const {
    std::vector<double> out(count > 0 ? static_cast<size_t>(count) : 0);
    if (!out.empty()) EmuRead(handle_, out.data(), out.size());
    return out;
  }
  std::vector<std::complex<double>> Complexes() const { return Complexes(Count()); }
  std::vector<std::complex<double>> Complexes(int32_t count) const {
    std::vector<std::complex<double>> out(count > 0 ? static_cast<size_t>(count) : 0);
    if (!out.empty()) EmuRead(handle_, reinterpret_cast<double*>(out.data()), 2 * out.size());
    return out;
  }

 private:
  explicit HostArray(QdmArrayHandle handle) : handle_(handle) {
    if (handle_ == nullptr) throw std::runtime_error("emulated host could not make a handle");
  }
  QdmArrayHandle handle_;
};

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
