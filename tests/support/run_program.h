// Runs a built program with its own environment and standard input, and
// collects its standard output, standard error and exit status.
#pragma once

#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <map>
#include <string>
#include <vector>

#include "support/temp_dir.h"

namespace qrtest {

struct ProgramResult {
  int status = -1;  // exit status, or 128 + signal
  std::string out;
  std::string err;
};

struct ProgramOptions {
  std::vector<std::string> args;
  std::map<std::string, std::string> env;  // added to (or replacing) the test's environment
  std::string input;
  std::string stdoutPath;  // when set, standard output goes to this file (e.g. /dev/full)
};

// The standard streams are files in a scratch directory, so nothing can block.
inline ProgramResult runProgram(const std::string& program, const ProgramOptions& o) {
  TempDir dir;
  const std::string in = dir.write("stdin", o.input), err = dir / "stderr";
  const std::string out = o.stdoutPath.empty() ? dir / "stdout" : o.stdoutPath;
  pid_t pid = fork();
  if (pid == 0) {
    int fds[] = {open(in.c_str(), O_RDONLY), open(out.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644),
                 open(err.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644)};
    for (int target = 0; target < 3; ++target)
      if (fds[target] < 0 || dup2(fds[target], target) < 0) _exit(127);
    for (const auto& [k, v] : o.env) setenv(k.c_str(), v.c_str(), 1);
    std::vector<char*> argv{const_cast<char*>(program.c_str())};
    for (const auto& a : o.args) argv.push_back(const_cast<char*>(a.c_str()));
    argv.push_back(nullptr);
    execv(program.c_str(), argv.data());
    _exit(127);
  }
  int status = 0;
  waitpid(pid, &status, 0);
  return {WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status),
          o.stdoutPath.empty() ? readText(out) : "", readText(err)};
}

}  // namespace qrtest
