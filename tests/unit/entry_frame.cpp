// The common entry-point sequence with stand-in estimators, against the
// emulated host run-time (linked into this test, found by the library's own
// host lookup).
#include "host/entry_frame.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <vector>

#include "emuhost.h"
#include "numeric/work.h"

namespace {

using host::CountSource;
using host::EntryCall;
using host::EntrySpec;
using host::OutDouble;
using host::OutDoubleRole;
using host::OutputArray;
using host::ResizeFailure;

QdmArrayHandle MakeReal(std::vector<double> v) {
  return EmuMakeHandle(QDM_TYPE_DOUBLE, static_cast<int32_t>(v.size()), v.data());
}

std::vector<double> ReadDoubles(QdmArrayHandle h, size_t doubles) {
  std::vector<double> out(doubles);
  EmuRead(h, out.data(), doubles);
  return out;
}

// A call with a three-element real input, a real output of 3 known elements,
// a complex output of 2 whose count the estimator reports, and one out double
// of each kind except the spectrum df.
struct Fixture {
  QdmArrayHandle input = MakeReal({1.5, -2.5, 3.5});
  QdmArrayHandle known = MakeReal({9, 9, 9, 9, 9});
  QdmArrayHandle modes = EmuMakeHandle(QDM_TYPE_COMPLEX, 1, nullptr);
  double estimated = 7.0, f0 = 7.0, passed = 7.0;
  StatusCode check = status::kOk;
  ResizeFailure onResizeFailure = ResizeFailure::kEmptyOutputs;

  ~Fixture() {
    EmuFreeHandle(input);
    EmuFreeHandle(known);
    EmuFreeHandle(modes);
  }

