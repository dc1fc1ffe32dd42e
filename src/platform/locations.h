// Where the installation keeps the printing framework bundle.
#pragma once

#include <string>

namespace qr {

// CACHEWRIGHT_FRAMEWORK (ignored in a privileged context), else the build's default.
std::string frameworkBundlePath();

}  // namespace qr
