#include "modules/lookup_info.h"

namespace qr {

namespace {

// Every item's dictionary holds this key, so it is made once.
const String& lookupReferenceKey() {
  static String* const key = immortal(String::make("PrBrowser Lookup Reference").leak());
  return *key;
}

}  // namespace

LookupInfoItem::LookupInfoItem(const URL* pm, const Dictionary* lookupInfo) {
  if (pm) setPMURL(pm->absoluteURL());
  setLookupInfo(lookupInfo);
}

LookupInfoItem::LookupInfoItem(const URL* pm, Ref<MutableDictionary> lookupInfo) {
  if (pm) setPMURL(pm->absoluteURL());
  adopt(std::move(lookupInfo));
}

LookupInfoItem::~LookupInfoItem() {
  retain();  // keeps the count off zero while the dictionary lets go of the item
  detach();
}

void LookupInfoItem::setLookupInfo(const Dictionary* info) {
  detach();
  lookupInfo_.reset();
  if (info) adopt(info->mutableCopy());
}

void LookupInfoItem::adopt(Ref<MutableDictionary> info) {
  detach();
  lookupInfo_ = std::move(info);
  if (!lookupInfo_) return;
  lookupInfo_->set(Ref<Object>(const_cast<String*>(&lookupReferenceKey())), Ref<Object>(this));
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
  if (!lookupInfo_ || lookupInfo_->get(lookupReferenceKey()) != this) return;
  retain();  // what the dictionary gives back on removal was never counted
  lookupInfo_->remove(lookupReferenceKey());
}

LookupInfoItem* LookupInfoList::getItemAtIndex(uint32_t index) const {
  return lookupList_ ? cast<LookupInfoItem>(lookupList_->at(index)) : nullptr;
}

}  // namespace qr
