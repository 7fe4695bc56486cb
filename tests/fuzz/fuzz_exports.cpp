// libFuzzer target over the fourteen analysis exports, linked with the library's
// internal objects and the emulated host run-time, built with ASan and UBSan.
//
// Input, read front to back (missing bytes read as zero):
//   face (1 byte: even the host face, odd the plain C API), export (1 byte),
//   flags (1 byte: bit 0 the real-signal flag, bit 1 fail a work allocation,
//   bit 2 from then on, bit 3 fail a host resize, bit 4 make a LAPACK call
//   report INFO (plain face), bit 5 its sign, bit 6 the pencil's Krylov route
//   (plain face)), the three integer arguments
//   (each a selector byte, maybe four more), n (2 bytes, up to 256), the
//   sampling rate, the fault position (2 bytes), then the n data values (two per
//   complex element). A value is a selector byte, maybe followed by its bits:
//   NaN, +-inf, +-1e308, +-DBL_MAX, denormals, signed zeros, small or raw values.
//
// Beyond the sanitizers, each call's status must be documented, no work
// memory may stay allocated, a failed call must leave its outputs as the
// failure path does, and a faulted call is judged as in the fault-injection and
// plain-face tests, except that an export ignoring a solve's status may also
// end in a later step's documented failure. A broken check aborts (a crash).
#include <cfloat>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <set>

#include "emuhost.h"
#include "numeric/lapack_boundary.h"
#include "numeric/work.h"
#include "qdm.h"
#include "support/plain_table.h"

