#include "modules/module.h"

#include <utility>

#include "cache/failure_memory.h"
#include "cache/module_cache.h"
#include "modules/module_factory.h"
#include "modules/plugin_guard.h"
#include "platform/log.h"

namespace qr {

QuarrinModule::QuarrinModule(Ref<PlugIn> plugin, const Array* factories, Ref<URL> path)
    : _pluginURL(std::move(path)), _pluginRef(std::move(plugin)) {
  if (factories && !factories->isEmpty()) _factoryID = cast<UUID>(factories->at(0));
}

std::optional<std::string> QuarrinModule::callPlugin(const std::function<void()>& call) {
  if (_lost) return std::nullopt;
  try {
    auto raised = guardPluginCall(call);
    // It answered: once is enough to take it off the failure record.
    if (!std::exchange(_answered, true)) FailureMemory::shared().forget(*_pluginURL);
    return raised;
  } catch (const PluginCallLost& lost) {
    std::string what = "[" + lost.what + "] on call to '" + lost.entry + "'";
    log("%s for '%@'", what, _pluginURL);
    _lost = true;
    _interface = 0;
    FailureMemory::shared().remember(*_pluginRef, what);
    // Whatever it answered before does not stand for a module that fails.
    QuarrinModuleCache::defaultCache().removeEntry(_pluginURL.get());
    return std::nullopt;
  }
}

bool QuarrinModule::loadPluginInterface(const FollowUp* followUp) {
  UUID* type = typeID();
  UUID* interface = interfaceID();
  if (_loadAttempted || _interface || !_factoryID || !type || !interface) return _interface != 0;
  _loadAttempted = true;

  if (auto failure = FailureMemory::shared().standingFailure(*_pluginRef)) {
    log("Skipping '%@': %s in an earlier run, and it has not changed since", _pluginURL, *failure);
    QuarrinModuleFactory::countLoadFailure();
    return false;
  }
  InterfaceLoad load;
  // The runner reports the plug-in's raises; one that comes back here is the runner's own.
  if (auto raised = callPlugin([&] {
        load = runner().loadInterface(*_pluginRef, *_factoryID, *type, *interface, followUp);
      }))
    load.raised = raised;
  if (!_lost) {
    _interface = load.interface;
    if (load.instanceMade && !load.raised && load.queryResult < 0) {
      auto bits = static_cast<uint32_t>(load.queryResult);
      log("Unble to obtain interface[%@:(%@,%@)]: code:%d facility:%d severity:%d", _pluginURL,
          type->string(), interface->string(), static_cast<int>(bits & 0xFFFF),
          static_cast<int>((bits >> 16) & 0x1FFF), static_cast<int>(bits >> 31));
    }
    if (load.raised) log("[%@] creating an interface for '%@'", *load.raised, _pluginURL);
    if (load.releaseRaised)
      log("[%@] creating an interface for '%@'", *load.releaseRaised, _pluginURL);
  }
  if (!_interface) QuarrinModuleFactory::countLoadFailure();
  return _interface != 0;
}

}  // namespace qr
