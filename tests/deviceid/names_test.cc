// The product rule, the product string, the vendor clean-up, the display name
// and the software-update identifier of device ID strings.
#include <gtest/gtest.h>

#include "device_id_test_support.h"
#include "deviceid/device_id_rules.h"
#include "deviceid/string_additions.h"

using namespace deviceid_test;
using namespace PMStringAdditions;
using std::nullopt;

TEST(ProductRule, MakeAndModelFromTheProductValue) {
  auto id = S("product:(Hewlett-Packard LaserJet 4000)");
  EXPECT_EQ(text(make(*id)), "Hewlett-Packard");
  EXPECT_EQ(text(model(*id)), "LaserJet 4000");
  EXPECT_EQ(text(product(*id)), "(HP LaserJet 4000)");
  EXPECT_EQ(text(deviceName(*id)), "HP LaserJet 4000");
  // Outer characters are dropped without testing them.
  EXPECT_EQ(text(make(*S("product:<Acme Jet 5]"))), "Acme");
  EXPECT_EQ(text(model(*S("product:<Acme Jet 5]"))), "Jet 5");
}

TEST(ProductRule, DeskjetBelongsToHP) {
  auto id = S("product:(deskjet 990c)");
  EXPECT_EQ(text(make(*id)), "hp");
  EXPECT_EQ(text(model(*id)), "deskjet 990c");
  EXPECT_EQ(text(product(*id)), "(deskjet 990c)");
  EXPECT_EQ(text(deviceName(*id)), "hp deskjet 990c");
  EXPECT_EQ(text(make(*S("product:(Deskjet 990c)"))), "Deskjet") << "prefix is case-sensitive";
  EXPECT_EQ(text(model(*S("product:(deskjet"))), "deskje");
}

TEST(ProductRule, OpenCasesGiveNoValueAndNeverReadOutOfBounds) {
  // No product, an empty one, no space.
  EXPECT_EQ(text(make(*S("product:"))), nullopt);
  EXPECT_EQ(text(model(*S("product:"))), nullopt);
  EXPECT_EQ(text(make(*S("product:(Acme)"))), nullopt);
  EXPECT_EQ(text(model(*S("product:x"))), nullopt);
  // First space first: no make; first space last: no model.
  EXPECT_EQ(text(make(*S("product: Acme)"))), nullopt);
  EXPECT_EQ(text(model(*S("product: Acme)"))), "Acme");
  EXPECT_EQ(text(make(*S("product:(Acme "))), "Acme");
  EXPECT_EQ(text(model(*S("product:(Acme "))), nullopt);
  EXPECT_EQ(text(make(*S("product: "))), nullopt);
  EXPECT_EQ(text(model(*S("product: "))), nullopt);
  // One character of room on either side gives empty parts, not failures.
  EXPECT_EQ(text(make(*S("product:( x)"))), "");
  EXPECT_EQ(text(model(*S("product:(x )"))), "");
  EXPECT_EQ(text(softwareUpdateScaneID(*S("product:( )"))), "MANUFACTURER:;MODEL:");
  // Make and model keys win over the product value; "ty:" comes before it for the model.
  EXPECT_EQ(text(model(*S("product:(A B);ty:T"))), "T");
  EXPECT_EQ(text(make(*S("product:(A B);MFG:M"))), "M");
}

TEST(ProductRule, SurrogatePairsCountAsTwoUnits) {
  // The model drops the last code unit, so a trailing pair loses its low half.
  auto id = S("product:(Acme \xF0\x9F\x96\xA8)");
  EXPECT_EQ(text(model(*id)), "\xF0\x9F\x96\xA8");
  auto split = model(*S("product:(Acme Jet\xF0\x9F\x96\xA8"));
  ASSERT_TRUE(split);
  EXPECT_EQ(split->length(), 4u);
  EXPECT_EQ(split->at(3), 0xD83D);
}

TEST(Product, ProductValueElseParenthesisedMakeAndModel) {
  EXPECT_EQ(text(product(*S("MFG:HP;MDL:LaserJet 4000;CMD:PJL,PCL,POSTSCRIPT;"))),
            "(HP LaserJet 4000)");
  EXPECT_EQ(text(product(*S("MFG: HP ;MDL:X "))), "( HP  X )") << "not trimmed";
  EXPECT_EQ(text(product(*S("MFG:HP"))), "") << "empty, not null, without a model";
  EXPECT_EQ(text(product(*S(""))), "");
  EXPECT_EQ(text(product(*S("product:anything at all;MFG:Z;MDL:Y"))), "anything at all");
  auto p = product(*S("MFG:a;MDL:b"));
  p->appendUTF8("!");  // the result is the caller's own mutable string
  EXPECT_EQ(text(p), "(a b)!");
}

