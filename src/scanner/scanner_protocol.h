// What the run and its helper say to each other. Every message is one frame
// holding a binary property-list dictionary.
//
// The run asks: { "call": <one of the calls below>, arguments... }
// The helper answers with any number of { "log": "<message>" } (a log line
// for the run to write as its own), then one { "done": true, results... },
// with "raised" and "reason" when the plug-in raised the platform exception.
//
// Besides the socket, the two share one page of memory where the helper
// notes the entry into plug-in code it is about to make, so that a crash or
// a hang is told by the entry it happened in without a message per entry.
#pragma once

#include <array>
#include <cstddef>
#include <string_view>

namespace qr::scanner {

// The calls. "load" makes an instance, asks it for the interface and
// releases it, and may carry the question the run asks next; the other two
// are the kinds' entries of the same names.
constexpr std::string_view kLoad = "load";
constexpr std::string_view kGetConnectionInfo = "GetConnectionInfo";
constexpr std::string_view kCreateBrowserInfo = "CreateBrowserInfo";

// The entries into plug-in code, by their number in the shared page.
constexpr std::array<std::string_view, 6> kEntries = {
    "load", "factory", "QueryInterface", "Release", "GetConnectionInfo", "CreateBrowserInfo"};
constexpr size_t entryNumber(std::string_view entry) {
  for (size_t i = 0; i < kEntries.size(); ++i)
    if (kEntries[i] == entry) return i;
  return 0;
}

// Keys.
constexpr std::string_view kCall = "call";
constexpr std::string_view kBundle = "bundle";    // the bundle URL's absolute string
constexpr std::string_view kPath = "path";        // the bundle's directory
constexpr std::string_view kInfo = "info";        // its Info dictionary, as the run read it
constexpr std::string_view kFactory = "factory";  // UUID strings
constexpr std::string_view kType = "type";
constexpr std::string_view kInterface = "interface";
constexpr std::string_view kHandle = "handle";  // an interface in the helper
constexpr std::string_view kMade = "made";      // an instance was made
constexpr std::string_view kConnectionType = "connectionType";
constexpr std::string_view kPBMPath = "pbmPath";
constexpr std::string_view kStatus = "status";
constexpr std::string_view kAnswer = "answer";
constexpr std::string_view kLog = "log";
constexpr std::string_view kDone = "done";
constexpr std::string_view kRaised = "raised";
constexpr std::string_view kReason = "reason";
constexpr std::string_view kReleaseRaised = "releaseRaised";
// In "load": the question to ask once the interface is had, and its answer.
constexpr std::string_view kThen = "then";

// The helper finds the shared page at this descriptor, beside the socket.
constexpr int kEntryPageFd = 4;

// No honest answer comes near this; a larger frame is a broken helper.
constexpr size_t kMaxFrameSize = size_t(64) << 20;

}  // namespace qr::scanner
