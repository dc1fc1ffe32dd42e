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
#include "platform/frame_channel.h"
#include "platform/shared_page.h"
#include "values/dictionary.h"

namespace qr {

class ScannerClient final : public PluginRunner {
 public:
  // timeoutSeconds bounds each call; 0 takes pluginCallTimeoutSeconds() when
  // the helper is first needed.
  explicit ScannerClient(std::string program, int timeoutSeconds = 0);
  ~ScannerClient() override;

  InterfaceLoad loadInterface(PlugIn& plugin, const UUID& factoryID, const UUID& typeID,
                              const UUID& interfaceID, const FollowUp* followUp) override;
  int32_t getConnectionInfo(PluginHandle interface, Ref<String>* connectionType,
                            Ref<String>* pbmPath) override;
  Ref<Array> createBrowserInfo(PluginHandle interface, const String& connectionType) override;

  // The helper's process id, or 0 while none runs; for tests.
  pid_t helperPid() const noexcept { return helper_ ? helper_->pid() : 0; }

 private:
  // An interface made in a helper, and how to make it again in a fresh one.
  struct Remote {
    uint64_t generation;
    int64_t address;
    Ref<Dictionary> loadRequest;
  };

  // The answer to the question asked together with a load, when it is this one.
  Ref<Dictionary> takeFollowUp(PluginHandle handle, std::string_view entry,
                               const String* connectionType);
  void start();
  Ref<Dictionary> call(std::string_view entry, const Dictionary& request);
  [[noreturn]] void lose(const std::string& what);
  // The helper's address of a handle's interface, made again after a crash.
  int64_t liveAddress(PluginHandle handle);

  std::string program_;
  int timeoutSeconds_;
  std::unique_ptr<ChildProcess> helper_;
  std::unique_ptr<SharedPage> entryPage_;
  std::unique_ptr<FrameReader> reader_;
  uint64_t generation_ = 0;
  bool unavailable_ = false;
  std::vector<Remote> handles_;  // handle N is handles_[N - 1]
  struct {
    PluginHandle handle = 0;
    Ref<Dictionary> question, answer;
  } followUp_;
};

// The helper program: CACHEWRIGHT_SCANNER, else the installed one, else the
// one beside the running program (the build tree).
std::string scannerProgramPath();
// CACHEWRIGHT_PLUGIN_TIMEOUT in whole seconds from 1 to 3600, else 10 (an
// unusable value is logged).
int pluginCallTimeoutSeconds();

}  // namespace qr
