// Device ID questions asked of a dictionary of device properties, keyed by
// the key names without their colon ("MFG", "usb_MFG", "pdl", "product").
// Keys match exactly, letter case included. The field accessors give the
// stored value itself, whatever its kind; the rules that read a value as text
// (product rule, trimming, clean-up, capability tests) use a string as it is
// and any other value's description.
#pragma once

#include "values/dictionary.h"
#include "values/string.h"

namespace PMDictionaryAdditions {

qr::Ref<qr::Object> commandSet(const qr::Dictionary& device);
qr::Ref<qr::Object> compatibleIDs(const qr::Dictionary& device);
// Falls back on the "product" entry "(maker model)".
qr::Ref<qr::Object> make(const qr::Dictionary& device);
qr::Ref<qr::Object> model(const qr::Dictionary& device);
qr::Ref<qr::Object> serialNumber(const qr::Dictionary& device);

// The "product" entry, else "(make model)", with vendor names cleaned up;
// possibly empty, never null.
qr::Ref<qr::MutableString> product(const qr::Dictionary& device);
// "MANUFACTURER:make;MODEL:model", or null without make or model.
qr::Ref<qr::String> softwareUpdateScaneID(const qr::Dictionary& device);

bool supportsPCL(const qr::Dictionary& device);
bool supportsPostscript(const qr::Dictionary& device);

// "key:value" pairs joined by ";" in the dictionary's order, nothing escaped.
qr::Ref<qr::MutableString> stringValue(const qr::Dictionary& device);

}  // namespace PMDictionaryAdditions
