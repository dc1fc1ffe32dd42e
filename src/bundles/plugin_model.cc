// The plug-in component model over bundles and the dynamic loader.
#include "bundles/plugin_model.h"

#include <dlfcn.h>
#include <quarrin/plugin.h>
#include <unistd.h>

#include <optional>
#include <string>
#include <vector>

#include "bundles/c_bridge.h"
#include "platform/file_trust.h"
#include "platform/log.h"
#include "values/dictionary.h"
#include "values/string.h"

namespace qr {
namespace {

// The value filed under the text form of uuid in a dictionary keyed by UUID
// strings. Keys are compared as UUIDs, so letter case does not matter; the
// first matching key in the dictionary's order wins.
Object* valueForUUIDKey(const Object* dictionary, const UUID& uuid) {
  auto* d = dynamic_cast<const Dictionary*>(dictionary);
  if (!d) return nullptr;
  Object* found = nullptr;
  d->forEach([&](const Object& key, const Object& value) {
    if (found || key.kind() != TypeKind::String) return;
    Ref<UUID> parsed = UUID::fromString(static_cast<const String&>(key).utf8());
    if (parsed && parsed->isEqual(uuid)) found = const_cast<Object*>(&value);
  });
  return found;
}

}  // namespace

PlugIn::PlugIn(Ref<URL> url, Ref<Bundle> bundle)
    : url_(std::move(url)), bundle_(std::move(bundle)) {}

Ref<PlugIn> PlugIn::create(const URL& bundleURL) {
  return create(bundleURL, Bundle::open(bundleURL));
}

Ref<PlugIn> PlugIn::create(const URL& bundleURL, Ref<Bundle> bundle) {
  if (!bundle || !bundle->infoDictionary()) return nullptr;
  return Ref<PlugIn>::adopt(new PlugIn(Ref<URL>(const_cast<URL*>(&bundleURL)), std::move(bundle)));
}

Ref<Array> PlugIn::factoriesForType(const UUID& typeID) const {
  Object* declared = valueForUUIDKey(bundle_->infoValue("CFPlugInTypes"), typeID);
  if (!declared) return nullptr;
  std::vector<Ref<Object>> factories;
  if (auto* list = dynamic_cast<const Array*>(declared)) {
    for (const Ref<Object>& item : *list) {
      if (!item || item->kind() != TypeKind::String) continue;
      if (Ref<UUID> factory = UUID::fromString(static_cast<const String&>(*item).utf8()))
        factories.emplace_back(std::move(factory));
    }
  }
  return Array::build(std::move(factories));
}

void* PlugIn::loadImage() {
  std::call_once(loadOnce_, [this] {
    std::optional<std::string> path = bundle_->executablePath();
    if (!path) {
      log("Plug-in %@ names no executable in its Info dictionary", url_);
      return;
    }
    // Root runs only code that only root could have put there.
    if (::geteuid() == 0) {
      auto top = url_->fileSystemPath();
      if (auto problem = rootTrustProblem(top ? *top : *path, *path)) {
        log("Refusing to load '%s': %s", problem->path, problem->reason);
        return;
      }
    }
    // Never closed: the process may hold interfaces into the image until it ends.
    image_ = dlopen(path->c_str(), RTLD_NOW | RTLD_LOCAL);
    if (!image_) {
      const char* error = dlerror();
      log("Plug-in %@ cannot be loaded: %s", url_, error ? error : path->c_str());
    }
  });
  return image_;
}

void* PlugIn::createInstance(const UUID& factoryID, const UUID& typeID,
                             const std::function<void()>& beforeFactory) {
  auto* function =
      dynamic_cast<String*>(valueForUUIDKey(bundle_->infoValue("CFPlugInFactories"), factoryID));
  if (!function) {
    log("Plug-in %@ declares no factory function for %@", url_, &factoryID);
    return nullptr;
  }
  Ref<Array> makers = factoriesForType(typeID);
  bool makesType = false;
  if (makers)
    for (const Ref<Object>& maker : *makers) makesType = makesType || maker->isEqual(factoryID);
  if (!makesType) {
    log("Plug-in %@: factory %@ is not declared for type %@", url_, &factoryID, &typeID);
    return nullptr;
  }
  void* image = loadImage();
  if (!image) return nullptr;  // logged once, when loading failed
  std::string name = function->utf8();
  void* symbol = dlsym(image, name.c_str());
  if (!symbol) {
    log("Plug-in %@ has no function '%s' for factory %@", url_, name, &factoryID);
    return nullptr;
  }
  auto factory = reinterpret_cast<QrPlugInFactoryFunction>(symbol);
  if (beforeFactory) beforeFactory();
  void* instance = factory(nullptr, toC<QrUUIDRef>(&typeID));
  if (!instance) log("Plug-in %@: factory '%s' made no instance of type %@", url_, name, &typeID);
  return instance;
}

}  // namespace qr
