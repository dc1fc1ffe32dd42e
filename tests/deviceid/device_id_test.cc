// Device ID operations on strings and on dictionaries: the key search, the
// fields and names built on it, the dictionary form, capabilities, escaping.
#include <gtest/gtest.h>

#include <tuple>

#include "deviceid/dictionary_additions.h"
#include "deviceid/key_search.h"
#include "deviceid/string_additions.h"
#include "values/array.h"

using namespace PMStringAdditions;
using namespace PMDictionaryAdditions;
using std::nullopt;
using Text = std::optional<std::string>;

namespace {

qr::Ref<qr::String> S(std::string_view utf8) { return qr::String::make(utf8); }

// The same text in wide storage, so that ASCII takes the wide paths too.
qr::Ref<qr::String> wide(std::string_view utf8) {
  auto m = qr::make<qr::MutableString>();
  m->append(std::u16string_view(u"\u00e9"));
  m->replace(0, 1, *S(utf8));
  return m;
}

// A dictionary of the components of a device ID, keys and values untrimmed.
qr::Ref<qr::MutableDictionary> dict(std::string_view id) {
  auto d = qr::make<qr::MutableDictionary>();
  for (size_t end = 0; !id.empty(); id.remove_prefix(std::min(id.size(), end + 1))) {
    std::string_view entry = id.substr(0, end = std::min(id.find(';'), id.size()));
    size_t colon = std::min(entry.find(':'), entry.size());
    d->set(entry.substr(0, colon), S(entry.substr(std::min(colon + 1, entry.size()))));
  }
  return d;
}

template <class T>
Text show(const qr::Ref<T>& value) {
  return value ? Text(value->description()) : nullopt;
}

// Applies op to each row's input as made by every maker, naming the operation,
// the input and the maker's place when the answer is not the expected one.
template <class Op, class... Make>
void table(std::string_view name, Op op,
           std::initializer_list<std::pair<std::string_view, Text>> rows, Make... makers) {
  for (const auto& [input, expected] : rows) {
    int form = 0;
    auto check = [&](auto maker) {
      EXPECT_EQ(show(op(*maker(input))), expected)
          << name << " of \"" << input << "\" in input form " << form;
      ++form;
    };
    (check(makers), ...);
  }
}
// Narrow and wide strings, and (where the forms share a rule) dictionaries.
#define STRINGS &S, &wide
#define ALL_FORMS &S, &wide, &dict
#define OP(f) [](const auto& x) { return f(x); }

}  // namespace

TEST(Fields, EveryKeyInAnyCaseAfterBlanksOnlyAndInDictionariesInOrderAndExactCase) {
  struct {
    qr::Ref<qr::String> (*ofString)(const qr::String&);
    qr::Ref<qr::Object> (*ofDictionary)(const qr::Dictionary&);
    std::vector<std::string> keys;  // in the dictionaries' order of preference
  } fields[] = {
      {commandSet, commandSet, {"CMD", "COMMAND SET", "usb_CMD", "usb_COMMAND SET", "pdl"}},
      {make, make, {"MFG", "MANUFACTURER", "usb_MFG", "usb_MANUFACTURER", "usb_G"}},
      {model, model, {"MDL", "MODEL", "usb_MDL", "usb_MODEL", "ty"}},
      {serialNumber, serialNumber, {"SN", "SRN", "SERN", "usb_SN", "usb_SRN", "usb_SERN"}},
      {compatibleIDs, compatibleIDs, {"CID", "COMPATIBLITY ID", "usb_CID", "usb_COMPATIBLITY ID"}},
  };
  for (const auto& f : fields) {
    auto d = qr::make<qr::MutableDictionary>();
    for (auto k = f.keys.rbegin(); k != f.keys.rend(); ++k) {
      std::string upper = *k;
      for (char& c : upper) c = static_cast<char>(toupper(c));
      for (const std::string& c : {*k, upper}) {
        EXPECT_EQ(show(f.ofString(*S(" \t" + c + ": v ;x"))), " v ") << c;
        EXPECT_EQ(show(f.ofString(*wide("x" + c + ":v;\n" + c + ":v"))), nullopt) << c;
      }
      d->set(upper + " ", S("other"));
      d->set(*k, S(*k));
    }
    // usb_G and ty belong to the string form only.
    for (const std::string& k : f.keys) {
      EXPECT_EQ(show(f.ofDictionary(*d)), k == "usb_G" || k == "ty" ? nullopt : Text(k)) << k;
      d->remove(k);
    }
  }
}

