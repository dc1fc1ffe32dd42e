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

TEST(KeySearch, FirstComponentDecidesAndKeyOrderOnlyBreaksTiesWithinAComponent) {
  EXPECT_EQ(text(model(*S("MODEL:A;MDL:B"))), "A");
  EXPECT_EQ(text(make(*S("usb_MFG:U;MFG:M"))), "U");
  // One component carrying two keys: the earlier key in the list wins.
  EXPECT_EQ(text(searchStringFor(*S("XMFG:1"), *keys({"XMFG:", "MFG:"}))), "1");
  EXPECT_EQ(text(searchStringFor(*S("a:1;b:2"), *keys({"b:", "a:"}))), "1");
  EXPECT_EQ(text(stringForKey(*S("MDL:first;MDL:second"), *S("mdl:"))), "first");
}

TEST(KeySearch, KeysCountOnlyAtTheStartOrAfterSpacesAndTabs) {
  EXPECT_EQ(text(commandSet(*S("usb_CMD:PCL"))), "PCL") << "through usb_CMD:, not CMD:";
  EXPECT_EQ(text(stringForKey(*S("usb_CMD:PCL"), *S("CMD:"))), nullopt);
  EXPECT_EQ(text(stringForKey(*S("usb_SN:123"), *S("SN:"))), nullopt);
  EXPECT_EQ(text(make(*S("usb_MFG:Acme"))), "Acme");
  EXPECT_EQ(text(model(*S("MFG:HP; MDL: LaserJet"))), " LaserJet") << "value untrimmed";
  EXPECT_EQ(text(make(*S(" \t MFG:Tabbed "))), "Tabbed ");
  // Any space separator counts as a blank; a line break does not.
  EXPECT_EQ(text(make(*S("\xC2\xA0\xE3\x80\x80MFG:Wide"))), "Wide");  // NBSP, ideographic space
  EXPECT_EQ(text(make(*S("\nMFG:X"))), nullopt);
  EXPECT_EQ(text(make(*S("xMFG:X;MFG:Y"))), "Y");
  // A later occurrence in the same component is not looked for.
  EXPECT_EQ(text(make(*S("AMFG:MFG:X"))), nullopt);
}

TEST(KeySearch, NilIsDistinctFromEmpty) {
  EXPECT_EQ(text(make(*S("MFG:;MDL:X;product:(Other Thing)"))), "");
  EXPECT_EQ(text(make(*S("MDL:X"))), nullopt);
  EXPECT_EQ(text(commandSet(*S(""))), nullopt);
  EXPECT_EQ(text(searchStringFor(*S("MFG:X"), *keys({}))), nullopt);
  EXPECT_EQ(text(stringForKey(*S("MFG:X"), *S(""))), nullopt) << "an empty key is never found";
  EXPECT_EQ(text(stringForKey(*S(";;"), *S(";"))), nullopt);
  // Non-string keys are passed over.
  auto mixed = qr::make<qr::MutableArray>();
  mixed->append(qr::make<qr::MutableArray>());
  mixed->append(S("MDL:"));
  EXPECT_EQ(text(searchStringFor(*S("MDL:Q"), *mixed)), "Q");
}

TEST(KeySearch, AKeyWithoutItsColonGivesTheColonBack) {
  EXPECT_EQ(text(stringForKey(*S("MFG:HP"), *S("MFG"))), ":HP");
}

TEST(KeySearch, CompatibleIDKeysKeepTheirSpelling) {
  EXPECT_EQ(text(compatibleIDs(*S("COMPATIBLITY ID:x"))), "x");
  EXPECT_EQ(text(compatibleIDs(*S("COMPATIBILITY ID:x"))), nullopt);
  EXPECT_EQ(text(compatibleIDs(*S("usb_COMPATIBLITY ID:y"))), "y");
}

TEST(KeySearch, LetterCaseFoldsOneCodePointToOneCodePoint) {
  // Long s folds to s; Kelvin sign folds to k; sharp s does not match "ss".
  EXPECT_EQ(text(serialNumber(*S("\xC5\xBFN:long-s"))), "long-s");
  EXPECT_EQ(text(stringForKey(*S("\xE2\x84\xAA"
                                 "ey:v"),
                              *S("key:"))),
            "v");
  EXPECT_EQ(text(stringForKey(*S("STRASSE:1"), *S("stra\xC3\x9F"
                                                  "e:"))),
            nullopt);
  EXPECT_EQ(text(stringForKey(*S("stra\xC3\x9F"
                                 "e:1"),
                              *S("STRASSE:"))),
            nullopt);
  EXPECT_EQ(text(stringForKey(*S("STRA\xE1\xBA\x9E"
                                 "E:2"),
                              *S("stra\xC3\x9F"
                                 "e:"))),
            "2");
  // Non-ASCII keys and values, and letters outside the basic plane.
  EXPECT_EQ(text(stringForKey(*S("\xC3\x89TAT:pr\xC3\xAAt"), *S("\xC3\xA9tat:"))), "pr\xC3\xAAt");
  EXPECT_EQ(text(stringForKey(*S("\xF0\x90\x90\x80:deseret"), *S("\xF0\x90\x90\xA8:"))), "deseret");
  EXPECT_EQ(text(model(*S("MDL:\xF0\x9F\x96\xA8 Printer"))), "\xF0\x9F\x96\xA8 Printer");
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
  // Keys with blanks at their ends match only at the very start of a component.
  EXPECT_EQ(text(stringForKey(*S(" MFG:A"), *S(" MFG:"))), "A");
  EXPECT_EQ(text(stringForKey(*S("  MFG:A"), *S(" MFG:"))), nullopt);
  EXPECT_EQ(text(stringForKey(*S("MFG: A"), *S("MFG: "))), "A");
  EXPECT_EQ(text(stringForKey(*S(" MFG: A"), *S("MFG: "))), nullopt);
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