  template <typename Estimator>
  int32_t Run(const Estimator& estimate) {
    const OutputArray outputs[] = {{known, QDM_TYPE_DOUBLE, 3, CountSource::kLength},
                                   {modes, QDM_TYPE_COMPLEX, 2, CountSource::kModes}};
    const OutDouble doubles[] = {{&estimated, OutDoubleRole::kEstimator},
                                 {&f0, OutDoubleRole::kSpectrumF0},
                                 {&passed, OutDoubleRole::kPassThrough}};
    return host::RunEntry(
        EntrySpec{input, QDM_TYPE_DOUBLE, 3, check, outputs, doubles, onResizeFailure},
        estimate);
  }
};

bool Aligned(const void* p, size_t alignment) {
  return reinterpret_cast<uintptr_t>(p) % alignment == 0;
}

TEST(EntryFrame, SuccessCopiesResultsCountsAndDoublesIntoTheHost) {
  Fixture f;
  int calls = 0;
  const int64_t mark = EmuResizeCalls();
  const int32_t st = f.Run([&](EntryCall& c) -> StatusCode {
    ++calls;
    // The estimator sees aligned copies, the known count already written.
    EXPECT_TRUE(Aligned(c.input, alignof(Complex)));
    EXPECT_TRUE(Aligned(c.outputs[0], alignof(Complex)));
    EXPECT_TRUE(Aligned(c.outputs[1], alignof(Complex)));
    EXPECT_EQ(c.RealInput()[0], 1.5);
    EXPECT_EQ(c.RealInput()[2], 3.5);
    EXPECT_EQ(EmuCount(f.known), 3);
    EXPECT_EQ(c.outDoubles[2], 7.0);  // the pass-through value arrives
    c.RealOutput(0)[0] = 10;
    c.RealOutput(0)[2] = 30;
    c.ComplexOutput(1)[0] = Complex(1, 2);
    c.ComplexOutput(1)[1] = Complex(3, 4);
    c.modes = 1;
    c.outDoubles[0] = 0.25;
    c.outDoubles[2] = 0.5;
    c.spectrum.f0 = -4.0;
    return status::kOk;
  });
  EXPECT_EQ(st, 0);
  EXPECT_EQ(calls, 1);
  EXPECT_EQ(EmuResizeCalls() - mark, 2);
  EXPECT_EQ(EmuCount(f.known), 3);
  EXPECT_EQ(ReadDoubles(f.known, 3), (std::vector<double>{10, 0, 30}));
  EXPECT_EQ(EmuCount(f.modes), 1);
  EXPECT_EQ(ReadDoubles(f.modes, 4), (std::vector<double>{1, 2, 3, 4}));
  EXPECT_EQ(f.estimated, 0.25);
  EXPECT_EQ(f.f0, -4.0);
  EXPECT_EQ(f.passed, 0.5);
}

TEST(EntryFrame, EstimatorFailureEmptiesOutputsAndMapsTheStatus) {
  const struct {
    StatusCode internal;
    int32_t host;
  } cases[] = {{12, -42412}, {18, -42418}, {20001, -62401}, {-20062, -20062}, {-1, -1}};
  for (const auto& tc : cases) {
    Fixture f;
    const int64_t mark = EmuResizeCalls();
    const int32_t st = f.Run([&](EntryCall& c) {
      c.outDoubles[0] = 1.0;
      c.outDoubles[2] = 2.0;  // left as the estimator leaves it, even on failure
      c.modes = 2;
      return tc.internal;
    });
    EXPECT_EQ(st, tc.host) << tc.internal;
    EXPECT_EQ(EmuResizeCalls() - mark, 4);  // two resizes, then two to 0
    EXPECT_EQ(EmuCount(f.known), 0);
    EXPECT_EQ(EmuCapacity(f.known), 0u);
    EXPECT_EQ(EmuCount(f.modes), 0);
    EXPECT_EQ(EmuCapacity(f.modes), 0u);
    EXPECT_EQ(f.estimated, 0.0);
    EXPECT_EQ(f.f0, 0.0);
    EXPECT_EQ(f.passed, 2.0);
  }
}

TEST(EntryFrame, AFailedCheckIsMappedAndTheEstimatorIsNotCalled) {
  Fixture f;
  f.check = 12;
  bool called = false;
  const int64_t mark = EmuResizeCalls();
  EXPECT_EQ(f.Run([&](EntryCall&) {
    called = true;
    return status::kOk;
  }),
            -42412);
  EXPECT_FALSE(called);
  // Only the emptying resizes, each with its output's type code.
  int32_t type = 0, dims = 0;
  size_t count = 99;
  ASSERT_EQ(EmuResizeCalls() - mark, 2);
  ASSERT_TRUE(EmuResizeAt(mark + 1, &type, &dims, &count));
  EXPECT_EQ(type, QDM_TYPE_DOUBLE);
  EXPECT_EQ(count, 0u);
  ASSERT_TRUE(EmuResizeAt(mark + 2, &type, &dims, &count));
  EXPECT_EQ(type, QDM_TYPE_COMPLEX);
  EXPECT_EQ(dims, 1);
  EXPECT_EQ(count, 0u);
  EXPECT_EQ(f.passed, 7.0);  // never reached the estimator: untouched
  EXPECT_EQ(f.estimated, 0.0);
}

TEST(EntryFrame, FailedResizeEmptiesOrReturnsAtOnce) {
  for (ResizeFailure mode : {ResizeFailure::kEmptyOutputs, ResizeFailure::kReturnAtOnce}) {
    Fixture f;
    f.onResizeFailure = mode;
    EmuFailResize(1, 6);  // the second resize fails with host error 6
    bool called = false;
    const int32_t st = f.Run([&](EntryCall&) {
      called = true;
      return status::kOk;
    });
    EmuFailResize(0, 0);
    EXPECT_EQ(st, -42406);
    EXPECT_FALSE(called);
    if (mode == ResizeFailure::kEmptyOutputs) {
      EXPECT_EQ(EmuCount(f.known), 0);
      EXPECT_EQ(EmuCount(f.modes), 0);
      EXPECT_EQ(f.estimated, 0.0);
    } else {
      EXPECT_EQ(EmuCount(f.known), 5);  // resized to 3, count untouched
      EXPECT_EQ(EmuCapacity(f.known), 3u);
      EXPECT_EQ(EmuCount(f.modes), 1);
      EXPECT_EQ(EmuCapacity(f.modes), 1u);
      EXPECT_EQ(f.estimated, 7.0);
    }
  }
}

TEST(EntryFrame, NegativeResizeErrorPassesUnchanged) {
  Fixture f;
  EmuFailResize(0, -5);
  EXPECT_EQ(f.Run([](EntryCall&) { return status::kOk; }), -5);
  EmuFailResize(0, 0);
}

TEST(EntryFrame, MdlRunnerReturnsHostCodesAndZeroesTheOrderOnlyOnEstimatorFailure) {
  QdmArrayHandle x = MakeReal({1, 2, 3});
  const StatusCode failing = 14;
  const StatusCode passing = status::kOk;
  int32_t order = 77;
  auto fails = [](const void*, int32_t, int32_t, int32_t, int32_t* o) -> StatusCode {
    *o = 5;
    return 15;
  };
  auto succeeds = [](const void* in, int32_t n, int32_t L, int32_t minOrder,
                     int32_t* o) -> StatusCode {
    EXPECT_EQ(n, 3);
    EXPECT_EQ(static_cast<const double*>(in)[1], 2.0);
    *o = L + minOrder;
    return 0;
  };
  EXPECT_EQ(host::RunMdlEntry(x, QDM_TYPE_DOUBLE, 3, failing, 4, 1, &order, fails), -42414);
  EXPECT_EQ(order, 77);
  EXPECT_EQ(host::RunMdlEntry(x, QDM_TYPE_DOUBLE, 3, passing, 4, 1, &order, fails), -42415);
  EXPECT_EQ(order, 0);
  EXPECT_EQ(host::RunMdlEntry(x, QDM_TYPE_DOUBLE, 3, passing, 4, 2, &order, succeeds), 0);
  EXPECT_EQ(order, 6);
  EmuFreeHandle(x);
}

}  // namespace
