// Every device ID string operation over any bytes, read as UTF-8 (when well
// formed) and as UTF-16. Beyond crashes it checks that narrow and wide storage
// of the same text give the same answers, and that the key search's shortcut
// agrees with the rule it stands for.
#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "deviceid/device_id_json.h"
#include "deviceid/key_search.h"
#include "deviceid/percent_escape.h"
#include "deviceid/string_additions.h"
#include "values/array.h"
#include "values/dictionary.h"
#include "values/string.h"

using namespace PMStringAdditions;
using qr::Ref;
using qr::String;

namespace {

void check(bool ok) {
  if (!ok) __builtin_trap();
}

// The same text in wide storage, whatever it holds.
Ref<String> wideCopy(const String& s) {
  auto m = qr::make<qr::MutableString>();
  m->append(std::u16string_view(u"\u00e9"));
  m->replace(0, 1, s);
  return m;
}

void exercise(const String& s) {
  Ref<String> w = wideCopy(s);
  check(qr::equal(commandSet(s), commandSet(*w)));
  check(qr::equal(compatibleIDs(s), compatibleIDs(*w)));
  check(qr::equal(make(s), make(*w)));
  check(qr::equal(model(s), model(*w)));
  check(qr::equal(serialNumber(s), serialNumber(*w)));
  Ref<qr::MutableString> p = product(s);
  check(p && qr::equal(p, product(*w)));
  Ref<String> name = deviceName(s);
  check(name && qr::equal(name, deviceName(*w)));
  check(qr::equal(softwareUpdateScaneID(s), softwareUpdateScaneID(*w)));
  auto dict = dictionaryValue(s);
  check(!dict == s.isEmpty());
  check(qr::equal(dict, dictionaryValue(*w)));
  check(supportsPCL(s) == supportsPCL(*w));
  check(supportsPostscript(s) == supportsPostscript(*w));
  auto utf8 = pmStringByAddingPercentEscapesUsingEncoding(s, qr::TextEncoding::UTF8);
  check(qr::equal(utf8, pmStringByAddingPercentEscapesUsingEncoding(*w, qr::TextEncoding::UTF8)));
  pmStringByAddingPercentEscapesUsingEncoding(s, qr::TextEncoding::UTF16);
  pmStringByAddingPercentEscapesUsingEncoding(s, qr::TextEncoding::ISOLatin1);
  qr::deviceid::deviceIDRecord(s);
}

// The text before the first newline is a key (and separators), the rest the device ID.
void exerciseKey(const String& whole) {
  size_t cut = 0;
  while (cut < whole.length() && whole.at(cut) != u'\n') ++cut;
  Ref<String> key = whole.substring(0, cut);
  Ref<String> text = whole.substring(cut + 1, whole.length());
  qr::deviceid::FoldedKey folded = qr::deviceid::FoldedKey::of(*key);
  const qr::deviceid::FoldedKey* keys[] = {&folded};
  std::u16string units = text->utf16();
  using qr::deviceid::KeySearchMode;
  auto shortcut = qr::deviceid::searchKeys<char16_t>(units, keys, KeySearchMode::Shortcut);
  auto literal = qr::deviceid::searchKeys<char16_t>(units, keys, KeySearchMode::Literal);
  check(shortcut.has_value() == literal.has_value());
  check(!shortcut || *shortcut == *literal);
  Ref<String> found = stringForKey(*text, *key);
  check((found.get() != nullptr) == shortcut.has_value());
  auto list = qr::Array::build(std::vector<Ref<qr::Object>>{key, String::make("MFG:")});
  searchStringFor(*text, *list);
  dictionaryValueForKeySeperator(*text, *key->substring(0, 1), *key->substring(1, 2));
  auto long1 = dictionaryValueForKeySeperator(*text, *key, *String::make(";"));
  auto long2 = dictionaryValueForKeySeperator(*wideCopy(*text), *key, *String::make(";"));
  check(qr::equal(long1, long2));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  std::string_view bytes(reinterpret_cast<const char*>(data), size);
  if (Ref<String> s = String::fromUTF8(bytes)) {
    exercise(*s);
    exerciseKey(*s);
  }
  std::u16string units(size / 2, u'\0');
  for (size_t i = 0; i < units.size(); ++i)
    units[i] = static_cast<char16_t>(data[2 * i] | (data[2 * i + 1] << 8));
  Ref<String> wide = String::fromUTF16(units);
  exercise(*wide);
  exerciseKey(*wide);
  return 0;
}
