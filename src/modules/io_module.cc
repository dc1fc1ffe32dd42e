#include "modules/io_module.h"

#include "cache/module_cache.h"
#include "modules/module_factory.h"
#include "platform/log.h"

namespace qr {

UUID* IOModule::typeID() const { return QuarrinModuleFactory::iomTypeID(); }
UUID* IOModule::interfaceID() const { return QuarrinModuleFactory::iomIntfID(); }

Ref<String> IOModule::connectionType() {
  if (!_connectionType) connectionInfo();
  return _connectionType;
}

Ref<String> IOModule::pbmPath() {
  if (!_pbmPath) connectionInfo();
  return _pbmPath;
}

void IOModule::connectionInfo() {
  Ref<String> type, path;
  auto& cache = QuarrinModuleCache::defaultCache();
  const FollowUp ask{"GetConnectionInfo"};
  if (!cache.getInfoForIOModule(pluginURL().get(), &type, &path) && loadPluginInterface(&ask)) {
    auto raised = callPlugin([&] {
      int32_t status = runner().getConnectionInfo(interfaceHandle(), &type, &path);
      // A failed call records nothing, so the next run asks again.
      if (status == 0) cache.addInfoForIOModule(pluginURL().get(), type.get(), path.get());
    });
    if (raised) log("[%@] on call to 'GetConnectionInfo' for '%@'", *raised, pluginURL());
  }
  setConnectionType(std::move(type));
  setPBMPath(std::move(path));
}

}  // namespace qr
