// Where the installation keeps the printing framework bundle.
#pragma once

#include <string>

namespace qr {

// CACHEWRIGHT_FRAMEWORK, else the build's default. Like CACHEWRIGHT_PREFS, the
// variable is ignored only in set-user-ID or set-group-ID runs.
std::string frameworkBundlePath();

}  // namespace qr
