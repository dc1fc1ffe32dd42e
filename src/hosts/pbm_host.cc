#include "hosts/pbm_host.h"

#include "modules/module_factory.h"

namespace qr {

Ref<PBMModule> PBMHost::pbmInterfaceForURL(const URL* url) {
  if (!url) return nullptr;
  Object* found = loadedPlugins()->get(*url);
  if (!found) found = loadedPlugins()->get(*url->absoluteURL());
  if (found) return cast<PBMModule>(Ref<Object>(found));
  Ref<PBMModule> module = QuarrinModuleFactory::PBMModuleForURL(url);
  if (module) addPlugin(module, url);
  return module;
}

}  // namespace qr
