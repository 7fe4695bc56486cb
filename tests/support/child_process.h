// Runs a helper executable in a child process and collects its exit code and
// what it wrote to stderr: for paths that end the process (fatal messages).
#pragma once

#include <string>
#include <vector>

#if defined(_WIN32)
#include <cstdio>
#else
#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#endif

namespace qdmtest {

struct ChildResult {
  int exitCode = -1;  // -1: did not exit normally (signal, or could not start)
  std::string stderrText;
};

inline ChildResult RunChild(const std::vector<std::string>& argv) {
  ChildResult result;
#if defined(_WIN32)
  // stdout is discarded; stderr comes through the pipe.
  // cmd /c strips one outer pair of quotes, hence the extra pair around it all.
  std::string command = "\"";
  for (const std::string& arg : argv) command += "\"" + arg + "\" ";
  command += "2>&1 1>NUL\"";
  FILE* pipe = _popen(command.c_str(), "r");
  if (pipe == nullptr) return result;
  char buffer[512];
  size_t got;
  while ((got = fread(buffer, 1, sizeof buffer, pipe)) > 0) result.stderrText.append(buffer, got);
  result.exitCode = _pclose(pipe);
  // The child's stderr is in text mode: line ends arrive as CR LF.
  std::erase(result.stderrText, '\r');
#else
  int fds[2];
  if (pipe(fds) != 0) return result;
  const pid_t pid = fork();
  if (pid < 0) return result;
  if (pid == 0) {
    dup2(fds[1], STDERR_FILENO);
    const int devnull = open("/dev/null", O_WRONLY);
    if (devnull >= 0) dup2(devnull, STDOUT_FILENO);
    close(fds[0]);
    close(fds[1]);
    std::vector<char*> args;
    for (const std::string& arg : argv) args.push_back(const_cast<char*>(arg.c_str()));
    args.push_back(nullptr);
    execv(args[0], args.data());
    _exit(127);
  }
  close(fds[1]);
  char buffer[512];
  ssize_t got;
  while ((got = read(fds[0], buffer, sizeof buffer)) != 0) {
    if (got < 0) {
      if (errno == EINTR) continue;
      break;
    }
    result.stderrText.append(buffer, static_cast<size_t>(got));
  }
  close(fds[0]);
  int wstatus = 0;
  while (waitpid(pid, &wstatus, 0) < 0 && errno == EINTR) {
  }
  if (WIFEXITED(wstatus)) result.exitCode = WEXITSTATUS(wstatus);
#endif
  return result;
}

}  // namespace qdmtest
