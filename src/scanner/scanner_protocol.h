// What the run and its helper say to each other. Every message is one frame
// holding a binary property-list dictionary.
//
// The run asks: { "call": <one of the calls below>, arguments... }
// The helper answers with any number of { "log": "<message>" } (a log line
// for the run to write as its own) and { "entry": "<name>" } (it is about to
// enter that part of the plug-in), then one { "done": true, results... }, or
// { "done": true, "raised": <name>, "reason": <text> } when the plug-in
// raised the platform exception.
#pragma once

#include <cstddef>
#include <string_view>

namespace qr::scanner {

// The calls, each named as the entry it makes into the plug-in.
constexpr std::string_view kCreateInstance = "load";  // then "factory"
constexpr std::string_view kQueryInterface = "QueryInterface";
constexpr std::string_view kRelease = "Release";
constexpr std::string_view kGetConnectionInfo = "GetConnectionInfo";
constexpr std::string_view kCreateBrowserInfo = "CreateBrowserInfo";
constexpr std::string_view kFactoryEntry = "factory";

// Keys.
constexpr std::string_view kCall = "call";
constexpr std::string_view kBundle = "bundle";    // the bundle URL's absolute string
constexpr std::string_view kFactory = "factory";  // UUID strings
constexpr std::string_view kType = "type";
constexpr std::string_view kInterface = "interface";
constexpr std::string_view kHandle = "handle";  // an instance or interface in the helper
constexpr std::string_view kConnectionType = "connectionType";
constexpr std::string_view kPBMPath = "pbmPath";
constexpr std::string_view kStatus = "status";
constexpr std::string_view kAnswer = "answer";
constexpr std::string_view kLog = "log";
constexpr std::string_view kEntry = "entry";
constexpr std::string_view kDone = "done";
constexpr std::string_view kRaised = "raised";
constexpr std::string_view kReason = "reason";

// No honest answer comes near this; a larger frame is a broken helper.
constexpr size_t kMaxFrameSize = size_t(64) << 20;

}  // namespace qr::scanner
