// Lookup lists: the browser info of every printer module for one connection
// type, one item per entry. Each item's dictionary carries the connection
// type and a counted back-reference to the item ("PrBrowser Lookup
// Reference"), so any copy of it handed to a browser can reach the item.
#pragma once

#include <cstdint>

#include "modules/lookup_reference.h"
#include "values/array.h"
#include "values/dictionary.h"
#include "values/string.h"
#include "values/url.h"

namespace qr {

class LookupInfoItem final : public LookupReference {
 public:
  LookupInfoItem(const URL* pm, const Dictionary* lookupInfo);  // initWithPM:lookupInfo:
  // Takes lookupInfo itself as the item's own dictionary; the caller gives it
  // up and must hold no other reference to it.
  LookupInfoItem(const URL* pm, Ref<MutableDictionary> lookupInfo);
  ~LookupInfoItem() override;

  const Ref<URL>& pmURL() const noexcept { return pmURL_; }
  void setPMURL(Ref<URL> url) { pmURL_ = std::move(url); }
  // The item's own mutable dictionary, not a copy. Its back-reference to the
  // item is not counted: leave that key as it is.
  MutableDictionary* lookupInfo() const noexcept { return lookupInfo_.get(); }
  // Stores a shallow mutable copy of info with the back-reference set to this item.
  void setLookupInfo(const Dictionary* info);
  // A new immutable shallow copy, back-reference included.
  Ref<Dictionary> copyLookupInfoDict() const;
  // "Printer Browser Icons" of the entry, or null.
  Object* getIcon() const;
  Dictionary* referencedLookupInfo() const override { return lookupInfo_.get(); }

 private:
  // Makes info the item's own dictionary, with the uncounted back-reference.
  void adopt(Ref<MutableDictionary> info);
  // Takes the uncounted back-reference out of the item's own dictionary.
  void detach();

  Ref<URL> pmURL_;
  Ref<MutableDictionary> lookupInfo_;
};

class LookupInfoList final : public Object {
 public:
  explicit LookupInfoList(Ref<String> connectionType)  // initWithConnectionType:
      : connectionType_(std::move(connectionType)), lookupList_(make<MutableArray>()) {}

  const Ref<String>& connectionType() const noexcept { return connectionType_; }
  void setConnectionType(Ref<String> type) { connectionType_ = std::move(type); }
  MutableArray* lookupList() const noexcept { return lookupList_.get(); }
  void setLookupList(Ref<MutableArray> list) { lookupList_ = std::move(list); }

  void addItem(Ref<LookupInfoItem> item) { lookupList_->append(std::move(item)); }
  // The item at index, which must be below maxIndex().
  LookupInfoItem* getItemAtIndex(uint32_t index) const;
  // The number of items (not the highest index).
  uint32_t maxIndex() const noexcept {
    return lookupList_ ? static_cast<uint32_t>(lookupList_->count()) : 0;
  }

 private:
  Ref<String> connectionType_;
  Ref<MutableArray> lookupList_;
};

}  // namespace qr