TEST(KeySearch, StringForKeyAndSearchStringFor) {
  // Only a key's first occurrence in a component counts, and a key that
  // begins or ends with a blank only at the very start.
  for (auto [text, key, expected] :
       std::initializer_list<std::tuple<const char*, const char*, Text>>{
           {"MDL:first;MDL:second", "mdl:", "first"},
           {"xMFG:X;MFGX:Z;MFG:", "MFG:", ""},
           {"MFG:X", "", nullopt},
           {"AMFG:MFG:X", "MFG:", nullopt},
           {"  MFG:A", " MFG:", nullopt},
           {"MFG: A", "MFG: ", "A"},
           {"\xC2\xA0\xE3\x80\x80\xC5\xBFN:1", "SN:", "1"},
           {"\xC3\x89TAT:pr\xC3\xAAt", "\xC3\xA9tat:", "pr\xC3\xAAt"},
           {"\xF0\x90\x90\x80:d", "\xF0\x90\x90\xA8:", "d"}})
    for (const auto& t : {S(text), wide(text)})
      for (const auto& k : {S(key), wide(key)})
        EXPECT_EQ(show(stringForKey(*t, *k)), expected) << text << " by " << key;
  auto list = [](std::vector<qr::Ref<qr::Object>> items) { return qr::Array::build(items); };
  // The component decides before the key order; keys that are not strings are passed over.
  EXPECT_EQ(show(searchStringFor(*S("a:1;b:2"), *list({list({}), S("b:"), S("a:")}))), "1");
  EXPECT_EQ(show(searchStringFor(*S("a:1"), *list({}))), nullopt);
}

// On every text of up to five of these characters, for single keys and lists:
// the shortcut and narrow storage agree with the literal rule on wide text.
TEST(KeySearch, ShortcutAndNarrowAgreeWithTheLiteralRule) {
  using namespace qr::deviceid;
  std::vector<FoldedKey> keys;  // letter case varies; wide keys alternate with narrow ones
  for (std::string_view n : {"a:", " A", "a: ", "Za", ":", " ", "z"})
    keys.push_back(FoldedKey::of(keys.size() % 2 ? *wide(n) : *S(n)));
  std::vector<std::vector<const FoldedKey*>> lists = {{&keys[3], &keys[0], &keys[6], &keys[4]}, {}};
  for (const FoldedKey& k : keys) lists[1].push_back(&k), lists.push_back({&k});
  const std::u16string alphabet = u" \ta;Z:\u00a0";
  auto at = [](auto text, auto found) { return found ? found->data() - text.data() : -1; };
  for (size_t code = 0; code < 1 + 7 + 49 + 343 + 2401 + 16807; ++code) {
    std::u16string text;
    for (size_t c = code; c; c = (c - 1) / 7) text += alphabet[(c - 1) % 7];
    std::string narrow(text.begin(), text.end());
    View<char16_t> w = text;
    View<char> n = narrow;
    bool ascii = text.find(u'\u00a0') == std::u16string::npos;
    for (const auto& list : lists) {
      auto literal = at(w, searchKeys(w, list, KeySearchMode::Literal));
      for (auto found : {at(w, searchKeys(w, list)), ascii ? at(n, searchKeys(n, list)) : literal,
                         ascii ? at(n, searchKeys(n, list, KeySearchMode::Literal)) : literal})
        ASSERT_EQ(found, literal) << '"' << narrow << "\" with key list " << &list - &lists[0];
    }
  }
}

