// Host of the I/O modules: builds the connection records, one per I/O module
// that names both a connection type and a printer browser module.
#pragma once

#include "hosts/connection_info.h"
#include "hosts/host.h"
#include "modules/io_module.h"
#include "values/array.h"

namespace qr {

class IOMHost final : public QuarrinHost {
 public:
  // Built on the first call and the same list afterwards.
  MutableArray* connectionInfoList();
  void setConnectionInfoList(Ref<MutableArray> list) { _connectionInfoList = std::move(list); }
  // The module registered under exactly that URL (a registry key), or null.
  IOModule* iomInterfaceForURL(const URL* url) const;
  // A module serving the connection type: the first record's, else one whose
  // current cache entry names the type (it may have no browser module).
  Ref<URL> iomURLForConnectionType(const String& connectionType);

 private:
  Ref<MutableArray> _connectionInfoList;
};

}  // namespace qr