namespace {

using namespace qdmtest;

struct Reader {
  const uint8_t* p;
  size_t left;
  uint8_t Byte() { return left == 0 ? 0 : (--left, *p++); }
  template <typename T>
  T Bits() {
    unsigned char b[sizeof(T)];
    for (unsigned char& c : b) c = Byte();
    return std::bit_cast<T>(b);
  }
};

int32_t IntegerArgument(Reader& r) {
  const uint8_t s = r.Byte();
  constexpr int32_t kFixed[] = {INT32_MIN, INT32_MAX, INT32_C(1) << 30, (INT32_C(1) << 30) + 1};
  if (s % 8 < 4) return kFixed[s % 8];
  return s % 8 == 4 ? r.Bits<int32_t>() : static_cast<int8_t>(s) / 8;  // -16..15 mostly
}

double Value(Reader& r) {
  const uint8_t s = r.Byte();
  constexpr double kFixed[] = {NAN,      INFINITY, -INFINITY,    1e308, -1e308, DBL_MAX,
                               -DBL_MAX, 4.9e-324, -DBL_MIN / 4, 0.0,   -0.0};
  if (s % 16 < 11) return kFixed[s % 16];
  if (s % 16 == 11) return r.Bits<double>();
  return static_cast<int16_t>(r.Bits<uint16_t>()) / 4096.0 + (s >> 4);
}

constexpr int32_t kResizeError = 3;
const std::set<int32_t> kPlainStatuses = {
#define QDM_FUZZ_STATUS(name, code, text) code,
    QDM_STATUS_TABLE(QDM_FUZZ_STATUS)
#undef QDM_FUZZ_STATUS
};
// The host face has neither the warning nor the plain face's own refusals and
// results screen, but the injected resize error.
bool HostStatus(int32_t st) {
  return st == HostCode(kResizeError) || (kPlainStatuses.count(st) && st != 20001 && st > -42419 &&
                                          st != QDM_ERR_NON_FINITE_RESULT);
}

void Require(bool ok, const char* what, const Export& x, int32_t st) {
  if (ok) return;
  std::fprintf(stderr, "fuzz check failed: %s (%s, status %d)\n", what, x.name, st);
  std::abort();
}

// The host face calls the linked exports directly.
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

void PlainFace(const Export& x, const Scalars& s, const double* data, uint8_t flags,
               uint16_t faultAt) {
  PlainCall clean, faulted;
  clean.solver = faulted.solver = (flags & 64) ? QDM_SOLVER_KRYLOV : QDM_SOLVER_AUTO;
  const int32_t cleanStatus = CallPlain(x, data, s, clean);
  Require(kPlainStatuses.count(cleanStatus) != 0, "undocumented plain status", x, cleanStatus);
  Require(NumAllocOutstanding() == 0, "work memory left allocated", x, cleanStatus);
  Require(cleanStatus >= 0 || cleanStatus <= -42400 || Zeroed(x, clean),
          "failed plain call did not zero its outputs", x, cleanStatus);
  Require(cleanStatus < 0 || AllFinite(x, clean), "a plain success holds NaN or infinity", x,
          cleanStatus);
  if ((flags & 18) == 0) return;
  if (flags & 16) {
    LapackFailAt(faultAt % 64 + 1, (flags & 32) ? -1 : 1, false);
  } else {
    NumAllocFailAt(faultAt % 1024 + 1, (flags & 4) != 0);
  }
  const int32_t st = CallPlain(x, data, s, faulted);
  LapackFailAt(0, 0, false);
  NumAllocFailAt(0, false);
  Require(NumAllocOutstanding() == 0, "work memory left allocated after a fault", x, st);
  Require(kPlainStatuses.count(st) != 0, "undocumented plain status after a fault", x, st);
  Require(FaultedPlainCallIsRight(x, cleanStatus, clean, st, faulted),
          "a fault gave neither the clean result nor a zeroed failure", x, st);
}

void HostFace(const Export& x, const Scalars& s, const std::vector<double>& values, uint8_t flags,
              uint16_t faultAt) {
  Call clean{Block(x.complexData, values)}, faulted{Block(x.complexData, values)};
  clean.flag = faulted.flag = flags & 1;
  const int32_t cleanStatus = x.invoke(HostApi(), clean, s);
  Require(HostStatus(cleanStatus), "undocumented status", x, cleanStatus);
  Require(NumAllocOutstanding() == 0, "work memory left allocated", x, cleanStatus);
  Require(cleanStatus == 0 || Emptied(x, clean, true), "failed call did not empty its outputs", x,
          cleanStatus);
  if ((flags & 10) == 0) return;
  const bool resize = (flags & 8) != 0;
  if (resize) {
    EmuFailResize(faultAt % 4, kResizeError);
  } else {
    NumAllocFailAt(faultAt % 1024 + 1, (flags & 4) != 0);
  }
  const int32_t st = x.invoke(HostApi(), faulted, s);
  NumAllocFailAt(0, false);
  EmuFailResize(0, 0);
  Require(NumAllocOutstanding() == 0, "work memory left allocated after a fault", x, st);
  Require(HostStatus(st), "undocumented status after a fault", x, st);
  Require(
      FaultedHostCallIsRight(x, s, cleanStatus,
                             cleanStatus == 0 ? Leftovers(x, clean, s) : std::vector<uint64_t>{},
                             faulted, st, resize ? kResizeError : 0, false) ||
          (!resize && IgnoresSolveStatus(x)),
      "a fault gave neither the clean result nor the failure", x, st);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  Reader r{data, size};
  const bool plainFace = (r.Byte() & 1) != 0;
  const Export& x = Exports()[r.Byte() % Exports().size()];
  const uint8_t flags = r.Byte();
  Scalars s{0, IntegerArgument(r), IntegerArgument(r), IntegerArgument(r), 0};  // in order
  // Spectrum sizes between 8192 and 2^30 are valid but only cost time.
  const bool spectrum = x.family == Family::kCovSpectrum || x.family == Family::kPcarSpectrum;
  if (spectrum && s.b > 8192 && s.b <= (INT32_C(1) << 30)) s.b = 2 + s.b % 8191;
  s.n = r.Bits<uint16_t>() % 257;
  s.fs = Value(r);
  const uint16_t faultAt = r.Bits<uint16_t>();
  std::vector<double> values(static_cast<size_t>(s.n) * (x.complexData ? 2 : 1));
  for (double& v : values) v = Value(r);
  plainFace ? PlainFace(x, s, values.empty() ? &kStale : values.data(), flags, faultAt)
            : HostFace(x, s, values, flags, faultAt);
  return 0;
}
