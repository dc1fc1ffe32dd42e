#include "deviceid/device_id_rules.h"

#include <array>

#include "deviceid/folded_search.h"

namespace qr::deviceid {
namespace {

template <class C>
constexpr View<C> hpLiteral() noexcept {
  if constexpr (sizeof(C) == 1)
    return "hp";
  else
    return u"hp";
}

struct VendorPattern {
  FoldedKey pattern;
  std::string_view replacement;
};

using VendorGroup = std::array<VendorPattern, 3>;

const std::array<VendorGroup, 2>& vendorGroups(CleanUpForm form) {
  auto make = [](std::string_view pattern, std::string_view replacement) {
    return VendorPattern{FoldedKey::fromASCII(pattern), replacement};
  };
  static const std::array<VendorGroup, 2> parenthesised = {{
      {{make("(Hewlett-Packard HP", "(HP"), make("(HP HP", "(HP"),
        make("(Hewlett-Packard ", "(HP ")}},
      {{make("(Lexmark International Lexmark ", "(Lexmark "),
        make("(Lexmark International ", "(Lexmark "), make("(Lexmark Lexmark ", "(Lexmark ")}},
  }};
  static const std::array<VendorGroup, 2> plain = {{
      {{make("Hewlett-Packard HP", "HP"), make("HP HP", "HP"), make("Hewlett-Packard ", "HP ")}},
      {{make("Lexmark International Lexmark ", "Lexmark "),
        make("Lexmark International ", "Lexmark "), make("Lexmark Lexmark ", "Lexmark ")}},
  }};
  return form == CleanUpForm::Parenthesised ? parenthesised : plain;
}

struct CapabilityKeys {
  FoldedKey pcl = FoldedKey::fromASCII("pcl");
  FoldedKey postscript = FoldedKey::fromASCII("postscript");
  FoldedKey ps = FoldedKey::fromASCII("ps");
  FoldedKey spacedPS = FoldedKey::fromASCII(" ps ");
};

const CapabilityKeys& capabilityKeys() {
  static const CapabilityKeys keys;
  return keys;
}

}  // namespace

template <class C>
std::optional<View<C>> productMake(std::optional<View<C>> product) noexcept {
  if (!product || product->empty()) return std::nullopt;
  if (hasASCIIPrefix(*product, "(deskjet")) return hpLiteral<C>();
  size_t space = product->find(static_cast<C>(' '));
  if (space == View<C>::npos || space == 0) return std::nullopt;
  return product->substr(1, space - 1);
}

template <class C>
std::optional<View<C>> productModel(std::optional<View<C>> product) noexcept {
  if (!product || product->empty()) return std::nullopt;
  if (hasASCIIPrefix(*product, "(deskjet")) return product->substr(1, product->size() - 2);
  size_t space = product->find(static_cast<C>(' '));
  if (space == View<C>::npos || space + 1 == product->size()) return std::nullopt;
  return product->substr(space + 1, product->size() - 1 - (space + 1));
}

template <class C>
void cleanUpVendorNames(Buffer<C>& text, CleanUpForm form) {
  for (const VendorGroup& group : vendorGroups(form)) {
    for (const VendorPattern& p : group) {
      size_t at = findFolded(View<C>(text), p.pattern);
      if (at == View<C>::npos) continue;
      Buffer<C> replacement;
      appendASCII(replacement, p.replacement);
      text.replace(at, p.pattern.units, replacement);
      break;
    }
  }
}

template <class C>
Buffer<C> parenthesisedMakeAndModel(View<C> make, View<C> model) {
  Buffer<C> out;
  out.reserve(make.size() + model.size() + 3);
  out += static_cast<C>('(');
  out += make;
  out += static_cast<C>(' ');
  out += model;
  out += static_cast<C>(')');
  return out;
}

template <class C>
Buffer<C> joinedDeviceName(View<C> make, View<C> model) {
  Buffer<C> out;
  if (!make.empty() && model.substr(0, make.size()) == make) {
    out = model;
  } else {
    out.reserve(make.size() + model.size() + 1);
    out += make;
    out += static_cast<C>(' ');
    out += model;
  }
  cleanUpVendorNames(out, CleanUpForm::Plain);
  return out;
}

template <class C>
std::optional<Buffer<C>> softwareUpdateIdentifier(std::optional<View<C>> make,
                                                  std::optional<View<C>> model) {
  if (!make || !model) return std::nullopt;
  View<C> mk = trimBlank(*make), md = trimBlank(*model);
  if (md.size() > mk.size() && md.substr(0, mk.size()) == mk && md[mk.size()] == C(' '))
    md.remove_prefix(mk.size() + 1);
  Buffer<C> out;
  appendASCII(out, "MANUFACTURER:");
  out += mk;
  appendASCII(out, ";MODEL:");
  out += md;
  return out;
}

template <class C>
bool commandSetSupportsPCL(std::optional<View<C>> commandSet) {
  return commandSet && findFolded(*commandSet, capabilityKeys().pcl) != View<C>::npos;
}

template <class C>
bool commandSetSupportsPostscript(std::optional<View<C>> commandSet) {
  if (!commandSet) return true;
  const CapabilityKeys& keys = capabilityKeys();
  if (findFolded(*commandSet, keys.postscript) != View<C>::npos) return true;
  const FoldedKey& ps = keys.ps;
  const FoldedKey& spacedPS = keys.spacedPS;
  View<C> rest = *commandSet;
  for (;;) {
    size_t stop = rest.find(static_cast<C>(';'));
    View<C> component = rest.substr(0, stop);
    if (component.size() == ps.units && matchesAt(component, 0, ps)) return true;
    if (findFolded(component, spacedPS) != View<C>::npos) return true;
    if (stop == View<C>::npos) return false;
    rest.remove_prefix(stop + 1);
  }
}

#define QR_DEVICEID_INSTANTIATE(C)                                                    \
  template std::optional<View<C>> productMake(std::optional<View<C>>) noexcept;       \
  template std::optional<View<C>> productModel(std::optional<View<C>>) noexcept;      \
  template void cleanUpVendorNames(Buffer<C>&, CleanUpForm);                          \
  template Buffer<C> parenthesisedMakeAndModel(View<C>, View<C>);                     \
  template Buffer<C> joinedDeviceName(View<C>, View<C>);                              \
  template std::optional<Buffer<C>> softwareUpdateIdentifier(std::optional<View<C>>,  \
                                                             std::optional<View<C>>); \
  template bool commandSetSupportsPCL(std::optional<View<C>>);                        \
  template bool commandSetSupportsPostscript(std::optional<View<C>>);

QR_DEVICEID_INSTANTIATE(char)
QR_DEVICEID_INSTANTIATE(char16_t)

}  // namespace qr::deviceid
