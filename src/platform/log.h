// The system log: one line per event on standard error as
// "<program>[<pid>]: <message>", and the same message to syslog (user, notice).
#pragma once

#include <functional>
#include <string>
#include <string_view>

#include "platform/format.h"

namespace qr {

void logMessage(std::string_view message);

// log("Module is missing short version: %@", url)
template <class... Args>
void log(const char* format, const Args&... args) {
  logMessage(qr::format(format, args...));
}

// Tests watch the log through a sink; while one is set, nothing reaches stderr
// or syslog. Returns the previous sink.
using LogSink = std::function<void(std::string_view)>;
LogSink setLogSink(LogSink sink);

}  // namespace qr
