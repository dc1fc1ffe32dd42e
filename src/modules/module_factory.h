// The one place where a plug-in bundle on disk becomes a module object: it
// opens the bundle, tells its kind by the factories it declares per plug-in
// type, and makes the module of that kind. It also owns the seven plug-in
// UUIDs and the process-wide count of modules whose interface failed to load.
#pragma once

#include <cstdint>

#include "values/object.h"
#include "values/url.h"
#include "values/uuid.h"

namespace qr {

class QuarrinModule;
class PMModule;
class IOModule;
class PBMModule;

class QuarrinModuleFactory {
 public:
  QuarrinModuleFactory() = delete;

  // A module of whichever kind the bundle provides (I/O, else printer, else
  // printer browser), or null.
  static Ref<QuarrinModule> pluginForURL(const URL* url);
  // A module of the given kind only, or null; type is one of the three type UUIDs.
  static Ref<QuarrinModule> pluginType(const UUID* type, const URL* forURL);
  static Ref<QuarrinModule> pluginForPath(const char* path);
  static Ref<PMModule> PMModuleForURL(const URL* url);
  static Ref<IOModule> IOMModuleForURL(const URL* url);
  static Ref<PBMModule> PBMModuleForURL(const URL* url);

  // Each is made on first use and is the same object for the rest of the process.
  static UUID* pmTypeID();
  static UUID* pmIntfID();
  static UUID* iomTypeID();
  static UUID* iomIntfID();
  static UUID* pbmTypeID();
  static UUID* pbmVersID();
  static UUID* pbmIntfID();

  static int32_t loadFailures();
  static void resetLoadFailures();
  static void countLoadFailure();
};

}  // namespace qr
