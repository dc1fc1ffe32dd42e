// Runs a built program with its own environment and standard input, and
// collects its standard output, standard error and exit status.
#pragma once

#include <fcntl.h>
#include <poll.h>
#include <sys/wait.h>
#include <unistd.h>

#include <map>
#include <string>
#include <vector>

namespace qrtest {

struct ProgramResult {
  int status = -1;  // exit status, or 128 + signal
  std::string out;
  std::string err;
};

struct ProgramOptions {
  std::vector<std::string> args;
  std::map<std::string, std::string> env;  // added to (or replacing) the test's environment
  std::vector<std::string> unsetEnv;
  std::string input;
  std::string stdoutPath;  // when set, standard output goes to this file (e.g. /dev/full)
};

inline ProgramResult runProgram(const std::string& program, const ProgramOptions& o) {
  int in[2], out[2], err[2];
  if (pipe2(in, O_CLOEXEC) || pipe2(out, O_CLOEXEC) || pipe2(err, O_CLOEXEC)) return {};
  pid_t pid = fork();
  if (pid == 0) {
    dup2(in[0], 0);
    if (!o.stdoutPath.empty()) {
      int fd = open(o.stdoutPath.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
      dup2(fd, 1);
    } else {
      dup2(out[1], 1);
    }
    dup2(err[1], 2);
    for (const auto& name : o.unsetEnv) unsetenv(name.c_str());
    for (const auto& [k, v] : o.env) setenv(k.c_str(), v.c_str(), 1);
    std::vector<char*> argv{const_cast<char*>(program.c_str())};
    for (const auto& a : o.args) argv.push_back(const_cast<char*>(a.c_str()));
    argv.push_back(nullptr);
    execv(program.c_str(), argv.data());
    _exit(127);
  }
  close(in[0]);
  close(out[1]);
  close(err[1]);
  ProgramResult r;
  size_t written = 0;
  bool inOpen = true;
  if (o.input.empty()) {
    close(in[1]);
    inOpen = false;
  }
  bool outOpen = true, errOpen = true;
  while (outOpen || errOpen) {
    pollfd fds[3];
    int n = 0;
    if (outOpen) fds[n++] = {out[0], POLLIN, 0};
    if (errOpen) fds[n++] = {err[0], POLLIN, 0};
    if (inOpen) fds[n++] = {in[1], POLLOUT, 0};
    if (poll(fds, n, 30000) <= 0) break;
    for (int i = 0; i < n; ++i) {
      if (!fds[i].revents) continue;
      if (fds[i].fd == in[1]) {
        ssize_t w = write(in[1], o.input.data() + written, o.input.size() - written);
        if (w > 0) written += static_cast<size_t>(w);
        if (w <= 0 || written == o.input.size()) {
          close(in[1]);
          inOpen = false;
        }
        continue;
      }
      char buf[65536];
      ssize_t got = read(fds[i].fd, buf, sizeof buf);
      if (got <= 0) {
        close(fds[i].fd);
        (fds[i].fd == out[0] ? outOpen : errOpen) = false;
      } else {
        (fds[i].fd == out[0] ? r.out : r.err).append(buf, static_cast<size_t>(got));
      }
    }
  }
  if (inOpen) close(in[1]);
  if (outOpen) close(out[0]);
  if (errOpen) close(err[0]);
  int status = 0;
  waitpid(pid, &status, 0);
  r.status = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
  return r;
}

}  // namespace qrtest
