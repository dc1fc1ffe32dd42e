#include "platform/file_trust.h"

#include <sys/stat.h>

#include <cerrno>
#include <climits>
#include <cstdlib>
#include <cstring>
#include <vector>

namespace qr {
namespace {

std::optional<TrustProblem> problemOf(const std::string& path) {
  struct stat st;
  if (::stat(path.c_str(), &st) != 0)
    return TrustProblem{path, std::string("cannot be examined: ") + std::strerror(errno)};
  if (st.st_uid != 0) return TrustProblem{path, "owned by user " + std::to_string(st.st_uid)};
  if (st.st_mode & S_IWGRP) return TrustProblem{path, "writable by group"};
  if (st.st_mode & S_IWOTH) return TrustProblem{path, "writable by others"};
  return std::nullopt;
}

}  // namespace

std::optional<TrustProblem> rootTrustProblem(const std::string& top, const std::string& file) {
  std::vector<std::string> paths{top};
  if (file.size() > top.size() && file.compare(0, top.size(), top) == 0) {
    for (size_t slash = file.find('/', top.size() + 1); slash != std::string::npos;
         slash = file.find('/', slash + 1))
      paths.push_back(file.substr(0, slash));
  }
  // Through a link, the file it leads to is named: that is the one to fix.
  char resolved[PATH_MAX];
  if (::realpath(file.c_str(), resolved) && file != resolved) paths.push_back(resolved);
  paths.push_back(file);
  for (const auto& path : paths)
    if (auto problem = problemOf(path)) return problem;
  return std::nullopt;
}

}  // namespace qr