TEST(Names, ProductRuleProductDeviceNameAndSoftwareUpdateID) {
  // Outer characters go untested; "(deskjet" (that case only) belongs to hp.
  auto makeAndModel = [](const auto& x) {
    return S(show(make(x)).value_or("-") + " / " + show(model(x)).value_or("-"));
  };
  table("make / model", makeAndModel,
        {{"product:<Hewlett-Packard LaserJet 4000]", "Hewlett-Packard / LaserJet 4000"},
         {"product:(deskjet", "hp / deskje"},
         {"product:(Deskjet", "- / -"},
         {"product: Acme)", "- / Acme"},
         {"product:( )", " / "},
         {"product:(A B);MFG:;MDL:M", " / M"}},
        ALL_FORMS);
  // Vendor clean-up: one change per group, both groups, any case.
  table("product", OP(product),
        {{"product:anything;MFG:Z;MDL:Y", "anything"},
         {"MFG: HP ;MDL:X ", "( HP  X )"},
         {"MFG:HP", ""},
         {"product:(hewlett-packard hp 5)", "(HP 5)"},
         {"product:(HP HP (Hewlett-Packard X)", "(HP (Hewlett-Packard X)"},
         {"product:(Lexmark International Lexmark T (Hewlett-Packard Z)", "(Lexmark T (HP Z)"},
         {"MFG:Lexmar\xE2\x84\xAA International;MDL:T", "(Lexmark T)"}},
        ALL_FORMS);
  // The model alone when it starts with the make (an empty make never does).
  table("deviceName", OP(deviceName),
        {{"product:(Hewlett-Packard LaserJet 4000)", "HP LaserJet 4000"},
         {"MFG:lexmark;MDL:Lexmark T640", "Lexmark T640"},
         {"MFG: \tAcme \t;MDL:  Acme Jet  ", "Acme Jet"},
         {"MFG:;MDL:Jet", " Jet"},
         {"MDL: HP HP Solo ", "HP HP Solo"},
         {"MFG:\tHewlett-Packard ", "Hewlett-Packard"},
         {"DESCRIPTION: Lobby ;DES:x", " Lobby "},
         {"CMD:PCL", "Unknown"}},
        STRINGS);
  // The make and a space leave the model only in that case; no clean-up.
  table("softwareUpdateScaneID", OP(softwareUpdateScaneID),
        {{"MFG:hp;MDL:HP LaserJet", "MANUFACTURER:hp;MODEL:HP LaserJet"},
         {"MFG: HP ;MDL: HP  X ", "MANUFACTURER:HP;MODEL: X"},
         {"MFG:HP;MDL:HP ", "MANUFACTURER:HP;MODEL:HP"},
         {"MFG:Hewlett-Packard HP;MDL:\xC3\xA9", "MANUFACTURER:Hewlett-Packard HP;MODEL:\xC3\xA9"},
         {"MFG:HP", nullopt},
         {"MDL:X", nullopt}},
        ALL_FORMS);
  // PCL anywhere; PostScript by name or as an item (";" splits a dictionary's value).
  auto both = [](const auto& x) {
    return S(std::string(supportsPCL(x) ? "pcl" : "") + (supportsPostscript(x) ? " ps" : ""));
  };
  table("capabilities", both,
        {{"MFG:HP;CMD:PJL,PCL,POSTSCRIPT;", "pcl ps"},
         {"CMD:ps", " ps"},
         {"CMD:PCL,PS", "pcl"},
         {"CMD:PJL PS PCL", "pcl ps"},
         {"CMD:PS ", ""},
         {"CMD: PS", ""},
         {"MFG:HP", " ps"}},
        ALL_FORMS);
  auto d = qr::make<qr::MutableDictionary>();
  d->set("pdl", S("PCL;PS"));
  EXPECT_EQ(show(both(*d)), "pcl ps");
}

TEST(DictionaryFormAndEscaping, SplitTrimAndLowerCaseKeys) {
  // The last of equal keys wins in the first one's place.
  table(
      "dictionaryValue", OP(dictionaryValue),
      {{"MFG:HP;MDL:LaserJet;A:1:2;a:3", "{mfg = HP; mdl = LaserJet; a = 3}"},
       {"", nullopt},
       {" \r\n Key \t: \x0B V l \xE2\x80\xA8;\xE3\x80\x80k\xC2\x85:\xE2\x80\xA9v",
        "{key = V l; k = v}"},
       {"\xC4\xB0\xC4\xB0\xC4\xB0\xC4\xB0\xC4\xB0\xC4\xB0\xC4\xB0\xC4\xB0\xC4\xB0:1",
        "{i\xCC\x87i\xCC\x87i\xCC\x87i\xCC\x87i\xCC\x87i\xCC\x87i\xCC\x87i\xCC\x87i\xCC\x87 = 1}"}},
      STRINGS);
  // A key separator of more than one unit leaves its components out.
  for (auto [text, key, component, expected] :
       std::initializer_list<std::tuple<const char*, const char*, const char*, const char*>>{
           {"a=>1,b", "=>", ",", "{b = }"},
           {"a::1;;b", ":", ";;", "{a = :1; b = }"},
           {"A:1;B:2", "", ";", "{a:1 = ; b:2 = }"},
           {"A:1;B:2", ":", "", "{a = 1;B:2}"},
           {"K\xC2\xB7V\xC2\xA6K2\xC2\xB7V2", "\xC2\xB7", "\xC2\xA6", "{k = V; k2 = V2}"}})
    EXPECT_EQ(show(dictionaryValueForKeySeperator(*S(text), *S(key), *S(component))), expected)
        << text << " split at " << key << " and " << component;
  EXPECT_EQ(show(stringValue(*dict("MDL:X;MFG:\xC3\xA9;a:b:c"))), "MDL:X;MFG:\xC3\xA9;a:b:c");
  // Escaping (more through pmdeviceid): unknown encodings and lone surrogates give none.
  EXPECT_FALSE(pmStringByAddingPercentEscapesUsingEncoding(*S("x"), qr::TextEncoding(0)));
  auto lone = qr::String::fromUTF16(u"a\xD800");
  EXPECT_FALSE(pmStringByAddingPercentEscapesUsingEncoding(*lone, qr::TextEncoding::UTF16));
}
