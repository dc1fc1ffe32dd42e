#include "modules/lookup_info.h"

namespace qr {

constexpr std::string_view kLookupReferenceKey = "PrBrowser Lookup Reference";

LookupInfoItem::LookupInfoItem(const URL* pm, const Dictionary* lookupInfo) {
  if (pm) setPMURL(pm->absoluteURL());
  setLookupInfo(lookupInfo);
}

LookupInfoItem::~LookupInfoItem() {
  retain();  // keeps the count off zero while the dictionary lets go of the item
  detach();
}

void LookupInfoItem::setLookupInfo(const Dictionary* info) {
  detach();
  lookupInfo_.reset();
  if (!info) return;
  lookupInfo_ = info->mutableCopy();
  lookupInfo_->set(kLookupReferenceKey, Ref<Object>(this));
  // The item's own dictionary refers back without counting: counted, the two
  // would keep each other alive for good. Copies handed out do count.
  release();
}

Ref<Dictionary> LookupInfoItem::copyLookupInfoDict() const {
  return lookupInfo_ ? lookupInfo_->copy() : nullptr;
}

Object* LookupInfoItem::getIcon() const {
  return lookupInfo_ ? lookupInfo_->get("Printer Browser Icons") : nullptr;
}

void LookupInfoItem::detach() {
  if (!lookupInfo_ || lookupInfo_->get(kLookupReferenceKey) != this) return;
  retain();  // what the dictionary gives back on removal was never counted
  lookupInfo_->remove(kLookupReferenceKey);
}

LookupInfoItem* LookupInfoList::getItemAtIndex(uint32_t index) const {
  return lookupList_ ? cast<LookupInfoItem>(lookupList_->at(index)) : nullptr;
}

}  // namespace qr
