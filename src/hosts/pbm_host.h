// Host of the printer browser modules: loads and registers one on first request.
#pragma once

#include "hosts/host.h"
#include "modules/pbm_module.h"

namespace qr {

class PBMHost final : public QuarrinHost {
 public:
  // The registered module for the bundle (looked up as given, then in normal
  // form), else loaded and registered under the given URL; null when the
  // bundle is no printer browser module.
  Ref<PBMModule> pbmInterfaceForURL(const URL* url);
};

}  // namespace qr
