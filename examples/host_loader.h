// The host side of libqdm, shared by the example host and the tests: loading
// the library as a host does (its own symbols kept local), the fifteen exports
// as typed function pointers, and array handles owned by the host run-time
// (here the emulated one, libgfrtemu / gfrtemu.dll, which the program links).
//
//   const qdmhost::QdmApi qdm = qdmhost::LoadQdm("libqdm.so", qdmhost::RuntimeModule());
//   auto x = qdmhost::HostArray::Real({1, 2, 3, 4});
//   auto a = qdmhost::HostArray::Empty(QDM_TYPE_DOUBLE), r = ...;
//   double v = 0;
//   int32_t st = qdm.QdmReCovarianceH(x, 2, a, r, &v);
//   std::vector<double> coefficients = a.Reals();       // Count() elements
//
// Host elements sit at byte 4 of their block (4 mod 8): they are read and
// written only through HostArray, which copies with memcpy.
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

namespace qdmhost {

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

// The module that holds this process's NumericArrayResize: the run-time a host
// names to the library.
inline Module RuntimeModule() {
  void* address = reinterpret_cast<void*>(&NumericArrayResize);
#if defined(_WIN32)
  HMODULE module = nullptr;
  GetModuleHandleExA(
      GET_MODULE_HANDLE_EX_FLAG_FROM_ADDRESS | GET_MODULE_HANDLE_EX_FLAG_UNCHANGED_REFCOUNT,
      static_cast<LPCSTR>(address), &module);
  return reinterpret_cast<Module>(module);
#else
  Dl_info info{};
  if (dladdr(address, &info) == 0 || info.dli_fname == nullptr) return nullptr;
  return dlopen(info.dli_fname, RTLD_LAZY | RTLD_NOLOAD);
#endif
}

// ---- the exports -------------------------------------------------------------------------

// clang-format off
#define QDM_HOST_EXPORTS(X)                                                            \
  X(SetGFRTModule) X(QdmReCovarianceH) X(QdmCxCovarianceH) X(QdmRePCARH) X(QdmCxPCARH) \
  X(QdmRePronyH) X(QdmCxPronyH) X(QdmReMatrixPencilH) X(QdmCxMatrixPencilH)            \
  X(QdmReMinDescriptLenH) X(QdmCxMinDescriptLenH) X(QdmReCovPowerSpectrH)              \
  X(QdmCxCovPowerSpectrH) X(QdmRePCARPowerSpectrumH) X(QdmCxPCARPowerSpectrumH)
// clang-format on

// Typed pointers to the fifteen exports, named as the exports are.
struct QdmApi {
  Module module = nullptr;
#define QDM_HOST_MEMBER(name) decltype(&::name) name = nullptr;
  QDM_HOST_EXPORTS(QDM_HOST_MEMBER)
#undef QDM_HOST_MEMBER
};

// Loads the library at `path` and resolves every export; throws
// std::runtime_error naming what is missing. A non-null `runtime` is named to
// the library through SetGFRTModule, as a host embedding it would; with null
// the library finds the run-time by its own lookup.
inline QdmApi LoadQdm(const std::string& path, Module runtime = EmulatedHostModule()) {
  QdmApi api;
  std::string error;
  api.module = OpenModule(path, &error);
  if (api.module == nullptr)
    throw std::runtime_error("cannot load the library " + path + ": " + error);
#define QDM_HOST_RESOLVE(name)                                                      \
  api.name = reinterpret_cast<decltype(api.name)>(ModuleSymbol(api.module, #name)); \
  if (api.name == nullptr) throw std::runtime_error(path + " does not export " #name);
  QDM_HOST_EXPORTS(QDM_HOST_RESOLVE)
#undef QDM_HOST_RESOLVE
  if (runtime != nullptr) api.SetGFRTModule(runtime);
  return api;
}

// ---- host arrays -----------------------------------------------------------------------------

// One host array handle owned by the emulated host; freed on destruction.
// Converts to QdmArrayHandle, so it can be passed to an export directly.
class HostArray {
 public:
  // A type-10 array holding `values`, count set.
  static HostArray Real(std::span<const double> values) {
    return HostArray(
        EmuMakeHandle(QDM_TYPE_DOUBLE, static_cast<int32_t>(values.size()), values.data()),
        QDM_TYPE_DOUBLE);
  }
  static HostArray Real(std::initializer_list<double> values) {
    return Real(std::span<const double>(values.begin(), values.size()));
  }
  // A type-13 array holding `values`, count set.
  static HostArray Complex(std::span<const std::complex<double>> values) {
    return HostArray(EmuMakeHandle(QDM_TYPE_COMPLEX, static_cast<int32_t>(values.size()),
                                   reinterpret_cast<const double*>(values.data())),
                     QDM_TYPE_COMPLEX);
  }
  // An array of the type code holding `doubles`: reals, or (re, im) pairs.
  static HostArray FromDoubles(int32_t typeCode, std::span<const double> doubles) {
    const size_t per = typeCode == QDM_TYPE_COMPLEX ? 2 : 1;
    return HostArray(EmuMakeHandle(typeCode, static_cast<int32_t>(doubles.size() / per),
                                   doubles.empty() ? nullptr : doubles.data()),
                     typeCode);
  }
  // An array of `count` elements of the type code, every double equal to `fill`:
  // an output with stale contents.
  static HostArray Filled(int32_t typeCode, int32_t count, double fill) {
    const size_t doubles = static_cast<size_t>(count) * (typeCode == QDM_TYPE_COMPLEX ? 2 : 1);
    std::vector<double> values(doubles, fill);
    return HostArray(EmuMakeHandle(typeCode, count, values.data()), typeCode);
  }
  // An array with no elements.
  static HostArray Empty(int32_t typeCode) {
    return HostArray(EmuMakeHandle(typeCode, 0, nullptr), typeCode);
  }

  HostArray(HostArray&& other) noexcept
      : handle_(std::exchange(other.handle_, nullptr)), type_(other.type_) {}
  HostArray& operator=(HostArray&& other) noexcept {
    std::swap(handle_, other.handle_);
    std::swap(type_, other.type_);
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

  // Every element as doubles, complex ones as (re, im) pairs, copied out.
  std::vector<double> Doubles() const {
    return Reals(type_ == QDM_TYPE_COMPLEX ? 2 * Count() : Count());
  }
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
  HostArray(QdmArrayHandle handle, int32_t type) : handle_(handle), type_(type) {
    if (handle_ == nullptr) throw std::runtime_error("the host run-time could not make an array");
  }
  QdmArrayHandle handle_;
  int32_t type_;
};

}  // namespace qdmhost
