#include "deviceid/dictionary_additions.h"

#include <array>
#include <span>

#include "deviceid/device_id_keys.h"
#include "deviceid/device_id_rules.h"
#include "deviceid/string_units.h"

namespace PMDictionaryAdditions {
namespace {

using qr::MutableString;
using qr::Object;
using qr::Ref;
using qr::String;
using namespace qr::deviceid;
namespace K = PMDeviceIDDictionaryKeys;

constexpr std::array<std::string_view, 5> kCommandSetKeys = {K::kCMD, K::kCommandSet, K::kUSBCMD,
                                                             K::kUSBCommandSet, K::kPDL};
constexpr std::array<std::string_view, 4> kCompatibleIDKeys = {K::kCID, K::kCompatiblityID,
                                                               K::kUSBCID, K::kUSBCompatiblityID};
constexpr std::array<std::string_view, 4> kMakeKeys = {K::kMFG, K::kManufacturer, K::kUSBMFG,
                                                       K::kUSBManufacturer};
constexpr std::array<std::string_view, 4> kModelKeys = {K::kMDL, K::kModel, K::kUSBMDL,
                                                        K::kUSBModel};
constexpr std::array<std::string_view, 6> kSerialNumberKeys = {K::kSN,    K::kSRN,    K::kSERN,
                                                               K::kUSBSN, K::kUSBSRN, K::kUSBSERN};

Ref<Object> firstPresent(const qr::Dictionary& device, std::span<const std::string_view> keys) {
  for (std::string_view key : keys)
    if (Object* value = device.get(key)) return Ref<Object>(value);
  return nullptr;
}

// A string as it is, any other value as its description.
Ref<String> textOf(const Object* value) {
  if (!value) return nullptr;
  if (value->kind() == qr::TypeKind::String)
    return Ref<String>(static_cast<String*>(const_cast<Object*>(value)));
  return String::make(value->description());
}

Ref<String> productEntry(const qr::Dictionary& device) { return textOf(device.get(K::kProduct)); }

// Both texts as views of one width: narrow when both are, wide otherwise.
template <class F>
auto withUnitsOfBoth(const Ref<String>& a, const Ref<String>& b, F&& f) {
  auto narrowView = [](const Ref<String>& s) {
    return s ? std::optional<View<char>>(s->narrow()) : std::nullopt;
  };
  if ((!a || a->isNarrow()) && (!b || b->isNarrow())) return f(narrowView(a), narrowView(b));
  std::u16string wideA = a ? a->utf16() : std::u16string(),
                 wideB = b ? b->utf16() : std::u16string();
  auto wideView = [](const Ref<String>& s, const std::u16string& units) {
    return s ? std::optional<View<char16_t>>(units) : std::nullopt;
  };
  return f(wideView(a, wideA), wideView(b, wideB));
}

}  // namespace

Ref<Object> commandSet(const qr::Dictionary& device) {
  return firstPresent(device, kCommandSetKeys);
}

Ref<Object> compatibleIDs(const qr::Dictionary& device) {
  return firstPresent(device, kCompatibleIDKeys);
}

Ref<Object> make(const qr::Dictionary& device) {
  if (auto value = firstPresent(device, kMakeKeys)) return value;
  Ref<String> product = productEntry(device);
  if (!product) return nullptr;
  return withUnits(*product, [](auto units) -> Ref<Object> {
    return toString(productMake(std::optional(units)));
  });
}

Ref<Object> model(const qr::Dictionary& device) {
  if (auto value = firstPresent(device, kModelKeys)) return value;
  Ref<String> product = productEntry(device);
  if (!product) return nullptr;
  return withUnits(*product, [](auto units) -> Ref<Object> {
    return toString(productModel(std::optional(units)));
  });
}

Ref<Object> serialNumber(const qr::Dictionary& device) {
  return firstPresent(device, kSerialNumberKeys);
}

Ref<MutableString> product(const qr::Dictionary& device) {
  auto text = qr::make<MutableString>();
  if (Ref<String> entry = productEntry(device)) {
    text->append(*entry);
  } else {
    Ref<String> make = textOf(PMDictionaryAdditions::make(device).get());
    Ref<String> model = textOf(PMDictionaryAdditions::model(device).get());
    if (make && model) {
      text->appendUTF8("(");
      text->append(*make);
      text->appendUTF8(" ");
      text->append(*model);
      text->appendUTF8(")");
    }
  }
  return withUnits(*text, [](auto units) {
    Buffer<typename decltype(units)::value_type> cleaned(units);
    cleanUpVendorNames(cleaned, CleanUpForm::Parenthesised);
    return toMutableString(View<typename decltype(units)::value_type>(cleaned));
  });
}

Ref<String> softwareUpdateScaneID(const qr::Dictionary& device) {
  Ref<String> make = textOf(PMDictionaryAdditions::make(device).get());
  Ref<String> model = textOf(PMDictionaryAdditions::model(device).get());
  return withUnitsOfBoth(make, model, [](auto makeUnits, auto modelUnits) -> Ref<String> {
    auto id = softwareUpdateIdentifier(makeUnits, modelUnits);
    if (!id) return nullptr;
    return toString(View<typename decltype(id)::value_type::value_type>(*id));
  });
}

bool supportsPCL(const qr::Dictionary& device) {
  Ref<String> commands = textOf(commandSet(device).get());
  if (!commands) return false;
  return withUnits(*commands,
                   [](auto units) { return commandSetSupportsPCL(std::optional(units)); });
}

bool supportsPostscript(const qr::Dictionary& device) {
  Ref<String> commands = textOf(commandSet(device).get());
  if (!commands) return true;
  return withUnits(*commands,
                   [](auto units) { return commandSetSupportsPostscript(std::optional(units)); });
}

Ref<MutableString> stringValue(const qr::Dictionary& device) {
  auto out = qr::make<MutableString>();
  bool first = true;
  device.forEach([&](const Object& key, const Object& value) {
    if (!first) out->appendUTF8(";");
    first = false;
    out->append(*textOf(&key));
    out->appendUTF8(":");
    out->append(*textOf(&value));
  });
  return out;
}

}  // namespace PMDictionaryAdditions
