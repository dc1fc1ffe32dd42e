// Whether code a privileged run is about to load could have been replaced by
// someone else: the file, and every directory from a top folder down to it,
// must be owned by root and writable by no group and no other user.
#pragma once

#include <optional>
#include <string>

namespace qr {

struct TrustProblem {
  std::string path;    // the first path that fails
  std::string reason;  // "owned by user 1000", "writable by group", ...
};

// file lies below top; a symbolic link is judged by what it leads to as well.
std::optional<TrustProblem> rootTrustProblem(const std::string& top, const std::string& file);

}  // namespace qr
