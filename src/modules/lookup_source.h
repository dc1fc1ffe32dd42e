// Where a fully opened browser module finds the lookup list of its connection
// type. The printer module host is the one source; browser modules know it
// only through this, so they need nothing from the hosts above them.
#pragma once

#include "modules/lookup_info.h"
#include "values/string.h"

namespace qr {

class LookupListSource {
 public:
  // The list for the connection type, or null when there is none.
  virtual LookupInfoList* GetLookupInfoList(const String& connectionType) = 0;

 protected:
  ~LookupListSource() = default;
};

}  // namespace qr
