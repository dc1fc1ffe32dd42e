// The JSON Lines records that pmdeviceid prints for device ID strings and
// device dictionaries, keys in a fixed order, null for no value.
#pragma once

#include <string>

#include "values/dictionary.h"
#include "values/string.h"

namespace qr::deviceid {

// A JSON string; a lone surrogate comes out as U+FFFD.
void appendJSONString(std::string& out, const String& text);
// Strings, numbers, booleans, arrays and dictionaries as themselves; data as
// base64 and dates as ISO 8601 strings; anything else as its description;
// null for none and below kMaxPropertyListDepth levels of nesting.
void appendJSONValue(std::string& out, const Object* value);

// input, make, model, commandSet, compatibleIDs, serialNumber, product,
// deviceName, softwareUpdateScaneID, supportsPCL, supportsPostscript,
// dictionaryValue. No trailing newline.
std::string deviceIDRecord(const String& deviceID);
// make, model, commandSet, compatibleIDs, serialNumber, product,
// softwareUpdateScaneID, supportsPCL, supportsPostscript, stringValue.
std::string deviceDictionaryRecord(const Dictionary& device);

}  // namespace qr::deviceid