TEST(CleanUp, EachGroupMakesAtMostOneReplacementInTableOrder) {
  EXPECT_EQ(text(product(*S("product:(HP HP LaserJet)"))), "(HP LaserJet)");
  EXPECT_EQ(text(product(*S("product:(hewlett-packard hp 5)"))), "(HP 5)");
  EXPECT_EQ(text(product(*S("product:(Hewlett-Packard HPX)"))), "(HPX)") << "no space needed";
  EXPECT_EQ(text(product(*S("product:(Hewlett-Packard Jet)"))), "(HP Jet)");
  // Group 1 stops after its first hit; the third row would match the leftover.
  EXPECT_EQ(text(product(*S("product:(HP HP (Hewlett-Packard X)"))), "(HP (Hewlett-Packard X)");
  // Only the first occurrence is replaced.
  EXPECT_EQ(text(product(*S("product:(HP HP (HP HP)"))), "(HP (HP HP)");
  // Both groups apply, group 1 first.
  EXPECT_EQ(text(product(*S("product:(Lexmark International Lexmark T (Hewlett-Packard Z)"))),
            "(Lexmark T (HP Z)");
  EXPECT_EQ(text(product(*S("product:(LEXMARK INTERNATIONAL E)"))), "(Lexmark E)");
  EXPECT_EQ(text(product(*S("product:(Lexmark Lexmark C)"))), "(Lexmark C)");
  // The parenthesised form needs its parenthesis.
  EXPECT_EQ(text(product(*S("product:[HP HP 1]"))), "[HP HP 1]");
  // Case folding reaches non-ASCII letters that fold to ASCII (Kelvin sign).
  EXPECT_EQ(text(product(*S("product:(Hewlett-Pac\xE2\x84\xAA"
                            "ard Jet)"))),
            "(HP Jet)");
}

TEST(CleanUp, PlainFormRunsOnTheJoinedName) {
  qr::deviceid::Buffer<char> name = "x Hewlett-Packard HP y";
  qr::deviceid::cleanUpVendorNames(name, qr::deviceid::CleanUpForm::Plain);
  EXPECT_EQ(name, "x HP y");
  std::u16string wide = u"\u00e9 lexmark lexmark z";
  qr::deviceid::cleanUpVendorNames(wide, qr::deviceid::CleanUpForm::Plain);
  EXPECT_EQ(wide, u"\u00e9 Lexmark z");
}

TEST(DeviceName, JoinsOrPrefersTheModelThenCleansUp) {
  EXPECT_EQ(text(deviceName(*S("MFG:HP;MDL:LaserJet 4000;CMD:PJL,PCL,POSTSCRIPT;"))),
            "HP LaserJet 4000");
  EXPECT_EQ(text(deviceName(*S("MFG:Lexmark International;MDL:Lexmark T640"))), "Lexmark T640");
  EXPECT_EQ(text(deviceName(*S("MFG:HP;MDL:HP LaserJet"))), "HP LaserJet");
  EXPECT_EQ(text(deviceName(*S("MFG:hp;MDL:HP LaserJet"))), "HP LaserJet");
  EXPECT_EQ(text(deviceName(*S("MFG: \tAcme \t;MDL:  Acme Jet  "))), "Acme Jet");
  EXPECT_EQ(text(deviceName(*S("MFG:;MDL:Jet"))), " Jet") << "an empty make is never a prefix";
}

TEST(DeviceName, FallsBackOnModelMakeDescriptionThenUnknown) {
  EXPECT_EQ(text(deviceName(*S("MDL: HP HP Solo "))), "HP HP Solo") << "no clean-up";
  EXPECT_EQ(text(deviceName(*S("MFG:\tHewlett-Packard "))), "Hewlett-Packard");
  EXPECT_EQ(text(deviceName(*S("DES:Office printer"))), "Office printer");
  EXPECT_EQ(text(deviceName(*S("DESCRIPTION: Lobby "))), " Lobby ") << "not trimmed";
  EXPECT_EQ(text(deviceName(*S("CMD:PCL"))), "Unknown");
  EXPECT_EQ(text(deviceName(*S(""))), "Unknown");
  EXPECT_EQ(text(deviceName(*S("MFG:\xC3\x89pson;MDL:\xC3\x89pson \xF0\x9F\x96\xA8"))),
            "\xC3\x89pson \xF0\x9F\x96\xA8");
}

TEST(SoftwareUpdateIdentifier, MakeAndModelWithTheRepeatedMakeDropped) {
  EXPECT_EQ(text(softwareUpdateScaneID(*S("MFG:HP;MDL:LaserJet 4000;CMD:PJL,PCL,POSTSCRIPT;"))),
            "MANUFACTURER:HP;MODEL:LaserJet 4000");
  EXPECT_EQ(text(softwareUpdateScaneID(*S("MFG:HP;MDL:HP LaserJet"))),
            "MANUFACTURER:HP;MODEL:LaserJet");
  EXPECT_EQ(text(softwareUpdateScaneID(*S("MFG:hp;MDL:HP LaserJet"))),
            "MANUFACTURER:hp;MODEL:HP LaserJet");
  EXPECT_EQ(text(softwareUpdateScaneID(*S("MFG: HP ;MDL: HP  X "))), "MANUFACTURER:HP;MODEL: X");
  EXPECT_EQ(text(softwareUpdateScaneID(*S("MFG:HP;MDL:HPX"))), "MANUFACTURER:HP;MODEL:HPX");
  EXPECT_EQ(text(softwareUpdateScaneID(*S("MFG:Hewlett-Packard HP;MDL:X"))),
            "MANUFACTURER:Hewlett-Packard HP;MODEL:X")
      << "no clean-up";
  EXPECT_EQ(text(softwareUpdateScaneID(*S("MFG:HP"))), nullopt);
  EXPECT_EQ(text(softwareUpdateScaneID(*S(""))), nullopt);
}
