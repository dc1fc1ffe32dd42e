// The plug-in component model: a plug-in bundle declares factories by UUID
// (CFPlugInFactories: factory UUID -> exported function) and, per plug-in
// type UUID, the factories that make instances of that type (CFPlugInTypes).
// The shared object is opened on the first instance and never closed.
#pragma once

#include <functional>
#include <mutex>
#include <string>

#include "bundles/bundle.h"
#include "values/array.h"
#include "values/object.h"
#include "values/url.h"
#include "values/uuid.h"

namespace qr {

class PlugIn final : public Object {
 public:
  // Null when the URL leads to no directory or one without a readable Info dictionary.
  static Ref<PlugIn> create(const URL& bundleURL);
  // The same over a bundle already opened or described.
  static Ref<PlugIn> create(const URL& bundleURL, Ref<Bundle> bundle);

  const Ref<URL>& url() const noexcept { return url_; }
  Bundle& bundle() const noexcept { return *bundle_; }
  // The UUIDs of the factories declared for the type, in the plug-in's
  // order; null when the plug-in declares nothing for the type.
  Ref<Array> factoriesForType(const UUID& typeID) const;
  // Calls the factory's function with the type and returns the instance (a
  // pointer whose first word points to the IUnknown-shaped table), or null
  // with one log line when the shared object or the function is missing, or
  // the factory returns NULL. The platform exception raised by the factory
  // passes through to the caller. beforeFactory runs once the function is
  // found, just before it is called.
  void* createInstance(const UUID& factoryID, const UUID& typeID,
                       const std::function<void()>& beforeFactory = {});

 private:
  PlugIn(Ref<URL> url, Ref<Bundle> bundle);
  void* loadImage();  // dlopen on first use; null after a failure (logged once)

  Ref<URL> url_;
  Ref<Bundle> bundle_;
  std::once_flag loadOnce_;
  void* image_ = nullptr;
};

}  // namespace qr
