#include "cache/module_cache.h"

#include <initializer_list>

#include "bundles/bundle.h"
#include "platform/file_io.h"
#include "platform/locations.h"
#include "platform/log.h"
#include "plist/property_list.h"
#include "store/prefs_store.h"
#include "values/deep_copy.h"

namespace qr {
namespace {

constexpr std::string_view kCachePrefKey = "pmcache 5";
constexpr int kCachePrefDomain = 8;
constexpr std::string_view kBundleVersionKey = "Bundle Version";
constexpr std::string_view kConnectionTypeKey = "kIOMConnectionType";
constexpr std::string_view kBrowserPathKey = "kIOMBrowserPath";
constexpr std::string_view kIconsKey = "Printer Browser Icons";

Ref<Object> loadDefaultCacheResource() {
  auto framework = Bundle::open(frameworkBundlePath());
  if (!framework) return nullptr;
  auto path = framework->resourcePath("com.varnex.pmcache", "xml");
  if (!path) return nullptr;
  auto value = readPropertyListFile(*path);
  if (!value || value->kind() != TypeKind::Dictionary) return nullptr;
  return value;
}

// A value the store cannot carry would make the whole store unwritable, so
// the answer holding it is left out instead.
bool storable(std::initializer_list<const Object*> values) {
  for (const Object* value : values)
    if (value && !canWriteXMLPropertyList(*value)) return false;
  return true;
}

void logUnstorable(const URL* module, const String* connection) {
  log("Not caching the answer of %@ for %@: it holds a value the store cannot carry", module,
      connection);
}

String* stringValue(Object* value) {
  return value && value->kind() == TypeKind::String ? static_cast<String*>(value) : nullptr;
}

}  // namespace

QuarrinModuleCache& QuarrinModuleCache::defaultCache() {
  static QuarrinModuleCache* const cache = new QuarrinModuleCache();
  return *cache;
}

MutableDictionary& QuarrinModuleCache::cacheDict() {
  if (cacheDict_) return *cacheDict_;
  // Only the top level is copied from the store's shared, immutable value:
  // an entry becomes a mutable copy of its own when it is changed (entryFor),
  // so a run that changes little copies little.
  Ref<MutableDictionary> loaded;
  if (Ref<Dictionary> stored =
          storedDictionaryPrintingPref(*String::make(kCachePrefKey), kCachePrefDomain))
    loaded = stored->mutableCopy();
  if (!loaded) {
    if (Ref<Object> source = loadDefaultCacheResource())
      loaded = cast<MutableDictionary>(deepCopy(*source, Mutability::MutableContainersAndLeaves));
  }
  if (!loaded) {
    log("Could not load internal printer module cache.");
    loaded = make<MutableDictionary>();
  }
  setCacheDict(loaded);
  return *cacheDict_;
}

Ref<Dictionary> QuarrinModuleCache::cacheDictionary() { return cacheDict().copy(); }

void QuarrinModuleCache::setCacheDict(const Ref<MutableDictionary>& dict) {
  if (cacheDict_ == dict) return;
  if (cacheDict_ && dict && cacheDict_->isEqual(*dict)) return;
  dirty_ = true;
  cacheDict_ = dict;
}

Ref<String> QuarrinModuleCache::cacheKey(const URL* url) {
  if (!url) return nullptr;
  return String::make(url->absoluteString());
}

Ref<String> QuarrinModuleCache::bundleShortVersion(const URL* module) {
  Ref<String> version;
  if (module) {
    if (auto path = module->fileSystemPath())
      if (auto bundle = Bundle::open(*path)) version = bundle->shortVersionString();
  }
  if (!version) log("Module is missing short version: %@", module);
  return version;
}

Ref<MutableArray> QuarrinModuleCache::browserInfo(const Array& info) {
  auto copy = cast<MutableArray>(deepCopy(info, Mutability::MutableContainersAndLeaves));
  if (!copy) return nullptr;
  for (const auto& element : *copy)
    if (auto* entry = cast<MutableDictionary>(element.get())) entry->remove(kIconsKey);
  return copy;
}

Dictionary* QuarrinModuleCache::currentEntry(const URL* module) {
  auto key = cacheKey(module);
  if (!key) return nullptr;
  MutableDictionary& top = cacheDict();
  Object* entry = top.get(*key);
  if (!entry) return nullptr;
  auto version = bundleShortVersion(module);
  auto* dict = cast<Dictionary>(entry);
  String* stored = dict ? stringValue(dict->get(kBundleVersionKey)) : nullptr;
  if (version && stored && stored->isEqual(*version)) return dict;
  // A stale entry goes whole: every connection type of the module is asked again.
  top.remove(*key);
  dirty_ = true;
  return nullptr;
}

MutableDictionary& QuarrinModuleCache::entryFor(const URL& module) {
  auto key = cacheKey(&module);
  MutableDictionary& top = cacheDict();
  Object* existing = top.get(*key);
  if (auto* dict = cast<MutableDictionary>(existing)) return *dict;
  // A hand-edited entry that is not a mutable dictionary is taken over as one.
  Ref<MutableDictionary> entry;
  if (auto* frozen = cast<Dictionary>(existing))
    entry = cast<MutableDictionary>(deepCopy(*frozen, Mutability::MutableContainersAndLeaves));
  if (!entry) entry = make<MutableDictionary>();
  top.set(key, entry);
  return *entry;
}

void QuarrinModuleCache::addInfo(const Array* info, const URL* forPrinterModule,
                                 const String* andConnection) {
  if (!forPrinterModule) return;
  Ref<MutableArray> value = info ? browserInfo(*info) : nullptr;
  if (!value) value = make<MutableArray>();
  Ref<String> version = andConnection ? bundleShortVersion(forPrinterModule) : nullptr;
  if (!storable({cacheKey(forPrinterModule).get(), andConnection, value.get(), version.get()})) {
    logUnstorable(forPrinterModule, andConnection);
    return;
  }
  MutableDictionary& entry = entryFor(*forPrinterModule);
  if (andConnection) {
    entry.set(Ref<Object>(andConnection->copy()), value);
    if (version)
      entry.set(kBundleVersionKey, version);
    else
      entry.remove(kBundleVersionKey);  // never current without a version
  }
  dirty_ = true;
}

Ref<Array> QuarrinModuleCache::recordedInfoForPrinterModule(const URL* module,
                                                            const String* andConnection) {
  Dictionary* entry = currentEntry(module);
  if (!entry || !andConnection) return nullptr;
  return Ref<Array>(cast<Array>(entry->get(*andConnection)));
}

Ref<MutableArray> QuarrinModuleCache::getInfoForPrinterModule(const URL* module,
                                                              const String* andConnection) {
  Ref<Array> info = recordedInfoForPrinterModule(module, andConnection);
  return info ? browserInfo(*info) : nullptr;
}

void QuarrinModuleCache::addInfoForIOModule(const URL* module, const String* toConnection,
                                            const String* andBrowser) {
  if (!module) return;
  Ref<String> version = bundleShortVersion(module);
  if (!storable({cacheKey(module).get(), toConnection, andBrowser, version.get()})) {
    logUnstorable(module, toConnection);
    return;
  }
  MutableDictionary& entry = entryFor(*module);
  if (version)
    entry.set(kBundleVersionKey, version);
  else
    entry.remove(kBundleVersionKey);
  if (toConnection) entry.set(kConnectionTypeKey, toConnection->copy());
  if (andBrowser) entry.set(kBrowserPathKey, andBrowser->copy());
  dirty_ = true;
}

bool QuarrinModuleCache::getInfoForIOModule(const URL* module, Ref<String>* connection,
                                            Ref<String>* browser) {
  Dictionary* entry = currentEntry(module);
  if (!entry) return false;
  if (connection) *connection = stringValue(entry->get(kConnectionTypeKey));
  if (browser) *browser = stringValue(entry->get(kBrowserPathKey));
  return true;
}

void QuarrinModuleCache::removeEntry(const URL* module) {
  auto key = cacheKey(module);
  if (key && cacheDict().remove(*key)) dirty_ = true;
}

bool QuarrinModuleCache::writeCache() {
  if (!dirty_) return false;
  if (!setPrintingPref(*String::make(kCachePrefKey), cacheDict(), kCachePrefDomain)) return false;
  dirty_ = false;
  return true;
}

bool QuarrinModuleCache::writeToFd(int fd) {
  return writeXMLPropertyList(cacheDict(),
                              [fd](std::string_view piece) { return writeAll(fd, piece); });
}

bool QuarrinModuleCache::readFromFd(int fd) {
  InputBuffer input;
  input.readAll(fd);  // a read error ends the input; what came before still counts
  if (input.view().empty()) return dirty_;
  auto value = readPropertyList(input.view(), Mutability::Immutable);
  if (!value) return dirty_;
  auto* dict = cast<Dictionary>(value.get());
  if (!dict) {
    log("Ignoring a cache on standard input that is not a dictionary.");
    return dirty_;
  }
  // As with the store: entries become mutable copies only when changed.
  setCacheDict(dict->mutableCopy());
  return dirty_;
}

}  // namespace qr
