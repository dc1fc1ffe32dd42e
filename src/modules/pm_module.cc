#include "modules/pm_module.h"

#include "cache/module_cache.h"
#include "images/image.h"
#include "modules/lookup_reference.h"
#include "modules/module_factory.h"
#include "platform/file_io.h"
#include "platform/log.h"
#include "values/deep_copy.h"

namespace qr {
namespace {

constexpr std::string_view kDNSSD = "DNSSD";
constexpr std::string_view kQuellnet = "Quellnet";

bool isEmpty(const Array* a) { return !a || a->isEmpty(); }
bool isNetworkDiscovery(const String& type) {
  return type.equals(kDNSSD) || type.equals(kQuellnet);
}

Dictionary* referencedInfo(const Dictionary& d, std::string_view key) {
  auto* reference = dynamic_cast<LookupReference*>(d.get(key));
  return reference ? reference->referencedLookupInfo() : nullptr;
}

// Both lack the key, or both hold equal values under it.
bool sameValue(const Dictionary& a, const Dictionary& b, std::string_view key) {
  return equal(a.get(key), b.get(key));
}

Ref<Data> iconFromFile(const Dictionary& entry) {
  auto* name = entry.getAs<String>("Printer Browser Icons Filename");
  auto* urlText = entry.getAs<String>("PM URL String");
  if (!name || !urlText) return nullptr;
  auto url = URL::withString(urlText->utf8());
  if (!url) return nullptr;
  auto bundlePath = url->fileSystemPath();
  if (!bundlePath) return nullptr;
  std::string path = *bundlePath + "/Contents/Resources/PrinterIcons/" + name->utf8();
  if (!isReadableFile(path)) return nullptr;
  return tiffRepresentationOfImageFile(path);
}

}  // namespace

UUID* PMModule::typeID() const { return QuarrinModuleFactory::pmTypeID(); }
UUID* PMModule::interfaceID() const { return QuarrinModuleFactory::pmIntfID(); }

Ref<Array> PMModule::askPluginOnce(const String& connectionType) {
  Ref<Array> answer;
  auto raised =
      callPlugin([&] { answer = runner().createBrowserInfo(interfaceHandle(), connectionType); });
  if (raised) {
    log("[%@] on call to 'CreateBrowserInfo' for '%@'", *raised, pluginURL());
    return nullptr;
  }
  return answer;
}

Ref<Array> PMModule::askPlugin(const String& connectionType) {
  Ref<Array> answer = askPluginOnce(connectionType);
  if (lost()) return nullptr;
  // Either network discovery type stands for the other, so the answer
  // recorded under "DNSSD" does not depend on which type is asked first.
  if (isEmpty(answer.get()) && connectionType.equals(kDNSSD))
    answer = askPluginOnce(*String::make(kQuellnet));
  else if (isEmpty(answer.get()) && connectionType.equals(kQuellnet))
    answer = askPluginOnce(*String::make(kDNSSD));
  return answer;
}

Ref<MutableArray> PMModule::createBrowserInfoForConnectionType(const String& connectionType) {
  return cast<MutableArray>(browserInfo(connectionType, true));
}

bool PMModule::recordBrowserInfoForConnectionType(const String& connectionType) {
  Ref<Array> answer = browserInfo(connectionType, false);
  if (!answer) return false;
  for (const auto& entry : *answer)
    if (cast<Dictionary>(entry.get())) return true;
  return false;
}

Ref<Array> PMModule::browserInfo(const String& connectionType, bool copied) {
  auto& cache = QuarrinModuleCache::defaultCache();
  const URL* url = pluginURL().get();
  auto recorded = [&](const String& type) -> Ref<Array> {
    if (copied) return cache.getInfoForPrinterModule(url, &type);
    return cache.recordedInfoForPrinterModule(url, &type);
  };
  Ref<Array> result;
  bool answered = false;
  if (lost()) return nullptr;
  if (!interfaceLoaded()) {
    result = recorded(connectionType);
    if (isEmpty(result.get()) && connectionType.equals(kQuellnet))
      result = recorded(*String::make(kDNSSD));
    // Even an empty array is a recorded answer.
    answered = result != nullptr;
  }
  const FollowUp ask{"CreateBrowserInfo", &connectionType};
  if (!answered && loadPluginInterface(&ask)) {
    Ref<Array> answer = askPlugin(connectionType);
    if (lost()) return nullptr;
    if (answer)
      result = cast<MutableArray>(deepCopy(*answer, Mutability::MutableContainersAndLeaves));
    Ref<String> key(const_cast<String*>(&connectionType));
    if (connectionType.equals(kQuellnet)) key = String::make(kDNSSD);
    cache.addInfo(result.get(), url, key.get());
  }
  if (!isEmpty(result.get()) || !isNetworkDiscovery(connectionType)) return result;

  // No network discovery answer of its own: lend the USB one, marked as borrowed.
  result = browserInfo(*String::make("USB"), copied);
  if (isEmpty(result.get())) result = browserInfo(*String::make("EPSON USB"), copied);
  if (copied && !isEmpty(result.get())) {
    for (const auto& element : *result)
      if (auto* entry = cast<MutableDictionary>(element.get()))
        entry->set("USBParasite", String::make("True"));
  }
  return result;
}

Ref<Data> PMModule::iconDataForConnectionType(const String& connectionType,
                                              const Dictionary& browserInfo) {
  if (Object* icon = browserInfo.get("Printer Browser Icons")) return cast<Data>(Ref<Object>(icon));
  if (!loadPluginInterface()) return nullptr;

  Ref<Array> answer = askPlugin(connectionType);
  if (isEmpty(answer.get()) && isNetworkDiscovery(connectionType)) {
    answer = askPluginOnce(*String::make("USB"));
    if (isEmpty(answer.get())) answer = askPluginOnce(*String::make("EPSON USB"));
  }
  if (!answer) return nullptr;

  const Dictionary* reference = referencedInfo(browserInfo, "PrBrowser Lookup Reference");
  if (!reference) reference = referencedInfo(browserInfo, "PrBrowser Selection Reference");
  if (!reference) reference = &browserInfo;

  for (const auto& element : *answer) {
    auto* entry = cast<Dictionary>(element.get());
    if (!entry) continue;
    if (!sameValue(*reference, *entry, "Printer Browser Kind") ||
        !sameValue(*reference, *entry, "Printer Browser Info") ||
        !sameValue(*reference, *entry, "Printer Browser DeviceID"))
      continue;
    // The first match decides, even when it carries no icon.
    if (Object* icon = entry->get("Printer Browser Icons")) return cast<Data>(Ref<Object>(icon));
    return iconFromFile(*entry);
  }
  return nullptr;
}

}  // namespace qr
