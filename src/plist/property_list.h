// Reading and writing property lists. Readers take XML, binary "bplist00" and
// the old text format (the one .strings tables use); every reader bounds its
// nesting, checks every offset and count against the input, and gives null
// for anything it cannot read. The writers write one canonical XML form and
// the binary form.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "values/deep_copy.h"
#include "values/object.h"

namespace qr {

enum class PropertyListFormat { XML, Binary, Text };

// Detects the format from the bytes and reads the one value they hold.
Ref<Object> readPropertyList(std::string_view bytes, Mutability mutability = Mutability::Immutable,
                             PropertyListFormat* format = nullptr);
// Null when the file is missing, unreadable or not a property list.
Ref<Object> readPropertyListFile(const std::string& path,
                                 Mutability mutability = Mutability::Immutable);

Ref<Object> readXMLPropertyList(std::string_view bytes, Mutability mutability);
Ref<Object> readBinaryPropertyList(std::string_view bytes, Mutability mutability);
// UTF-8, or UTF-16 with a byte-order mark. A top level of "key" = "value";
// pairs without braces (a .strings table) reads as a dictionary.
Ref<Object> readTextPropertyList(std::string_view bytes, Mutability mutability);

// The canonical XML form; none when the value holds anything that is not a
// property-list value or a string that XML 1.0 cannot carry.
std::optional<std::string> writeXMLPropertyList(const Object& value);
// The same text handed to sink in pieces, for output that goes straight to a
// file. Nothing reaches the sink for a value that cannot be written; false
// then, or when the sink returns false.
bool writeXMLPropertyList(const Object& value, const std::function<bool(std::string_view)>& sink);
// Whether writeXMLPropertyList would write the value, without writing it.
bool canWriteXMLPropertyList(const Object& value);
// The binary "bplist00" form; none when the value holds anything that is not a property-list value.
std::optional<std::string> writeBinaryPropertyList(const Object& value);
// Writes the XML form to a file in place (not atomically). False on any failure.
bool writePropertyListFile(const Object& value, const std::string& path);

}  // namespace qr
