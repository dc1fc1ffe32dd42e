// Printer module: offers browser info per connection type, the dictionaries
// by which a printer browser recognises the printers the module drives.
// "Quellnet" answers are filed under "DNSSD", and a module with no network
// discovery answer lends its USB answer, marked "USBParasite".
#pragma once

#include "modules/module.h"
#include "values/array.h"
#include "values/data.h"
#include "values/dictionary.h"
#include "values/string.h"

namespace qr {

class PMModule final : public QuarrinModule {
 public:
  using QuarrinModule::QuarrinModule;

  UUID* typeID() const override;
  UUID* interfaceID() const override;

  // The browser info for the connection type, or null; the entries are
  // mutable and belong to the caller alone.
  Ref<MutableArray> createBrowserInfoForConnectionType(const String& connectionType);
  // Asks as the call above does, so that the cache ends up holding the answer,
  // without copying what it already holds. Whether the answer has an entry
  // that a lookup list would take (a dictionary).
  bool recordBrowserInfoForConnectionType(const String& connectionType);
  // Icon image data for one browser-info entry, or null.
  Ref<Data> iconDataForConnectionType(const String& connectionType, const Dictionary& browserInfo);

 private:
  // The plug-in's answer, asking the other network discovery type when one
  // gives nothing; null when it gives nothing or raises.
  Ref<Array> askPlugin(const String& connectionType);
  // The answer; copied, fresh mutable copies, otherwise possibly the cache's own.
  Ref<Array> browserInfo(const String& connectionType, bool copied);
  Ref<Array> askPluginOnce(const String& connectionType);
};

}  // namespace qr
