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
  // the helper is first needed. A helper makes loadsPerHelper interfaces
  // before the next one takes over.
  static constexpr size_t kLoadsPerHelper = 400;
  explicit ScannerClient(std::string program, int timeoutSeconds = 0,
                         size_t loadsPerHelper = kLoadsPerHelper);
  ~ScannerClient() override;

  InterfaceLoad loadInterface(PlugIn& plugin, const UUID& factoryID, const UUID& typeID,
                              const UUID& interfaceID, const FollowUp* followUp) override;
  int32_t getConnectionInfo(PluginHandle interface, Ref<String>* connectionType,
                            Ref<String>* pbmPath) override;
  Ref<Array> createBrowserInfo(PluginHandle interface, const String& connectionType) override;

  // The current helper's process id, or 0 while none runs; for tests.
  pid_t helperPid() const noexcept { return current_.process ? current_.process->pid() : 0; }

 private:
  // One helper process. Each start has a generation of its own.
  struct Helper {
    std::unique_ptr<ChildProcess> process;
    std::unique_ptr<SharedPage> entryPage;
    std::unique_ptr<FrameReader> reader;
    uint64_t generation = 0;
    size_t loads = 0;
  };
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
  // The helper that makes the next interface: the current one, or a fresh
  // one once the current has made its share.
  Helper& helperForNewInterface();
  Ref<Dictionary> call(Helper& helper, std::string_view entry, const Dictionary& request);
  [[noreturn]] void lose(Helper& helper, const std::string& what);
  // The helper holding a handle's interface and its address there; an
  // interface whose helper was lost is made again in the current one.
  std::pair<Helper*, int64_t> liveAddress(PluginHandle handle);

  std::string program_;
  int timeoutSeconds_;
  size_t loadsPerHelper_;
  // New interfaces are made in the current helper. After a few hundred the
  // next helper takes over, since the loader of one process slows with every
  // object it holds; the earlier helpers stay, serving the interfaces they
  // made, so no plug-in sees its factory called twice.
  Helper current_;
  std::vector<Helper> earlier_;
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
