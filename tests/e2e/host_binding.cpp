// How the library finds the host's NumericArrayResize: in child processes for
// the paths that end the process, in this process for the rest; and what the
// library exports.
#include <gtest/gtest.h>

#include <cstdio>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "support/child_process.h"
#include "support/qdm_host.h"

namespace {

using qdmtest::ChildResult;
using qdmtest::HostArray;
using qdmtest::RunChild;

const char kNoHost[] = "Fatal Error: graffel.lib was not called from a Graffel process.";
const char kNoFunction[] = "Fatal Error: graffel.lib could not locate \"NumericArrayResize\".";

std::string FirstLine(const std::string& text) { return text.substr(0, text.find('\n')); }

#if defined(QDM_CHILD_NOHOST)

struct ChildCase {
  const char* what;
  std::vector<std::string> argv;  // child, then arguments after the library
  int exitCode;
  const char* message;  // first stderr line, or null for a normal run
};

TEST(HostBinding, LookupOrderAndFatalMessagesInChildProcesses) {
  const std::string lib = QDM_LIBRARY_PATH;
  const ChildCase cases[] = {
      {"no host anywhere: first message at the first resize",
       {QDM_CHILD_NOHOST, "none"},
       1,
       kNoHost},
      {"another loaded module is not a host",
       {QDM_CHILD_NOHOST, "loaded", QDM_NOFUNC_MODULE},
       1,
       kNoHost},
      {"executable probed for gGFRTVersion", {QDM_CHILD_HOST, "none"}, 0, nullptr},
      {"executable probed for AZNewHandle", {QDM_CHILD_AZHOST, "none"}, 0, nullptr},
      {"already loaded run-time module", {QDM_CHILD_NOHOST, "loaded", QDM_GFRT_MODULE}, 0, nullptr},
      {"override names the host", {QDM_CHILD_NOHOST, "module", QDM_GFRTEMU_MODULE}, 0, nullptr},
      {"override without the function: second message",
       {QDM_CHILD_NOHOST, "module", QDM_NOFUNC_MODULE},
       1,
       kNoFunction},
      {"override wins over an executable with gGFRTVersion",
       {QDM_CHILD_HOST, "module", QDM_NOFUNC_MODULE},
       1,
       kNoFunction},
      {"override wins over an executable with AZNewHandle",
       {QDM_CHILD_AZHOST, "module", QDM_NOFUNC_MODULE},
       1,
       kNoFunction},
      {"null override restores the automatic lookup",
       {QDM_CHILD_HOST, "reset", QDM_NOFUNC_MODULE},
       0,
       nullptr},
  };
  for (const ChildCase& c : cases) {
    std::vector<std::string> argv = {c.argv[0], lib};
    argv.insert(argv.end(), c.argv.begin() + 1, c.argv.end());
    const ChildResult r = RunChild(argv);
    EXPECT_EQ(r.exitCode, c.exitCode) << c.what << "\n" << r.stderrText;
    if (c.message != nullptr) {
      EXPECT_EQ(FirstLine(r.stderrText), c.message) << c.what;
    } else {
      EXPECT_EQ(r.stderrText, "") << c.what;
    }
  }
}

#endif

// Once resolved, the function stays resolved: a later override changes nothing.
TEST(HostBinding, OverrideAffectsOnlyUnresolvedRecords) {
  const qdmtest::QdmApi& qdm = qdmtest::Qdm();
  auto call = [&] {
    HostArray x = HostArray::Real({1.0, 0.5, -0.25, -0.6, 0.1, 0.4});
    HostArray a = HostArray::Empty(QDM_TYPE_DOUBLE), r = HostArray::Empty(QDM_TYPE_COMPLEX);
    double v = 0;
    (void)qdm.QdmReCovarianceH(x, 2, a, r, &v);
    return r.Capacity();
  };
  const int64_t before = EmuResizeCalls();
  (void)call();
  ASSERT_GT(EmuResizeCalls(), before);
#if defined(QDM_NOFUNC_MODULE)
  qdmtest::Module nofunc = qdmtest::OpenModule(QDM_NOFUNC_MODULE);
  ASSERT_NE(nofunc, nullptr);
  qdm.SetGFRTModule(nofunc);
  const int64_t mark = EmuResizeCalls();
  (void)call();  // would end the process if the function were looked up again
  EXPECT_GT(EmuResizeCalls(), mark);
  qdm.SetGFRTModule(qdmtest::EmulatedHostModule());
#endif
}

#if !defined(_WIN32)
TEST(HostBinding, LibraryExportsExactlyTheFifteenFunctions) {
  const std::string command = std::string("nm -D --defined-only '") + QDM_LIBRARY_PATH + "'";
  FILE* pipe = popen(command.c_str(), "r");
  ASSERT_NE(pipe, nullptr);
  std::set<std::string> names;
  char line[512];
  while (fgets(line, sizeof line, pipe) != nullptr) {
    std::istringstream fields(line);
    std::string address, kind, name;
    if (fields >> address >> kind >> name) names.insert(name);
  }
  ASSERT_EQ(pclose(pipe), 0);
  const std::set<std::string> expected = {"SetGFRTModule",
                                          "QdmReCovarianceH",
                                          "QdmCxCovarianceH",
                                          "QdmRePCARH",
                                          "QdmCxPCARH",
                                          "QdmRePronyH",
                                          "QdmCxPronyH",
                                          "QdmReMatrixPencilH",
                                          "QdmCxMatrixPencilH",
                                          "QdmReMinDescriptLenH",
                                          "QdmCxMinDescriptLenH",
                                          "QdmReCovPowerSpectrH",
                                          "QdmCxCovPowerSpectrH",
                                          "QdmRePCARPowerSpectrumH",
                                          "QdmCxPCARPowerSpectrumH"};
  EXPECT_EQ(names, expected);
}
#endif

}  // namespace
