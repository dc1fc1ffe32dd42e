#include "hosts/iom_host.h"

#include "cache/module_cache.h"

namespace qr {

IOModule* IOMHost::iomInterfaceForURL(const URL* url) const {
  if (!url) return nullptr;
  return cast<IOModule>(loadedPlugins()->get(*url));
}

MutableArray* IOMHost::connectionInfoList() {
  if (_connectionInfoList) return _connectionInfoList.get();
  auto list = make<MutableArray>();
  for (const auto& key : loadedPlugins()->keys()) {
    auto* url = cast<URL>(key.get());
    IOModule* module = iomInterfaceForURL(url);
    if (!module) continue;
    // Both are always asked, so the module's answer is complete in the cache.
    Ref<String> path = module->pbmPath();
    Ref<String> type = module->connectionType();
    if (!path || !type) continue;
    Ref<URL> browser = URL::fileURL(path->utf8(), true, Ref<URL>(url));
    list->append(ConnectionInfo::connectionInfoWithInfo(type, Ref<URL>(url), browser));
  }
  setConnectionInfoList(list);
  return _connectionInfoList.get();
}

Ref<URL> IOMHost::iomURLForConnectionType(const String& connectionType) {
  for (const auto& item : *connectionInfoList()) {
    auto* record = cast<ConnectionInfo>(item.get());
    if (record && record->connectionType() && record->connectionType()->isEqual(connectionType))
      return record->IOMURL();
  }
  auto& cache = QuarrinModuleCache::defaultCache();
  for (const auto& key : loadedPlugins()->keys()) {
    auto* url = cast<URL>(key.get());
    Ref<String> type;
    if (cache.getInfoForIOModule(url, &type, nullptr) && type && type->isEqual(connectionType))
      return Ref<URL>(url);
  }
  return nullptr;
}

}  // namespace qr
