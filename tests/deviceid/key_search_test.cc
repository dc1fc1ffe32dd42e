// The key search and the field operations built on it.
#include <gtest/gtest.h>

#include "device_id_test_support.h"
#include "deviceid/device_id_keys.h"
#include "deviceid/key_search.h"
#include "deviceid/string_additions.h"

using namespace deviceid_test;
using namespace PMStringAdditions;
using std::nullopt;

namespace {

struct FieldCase {
  const char* deviceID;
  std::optional<std::string> make, model, commandSet, serialNumber, compatibleIDs;
};

void expectFields(const qr::String& id, const FieldCase& c) {
  EXPECT_EQ(text(make(id)), c.make);
  EXPECT_EQ(text(model(id)), c.model);
  EXPECT_EQ(text(commandSet(id)), c.commandSet);
  EXPECT_EQ(text(serialNumber(id)), c.serialNumber);
  EXPECT_EQ(text(compatibleIDs(id)), c.compatibleIDs);
}

}  // namespace

TEST(KeySearch, FieldsOfATypicalDeviceIDInNarrowAndWideStorage) {
  const FieldCase cases[] = {
      {"MFG:HP;MDL:LaserJet 4000;CMD:PJL,PCL,POSTSCRIPT;", "HP", "LaserJet 4000",
       "PJL,PCL,POSTSCRIPT", nullopt, nullopt},
      {"mfg:Acme;mOdEl:Jet;command set:PS;sern:77;Cid:X1", "Acme", "Jet", "PS", "77", "X1"},
      {"usb_MFG:Acme;usb_MDL:Z;usb_CMD:PCL;usb_SN:123;usb_CID:c", "Acme", "Z", "PCL", "123", "c"},
      {"MANUFACTURER:A;MODEL:B;COMPATIBLITY ID:C;SRN:9", "A", "B", nullopt, "9", "C"},
      {"usb_G:Gee;ty:Typed;pdl:application/pdf", "Gee", "Typed", "application/pdf", nullopt,
       nullopt},
  };
  for (const FieldCase& c : cases) {
    SCOPED_TRACE(c.deviceID);
    expectFields(*S(c.deviceID), c);
    expectFields(*wideASCII(c.deviceID), c);
  }
}

TEST(KeySearch, WhereKeysCountAndWhatTheyFind) {
  // The first component decides; the earlier key in the list only breaks a tie
  // within one. Keys count at the start or after blanks (any space separator,
  // not a line break); a later occurrence in the same component is not looked
  // for. Values are untrimmed, and empty is not nil.
  expectCases("make", make,
              {{"usb_MFG:U;MFG:M", "U"},
               {"usb_MFG:Acme", "Acme"},
               {" \t MFG:Tabbed ", "Tabbed "},
               {"\xC2\xA0\xE3\x80\x80MFG:Wide", "Wide"},
               {"\nMFG:X", nullopt},
               {"xMFG:X;MFG:Y", "Y"},
               {"AMFG:MFG:X", nullopt},
               {"MFG:;MDL:X;product:(Other Thing)", ""},
               {"MDL:X", nullopt}});
  expectCases("model", model,
              {{"MODEL:A;MDL:B", "A"},
               {"MFG:HP; MDL: LaserJet", " LaserJet"},
               {"MDL:\xF0\x9F\x96\xA8 Printer", "\xF0\x9F\x96\xA8 Printer"}});
  expectCases("commandSet", commandSet, {{"usb_CMD:PCL", "PCL"}, {"", nullopt}});
  // The misspelt key is the one searched for.
  expectCases("compatibleIDs", compatibleIDs,
              {{"COMPATIBLITY ID:x", "x"},
               {"COMPATIBILITY ID:x", nullopt},
               {"usb_COMPATIBLITY ID:y", "y"}});
  // Long s folds to s and the Kelvin sign to k; sharp s does not match "ss".
  expectCases("serialNumber", serialNumber, {{"\xC5\xBFN:long-s", "long-s"}});
  struct {
    std::string_view text, key;
    std::optional<std::string> expected;
  } byKey[] = {{"MDL:first;MDL:second", "mdl:", "first"},
               {"usb_CMD:PCL", "CMD:", nullopt},
               {"usb_SN:123", "SN:", nullopt},
               {"MFG:X", "", nullopt},
               {";;", ";", nullopt},
               {"MFG:HP", "MFG", ":HP"},  // a key without its colon gives the colon back
               {"\xE2\x84\xAA"
                "ey:v",
                "key:", "v"},
               {"STRASSE:1",
                "stra\xC3\x9F"
                "e:",
                nullopt},
               {"stra\xC3\x9F"
                "e:1",
                "STRASSE:", nullopt},
               {"STRA\xE1\xBA\x9E"
                "E:2",
                "stra\xC3\x9F"
                "e:",
                "2"},
               {"\xC3\x89TAT:pr\xC3\xAAt", "\xC3\xA9tat:", "pr\xC3\xAAt"},
               {"\xF0\x90\x90\x80:deseret", "\xF0\x90\x90\xA8:", "deseret"},
               // Keys with blanks at their ends match only at the very start of a component.
               {" MFG:A", " MFG:", "A"},
               {"  MFG:A", " MFG:", nullopt},
               {"MFG: A", "MFG: ", "A"},
               {" MFG: A", "MFG: ", nullopt}};
  for (const auto& c : byKey)
    EXPECT_EQ(text(stringForKey(*S(c.text), *S(c.key))), c.expected) << c.text << " / " << c.key;

  EXPECT_EQ(text(searchStringFor(*S("XMFG:1"), *keys({"XMFG:", "MFG:"}))), "1");
  EXPECT_EQ(text(searchStringFor(*S("a:1;b:2"), *keys({"b:", "a:"}))), "1");
  EXPECT_EQ(text(searchStringFor(*S("MFG:X"), *keys({}))), nullopt);
  // Non-string keys are passed over.
  auto mixed = qr::make<qr::MutableArray>();
  mixed->append(qr::make<qr::MutableArray>());
  mixed->append(S("MDL:"));
  EXPECT_EQ(text(searchStringFor(*S("MDL:Q"), *mixed)), "Q");
}

