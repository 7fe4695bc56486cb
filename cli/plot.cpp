// gnuplot, run without a shell: a fixed script and data files in a private
// directory, the picture read from gnuplot's standard output and written by the
// tool itself. No user text is ever part of the script, and the output path
// never reaches gnuplot at all.
#include <fcntl.h>
#include <spawn.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "tool.h"

extern char** environ;

namespace qdm_cli {
namespace {

constexpr size_t kMaxPicture = size_t{64} << 20;

[[noreturn]] void PlotFailed(const std::string& message) { throw Failure{kOutput, {}, message}; }

// A directory of our own under $TMPDIR (or /tmp), removed with what it holds.
class PrivateDirectory {
 public:
  PrivateDirectory() {
    const char* tmp = std::getenv("TMPDIR");
    path_ = (tmp && tmp[0] == '/' ? std::string(tmp) : std::string("/tmp")) + "/qdm-plot-XXXXXX";
    if (mkdtemp(path_.data()) == nullptr)
      PlotFailed("cannot make a directory for gnuplot: " + std::string(std::strerror(errno)));
  }
  ~PrivateDirectory() {
    for (const std::string& f : files_) unlink(f.c_str());
    rmdir(path_.c_str());
  }
  PrivateDirectory(const PrivateDirectory&) = delete;
  PrivateDirectory& operator=(const PrivateDirectory&) = delete;

  const std::string& path() const { return path_; }
  std::string Add(const char* name) { return files_.emplace_back(path_ + "/" + name); }

  void Write(const char* name, const std::function<void(std::FILE*)>& write) {
    const std::string file = Add(name);
    std::FILE* f = std::fopen(file.c_str(), "wbx");
    if (f == nullptr)
      PlotFailed("cannot write gnuplot's input: " + std::string(std::strerror(errno)));
    try {
      write(f);
    } catch (...) {
      std::fclose(f);
      throw;
    }
    const bool failed = std::ferror(f) != 0;
    if (std::fclose(f) != 0 || failed)
      PlotFailed("cannot write gnuplot's input: " + std::string(std::strerror(errno)));
  }

 private:
  std::string path_;
  std::vector<std::string> files_;
};

// The last non-blank line gnuplot wrote on its standard error, as a message shows it.
std::string LastLine(const std::string& file) {
  std::string text, last;
  if (std::FILE* f = std::fopen(file.c_str(), "rb")) {
    char chunk[4096];
    for (size_t got;
         (got = std::fread(chunk, 1, sizeof chunk, f)) > 0 && text.size() < kMaxPicture;)
      text.append(chunk, got);
    std::fclose(f);
  }
  for (size_t i = 0; i < text.size();) {
    const size_t end = std::min(text.find('\n', i), text.size());
    if (text.find_first_not_of(" \t\r^", i) < end) last = text.substr(i, end - i);
    i = end + 1;
  }
  return Shown(last, 160);
}

void WriteAll(const std::string& png, const std::string& bytes) {
  const auto fail = [&](int error) {
    PlotFailed("cannot write " + Shown(png, kNameShown) + ": " + std::strerror(error));
  };
  const int fd = open(png.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0666);
  if (fd < 0) fail(errno);
  for (size_t done = 0; done < bytes.size();) {
    const ssize_t n = write(fd, bytes.data() + done, bytes.size() - done);
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) {
      const int error = n < 0 ? errno : EIO;
      close(fd);
      fail(error);
    }
    done += size_t(n);
  }
  if (close(fd) != 0) fail(errno);
}

}  // namespace

bool RunGnuplot(const std::string& script, const std::vector<PlotFile>& files,
                const std::string& png) {
  PrivateDirectory dir;
  dir.Write("plot.gp", [&](std::FILE* f) { std::fwrite(script.data(), 1, script.size(), f); });
  for (const PlotFile& file : files) dir.Write(file.name, file.write);
  dir.Add("errors.txt");

  int pipeFds[2];
  if (pipe2(pipeFds, O_CLOEXEC) != 0)
    PlotFailed("cannot run gnuplot: " + std::string(std::strerror(errno)));
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addopen(&actions, 0, "/dev/null", O_RDONLY, 0);
  posix_spawn_file_actions_adddup2(&actions, pipeFds[1], 1);
  posix_spawn_file_actions_addchdir_np(&actions, dir.path().c_str());
  posix_spawn_file_actions_addopen(&actions, 2, "errors.txt", O_WRONLY | O_CREAT | O_TRUNC, 0600);
  char program[] = "gnuplot", scriptName[] = "plot.gp";
  char* argv[] = {program, scriptName, nullptr};
  pid_t pid = 0;
  const int spawned = posix_spawnp(&pid, program, &actions, nullptr, argv, environ);
  posix_spawn_file_actions_destroy(&actions);
  close(pipeFds[1]);
  if (spawned != 0) {
    close(pipeFds[0]);
    if (spawned == ENOENT) return false;
    PlotFailed("cannot run gnuplot: " + std::string(std::strerror(spawned)));
  }
  std::string picture;
  char chunk[1 << 16];
  bool tooBig = false;
  for (;;) {
    const ssize_t n = read(pipeFds[0], chunk, sizeof chunk);
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) break;
    if (picture.size() + size_t(n) > kMaxPicture) tooBig = true;
    if (!tooBig) picture.append(chunk, size_t(n));
  }
  close(pipeFds[0]);
  int status = 0;
  while (waitpid(pid, &status, 0) < 0 && errno == EINTR) {
  }
  const std::string what = "gnuplot could not draw " + Shown(png, kNameShown) + ": ";
  if (WIFSIGNALED(status))
    PlotFailed(what + "killed by signal " + std::to_string(WTERMSIG(status)));
  if (!WIFEXITED(status) || WEXITSTATUS(status) != 0)
    PlotFailed(what + LastLine(dir.path() + "/errors.txt"));
  if (tooBig || picture.compare(0, 4, "\x89PNG") != 0)
    PlotFailed(what + "no PNG picture on its output");
  WriteAll(png, picture);
  return true;
}

}  // namespace qdm_cli
