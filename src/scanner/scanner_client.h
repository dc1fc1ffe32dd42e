// The run's side of the helper: a plug-in runner that makes every call in
// cachewright-scanner. The helper is started on the first call and kept for
// module after module. A call that crashes, exits, hangs or garbles the helper
// throws PluginCallLost; the helper is then reaped and the next call starts a
// fresh one, into which the modules loaded before are brought back.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "modules/plugin_runner.h"
#include "platform/child_process.h"
#include "values/dictionary.h"

namespace qr {

class ScannerClient final : public PluginRunner {
 public:
  // timeoutSeconds bounds each call; 0 takes pluginCallTimeoutSeconds() when
  // the helper is first needed.
  explicit ScannerClient(std::string program, int timeoutSeconds = 0);
  ~ScannerClient() override;

  PluginHandle createInstance(PlugIn& plugin, const UUID& factoryID, const UUID& typeID) override;
  int32_t queryInterface(PluginHandle instance, const UUID& interfaceID,
                         PluginHandle* out) override;
  void releaseInstance(PluginHandle instance) override;
  int32_t getConnectionInfo(PluginHandle interface, Ref<String>* connectionType,
                            Ref<String>* pbmPath) override;
  Ref<Array> createBrowserInfo(PluginHandle interface, const String& connectionType) override;

  // The helper's process id, or 0 while none runs; for tests.
  pid_t helperPid() const noexcept { return helper_ ? helper_->pid() : 0; }

 private:
  // What a handle given out stands for, and how to make it again in a fresh helper.
  struct Remote {
    uint64_t generation;
    int64_t address;
    std::string bundle, factory, type, interface;  // interface empty for an instance
  };

  Ref<Dictionary> call(std::string_view entry, const Ref<MutableDictionary>& request);
  [[noreturn]] void lose(const std::string& entry, const std::string& what);
  void start();
  int64_t remoteInstance(const std::string& bundle, const std::string& factory,
                         const std::string& type);
  // The helper's address of a handle's interface, brought back after a crash.
  int64_t liveAddress(PluginHandle handle);
  PluginHandle keep(Remote remote);

  std::string program_;
  int timeoutSeconds_;
  std::unique_ptr<ChildProcess> helper_;
  uint64_t generation_ = 0;
  bool unavailable_ = false;
  std::vector<Remote> handles_;  // handle N is handles_[N - 1]
};

// The helper program: CACHEWRIGHT_SCANNER, else the installed one, else the
// one beside the running program (the build tree).
std::string scannerProgramPath();
// CACHEWRIGHT_PLUGIN_TIMEOUT in whole seconds from 1 to 3600, else 10 (an
// unusable value is logged).
int pluginCallTimeoutSeconds();

}  // namespace qr
