// The printing-preferences store: one XML property-list file holding a
// dictionary. Writers lock a side file, re-read, set their key and replace the
// file atomically, so concurrent writers lose nothing and a crash leaves the
// old or the new store. The small integer of each call is accepted and ignored.
#pragma once

#include <string>

#include "values/dictionary.h"
#include "values/object.h"
#include "values/string.h"

namespace qr {

// The store's path: CACHEWRIGHT_PREFS (ignored in a privileged context), else
// the build's default.
std::string prefsStorePath();

// A new string the caller owns, or null when the key holds no string.
Ref<String> copyStringPrintingPref(const String& key, int domain);
// A new dictionary, mutable down to its leaves, that the caller owns; null when
// the key holds no dictionary.
Ref<MutableDictionary> copyDictionaryPrintingPref(const String& key, int domain);
// Stores a property-list value under the key; failures are logged.
void setPrintingPref(const String& key, const Object& value, int domain);

}  // namespace qr
