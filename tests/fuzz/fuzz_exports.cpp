// libFuzzer target over the fourteen analysis exports, linked with the library's
// internal objects and the emulated host run-time, built with ASan and UBSan.
//
// Input, read front to back (missing bytes read as zero):
//   face (1 byte: even the host face, odd the plain C API), export (1 byte),
//   flags (1 byte: bit 0 the real-signal flag, bit 1 fail a work allocation,
//   bit 2 from then on, bit 3 fail a host resize, bit 4 make a LAPACK call
//   report INFO, bit 5 its sign), the three integer arguments
//   (each a selector byte, maybe four more), n (2 bytes, up to 256), the
//   sampling rate, the fault position (2 bytes), then the n data values (two per
//   complex element). A value is a selector byte, maybe followed by its bits:
//   NaN, +-inf, +-1e308, +-DBL_MAX, denormals, signed zeros, small or raw values.
//
// Beyond the sanitizers, each call is checked: its status is 0 or a documented
// code; work memory is never left allocated; a failed call leaves its outputs
// as the failure path does; and a call with an injected allocation failure
// gives the clean call's result bit for bit or -20001 (the exports that ignore
// a least-squares solve's status on purpose may also succeed differently). A
// broken check aborts, which libFuzzer reports as a crash. On the plain face
// nothing is exempt: a faulted call gives the clean result bit for bit or an
// error with zero-filled outputs.
#include <cfloat>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <set>
#include <string>
#include <vector>

#include "emuhost.h"
#include "numeric/lapack_boundary.h"
#include "numeric/work.h"
#include "qdm.h"
#include "support/export_table.h"
#include "support/plain_table.h"

namespace {

using namespace qdmtest;

class Reader {
 public:
  Reader(const uint8_t* data, size_t size) : p_(data), left_(size) {}
  uint8_t Byte() {
    if (left_ == 0) return 0;
    --left_;
    return *p_++;
  }
  template <typename T>
  T Bits() {
    unsigned char b[sizeof(T)] = {};
    for (unsigned char& c : b) c = Byte();
    T v;
    std::memcpy(&v, b, sizeof v);
    return v;
  }

