#include "modules/module_factory.h"

#include <quarrin/plugin.h>

#include "bundles/plugin_model.h"
#include "modules/io_module.h"
#include "modules/module.h"
#include "modules/pbm_module.h"
#include "modules/plugin_guard.h"
#include "modules/pm_module.h"
#include "platform/log.h"

namespace qr {
namespace {

int32_t gLoadFailures = 0;

UUID* keptUUID(const char* text) { return immortal(UUID::fromString(text).leak()); }

template <class Module>
Ref<QuarrinModule> makeIfDeclared(PlugIn& plugin, UUID* type, const Ref<URL>& url) {
  Ref<Array> factories = plugin.factoriesForType(*type);
  if (!factories || factories->isEmpty()) return nullptr;
  return make<Module>(Ref<PlugIn>(&plugin), factories.get(), url);
}

Ref<QuarrinModule> makeOfType(PlugIn& plugin, UUID* type, const Ref<URL>& url) {
  if (type->isEqual(*QuarrinModuleFactory::iomTypeID()))
    return makeIfDeclared<IOModule>(plugin, type, url);
  if (type->isEqual(*QuarrinModuleFactory::pmTypeID()))
    return makeIfDeclared<PMModule>(plugin, type, url);
  if (type->isEqual(*QuarrinModuleFactory::pbmTypeID()))
    return makeIfDeclared<PBMModule>(plugin, type, url);
  return nullptr;  // the browser version UUID and anything else make no module
}

}  // namespace

UUID* QuarrinModuleFactory::pmTypeID() {
  static UUID* const id = keptUUID(QR_PM_TYPE_ID);
  return id;
}
UUID* QuarrinModuleFactory::pmIntfID() {
  static UUID* const id = keptUUID(QR_PM_INTERFACE_ID);
  return id;
}
UUID* QuarrinModuleFactory::iomTypeID() {
  static UUID* const id = keptUUID(QR_IOM_TYPE_ID);
  return id;
}
UUID* QuarrinModuleFactory::iomIntfID() {
  static UUID* const id = keptUUID(QR_IOM_INTERFACE_ID);
  return id;
}
UUID* QuarrinModuleFactory::pbmTypeID() {
  static UUID* const id = keptUUID(QR_PBM_TYPE_ID);
  return id;
}
UUID* QuarrinModuleFactory::pbmVersID() {
  static UUID* const id = keptUUID(QR_PBM_VERSION_ID);
  return id;
}
UUID* QuarrinModuleFactory::pbmIntfID() {
  static UUID* const id = keptUUID(QR_PBM_INTERFACE_ID);
  return id;
}

int32_t QuarrinModuleFactory::loadFailures() { return gLoadFailures; }
void QuarrinModuleFactory::resetLoadFailures() { gLoadFailures = 0; }
void QuarrinModuleFactory::countLoadFailure() { ++gLoadFailures; }

Ref<QuarrinModule> QuarrinModuleFactory::pluginForURL(const URL* url) {
  if (!url) return nullptr;
  Ref<URL> path(const_cast<URL*>(url));
  Ref<PlugIn> plugin = PlugIn::create(*url);
  if (!plugin) return nullptr;
  Ref<QuarrinModule> module;
  // I/O first, then printer, then browser: a bundle declaring several kinds
  // becomes the first of them.
  auto raised = guardPluginCall([&] {
    for (UUID* type : {iomTypeID(), pmTypeID(), pbmTypeID()})
      if ((module = makeOfType(*plugin, type, path))) return;
  });
  if (raised) {
    log("[%@] creating an interface for '%@'", *raised, url);
    module.reset();
  }
  return module;
}

Ref<QuarrinModule> QuarrinModuleFactory::pluginType(const UUID* type, const URL* forURL) {
  if (!forURL) return nullptr;
  Ref<URL> path(const_cast<URL*>(forURL));
  Ref<PlugIn> plugin = PlugIn::create(*forURL);
  if (!plugin || !type) return nullptr;
  Ref<QuarrinModule> module;
  auto raised =
      guardPluginCall([&] { module = makeOfType(*plugin, const_cast<UUID*>(type), path); });
  if (raised) {
    log("[%@] creating an interface for '%@'", *raised, forURL);
    module.reset();
  }
  return module;
}

Ref<QuarrinModule> QuarrinModuleFactory::pluginForPath(const char* path) {
  if (!path) return nullptr;
  auto url = URL::fileURL(path, true);
  if (!url) return nullptr;
  return pluginForURL(url.get());
}

Ref<PMModule> QuarrinModuleFactory::PMModuleForURL(const URL* url) {
  return cast<PMModule>(pluginType(pmTypeID(), url));
}

Ref<IOModule> QuarrinModuleFactory::IOMModuleForURL(const URL* url) {
  return cast<IOModule>(pluginType(iomTypeID(), url));
}

Ref<PBMModule> QuarrinModuleFactory::PBMModuleForURL(const URL* url) {
  return cast<PBMModule>(pluginType(pbmTypeID(), url));
}

}  // namespace qr
