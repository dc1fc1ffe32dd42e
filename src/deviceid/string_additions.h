// Device ID operations on string values: the semicolon-separated key-and-value
// text a printer reports about itself (IEEE 1284 device ID), including the
// "usb_" keys of USB devices and the "pdl", "ty" and "product" keys of printers
// found through network service discovery. Positions and lengths count UTF-16
// code units. Every result is new; a null result means no value, which is
// distinct from the empty string.
#pragma once

#include "deviceid/text_encoding.h"
#include "values/array.h"
#include "values/dictionary.h"
#include "values/string.h"

namespace PMStringAdditions {

// The value after the first key found, in the first ";"-separated component
// that carries any of the keys (each a string, as "MDL:" with its colon).
// Keys compare with letter case ignored and count only at the start of a
// component or after spaces and tabs. The value is not trimmed.
qr::Ref<qr::String> searchStringFor(const qr::String& deviceID, const qr::Array& keys);
qr::Ref<qr::String> stringForKey(const qr::String& deviceID, const qr::String& key);

qr::Ref<qr::String> commandSet(const qr::String& deviceID);
qr::Ref<qr::String> compatibleIDs(const qr::String& deviceID);
// Falls back on the product value "(maker model)".
qr::Ref<qr::String> make(const qr::String& deviceID);
// Falls back on "ty:", then on the product value.
qr::Ref<qr::String> model(const qr::String& deviceID);
qr::Ref<qr::String> serialNumber(const qr::String& deviceID);

// The product value, else "(make model)", with vendor names cleaned up;
// possibly empty, never null.
qr::Ref<qr::MutableString> product(const qr::String& deviceID);
// A display name: "make model" (or the model alone when it starts with the
// make) cleaned up, else the model, the make, the description or "Unknown".
qr::Ref<qr::String> deviceName(const qr::String& deviceID);
// "MANUFACTURER:make;MODEL:model", or null without make or model.
qr::Ref<qr::String> softwareUpdateScaneID(const qr::String& deviceID);

// The components split at ":" into lower-cased trimmed keys and trimmed
// values; null for an empty string.
qr::Ref<qr::MutableDictionary> dictionaryValue(const qr::String& deviceID);
// The same with any separators. A component without the key separator is a
// key with an empty value; a key separator longer than one code unit leaves
// every component that holds it out. The last of equal keys wins.
qr::Ref<qr::MutableDictionary> dictionaryValueForKeySeperator(const qr::String& deviceID,
                                                              const qr::String& keySeperator,
                                                              const qr::String& componentSeparator);

// "pcl" anywhere in the command set; no command set means no.
bool supportsPCL(const qr::String& deviceID);
// "postscript" anywhere, or an item "ps" standing alone or between spaces; no
// command set means yes.
bool supportsPostscript(const qr::String& deviceID);

// See qr::percentEscape; null when the text cannot be written in the encoding.
qr::Ref<qr::String> pmStringByAddingPercentEscapesUsingEncoding(const qr::String& text,
                                                                qr::TextEncoding encoding);

}  // namespace PMStringAdditions
