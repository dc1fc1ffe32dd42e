// What a browser-info dictionary's back-reference points at: an object that
// holds the full lookup dictionary. The printer module host's lookup items
// are such objects; the icon lookup follows the reference to them.
#pragma once

#include "values/dictionary.h"
#include "values/object.h"

namespace qr {

class LookupReference : public Object {
 public:
  virtual Dictionary* referencedLookupInfo() const = 0;
};

}  // namespace qr
