#include "hosts/pm_host.h"

#include "values/deep_copy.h"

namespace qr {
namespace {

const Ref<Object>& connectionTypeKey() {
  static const Ref<Object> key(immortal(String::make("connectionType").leak()));
  return key;
}

}  // namespace

PMModule* PMHost::pmInterfaceForURL(const URL* url) const {
  if (!url) return nullptr;
  return cast<PMModule>(loadedPlugins()->get(*url));
}

LookupInfoList* PMHost::listFor(const String& connectionType) const {
  for (const auto& item : *_lookupLists) {
    auto* candidate = cast<LookupInfoList>(item.get());
    if (candidate && candidate->connectionType() &&
        candidate->connectionType()->isEqual(connectionType))
      return candidate;
  }
  return nullptr;
}

LookupInfoList* PMHost::GetLookupInfoList(const String& connectionType) {
  LookupInfoList* list = listFor(connectionType);
  if (!list) {
    auto created = make<LookupInfoList>(connectionType.copy());
    list = created.get();
    _lookupLists->append(created);
  }
  if (list->maxIndex() != 0) return list;

  Ref<String> type = connectionType.copy();
  for (const auto& key : loadedPlugins()->keys()) {
    auto* url = cast<URL>(key.get());
    PMModule* module = pmInterfaceForURL(url);
    if (!module) continue;
    Ref<MutableArray> answer = module->createBrowserInfoForConnectionType(connectionType);
    if (!answer) continue;
    // An answer made afresh for this call (the cache's are) is already the
    // copy the list needs, and is taken as it is.
    bool soleAnswer = answer->retainCount() == 1;
    for (const auto& entry : *answer) {
      Ref<MutableDictionary> copy;
      if (soleAnswer && isSoleMutableTree(*entry))
        copy = cast<MutableDictionary>(entry.get());
      else
        copy = cast<MutableDictionary>(deepCopy(*entry, Mutability::MutableContainersAndLeaves));
      if (!copy) continue;  // not a property-list dictionary
      copy->set(connectionTypeKey(), type);
      list->addItem(make<LookupInfoItem>(url, std::move(copy)));
    }
  }
  return list;
}

void PMHost::recordLookupInfo(const String& connectionType) {
  if (LookupInfoList* list = listFor(connectionType); list && list->maxIndex() != 0) return;
  for (const auto& type : _recordedTypes)
    if (type->isEqual(connectionType)) return;
  bool filled = false;
  for (const auto& key : loadedPlugins()->keys())
    if (PMModule* module = pmInterfaceForURL(cast<URL>(key.get())))
      filled = module->recordBrowserInfoForConnectionType(connectionType) || filled;
  // As with a list: one that would stay empty asks every module again next time.
  if (filled) _recordedTypes.push_back(connectionType.copy());
}

}  // namespace qr
