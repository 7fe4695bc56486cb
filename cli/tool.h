// What the parts of the qdm tool share: its exit codes, its one failure type,
// how user text is shown in messages, the CSV reader and the plot.
#ifndef QDM_CLI_TOOL_H
#define QDM_CLI_TOOL_H

#include <cstdint>
#include <cstdio>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace qdm_cli {

// 1: usage, input or a value the library refuses (-424xx); 2: the fit failed
// (any other library status, or no memory); 3: an output not written.
enum Exit { kOk = 0, kUsage = 1, kFailed = 2, kOutput = 3 };

// A failed record or run: its exit code, the library status if any, one line.
struct Failure {
  int exit;
  std::optional<int32_t> status;
  std::string message;
};
[[noreturn]] void Bad(std::string message);

// User text as a message shows it: printable ASCII and valid UTF-8 as they are,
// every other byte (controls, NUL, DEL, C1 controls, invalid UTF-8) as \xHH, and
// at most `limit` input bytes, then "...". With `noQuotes` a double quote is
// escaped as well (for gnuplot's data reader, which takes it as a delimiter).
std::string Shown(std::string_view text, size_t limit, bool noQuotes = false);
constexpr size_t kFieldShown = 40;  // a field, value or column name
constexpr size_t kNameShown = 256;  // a file name

// How a CSV file is split and which of its columns are read.
struct CsvFormat {
  char delimiter = ',';
  bool blanks = false;               // fields split at runs of spaces and tabs
  std::vector<std::string> columns;  // one or two, by 1-based index or header name
  uint64_t maxBytes = uint64_t{1} << 30;
};
constexpr size_t kMaxLineBytes = size_t{1} << 20;

struct Signal {
  bool complex = false;
  std::vector<double> values;  // n reals, or n (re, im) pairs
  int32_t n = 0;
  double defaultRate = 1.0;
};

// Reads a signal from `in` (an open file or standard input) named `name`.
Signal ReadCsv(std::FILE* in, const std::string& name, const CsvFormat& format);

// Runs gnuplot on a private directory holding `script` and the named data
// files, and writes the picture it prints to `png`. False: no gnuplot on PATH.
// Throws a Failure with exit 3 when gnuplot fails or `png` cannot be written.
struct PlotFile {
  const char* name;                       // a fixed name inside the directory
  std::function<void(std::FILE*)> write;  // writes its contents
};
bool RunGnuplot(const std::string& script, const std::vector<PlotFile>& files,
                const std::string& png);

}  // namespace qdm_cli

#endif  // QDM_CLI_TOOL_H
