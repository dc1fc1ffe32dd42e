// The Info dictionaries of the installed bundles, kept in the store between
// runs under a key of their own with the stamp of the file each was read
// from, so that a later run takes an unchanged bundle's Info dictionary from
// there after one stat() instead of reading and parsing the file:
//
//   "<bundle path>" -> { "Device", "Inode", "Size", "Mode": <integers>,
//                        "Modified", "Changed": <ns since the epoch>,
//                        "Info": { the Info dictionary } }
//
// Any change to the file moves its status-change time, which no one can set
// back, so a rewrite in the same second at the same size is seen too. A file
// modified moments before it was read proves nothing and is not kept.
#pragma once

#include <string>

#include "values/dictionary.h"
#include "values/url.h"

namespace qr {

class BundleStamps {
 public:
  // The process-wide record.
  static BundleStamps& shared();

  // Reads the record from the store and hands it to the bundles.
  void consult();
  // Records the bundle at the module's URL as this process has it.
  void keep(const URL& module);
  // Writes what keep() recorded when it differs from the stored record: the
  // bundles not kept this time are dropped. False when that failed (logged).
  bool save();

  // Public for tests; the programs use shared().
  BundleStamps() = default;

 private:
  Ref<Dictionary> stored_;
  Ref<MutableDictionary> kept_ = make<MutableDictionary>();
};

}  // namespace qr
