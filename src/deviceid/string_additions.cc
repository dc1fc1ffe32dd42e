#include "deviceid/string_additions.h"

#include <array>
#include <vector>

#include "deviceid/device_id_keys.h"
#include "deviceid/device_id_rules.h"
#include "deviceid/key_search.h"
#include "deviceid/percent_escape.h"
#include "deviceid/string_units.h"

namespace PMStringAdditions {
namespace {

using qr::MutableDictionary;
using qr::MutableString;
using qr::Ref;
using qr::String;
using namespace qr::deviceid;
namespace K = PMDeviceIDSearchKeys;

template <class C>
using Found = std::optional<View<C>>;

// Search keys folded once; the pointers are what the key search walks.
template <size_t N>
class KeyList {
 public:
  explicit KeyList(const std::array<std::string_view, N>& names) {
    for (size_t i = 0; i < N; ++i) {
      keys_[i] = FoldedKey::fromASCII(names[i]);
      pointers_[i] = &keys_[i];
    }
  }
  KeyList(const KeyList&) = delete;
  std::span<const FoldedKey* const> span() const noexcept { return pointers_; }

 private:
  std::array<FoldedKey, N> keys_;
  std::array<const FoldedKey*, N> pointers_;
};

// Each operation's keys in its own search order.
struct SearchOrders {
  KeyList<5> commandSet{{K::kCMD, K::kCommandSet, K::kUSBCMD, K::kUSBCommandSet, K::kPDL}};
  KeyList<4> compatibleIDs{{K::kCID, K::kCompatiblityID, K::kUSBCID, K::kUSBCompatiblityID}};
  KeyList<5> make{{K::kMFG, K::kManufacturer, K::kUSBMFG, K::kUSBManufacturer, K::kUSBG}};
  KeyList<4> model{{K::kMDL, K::kModel, K::kUSBMDL, K::kUSBModel}};
  KeyList<1> modelFromType{{K::kTY}};
  KeyList<6> serialNumber{{K::kSN, K::kSRN, K::kSERN, K::kUSBSN, K::kUSBSRN, K::kUSBSERN}};
  KeyList<1> product{{K::kProduct}};
  KeyList<2> description{{K::kDES, K::kDescription}};
};

const SearchOrders& orders() {
  static const SearchOrders instance;
  return instance;
}

template <class C, size_t N>
Found<C> search(View<C> text, const KeyList<N>& keys) {
  return searchKeys(text, keys.span());
}

template <class C>
Found<C> makeOf(View<C> text) {
  if (auto value = search(text, orders().make)) return value;
  return productMake(search(text, orders().product));
}

template <class C>
Found<C> modelOf(View<C> text) {
  if (auto value = search(text, orders().model)) return value;
  if (auto value = search(text, orders().modelFromType)) return value;
  return productModel(search(text, orders().product));
}

template <class C>
Ref<String> deviceNameOf(View<C> text) {
  Found<C> make = makeOf(text), model = modelOf(text);
  if (make) make = trimBlank(*make);
  if (model) model = trimBlank(*model);
  if (make && model) return toString(View<C>(joinedDeviceName(*make, *model)));
  if (model) return toString(*model);
  if (make) return toString(*make);
  if (auto description = search(text, orders().description)) return toString(*description);
  static String* const unknown = immortal(String::make("Unknown").leak());
  return Ref<String>(unknown);
}

template <class C>
Ref<MutableString> productOf(View<C> text) {
  Buffer<C> out;
  if (auto value = search(text, orders().product)) {
    out = *value;
  } else {
    Found<C> make = makeOf(text), model = modelOf(text);
    if (make && model) out = parenthesisedMakeAndModel(*make, *model);
  }
  cleanUpVendorNames(out, CleanUpForm::Parenthesised);
  return toMutableString(View<C>(out));
}

template <class C>
Ref<MutableDictionary> dictionaryOf(View<C> text, View<C> keySeparator,
                                    View<C> componentSeparator) {
  if (text.empty()) return nullptr;
  auto dictionary = qr::make<MutableDictionary>();
  size_t start = 0;
  for (;;) {
    // An empty separator is never found: the whole text is one component.
    size_t stop = componentSeparator.empty() ? View<C>::npos : text.find(componentSeparator, start);
    View<C> component = text.substr(start, stop == View<C>::npos ? View<C>::npos : stop - start);
    size_t at = keySeparator.empty() ? View<C>::npos : component.find(keySeparator);
    if (at == View<C>::npos) {
      Buffer<C> key = lowercase(trimBlankOrNewline(component));
      dictionary->set(toString(View<C>(key)), String::empty());
    } else if (keySeparator.size() == 1) {
      Buffer<C> key = lowercase(trimBlankOrNewline(component.substr(0, at)));
      dictionary->set(toString(View<C>(key)),
                      toString(trimBlankOrNewline(component.substr(at + 1))));
    }
    if (stop == View<C>::npos) return dictionary;
    start = stop + componentSeparator.size();
  }
}

}  // namespace

Ref<String> searchStringFor(const String& deviceID, const qr::Array& keys) {
  std::vector<FoldedKey> folded;
  folded.reserve(keys.count());
  for (const auto& key : keys)
    if (key && key->kind() == qr::TypeKind::String)
      folded.push_back(FoldedKey::of(static_cast<const String&>(*key)));
  std::vector<const FoldedKey*> pointers;
  pointers.reserve(folded.size());
  for (const FoldedKey& k : folded) pointers.push_back(&k);
  return withUnits(deviceID, [&](auto units) { return toString(searchKeys(units, pointers)); });
}

Ref<String> stringForKey(const String& deviceID, const String& key) {
  FoldedKey folded = FoldedKey::of(key);
  const FoldedKey* pointers[] = {&folded};
  return withUnits(deviceID, [&](auto units) { return toString(searchKeys(units, pointers)); });
}

Ref<String> commandSet(const String& deviceID) {
  return withUnits(deviceID,
                   [](auto units) { return toString(search(units, orders().commandSet)); });
}

Ref<String> compatibleIDs(const String& deviceID) {
  return withUnits(deviceID,
                   [](auto units) { return toString(search(units, orders().compatibleIDs)); });
}

Ref<String> make(const String& deviceID) {
  return withUnits(deviceID, [](auto units) { return toString(makeOf(units)); });
}

Ref<String> model(const String& deviceID) {
  return withUnits(deviceID, [](auto units) { return toString(modelOf(units)); });
}

Ref<String> serialNumber(const String& deviceID) {
  return withUnits(deviceID,
                   [](auto units) { return toString(search(units, orders().serialNumber)); });
}

Ref<MutableString> product(const String& deviceID) {
  return withUnits(deviceID, [](auto units) { return productOf(units); });
}

Ref<String> deviceName(const String& deviceID) {
  return withUnits(deviceID, [](auto units) { return deviceNameOf(units); });
}

Ref<String> softwareUpdateScaneID(const String& deviceID) {
  return withUnits(deviceID, [](auto units) -> Ref<String> {
    auto id = softwareUpdateIdentifier(makeOf(units), modelOf(units));
    return id ? toString(View<typename decltype(units)::value_type>(*id)) : nullptr;
  });
}

Ref<MutableDictionary> dictionaryValue(const String& deviceID) {
  if (deviceID.isNarrow()) return dictionaryOf<char>(deviceID.narrow(), ":", ";");
  return dictionaryOf<char16_t>(deviceID.wide(), u":", u";");
}

Ref<MutableDictionary> dictionaryValueForKeySeperator(const String& deviceID,
                                                      const String& keySeperator,
                                                      const String& componentSeparator) {
  if (deviceID.isNarrow() && keySeperator.isNarrow() && componentSeparator.isNarrow())
    return dictionaryOf(deviceID.narrow(), keySeperator.narrow(), componentSeparator.narrow());
  std::u16string text = deviceID.utf16(), key = keySeperator.utf16(),
                 component = componentSeparator.utf16();
  return dictionaryOf<char16_t>(text, key, component);
}

bool supportsPCL(const String& deviceID) {
  return withUnits(deviceID, [](auto units) {
    return commandSetSupportsPCL(search(units, orders().commandSet));
  });
}

bool supportsPostscript(const String& deviceID) {
  return withUnits(deviceID, [](auto units) {
    return commandSetSupportsPostscript(search(units, orders().commandSet));
  });
}

Ref<String> pmStringByAddingPercentEscapesUsingEncoding(const String& text,
                                                        qr::TextEncoding encoding) {
  auto escaped = qr::percentEscape(text, encoding);
  return escaped ? String::fromUTF8(*escaped) : nullptr;
}

}  // namespace PMStringAdditions
