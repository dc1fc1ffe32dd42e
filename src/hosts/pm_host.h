// Host of the printer modules: gathers, per connection type, every printer
// module's browser info into a lookup list.
#pragma once

#include <vector>

#include "hosts/host.h"
#include "modules/lookup_source.h"
#include "modules/pm_module.h"

namespace qr {

class PMHost final : public QuarrinHost, public LookupListSource {
 public:
  PMHost() : _lookupLists(make<MutableArray>()) {}

  MutableArray* lookupLists() const noexcept { return _lookupLists.get(); }
  void setLookupLists(Ref<MutableArray> lists) { _lookupLists = std::move(lists); }
  // The list for the connection type, never null. A list that already holds
  // items is returned as it is; an empty one asks every module again.
  LookupInfoList* GetLookupInfoList(const String& connectionType) override;
  // Has every module asked as GetLookupInfoList does, for a caller that wants
  // only the answers in the cache: no list is built. As there, a type whose
  // list or earlier recording holds an entry is not asked again.
  void recordLookupInfo(const String& connectionType);
  // The module registered under exactly that URL (a registry key), or null.
  PMModule* pmInterfaceForURL(const URL* url) const;

 private:
  LookupInfoList* listFor(const String& connectionType) const;

  Ref<MutableArray> _lookupLists;
  std::vector<Ref<String>> _recordedTypes;
};

}  // namespace qr
