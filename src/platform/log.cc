#include "platform/log.h"

#include <errno.h>
#include <syslog.h>
#include <unistd.h>

#include <cinttypes>
#include <cstdio>
#include <mutex>

#include "values/object.h"

namespace qr {
namespace {
std::mutex& sinkMutex() {
  static std::mutex m;
  return m;
}
LogSink& currentSink() {
  static LogSink sink;
  return sink;
}
}  // namespace

std::string formatArgs(std::string_view fmt, const std::vector<FormatArg>& args) {
  std::string out;
  size_t next = 0;
  auto take = [&]() -> const FormatArg* { return next < args.size() ? &args[next++] : nullptr; };
  for (size_t i = 0; i < fmt.size(); ++i) {
    char c = fmt[i];
    if (c != '%' || i + 1 == fmt.size()) {
      out += c;
      continue;
    }
    // Flags and width, then a conversion letter.
    size_t j = i + 1;
    std::string directive = "%";
    while (j < fmt.size() && (fmt[j] == '0' || fmt[j] == '-' || (fmt[j] >= '1' && fmt[j] <= '9')))
      directive += fmt[j++];
    if (j == fmt.size()) {
      out.append(fmt.substr(i));
      break;
    }
    char conv = fmt[j];
    i = j;
    if (conv == '%') {
      out += '%';
      continue;
    }
    const FormatArg* a = take();
    char buf[64];
    switch (conv) {
      case '@':
        if (!a)
          out += "(null)";
        else if (a->type == FormatArg::Type::Object)
          out += describe(a->object);
        else if (a->type == FormatArg::Type::Text)
          out += a->text;
        else
          out += std::to_string(a->type == FormatArg::Type::Signed ? a->i : int64_t(a->u));
        break;
      case 's':
        if (a && a->type == FormatArg::Type::Text)
          out += a->text;
        else if (a && a->type == FormatArg::Type::Object)
          out += describe(a->object);
        else
          out += "(null)";
        break;
      case 'd':
      case 'i':
      case 'u':
      case 'x':
      case 'X': {
        int64_t v = !a ? 0 : a->type == FormatArg::Type::Signed ? a->i : int64_t(a->u);
        if (conv == 'd' || conv == 'i') {
          // %d prints a 32-bit int, as the messages were written for one.
          std::snprintf(buf, sizeof buf, (directive + "" PRId32).c_str(), static_cast<int32_t>(v));
        } else {
          std::string f = directive + (conv == 'u' ? PRIu32 : conv == 'x' ? PRIx32 : PRIX32);
          std::snprintf(buf, sizeof buf, f.c_str(), static_cast<uint32_t>(v));
        }
        out += buf;
        break;
      }
      default:
        out += directive;
        out += conv;
        break;
    }
  }
  return out;
}

LogSink setLogSink(LogSink sink) {
  std::lock_guard<std::mutex> lock(sinkMutex());
  return std::exchange(currentSink(), std::move(sink));
}

void logMessage(std::string_view message) {
  {
    std::lock_guard<std::mutex> lock(sinkMutex());
    if (currentSink()) {
      currentSink()(message);
      return;
    }
  }
  std::string line = program_invocation_short_name;
  line += '[' + std::to_string(getpid()) + "]: ";
  line += message;
  line += '\n';
  // One write keeps the line whole when several processes share stderr.
  const char* p = line.data();
  size_t left = line.size();
  while (left > 0) {
    ssize_t n = ::write(STDERR_FILENO, p, left);
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) break;
    p += n;
    left -= static_cast<size_t>(n);
  }
  syslog(LOG_USER | LOG_NOTICE, "%.*s", static_cast<int>(message.size()), message.data());
}

}  // namespace qr
