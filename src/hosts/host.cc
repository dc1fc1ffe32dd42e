#include "hosts/host.h"

namespace qr {

void QuarrinHost::addPlugin(Ref<Object> module, const URL* forURL) {
  if (!forURL || !module || !_loadedPlugins) return;
  _loadedPlugins->set(forURL->absoluteURL(), std::move(module));
}

}  // namespace qr
