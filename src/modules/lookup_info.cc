#include "modules/lookup_info.h"

namespace qr {

constexpr std::string_view kLookupReferenceKey = "PrBrowser Lookup Reference";

LookupInfoItem::LookupInfoItem(const URL* pm, const Dictionary* lookupInfo) {
  if (pm) setPMURL(pm->absoluteURL());
  setLookupInfo(lookupInfo);
}

void LookupInfoItem::setLookupInfo(const Dictionary* info) {
  if (lookupInfo_) detach();
  lookupInfo_.reset();
  if (!info) return;
  lookupInfo_ = info->mutableCopy();
  lookupInfo_->set(kLookupReferenceKey, Ref<Object>(this));
}

Ref<Dictionary> LookupInfoItem::copyLookupInfoDict() const {
  return lookupInfo_ ? lookupInfo_->copy() : nullptr;
}

Object* LookupInfoItem::getIcon() const {
  return lookupInfo_ ? lookupInfo_->get("Printer Browser Icons") : nullptr;
}

void LookupInfoItem::detach() {
  if (lookupInfo_) lookupInfo_->remove(kLookupReferenceKey);
}

LookupInfoList::~LookupInfoList() {
  // Items and their dictionaries hold each other; copies handed out keep their
  // own references to the items, so only the list's share of the cycle goes.
  if (!lookupList_) return;
  for (const auto& item : *lookupList_)
    if (auto* lookup = cast<LookupInfoItem>(item.get())) lookup->detach();
}

LookupInfoItem* LookupInfoList::getItemAtIndex(uint32_t index) const {
  return lookupList_ ? cast<LookupInfoItem>(lookupList_->at(index)) : nullptr;
}

}  // namespace qr
