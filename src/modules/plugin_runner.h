// Where plug-in code runs. Modules make every call into a plug-in through a
// runner: in this process by default, or in a helper process when a run
// installs one, so that a plug-in that crashes or hangs costs only its own
// answers. Instances and interfaces are named by handles; in this process a
// handle is the plug-in's own pointer.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "bundles/plugin_model.h"
#include "values/array.h"
#include "values/string.h"
#include "values/uuid.h"

namespace qr {

using PluginHandle = uint64_t;

// Thrown by a runner when a call never came back: the process running the
// plug-in died or fell silent.
class InProcessRunner;

struct PluginCallLost {
  std::string what;   // "SIGSEGV", "exit status 3", "timed out after 2 s"
  std::string entry;  // the call it happened in: "load", "factory", "QueryInterface", ...
};

// What making a module's interface gave, step by step, for the module to
// report in order.
struct InterfaceLoad {
  bool instanceMade = false;
  int32_t queryResult = 0;  // what QueryInterface returned, when it was called and returned
  PluginHandle interface = 0;
  std::optional<std::string> raised;  // the platform exception of the factory or QueryInterface
  std::optional<std::string> releaseRaised;
};

// What a module asks right after a load that gives it an interface, so that
// a runner in another process can ask it in the same trip.
struct FollowUp {
  std::string_view entry;  // "GetConnectionInfo" or "CreateBrowserInfo"
  const String* connectionType = nullptr;
};

class PluginRunner {
 public:
  virtual ~PluginRunner() = default;

  // Creates an instance of the type from the factory, asks it for the
  // interface and releases it: each module does this at most once. Raised
  // platform exceptions are reported in the result.
  virtual InterfaceLoad loadInterface(PlugIn& plugin, const UUID& factoryID, const UUID& typeID,
                                      const UUID& interfaceID,
                                      const FollowUp* followUp = nullptr) = 0;
  // The platform exception a plug-in raises in these passes through to the caller.
  // What the plug-in stored reaches the outputs even when it raises.
  virtual int32_t getConnectionInfo(PluginHandle interface, Ref<String>* connectionType,
                                    Ref<String>* pbmPath) = 0;
  // Null when the plug-in gives no array.
  virtual Ref<Array> createBrowserInfo(PluginHandle interface, const String& connectionType) = 0;

  // The runner modules use unless they must stay in this process.
  static PluginRunner& current();
  static InProcessRunner& inProcess();
  // Replaces the current runner; null goes back to running in this process.
  static void install(std::unique_ptr<PluginRunner> runner);
};

// Calls plug-in code in this process; a handle is the plug-in's own pointer.
class InProcessRunner final : public PluginRunner {
 public:
  InterfaceLoad loadInterface(PlugIn& plugin, const UUID& factoryID, const UUID& typeID,
                              const UUID& interfaceID, const FollowUp* followUp = nullptr) override;
  int32_t getConnectionInfo(PluginHandle interface, Ref<String>* connectionType,
                            Ref<String>* pbmPath) override;
  Ref<Array> createBrowserInfo(PluginHandle interface, const String& connectionType) override;

  // Told the name of each entry into plug-in code just before it is made.
  void setEntryHook(std::function<void(const char* entry)> hook) { entering_ = std::move(hook); }

 private:
  void entering(const char* entry) const {
    if (entering_) entering_(entry);
  }
  std::function<void(const char*)> entering_;
};

}  // namespace qr
