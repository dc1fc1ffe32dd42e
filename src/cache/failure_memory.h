// The modules whose plug-in crashed, exited or hung during a run, kept in the
// store under a key of their own so that later runs do not load them again
// while nothing about them changed: the same URL, the same short version and
// the same shared object (modification time to the nanosecond, and size).
//
//   "<module URL>" -> { "Bundle Version": "...", "Executable Modified": <ns>,
//                       "Executable Size": <bytes>, "Failure": "<what happened>" }
#pragma once

#include <optional>
#include <set>
#include <string>

#include "bundles/plugin_model.h"
#include "values/dictionary.h"
#include "values/url.h"

namespace qr {

class FailureMemory {
 public:
  // The process-wide record, read from the store on first use.
  static FailureMemory& shared();

  // Path mode asks every module again, so it does not consult the record.
  void setConsulted(bool consulted) noexcept { consulted_ = consulted; }
  // What happened to the plug-in last time, while it is unchanged since.
  std::optional<std::string> standingFailure(const PlugIn& plugin);
  void remember(const PlugIn& plugin, const std::string& what);
  // The module answered: it is no longer a failed one.
  void forget(const URL& module);
  // Drops the modules that are no longer installed.
  void keepOnly(const std::set<std::string>& installedURLs);
  // Writes the record to the store when it changed; false when that failed (logged).
  bool save();

  // Public for tests; the programs use shared().
  FailureMemory() = default;

 private:
  MutableDictionary& entries();
  static Ref<Dictionary> describe(const PlugIn& plugin);

  Ref<MutableDictionary> entries_;
  bool consulted_ = true;
  bool changed_ = false;
};

}  // namespace qr
