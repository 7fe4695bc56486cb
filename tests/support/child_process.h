// Runs a helper executable in a child process and collects its exit code and
// what it wrote to stderr: for paths that end the process (fatal messages).
#pragma once

#include <string>
#include <vector>

#include <cstdio>
#if !defined(_WIN32)
#include <sys/wait.h>
#endif

namespace qdmtest {

struct ChildResult {
  int exitCode = -1;  // -1: could not start, or did not exit normally
  std::string stderrText;
};

// The command's stderr comes through the pipe; its stdout is discarded.
inline ChildResult RunChild(const std::vector<std::string>& argv) {
  ChildResult result;
#if defined(_WIN32)
  // cmd /c strips one outer pair of quotes, hence the extra pair around it all.
  std::string command = "\"";
  for (const std::string& arg : argv) command += "\"" + arg + "\" ";
  FILE* pipe = _popen((command + "2>&1 1>NUL\"").c_str(), "r");
#else
  std::string command;
  for (const std::string& arg : argv) command += "'" + arg + "' ";
  FILE* pipe = popen((command + "2>&1 1>/dev/null").c_str(), "r");
#endif
  if (pipe == nullptr) return result;
  char buffer[512];
  size_t got;
  while ((got = fread(buffer, 1, sizeof buffer, pipe)) > 0) result.stderrText.append(buffer, got);
#if defined(_WIN32)
  result.exitCode = _pclose(pipe);
  std::erase(result.stderrText, '\r');  // the child's stderr is in text mode
#else
  const int status = pclose(pipe);
  if (WIFEXITED(status)) result.exitCode = WEXITSTATUS(status);
#endif
  return result;
}

}  // namespace qdmtest
