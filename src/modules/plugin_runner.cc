#include "modules/plugin_runner.h"

#include "modules/plugin_calls.h"
#include "modules/plugin_guard.h"

namespace qr {
namespace {

void* pointer(PluginHandle handle) { return reinterpret_cast<void*>(handle); }
PluginHandle handle(void* pointer) { return reinterpret_cast<PluginHandle>(pointer); }

std::unique_ptr<PluginRunner>& installed() {
  static std::unique_ptr<PluginRunner> runner;
  return runner;
}

}  // namespace

InterfaceLoad InProcessRunner::loadInterface(PlugIn& plugin, const UUID& factoryID,
                                             const UUID& typeID, const UUID& interfaceID,
                                             const FollowUp*) {
  InterfaceLoad load;
  void* instance = nullptr;
  load.raised = guardPluginCall([&] {
    instance = plugin.createInstance(factoryID, typeID, [this] { entering("factory"); });
    if (!instance) return;
    load.instanceMade = true;
    void* interface = nullptr;
    entering("QueryInterface");
    load.queryResult = plugin_calls::queryInterface(instance, interfaceID, &interface);
    load.interface = handle(interface);
  });
  if (load.raised) load.interface = 0;
  if (instance) {
    entering("Release");
    load.releaseRaised = guardPluginCall([&] { plugin_calls::releaseInstance(instance); });
  }
  return load;
}

int32_t InProcessRunner::getConnectionInfo(PluginHandle interface, Ref<String>* connectionType,
                                           Ref<String>* pbmPath) {
  entering("GetConnectionInfo");
  return plugin_calls::getConnectionInfo(pointer(interface), connectionType, pbmPath);
}

Ref<Array> InProcessRunner::createBrowserInfo(PluginHandle interface,
                                              const String& connectionType) {
  entering("CreateBrowserInfo");
  return plugin_calls::createBrowserInfo(pointer(interface), connectionType);
}

InProcessRunner& PluginRunner::inProcess() {
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
