// The product rule, the product string, the vendor clean-up, the display name
// and the software-update identifier of device ID strings.
#include <gtest/gtest.h>

#include "device_id_test_support.h"
#include "deviceid/device_id_rules.h"
#include "deviceid/string_additions.h"

using namespace deviceid_test;
using namespace PMStringAdditions;
using std::nullopt;

TEST(ProductRule, MakeAndModelFromTheProductValueAndItsOpenCases) {
  // Outer characters are dropped untested; deskjet belongs to HP, case-sensitively.
  // No product, an empty one, no space or a first space first: no make; one
  // character of room gives an empty part; make keys win over the product value.
  expectCases("make", make,
              {{"product:(Hewlett-Packard LaserJet 4000)", "Hewlett-Packard"},
               {"product:<Acme Jet 5]", "Acme"},
               {"product:(deskjet 990c)", "hp"},
               {"product:(Deskjet 990c)", "Deskjet"},
               {"product:", nullopt},
               {"product:(Acme)", nullopt},
               {"product: Acme)", nullopt},
               {"product: ", nullopt},
               {"product:(Acme ", "Acme"},
               {"product:( x)", ""},
               {"product:(A B);MFG:M", "M"}});
  // No space or a first space last: no model; "ty:" comes before the product value.
  expectCases("model", model,
              {{"product:(Hewlett-Packard LaserJet 4000)", "LaserJet 4000"},
               {"product:<Acme Jet 5]", "Jet 5"},
               {"product:(deskjet 990c)", "deskjet 990c"},
               {"product:(deskjet", "deskje"},
               {"product:", nullopt},
               {"product:x", nullopt},
               {"product:(Acme ", nullopt},
               {"product: ", nullopt},
               {"product: Acme)", "Acme"},
               {"product:(x )", ""},
               {"product:(A B);ty:T", "T"},
               {"product:(Acme \xF0\x9F\x96\xA8)", "\xF0\x9F\x96\xA8"}});
  // The model drops the last code unit, so a trailing pair loses its low half.
  auto split = model(*S("product:(Acme Jet\xF0\x9F\x96\xA8"));
  ASSERT_TRUE(split);
  EXPECT_EQ(split->length(), 4u);
  EXPECT_EQ(split->at(3), 0xD83D);
}

TEST(Product, ProductValueElseParenthesisedMakeAndModelThenCleanUp) {
  // Make and model are not trimmed; without a model the product is empty, not null.
  expectCases("product", product,
              {{"product:(deskjet 990c)", "(deskjet 990c)"},
               {"MFG:HP;MDL:LaserJet 4000;CMD:PJL,PCL,POSTSCRIPT;", "(HP LaserJet 4000)"},
               {"MFG: HP ;MDL:X ", "( HP  X )"},
               {"MFG:HP", ""},
               {"", ""},
               {"product:anything at all;MFG:Z;MDL:Y", "anything at all"}});
  // Each clean-up group makes at most one replacement, of the first occurrence,
  // in table order (group 1 stops after its first hit, though its third row
  // would match the leftover); both groups apply, group 1 first; the
  // parenthesised form needs its parenthesis; case folding reaches non-ASCII
  // letters that fold to ASCII (the Kelvin sign).
  expectCases(
      "product", product,
      {{"product:(Hewlett-Packard LaserJet 4000)", "(HP LaserJet 4000)"},
       {"product:(HP HP LaserJet)", "(HP LaserJet)"},
       {"product:(hewlett-packard hp 5)", "(HP 5)"},
       {"product:(Hewlett-Packard HPX)", "(HPX)"},
       {"product:(Hewlett-Packard Jet)", "(HP Jet)"},
       {"product:(HP HP (Hewlett-Packard X)", "(HP (Hewlett-Packard X)"},
       {"product:(HP HP (HP HP)", "(HP (HP HP)"},
       {"product:(Lexmark International Lexmark T (Hewlett-Packard Z)", "(Lexmark T (HP Z)"},
       {"product:(LEXMARK INTERNATIONAL E)", "(Lexmark E)"},
       {"product:(Lexmark Lexmark C)", "(Lexmark C)"},
       {"product:[HP HP 1]", "[HP HP 1]"},
       {"product:(Hewlett-Pac\xE2\x84\xAA"
        "ard Jet)",
        "(HP Jet)"}});
  auto p = product(*S("MFG:a;MDL:b"));
  p->appendUTF8("!");  // the result is the caller's own mutable string
  EXPECT_EQ(text(p), "(a b)!");
}

