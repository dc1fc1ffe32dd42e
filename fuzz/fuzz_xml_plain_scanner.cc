// The plain scanner against the expat reader on the same bytes, with each
// mutability option: whatever the scanner reads must be identical to what
// expat reads, kinds included, and what it calls malformed expat must not
// read. The bytes are also tried inside <plist>, and as choices among the
// pieces plain documents are made of, so that most inputs come close to a
// property list and reach the scanner's element and text paths.
#include <cstdint>
#include <cstdlib>
#include <iterator>
#include <string>
#include <string_view>

#include "../tests/support/plist_identity.h"
#include "plist/xml_expat_reader.h"
#include "plist/xml_plain_scanner.h"

using namespace qr;
using xmlplist::PlainScan;

namespace {

void compare(std::string_view bytes) {
  for (Mutability m : qrtest::kAllMutabilities) {
    PlainScan scan = xmlplist::scanPlainXMLPropertyList(bytes, m);
    if (scan.outcome == PlainScan::Declined) continue;
    Ref<Object> expat = readXMLPropertyListWithExpat(bytes, m);
    bool agree = scan.outcome == PlainScan::Malformed
                     ? !scan.value && !expat
                     : scan.value && qrtest::identical(scan.value.get(), expat.get(), &m) &&
                           qrtest::identical(expat.get(), scan.value.get(), &m);
    if (!agree) std::abort();
  }
}

// A byte below the number of pieces stands for that piece, any other for
// itself.
std::string fromPieces(std::string_view bytes) {
  // clang-format off
  static constexpr std::string_view kPieces[] = {
      "<dict>", "</dict>", "<array>", "</array>", "<key>", "</key>", "<string>", "</string>",
      "<integer>", "</integer>", "<real>", "</real>", "<true/>", "<false/>", "<data>", "</data>",
      "<date>", "</date>", "<dict/>", "<array/>", "<string/>", "&amp;", "&lt;", "&#x1F5A8;",
      "&#13;", "\r\n", "\t", "\n", "\r", "\xC3\xA9", "\xEF\xBF\xBE", "]]>", "<!--c-->",
      "<![CDATA[x]]>", "2024-01-01T00:00:00Z", "AAEC", "0x1F", "<key >", {"\0", 1}, "<true>"};
  // clang-format on
  std::string out = "<plist>";
  for (char c : bytes) {
    auto b = static_cast<unsigned char>(c);
    if (b < std::size(kPieces))
      out += kPieces[b];
    else
      out += c;
  }
  return out + "</plist>";
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  std::string_view bytes(reinterpret_cast<const char*>(data), size);
  compare(bytes);
  compare("<plist>" + std::string(bytes) + "</plist>");
  compare(fromPieces(bytes));
  return 0;
}