 private:
  const uint8_t* p_;
  size_t left_;
};

int32_t IntegerArgument(Reader& r) {
  const uint8_t s = r.Byte();
  switch (s % 8) {
    case 0: return INT32_MIN;
    case 1: return INT32_MAX;
    case 2: return INT32_C(1) << 30;
    case 3: return (INT32_C(1) << 30) + 1;
    case 4: return r.Bits<int32_t>();
    default: return static_cast<int8_t>(s) / 8;  // -16..15: the interesting range
  }
}

double Value(Reader& r) {
  const uint8_t s = r.Byte();
  switch (s % 16) {
    case 0: return NAN;
    case 1: return INFINITY;
    case 2: return -INFINITY;
    case 3: return 1e308;
    case 4: return -1e308;
    case 5: return DBL_MAX;
    case 6: return -DBL_MAX;
    case 7: return 4.9e-324;
    case 8: return -DBL_MIN / 4;
    case 9: return 0.0;
    case 10: return -0.0;
    case 11: return r.Bits<double>();
    default: return static_cast<int16_t>(r.Bits<uint16_t>()) / 4096.0 + (s >> 4);
  }
}

// Host codes a call may return: argument errors, numeric and FFT failures,
// the injected host resize error.
constexpr int32_t kResizeError = 3;
const std::set<int32_t> kStatuses = {0,      -42401, -42411, -42412, -42413, -42414, -42415,
                                     -42416, -42417, -42418, -20001, -20003, -20004, -20061,
                                     -20062, -20063, -20068, -20116, -20999, -1,
                                     -42400 - kResizeError};

const std::set<std::string> kSolveStatusIgnored = {
    "QdmReCovarianceH",     "QdmCxCovarianceH",        "QdmRePronyH",
    "QdmCxPronyH",          "QdmReMatrixPencilH",      "QdmCxMatrixPencilH",
    "QdmReCovPowerSpectrH", "QdmCxCovPowerSpectrH",    "QdmRePCARPowerSpectrumH",
    "QdmCxPCARPowerSpectrumH", "QdmReMinDescriptLenH", "QdmCxMinDescriptLenH"};

void Require(bool ok, const char* what, const Export& x, int32_t st) {
  if (ok) return;
  std::fprintf(stderr, "fuzz check failed: %s (%s, status %d)\n", what, x.name, st);
  std::abort();
}

// ---- faces ------------------------------------------------------------------------------
// A face calls one export row on prepared host state. The host face calls the
// linked exports directly.
const QdmApi& HostApi() {
  static const QdmApi api = [] {
    QdmApi a;
#define QDM_FUZZ_BIND(name) a.name = &::name;
    QDM_HOST_EXPORTS(QDM_FUZZ_BIND)
#undef QDM_FUZZ_BIND
    return a;
  }();
  return api;
}

int32_t HostFace(const Export& x, Call& c, const Scalars& s) { return x.invoke(HostApi(), c, s); }

// ---- the plain face ------------------------------------------------------------------------
const std::set<int32_t> kPlainStatuses = {
#define QDM_FUZZ_STATUS(name, code, text) code,
    QDM_STATUS_TABLE(QDM_FUZZ_STATUS)
#undef QDM_FUZZ_STATUS
};

bool Zeroed(const PlainCall& c) {
  for (const auto& out : c.out) {
    for (double v : out) {
      if (v != 0.0 || std::signbit(v)) return false;
    }
  }
  return true;
}

bool Same(const PlainCall& a, const PlainCall& b) {
  for (int i = 0; i < 4; ++i) {
    if (a.out[i].size() != b.out[i].size() ||
        (!a.out[i].empty() &&
         std::memcmp(a.out[i].data(), b.out[i].data(), a.out[i].size() * sizeof(double)) != 0)) {
      return false;
    }
  }
  return std::memcmp(a.d, b.d, sizeof a.d) == 0 && a.count == b.count;
}

void Arm(uint8_t flags, uint16_t at) {
  if (flags & 16) {
    LapackFailAt(at % 64 + 1, (flags & 32) ? -1 : 1, false);
  } else {
    NumAllocFailAt(at % 1024 + 1, (flags & 4) != 0);
  }
}

void Disarm() {
  LapackFailAt(0, 0, false);
  NumAllocFailAt(0, false);
}

int PlainFace(const Export& x, const Scalars& s, const std::vector<double>& values,
              uint8_t flags, uint16_t faultAt) {
  const PlainFn& plain = PlainFunctions().at(x.name);
  const double none = 0.0;
  const double* data = values.empty() ? &none : values.data();
  PlainCall clean;
  const int32_t cleanStatus = plain(data, s, clean);
  Require(kPlainStatuses.count(cleanStatus) != 0, "undocumented plain status", x, cleanStatus);
  Require(NumAllocOutstanding() == 0, "work memory left allocated", x, cleanStatus);
  if (cleanStatus < 0 && cleanStatus > -42400) {
    Require(Zeroed(clean), "failed plain call did not zero its outputs", x, cleanStatus);
  }
  if ((flags & 18) == 0) return 0;
  PlainCall faulted;
  Arm(flags, faultAt);
  const int32_t st = plain(data, s, faulted);
  Disarm();
  Require(NumAllocOutstanding() == 0, "work memory left allocated after a fault", x, st);
  Require(kPlainStatuses.count(st) != 0, "undocumented plain status after a fault", x, st);
  if (st >= 0) {
    Require(st == cleanStatus && Same(clean, faulted), "plain success after a fault", x, st);
  } else if (st > -42400) {
    Require(Zeroed(faulted), "failed plain call did not zero its outputs", x, st);
  }
  return 0;
}

Call Prepare(const Export& x, const Scalars& s, const std::vector<double>& values, bool flag) {
  Call c{x.complexData ? HostArray::Complex(std::span<const std::complex<double>>(
                             reinterpret_cast<const std::complex<double>*>(values.data()),
                             values.size() / 2))
                       : HostArray::Real(values)};
  c.flag = flag ? 1 : 0;
  (void)s;
  return c;
}

bool Emptied(const Export& x, const Call& c) {
  for (int i = 0; i < x.outputs; ++i)
    if (c.out[i].Count() != 0) return false;
  return true;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  Reader r(data, size);
  const bool plainFace = (r.Byte() & 1) != 0;
  const std::vector<Export>& exports = Exports();
  const Export& x = exports[r.Byte() % exports.size()];
  const uint8_t flags = r.Byte();
  Scalars s{};
  s.a = IntegerArgument(r);
  s.b = IntegerArgument(r);
  s.c = IntegerArgument(r);
  // Spectrum sizes between 8192 and 2^30 are valid but only cost time.
  const bool spectrum = x.family == Family::kCovSpectrum || x.family == Family::kPcarSpectrum;
  if (spectrum && s.b > 8192 && s.b <= (INT32_C(1) << 30)) s.b = 2 + s.b % 8191;
  s.n = r.Bits<uint16_t>() % 257;
  s.fs = Value(r);
  const uint16_t faultAt = r.Bits<uint16_t>();
  std::vector<double> values(static_cast<size_t>(s.n) * (x.complexData ? 2 : 1));
  for (double& v : values) v = Value(r);
  if (plainFace) return PlainFace(x, s, values, flags, faultAt);
  const auto face = HostFace;

  // The clean call.
  Call clean = Prepare(x, s, values, flags & 1);
  const int32_t cleanStatus = face(x, clean, s);
  Require(kStatuses.count(cleanStatus) != 0, "undocumented status", x, cleanStatus);
  Require(NumAllocOutstanding() == 0, "work memory left allocated", x, cleanStatus);
  if (cleanStatus != 0 && x.family != Family::kMdl) {
    Require(Emptied(x, clean), "failed call did not empty its outputs", x, cleanStatus);
  }
  if ((flags & 10) == 0) return 0;

  // The same call with a fault.
  Call faulted = Prepare(x, s, values, flags & 1);
  const bool resize = (flags & 8) != 0;
  if (resize) {
    EmuFailResize(faultAt % 4, kResizeError);
  } else {
    NumAllocFailAt(faultAt % 1024 + 1, (flags & 4) != 0);
  }
  const int32_t st = face(x, faulted, s);
  NumAllocFailAt(0, false);
  EmuFailResize(0, 0);
  Require(NumAllocOutstanding() == 0, "work memory left allocated after a fault", x, st);
  Require(kStatuses.count(st) != 0, "undocumented status after a fault", x, st);
  if (st == cleanStatus) {
    if (st == 0 && kSolveStatusIgnored.count(x.name) == 0) {
      Require(Leftovers(x, faulted, s) == Leftovers(x, clean, s),
              "success after a fault with a different result", x, st);
    }
    return 0;
  }
  if (resize) {
    Require(st == -42400 - kResizeError, "resize failure not reported", x, st);
  } else if (kSolveStatusIgnored.count(x.name) != 0) {
    // These go on past a failed solve with whatever it left, so a fault inside
    // it may end in success or in a later step's documented failure.
    return 0;
  } else {
    Require(st == -20001, "a fault gave neither the clean status nor -20001", x, st);
  }
  return 0;
}
