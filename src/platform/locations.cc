#include "platform/locations.h"

#include <cstdlib>

namespace qr {

std::string frameworkBundlePath() {
  if (const char* dir = secure_getenv("CACHEWRIGHT_FRAMEWORK"); dir && *dir) return dir;
  return QUARRIN_FRAMEWORK_DIR;
}

}  // namespace qr