TEST(CleanUp, PlainFormRunsOnTheJoinedName) {
  qr::deviceid::Buffer<char> name = "x Hewlett-Packard HP y";
  qr::deviceid::cleanUpVendorNames(name, qr::deviceid::CleanUpForm::Plain);
  EXPECT_EQ(name, "x HP y");
  std::u16string wide = u"\u00e9 lexmark lexmark z";
  qr::deviceid::cleanUpVendorNames(wide, qr::deviceid::CleanUpForm::Plain);
  EXPECT_EQ(wide, u"\u00e9 Lexmark z");
}

TEST(DeviceName, JoinsOrPrefersTheModelThenCleansUpElseFallsBack) {
  // An empty make is never a prefix. Without both: the model (not cleaned up),
  // the make, the description (not trimmed), "Unknown".
  expectCases(
      "deviceName", deviceName,
      {{"MFG:HP;MDL:LaserJet 4000;CMD:PJL,PCL,POSTSCRIPT;", "HP LaserJet 4000"},
       {"product:(Hewlett-Packard LaserJet 4000)", "HP LaserJet 4000"},
       {"product:(deskjet 990c)", "hp deskjet 990c"},
       {"MFG:Lexmark International;MDL:Lexmark T640", "Lexmark T640"},
       {"MFG:HP;MDL:HP LaserJet", "HP LaserJet"},
       {"MFG:hp;MDL:HP LaserJet", "HP LaserJet"},
       {"MFG: \tAcme \t;MDL:  Acme Jet  ", "Acme Jet"},
       {"MFG:;MDL:Jet", " Jet"},
       {"MDL: HP HP Solo ", "HP HP Solo"},
       {"MFG:\tHewlett-Packard ", "Hewlett-Packard"},
       {"DES:Office printer", "Office printer"},
       {"DESCRIPTION: Lobby ", " Lobby "},
       {"CMD:PCL", "Unknown"},
       {"", "Unknown"},
       {"MFG:\xC3\x89pson;MDL:\xC3\x89pson \xF0\x9F\x96\xA8", "\xC3\x89pson \xF0\x9F\x96\xA8"}});
}

TEST(SoftwareUpdateIdentifier, MakeAndModelWithTheRepeatedMakeDropped) {
  // The repeated make goes only with its case and a space; no clean-up.
  expectCases(
      "softwareUpdateScaneID", softwareUpdateScaneID,
      {{"MFG:HP;MDL:LaserJet 4000;CMD:PJL,PCL,POSTSCRIPT;", "MANUFACTURER:HP;MODEL:LaserJet 4000"},
       {"MFG:HP;MDL:HP LaserJet", "MANUFACTURER:HP;MODEL:LaserJet"},
       {"MFG:hp;MDL:HP LaserJet", "MANUFACTURER:hp;MODEL:HP LaserJet"},
       {"MFG: HP ;MDL: HP  X ", "MANUFACTURER:HP;MODEL: X"},
       {"MFG:HP;MDL:HPX", "MANUFACTURER:HP;MODEL:HPX"},
       {"MFG:Hewlett-Packard HP;MDL:X", "MANUFACTURER:Hewlett-Packard HP;MODEL:X"},
       {"product:( )", "MANUFACTURER:;MODEL:"},
       {"MFG:HP", nullopt},
       {"", nullopt}});
}
