#include "modules/plugin_runner.h"

#include "modules/plugin_calls.h"

namespace qr {
namespace {

void* pointer(PluginHandle handle) { return reinterpret_cast<void*>(handle); }
PluginHandle handle(void* pointer) { return reinterpret_cast<PluginHandle>(pointer); }

class InProcessRunner final : public PluginRunner {
 public:
  PluginHandle createInstance(PlugIn& plugin, const UUID& factoryID, const UUID& typeID) override {
    return handle(plugin.createInstance(factoryID, typeID));
  }
  int32_t queryInterface(PluginHandle instance, const UUID& interfaceID,
                         PluginHandle* out) override {
    void* interface = nullptr;
    int32_t result = plugin_calls::queryInterface(pointer(instance), interfaceID, &interface);
    *out = handle(interface);
    return result;
  }
  void releaseInstance(PluginHandle instance) override {
    plugin_calls::releaseInstance(pointer(instance));
  }
  int32_t getConnectionInfo(PluginHandle interface, Ref<String>* connectionType,
                            Ref<String>* pbmPath) override {
    return plugin_calls::getConnectionInfo(pointer(interface), connectionType, pbmPath);
  }
  Ref<Array> createBrowserInfo(PluginHandle interface, const String& connectionType) override {
    return plugin_calls::createBrowserInfo(pointer(interface), connectionType);
  }
};

std::unique_ptr<PluginRunner>& installed() {
  static std::unique_ptr<PluginRunner> runner;
  return runner;
}

}  // namespace

PluginRunner& PluginRunner::inProcess() {
  static InProcessRunner* const runner = new InProcessRunner;
  return *runner;
}

PluginRunner& PluginRunner::current() {
  auto& runner = installed();
  return runner ? *runner : inProcess();
}

void PluginRunner::install(std::unique_ptr<PluginRunner> runner) {
  installed() = std::move(runner);
}

}  // namespace qr
