#include "scanner/scanner_client.h"

#include <time.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <cstdlib>

#include "platform/frame_channel.h"
#include "platform/log.h"
#include "plist/property_list.h"
#include "scanner/scanner_protocol.h"
#include "values/exception.h"
#include "values/number.h"

namespace qr {
namespace {

using namespace scanner;

constexpr int kDefaultTimeoutSeconds = 10;
// A helper whose pipe closed gets this long to finish dying, so that its
// exit status or signal can be told.
constexpr int kExitGraceMs = 2000;

int64_t nowMs() {
  timespec t;
  ::clock_gettime(CLOCK_MONOTONIC, &t);
  return int64_t(t.tv_sec) * 1000 + t.tv_nsec / 1000000;
}

int64_t integerValue(const Dictionary& d, std::string_view key) {
  auto* number = d.getAs<Number>(key);
  return number ? number->int64Value() : 0;
}

Ref<String> stringValue(const Dictionary& d, std::string_view key) {
  return Ref<String>(d.getAs<String>(key));
}

// The plug-in's raise, passed on to the module as if it had happened here.
Ref<Dictionary> passRaise(Ref<Dictionary> reply) {
  if (auto* raised = reply->getAs<String>(kRaised)) {
    auto* reason = reply->getAs<String>(kReason);
    throw Exception(raised->utf8(), reason ? reason->utf8() : "");
  }
  return reply;
}

Ref<MutableDictionary> request(std::string_view call) {
  auto r = make<MutableDictionary>();
  r->set(kCall, String::make(call));
  return r;
}

// The helper runs plug-in code, which could write frames of its own: a line
// it sends stays one line, so it cannot pass for another log line of the run.
std::string oneLine(std::string text) {
  for (char& c : text)
    if (c == '\n' || c == '\r') c = ' ';
  return text;
}

bool isExecutable(const std::string& path) { return ::access(path.c_str(), X_OK) == 0; }

}  // namespace

std::string scannerProgramPath() {
  if (const char* path = secure_getenv("CACHEWRIGHT_SCANNER"); path && *path) return path;
  // The helper of the installation the running program belongs to, wherever
  // its prefix; then the one beside it (the build tree); then the default.
  char self[PATH_MAX];
  ssize_t n = ::readlink("/proc/self/exe", self, sizeof self - 1);
  if (n > 0) {
    std::string folder(self, size_t(n));
    folder.resize(folder.rfind('/') + 1);
    for (const std::string& candidate :
         {folder + QUARRIN_SCANNER_FROM_PROGRAM, folder + "cachewright-scanner"})
      if (isExecutable(candidate)) return candidate;
  }
  return QUARRIN_SCANNER_PATH;
}

int pluginCallTimeoutSeconds() {
  const char* text = secure_getenv("CACHEWRIGHT_PLUGIN_TIMEOUT");
  if (!text) return kDefaultTimeoutSeconds;
  char* end = nullptr;
  errno = 0;
  long seconds = std::strtol(text, &end, 10);
  if (errno == 0 && end != text && *end == '\0' && seconds >= 1 && seconds <= 3600)
    return static_cast<int>(seconds);
  log("CACHEWRIGHT_PLUGIN_TIMEOUT=\"%s\" is not a whole number of seconds from 1 to 3600; "
      "using %d",
      text, kDefaultTimeoutSeconds);
  return kDefaultTimeoutSeconds;
}

ScannerClient::ScannerClient(std::string program, int timeoutSeconds, size_t loadsPerHelper)
    : program_(std::move(program)),
      timeoutSeconds_(timeoutSeconds),
      loadsPerHelper_(std::max<size_t>(loadsPerHelper, 1)) {}

ScannerClient::~ScannerClient() {
  // Closing the socket ends a helper; one stuck in a plug-in's exit code is killed.
  for (Helper& helper : earlier_)
    if (helper.process) helper.process->finish(kExitGraceMs);
  if (current_.process) current_.process->finish(kExitGraceMs);
}

void ScannerClient::start() {
  if (timeoutSeconds_ == 0) timeoutSeconds_ = pluginCallTimeoutSeconds();
  // No module can be asked without it; each says so, and none is remembered as failed.
  if (unavailable_) throw Exception("QrScannerUnavailable", program_);
  std::string error = "no shared memory";
  current_ = {};
  current_.entryPage = SharedPage::create();
  if (current_.entryPage)
    current_.process =
        ChildProcess::start(program_, &error, current_.entryPage->fd(), kEntryPageFd);
  if (!current_.process) {
    unavailable_ = true;
    log("Cannot start the plug-in helper %s: %s", program_, error);
    throw Exception("QrScannerUnavailable", program_);
  }
  current_.reader = std::make_unique<FrameReader>(current_.process->socket(), kMaxFrameSize);
  current_.generation = ++generation_;
}

ScannerClient::Helper& ScannerClient::helperForNewInterface() {
  if (current_.process && current_.loads >= loadsPerHelper_) {
    earlier_.push_back(std::move(current_));
    current_ = {};
  }
  if (!current_.process) start();
  ++current_.loads;
  return current_;
}

void ScannerClient::lose(Helper& helper, const std::string& what) {
  size_t entry = helper.entryPage->bytes()[0];
  helper.process.reset();
  helper.reader.reset();
  throw PluginCallLost{what, std::string(kEntries[entry < kEntries.size() ? entry : 0])};
}

Ref<Dictionary> ScannerClient::call(Helper& helper, std::string_view entry,
                                    const Dictionary& request) {
  auto bytes = writeBinaryPropertyList(request);
  if (!bytes) throw Exception("QrScannerRequest", "a question that cannot be sent");
  volatile uint8_t* entryByte = helper.entryPage->bytes();
  *entryByte = static_cast<uint8_t>(entryNumber(entry));
  ChildProcess& process = *helper.process;
  if (!sendFrame(process.socket(), *bytes)) lose(helper, process.finish(kExitGraceMs));
  int64_t deadline = nowMs() + int64_t(timeoutSeconds_) * 1000;
  uint8_t timedEntry = *entryByte;
  std::string payload;
  for (;;) {
    int left = static_cast<int>(std::max<int64_t>(deadline - nowMs(), 0));
    switch (helper.reader->receive(payload, left)) {
      case FrameResult::Received:
        break;
      case FrameResult::Closed:
        lose(helper, process.finish(kExitGraceMs));
      case FrameResult::TimedOut:
        // One request may make several entries; each has a limit of its own.
        if (*entryByte != timedEntry) {
          timedEntry = *entryByte;
          deadline = nowMs() + int64_t(timeoutSeconds_) * 1000;
          continue;
        }
        process.finish(0);
        lose(helper, "timed out after " + std::to_string(timeoutSeconds_) + " s");
      case FrameResult::TooLarge:
        process.finish(0);
        lose(helper, "unreadable answer");
    }
    auto frame = cast<Dictionary>(readBinaryPropertyList(payload, Mutability::Immutable));
    if (!frame) {
      process.finish(0);
      lose(helper, "unreadable answer");
    }
    if (auto* line = frame->getAs<String>(kLog))
      logMessage(oneLine(line->utf8()));
    else if (frame->get(kDone))
      return frame;
  }
}

InterfaceLoad ScannerClient::loadInterface(PlugIn& plugin, const UUID& factoryID,
                                           const UUID& typeID, const UUID& interfaceID,
                                           const FollowUp* followUp) {
  auto message = request(kLoad);
  message->set(kBundle, String::make(plugin.url()->absoluteString()));
  // The helper need not read the Info dictionary again.
  message->set(kPath, String::make(plugin.bundle().path()));
  message->set(kInfo, Ref<Dictionary>(plugin.bundle().infoDictionary()));
  message->set(kFactory, String::make(factoryID.string()));
  message->set(kType, String::make(typeID.string()));
  message->set(kInterface, String::make(interfaceID.string()));
  Ref<Dictionary> again = message->copy();  // to make it again in a fresh helper
  Ref<MutableDictionary> question;
  if (followUp) {
    // Asked in the same trip; the plug-in sees the calls in the same order.
    question = request(followUp->entry);
    if (followUp->connectionType) question->set(kConnectionType, followUp->connectionType->copy());
    message->set(kThen, question);
  }
  followUp_ = {};
  Ref<Dictionary> reply = call(helperForNewInterface(), kLoad, *message);
  InterfaceLoad load;
  load.instanceMade = reply->get(kMade) != nullptr;
  load.queryResult = static_cast<int32_t>(integerValue(*reply, kStatus));
  if (auto* raised = reply->getAs<String>(kRaised)) load.raised = raised->utf8();
  if (auto* raised = reply->getAs<String>(kReleaseRaised)) load.releaseRaised = raised->utf8();
  if (int64_t address = integerValue(*reply, kHandle)) {
    handles_.push_back({current_.generation, address, again});
    load.interface = handles_.size();
  }
  if (auto* answer = reply->getAs<Dictionary>(kThen))
    followUp_ = {load.interface, question, Ref<Dictionary>(answer)};
  return load;
}

Ref<Dictionary> ScannerClient::takeFollowUp(PluginHandle handle, std::string_view entry,
                                            const String* connectionType) {
  auto taken = std::exchange(followUp_, {});
  if (!taken.answer || taken.handle != handle) return nullptr;
  auto* call = taken.question->getAs<String>(kCall);
  auto* type = taken.question->getAs<String>(kConnectionType);
  if (!call || !call->equals(entry) || !equal(type, connectionType)) return nullptr;
  return taken.answer;
}

std::pair<ScannerClient::Helper*, int64_t> ScannerClient::liveAddress(PluginHandle handle) {
  if (handle == 0 || handle > handles_.size()) {
    if (!current_.process) start();
    return {&current_, 0};
  }
  Remote& remote = handles_[handle - 1];
  if (current_.process && current_.generation == remote.generation)
    return {&current_, remote.address};
  for (Helper& helper : earlier_)
    if (helper.process && helper.generation == remote.generation) return {&helper, remote.address};
  // Another module took its helper down: make this one's interface again in
  // the current helper, the way it was made the first time.
  remote.address =
      integerValue(*call(helperForNewInterface(), kLoad, *remote.loadRequest), kHandle);
  remote.generation = current_.generation;
  return {&current_, remote.address};
}

int32_t ScannerClient::getConnectionInfo(PluginHandle interface, Ref<String>* connectionType,
                                         Ref<String>* pbmPath) {
  Ref<Dictionary> reply = takeFollowUp(interface, kGetConnectionInfo, nullptr);
  if (!reply) {
    auto message = request(kGetConnectionInfo);
    auto [helper, address] = liveAddress(interface);
    message->set(kHandle, Number::integer(address));
    reply = call(*helper, kGetConnectionInfo, *message);
  }
  // What the plug-in stored before raising still counts; the helper sent it along.
  *connectionType = stringValue(*reply, kConnectionType);
  *pbmPath = stringValue(*reply, kPBMPath);
  return static_cast<int32_t>(integerValue(*passRaise(reply), kStatus));
}

Ref<Array> ScannerClient::createBrowserInfo(PluginHandle interface, const String& connectionType) {
  Ref<Dictionary> reply = takeFollowUp(interface, kCreateBrowserInfo, &connectionType);
  if (!reply) {
    auto message = request(kCreateBrowserInfo);
    auto [helper, address] = liveAddress(interface);
    message->set(kHandle, Number::integer(address));
    message->set(kConnectionType, connectionType.copy());
    reply = call(*helper, kCreateBrowserInfo, *message);
  }
  return Ref<Array>(passRaise(reply)->getAs<Array>(kAnswer));
}

}  // namespace qr
