#include "platform/child_process.h"

#include <fcntl.h>
#include <signal.h>
#include <spawn.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <vector>

extern char** environ;

namespace qr {
namespace {

bool waitExited(pid_t pid, int* status, int graceMs) {
  for (int waited = 0;; ++waited) {
    pid_t r = ::waitpid(pid, status, WNOHANG);
    if (r == pid) return true;
    if (r < 0 && errno != EINTR) return false;
    if (waited >= graceMs) return false;
    timespec millisecond{0, 1000000};
    ::nanosleep(&millisecond, nullptr);
  }
}

// Above the descriptors the helper's are moved to, so that no move overwrites
// one still to be moved.
int aboveHelperFds(int fd) {
  if (fd < 0 || fd > 9) return fd;
  int moved = ::fcntl(fd, F_DUPFD_CLOEXEC, 10);
  ::close(fd);
  return moved;
}

}  // namespace

std::string signalName(int signal) {
  const char* abbreviation = ::sigabbrev_np(signal);
  if (!abbreviation) return "signal " + std::to_string(signal);
  return std::string("SIG") + abbreviation;
}

std::unique_ptr<ChildProcess> ChildProcess::start(const std::string& program, std::string* error,
                                                  int passFd, int passAs) {
  int pair[2];
  if (::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, pair) != 0) {
    *error = std::strerror(errno);
    return nullptr;
  }
  pair[1] = aboveHelperFds(pair[1]);
  // posix_spawn, not fork: the parent may hold a large heap, and the helper
  // arms its own death signal.
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
  posix_spawn_file_actions_adddup2(&actions, STDERR_FILENO, STDOUT_FILENO);
  posix_spawn_file_actions_adddup2(&actions, pair[1], kSocketFd);
  int passing = passFd >= 0 ? ::fcntl(passFd, F_DUPFD_CLOEXEC, 10) : -1;
  if (passing >= 0) posix_spawn_file_actions_adddup2(&actions, passing, passAs);
  std::string parent = std::to_string(::getpid());
  std::vector<char*> argv{const_cast<char*>(program.c_str()), const_cast<char*>("--parent"),
                          parent.data(), nullptr};
  pid_t pid = 0;
  int result = ::posix_spawn(&pid, program.c_str(), &actions, nullptr, argv.data(), environ);
  posix_spawn_file_actions_destroy(&actions);
  ::close(pair[1]);
  if (passing >= 0) ::close(passing);
  if (result != 0) {
    ::close(pair[0]);
    *error = std::strerror(result);
    return nullptr;
  }
  return std::unique_ptr<ChildProcess>(new ChildProcess(pid, pair[0]));
}

std::string ChildProcess::finish(int graceMs) {
  if (socket_ >= 0) ::close(socket_);
  socket_ = -1;
  int status = 0;
  if (!waitExited(pid_, &status, graceMs)) {
    ::kill(pid_, SIGKILL);
    while (::waitpid(pid_, &status, 0) < 0 && errno == EINTR) {
    }
  }
  reaped_ = true;
  if (WIFSIGNALED(status)) return signalName(WTERMSIG(status));
  return "exit status " + std::to_string(WEXITSTATUS(status));
}

ChildProcess::~ChildProcess() {
  if (!reaped_) finish(0);
}

void followParent(pid_t parent) {
  ::prctl(PR_SET_PDEATHSIG, SIGKILL);
  // The parent may have died before the signal was armed.
  if (::getppid() != parent) ::_exit(0);
}

}  // namespace qr
