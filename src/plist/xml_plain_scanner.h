// A reader of its own for the plain form of XML property lists, the one our
// writer and every tidy file use: an optional XML declaration in UTF-8, an
// optional DOCTYPE naming only an external DTD, <plist> with at most its
// version, the property-list elements without attributes, white space between
// them, and text with the predefined entities and character references.
// expat alone tokenizes slower than this reads and builds.
#pragma once

#include <cstdint>
#include <string_view>

#include "values/deep_copy.h"
#include "values/object.h"

namespace qr::xmlplist {

struct PlainScan {
  enum Outcome : uint8_t {
    Read,       // value is what the expat reader gives for the same bytes
    Malformed,  // the expat reader gives null for these bytes too
    Declined,   // something outside the plain form: the expat reader decides
  };
  Outcome outcome;
  Ref<Object> value;
};

PlainScan scanPlainXMLPropertyList(std::string_view bytes, Mutability mutability);

}  // namespace qr::xmlplist
