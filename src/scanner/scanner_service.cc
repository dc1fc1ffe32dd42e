#include "scanner/scanner_service.h"

#include <fcntl.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <string>

#include "modules/plugin_runner.h"
#include "platform/child_process.h"
#include "platform/frame_channel.h"
#include "platform/log.h"
#include "platform/shared_page.h"
#include "plist/property_list.h"
#include "scanner/scanner_protocol.h"
#include "values/boolean.h"
#include "values/deep_copy.h"
#include "values/exception.h"
#include "values/number.h"

namespace qr {
namespace {

using namespace scanner;

constexpr int kSocket = ChildProcess::kSocketFd;

void send(const Dictionary& message) {
  auto bytes = writeBinaryPropertyList(message);
  // A run that went away takes us with it; nothing is left to answer.
  if (!bytes || !sendFrame(kSocket, *bytes)) ::_exit(0);
}

void sendOne(std::string_view key, std::string_view text) {
  auto message = make<MutableDictionary>();
  message->set(key, String::make(text));
  send(*message);
}

class Service {
 public:
  Ref<MutableDictionary> answer(const Dictionary& request);

 private:
  PlugIn* plugin(const Dictionary& request);
  void load(const Dictionary& request, MutableDictionary& reply);

  std::map<std::string, Ref<PlugIn>> plugins_;  // kept: their code stays loaded
  InProcessRunner& calls_ = PluginRunner::inProcess();
};

PlugIn* Service::plugin(const Dictionary& request) {
  auto* bundle = request.getAs<String>(kBundle);
  auto* path = request.getAs<String>(kPath);
  auto* info = request.getAs<Dictionary>(kInfo);
  if (!bundle || !path || !info) return nullptr;
  std::string key = bundle->utf8();
  auto found = plugins_.find(key);
  if (found != plugins_.end()) return found->second.get();
  auto url = URL::withString(key);
  Ref<PlugIn> made =
      url ? PlugIn::create(*url, Bundle::withInfo(path->utf8(), Ref<Dictionary>(info))) : nullptr;
  if (made) plugins_[key] = made;
  return made.get();
}

Ref<UUID> uuidValue(const Dictionary& d, std::string_view key) {
  auto* text = d.getAs<String>(key);
  return text ? UUID::fromString(text->utf8()) : nullptr;
}

PluginHandle handleValue(const Dictionary& d) {
  auto* number = d.getAs<Number>(kHandle);
  return number ? number->uint64Value() : 0;
}

void Service::load(const Dictionary& request, MutableDictionary& reply) {
  PlugIn* module = plugin(request);
  Ref<UUID> factory = uuidValue(request, kFactory), type = uuidValue(request, kType),
            interface = uuidValue(request, kInterface);
  if (!module || !factory || !type || !interface) return;
  InterfaceLoad load = calls_.loadInterface(*module, *factory, *type, *interface);
  if (load.instanceMade) reply.set(kMade, Boolean::trueValue());
  reply.set(kStatus, Number::integer(load.queryResult));
  reply.set(kHandle, Number::unsignedInteger(load.interface));
  if (load.raised) reply.set(kRaised, String::make(*load.raised));
  if (load.releaseRaised) reply.set(kReleaseRaised, String::make(*load.releaseRaised));
  auto* then = request.getAs<Dictionary>(kThen);
  if (then && load.interface && !load.raised) {
    auto question = then->mutableCopy();
    question->set(kHandle, Number::unsignedInteger(load.interface));
    reply.set(kThen, answer(*question));
  }
}

Ref<MutableDictionary> Service::answer(const Dictionary& request) {
  auto reply = make<MutableDictionary>();
  reply->set(kDone, Boolean::trueValue());
  auto* callName = request.getAs<String>(kCall);
  std::string call = callName ? callName->utf8() : "";
  PluginHandle handle = handleValue(request);
  try {
    if (call == kLoad) {
      load(request, *reply);
    } else if (call == kGetConnectionInfo) {
      Ref<String> type, path;
      // Whatever it stored is sent even when it raises, as a caller here would see it.
      struct Deliver {
        MutableDictionary& reply;
        Ref<String>& type;
        Ref<String>& path;
        ~Deliver() {
          if (type) reply.set(kConnectionType, type->copy());
          if (path) reply.set(kPBMPath, path->copy());
        }
      } deliver{*reply, type, path};
      int32_t status = handle ? calls_.getConnectionInfo(handle, &type, &path) : -1;
      reply->set(kStatus, Number::integer(status));
    } else if (call == kCreateBrowserInfo) {
      auto* type = request.getAs<String>(kConnectionType);
      Ref<Array> info = handle && type ? calls_.createBrowserInfo(handle, *type) : nullptr;
      // An answer holding other objects cannot cross; here it would not be
      // copied either, so it counts as no answer.
      if (info && isPropertyList(*info)) reply->set(kAnswer, info);
    }
  } catch (const Exception& e) {
    reply->set(kRaised, String::make(e.name()));
    reply->set(kReason, String::make(e.reason()));
  }
  return reply;
}

}  // namespace

int runScanner(int argc, char** argv) {
  if (argc != 3 || std::strcmp(argv[1], "--parent") != 0 || ::fcntl(kSocket, F_GETFD) < 0) {
    std::fputs("cachewright-scanner is started by cachewright; it is not run by hand.\n", stderr);
    return 2;
  }
  followParent(static_cast<pid_t>(std::atoll(argv[2])));
  // Plug-ins that start programs must not hand them our end of the socket.
  ::fcntl(kSocket, F_SETFD, FD_CLOEXEC);
  ::fcntl(kEntryPageFd, F_SETFD, FD_CLOEXEC);
  // Chatter reaches the run's standard error line by line.
  std::setvbuf(stdout, nullptr, _IOLBF, 0);
  setLogSink([](std::string_view message) { sendOne(kLog, message); });

  // The run reads the entry we are in from here when we crash or hang.
  auto entryPage = SharedPage::open(kEntryPageFd);
  if (!entryPage) return 2;
  PluginRunner::inProcess().setEntryHook([page = entryPage->bytes()](const char* entry) {
    page[0] = static_cast<uint8_t>(entryNumber(entry));
  });

  Service service;
  FrameReader reader(kSocket, kMaxFrameSize);
  std::string payload;
  while (reader.receive(payload, -1) == FrameResult::Received) {
    auto request = cast<Dictionary>(readBinaryPropertyList(payload, Mutability::Immutable));
    if (!request) return 2;
    send(*service.answer(*request));
  }
  return 0;
}

}  // namespace qr
