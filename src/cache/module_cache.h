// The module cache: for every plug-in module that was asked, its answers filed
// under the bundle URL's absolute string and stamped with the bundle's short
// version, so that a module whose version is unchanged is never loaded again.
//
// Layout of the cache dictionary:
//   "<module URL>" -> { "Bundle Version": "<short version>",
//                       "<connection type>": [ browser info ... ],     printer modules
//                       "kIOMConnectionType": "...", "kIOMBrowserPath": "..." }  I/O modules
#pragma once

#include "values/array.h"
#include "values/dictionary.h"
#include "values/object.h"
#include "values/string.h"
#include "values/url.h"

namespace qr {

class QuarrinModuleCache final : public Object {
 public:
  // The process-wide cache, created on first use and kept until exit.
  static QuarrinModuleCache& defaultCache();

  // An immutable copy of the top-level dictionary, loading it first if needed;
  // the entries are shared with the cache.
  Ref<Dictionary> cacheDictionary();
  // Installs dict unless the cache already holds equal contents; marks the cache changed.
  void setCacheDict(const Ref<MutableDictionary>& dict);

  // Printer module answers: browser info per connection type, stored and
  // handed out as fresh mutable copies without "Printer Browser Icons".
  void addInfo(const Array* info, const URL* forPrinterModule, const String* andConnection);
  Ref<MutableArray> getInfoForPrinterModule(const URL* module, const String* andConnection);
  // The same answer as the cache holds it, not copied: only to look at, as
  // the cache may replace it later. A stale entry goes, as above.
  Ref<Array> recordedInfoForPrinterModule(const URL* module, const String* andConnection);

  // I/O module answers: connection type and printer browser module path.
  void addInfoForIOModule(const URL* module, const String* toConnection, const String* andBrowser);
  // True and the entry's values (each possibly null) when a current entry exists.
  bool getInfoForIOModule(const URL* module, Ref<String>* connection, Ref<String>* browser);

  // Drops whatever is recorded for the module.
  void removeEntry(const URL* module);

  // Stores the dictionary under "pmcache 5" when it changed; true when it did.
  // False with the cache still dirty: the store could not be written (logged).
  bool writeCache();
  // Writes the dictionary to fd as an XML property list; true when every byte went out.
  bool writeToFd(int fd);
  // Reads one property list from fd to its end and installs it when it is a
  // dictionary. Returns the changed flag.
  bool readFromFd(int fd);

  bool dirty() const noexcept { return dirty_; }
  void setDirty(bool dirty) noexcept { dirty_ = dirty; }

  // Public for tests; the program uses defaultCache().
  QuarrinModuleCache() = default;

 private:
  MutableDictionary& cacheDict();
  static Ref<String> cacheKey(const URL* url);
  static Ref<String> bundleShortVersion(const URL* module);
  static Ref<MutableArray> browserInfo(const Array& info);
  // The entry of a module when it is current; a stale entry is dropped.
  Dictionary* currentEntry(const URL* module);
  MutableDictionary& entryFor(const URL& module);

  Ref<MutableDictionary> cacheDict_;
  bool dirty_ = false;
};

}  // namespace qr
