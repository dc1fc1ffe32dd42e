// Where plug-in code runs. Modules make every call into a plug-in through a
// runner: in this process by default, or in a helper process when a run
// installs one, so that a plug-in that crashes or hangs costs only its own
// answers. Instances and interfaces are named by handles; in this process a
// handle is the plug-in's own pointer.
#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "bundles/plugin_model.h"
#include "values/array.h"
#include "values/string.h"
#include "values/uuid.h"

namespace qr {

using PluginHandle = uint64_t;

// Thrown by a runner when a call never came back: the process running the
// plug-in died or fell silent.
struct PluginCallLost {
  std::string what;   // "SIGSEGV", "exit status 3", "timed out after 2 s"
  std::string entry;  // the call it happened in: "load", "factory", "QueryInterface", ...
};

class PluginRunner {
 public:
  virtual ~PluginRunner() = default;

  // The platform exception a plug-in raises passes through every call below.
  // An instance of the type from the factory, or 0 (logged).
  virtual PluginHandle createInstance(PlugIn& plugin, const UUID& factoryID,
                                      const UUID& typeID) = 0;
  virtual int32_t queryInterface(PluginHandle instance, const UUID& interfaceID,
                                 PluginHandle* out) = 0;
  virtual void releaseInstance(PluginHandle instance) = 0;
  // What the plug-in stored reaches the outputs even when it raises.
  virtual int32_t getConnectionInfo(PluginHandle interface, Ref<String>* connectionType,
                                    Ref<String>* pbmPath) = 0;
  // Null when the plug-in gives no array.
  virtual Ref<Array> createBrowserInfo(PluginHandle interface, const String& connectionType) = 0;

  // The runner modules use unless they must stay in this process.
  static PluginRunner& current();
  static PluginRunner& inProcess();
  // Replaces the current runner; null goes back to running in this process.
  static void install(std::unique_ptr<PluginRunner> runner);
};

}  // namespace qr
