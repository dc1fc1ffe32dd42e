// Plug-in code is entered only through guarded calls: the platform exception
// is caught and reported by name, any other exception passes to the caller.
// Keeping every entry behind this one shape lets a later runner move the
// calls into a child process without touching the modules.
#pragma once

#include <optional>
#include <string>

#include "values/exception.h"

namespace qr {

// Runs call(); the name of a platform exception it raised, or none.
template <class Call>
std::optional<std::string> guardPluginCall(Call&& call) {
  try {
    call();
    return std::nullopt;
  } catch (const Exception& e) {
    return e.name();
  }
}

}  // namespace qr
