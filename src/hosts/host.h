// The registry that every module host is built on: modules filed by the URL
// of their bundle, in normal form (made afresh from the absolute string), so
// one location is one entry however the caller spelled its URL.
#pragma once

#include "values/dictionary.h"
#include "values/object.h"
#include "values/url.h"

namespace qr {

class QuarrinHost : public Object {
 public:
  QuarrinHost() : _loadedPlugins(make<MutableDictionary>()) {}

  // The registry itself, not a copy: URL -> module.
  MutableDictionary* loadedPlugins() const noexcept { return _loadedPlugins.get(); }
  void setLoadedPlugins(Ref<MutableDictionary> plugins) { _loadedPlugins = std::move(plugins); }
  // Files the module under the normal form of the URL, replacing any module
  // filed there; a null URL is ignored.
  void addPlugin(Ref<Object> module, const URL* forURL);

 private:
  Ref<MutableDictionary> _loadedPlugins;
};

}  // namespace qr
