// A helper program run beside this process and joined to it by one socket.
// The helper dies with us (it arms PR_SET_PDEATHSIG itself, after checking
// the parent it was started by), and however it ends, it is reaped.
#pragma once

#include <sys/types.h>

#include <memory>
#include <string>

namespace qr {

class ChildProcess {
 public:
  // The descriptor number the helper finds its end of the socket at.
  static constexpr int kSocketFd = 3;

  // Starts program with the socket's other end as descriptor kSocketFd,
  // standard input from /dev/null and standard output onto our standard
  // error, plus "--parent <our pid>"; passFd, when not negative, becomes the
  // helper's descriptor passAs. Null with *error set when it cannot start.
  static std::unique_ptr<ChildProcess> start(const std::string& program, std::string* error,
                                             int passFd = -1, int passAs = -1);
  ~ChildProcess();  // kills and reaps it if still running

  ChildProcess(const ChildProcess&) = delete;
  ChildProcess& operator=(const ChildProcess&) = delete;

  int socket() const noexcept { return socket_; }
  pid_t pid() const noexcept { return pid_; }

  // Waits up to graceMs for the helper to end by itself, then kills it, and
  // says how it ended: "SIGSEGV", "exit status 3". Closes the socket.
  std::string finish(int graceMs);

 private:
  ChildProcess(pid_t pid, int socket) : pid_(pid), socket_(socket) {}

  pid_t pid_;
  int socket_;
  bool reaped_ = false;
};

// "SIGSEGV" for a signal number, "signal 77" for one without a name.
std::string signalName(int signal);

// Called by the helper first thing: dies with the parent named on its command
// line, and exits at once when that parent is already gone.
void followParent(pid_t parent);

}  // namespace qr
