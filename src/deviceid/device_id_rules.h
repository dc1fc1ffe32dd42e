// The rules that the string and the dictionary forms of the device ID
// operations share: the product rule, the vendor clean-up, the capability
// tests and the software-update identifier. Templates over the storage width
// of the text (char for narrow strings, char16_t for wide ones).
#pragma once

#include <optional>

#include "deviceid/unicode_text.h"

namespace qr::deviceid {

// A product value "(maker model)" split at its first space, outer characters
// dropped untested; "(deskjet..." belongs to "hp". None when there is no
// value, it is empty, it has no space, or the space leaves no room for the
// part (a space first for the make, last for the model).
template <class C>
std::optional<View<C>> productMake(std::optional<View<C>> product) noexcept;
template <class C>
std::optional<View<C>> productModel(std::optional<View<C>> product) noexcept;

enum class CleanUpForm { Parenthesised, Plain };
// Shortens doubled or long vendor names; at most one change per vendor group.
template <class C>
void cleanUpVendorNames(Buffer<C>& text, CleanUpForm form);

// "(make model)", not yet cleaned up.
template <class C>
Buffer<C> parenthesisedMakeAndModel(View<C> make, View<C> model);

// The display name from make and model, both present; cleaned up.
template <class C>
Buffer<C> joinedDeviceName(View<C> make, View<C> model);

// "MANUFACTURER:make;MODEL:model" with a leading "make " dropped from the model.
template <class C>
std::optional<Buffer<C>> softwareUpdateIdentifier(std::optional<View<C>> make,
                                                  std::optional<View<C>> model);

// No command set means no PCL but PostScript.
template <class C>
bool commandSetSupportsPCL(std::optional<View<C>> commandSet);
template <class C>
bool commandSetSupportsPostscript(std::optional<View<C>> commandSet);

}  // namespace qr::deviceid
