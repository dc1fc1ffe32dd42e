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

// The store's path: CACHEWRIGHT_PREFS, else the build's default. The variable
// is ignored only in set-user-ID or set-group-ID runs (secure_getenv); a run
// as root takes it, since root's environment is root's own choice.
std::string prefsStorePath();

// A new string the caller owns, or null when the key holds no string.
Ref<String> copyStringPrintingPref(const String& key, int domain);
// A new dictionary, mutable down to its leaves, that the caller owns; null when
// the key holds no dictionary.
Ref<MutableDictionary> copyDictionaryPrintingPref(const String& key, int domain);
// The dictionary under the key as the store holds it: immutable and shared,
// so nothing is copied. Null when the key holds no dictionary.
Ref<Dictionary> storedDictionaryPrintingPref(const String& key, int domain);
// Stores a property-list value under the key. False, with one log line, when
// the store could not be written.
bool setPrintingPref(const String& key, const Object& value, int domain);

}  // namespace qr