TEST(KeySearch, TheShortcutAgreesWithTheLiteralRule) {
  using namespace qr::deviceid;
  const char* texts[] = {"MFG:A",
                         " MFG:A",
                         "x MFG:A",
                         "\tmfg:B;MFG:C",
                         " ;MFG:D",
                         "  MFG :E",
                         "MFG",
                         ":MFG:",
                         "\xC2\xA0"
                         "MFG:F"};
  const char* keyTexts[] = {"MFG:", " MFG:", "MFG :", "MFG: ", "FG:", " ", ":"};
  for (const char* t : texts) {
    for (const char* k : keyTexts) {
      SCOPED_TRACE(std::string(t) + " / " + k);
      FoldedKey key = FoldedKey::of(*S(k));
      const FoldedKey* list[] = {&key};
      std::u16string wide = S(t)->utf16();
      auto shortcut = searchKeys<char16_t>(wide, list, KeySearchMode::Shortcut);
      auto literal = searchKeys<char16_t>(wide, list, KeySearchMode::Literal);
      EXPECT_EQ(shortcut.has_value(), literal.has_value());
      if (shortcut && literal) {
        EXPECT_EQ(*shortcut, *literal);
      }
    }
  }
}

TEST(KeySearch, KeyNamesComeInBothFormsInTheirFixedOrder) {
  ASSERT_EQ(PMDeviceIDSearchKeys::kAll.size(), PMDeviceIDDictionaryKeys::kAll.size());
  for (size_t i = 0; i < PMDeviceIDSearchKeys::kAll.size(); ++i)
    EXPECT_EQ(PMDeviceIDSearchKeys::kAll[i], std::string(PMDeviceIDDictionaryKeys::kAll[i]) + ":");
  EXPECT_EQ(PMDeviceIDDictionaryKeys::kAll.front(), "COMMAND SET");
  EXPECT_EQ(PMDeviceIDDictionaryKeys::kAll[5], "MANUFACTURER");
  EXPECT_EQ(PMDeviceIDDictionaryKeys::kAll[10], "MODEL");
  EXPECT_EQ(PMDeviceIDDictionaryKeys::kAll[15], "SERN");
  EXPECT_EQ(PMDeviceIDDictionaryKeys::kAll.back(), "usb_CID");
}
