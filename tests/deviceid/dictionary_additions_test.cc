// Device ID questions asked of dictionaries of device properties.
#include <gtest/gtest.h>

#include "device_id_test_support.h"
#include "deviceid/dictionary_additions.h"
#include "deviceid/string_additions.h"
#include "platform/boolean.h"
#include "platform/dictionary.h"
#include "platform/number.h"

using namespace deviceid_test;
using namespace PMDictionaryAdditions;
using std::nullopt;

namespace {

qr::Ref<qr::MutableDictionary> dict(
    std::initializer_list<std::pair<std::string_view, std::string_view>> entries) {
  auto d = qr::make<qr::MutableDictionary>();
  for (auto [k, v] : entries) d->set(k, S(v));
  return d;
}

}  // namespace

TEST(DictionaryAccessors, FieldsByKeyPreference) {
  auto d = dict({{"MFG", "HP"}, {"MDL", "LaserJet 4000"}});
  EXPECT_EQ(text(make(*d)), "HP");
  EXPECT_EQ(text(model(*d)), "LaserJet 4000");
  EXPECT_EQ(text(product(*d)), "(HP LaserJet 4000)");
  EXPECT_EQ(text(softwareUpdateScaneID(*d)), "MANUFACTURER:HP;MODEL:LaserJet 4000");
  // The list decides, not the dictionary's order.
  EXPECT_EQ(text(make(*dict({{"MANUFACTURER", "Acme"}, {"MFG", "HP"}}))), "HP");
  EXPECT_EQ(text(make(*dict({{"usb_MANUFACTURER", "U"}, {"usb_MFG", "M"}}))), "M");
  EXPECT_EQ(text(commandSet(*dict({{"pdl", "p"}, {"usb_COMMAND SET", "u"}}))), "u");
  EXPECT_EQ(text(serialNumber(*dict({{"usb_SN", "2"}, {"SERN", "1"}}))), "1");
  EXPECT_EQ(text(compatibleIDs(*dict({{"usb_COMPATIBLITY ID", "c"}}))), "c");
  EXPECT_EQ(text(compatibleIDs(*dict({{"COMPATIBILITY ID", "c"}}))), nullopt);
}

TEST(DictionaryAccessors, KeysMatchExactly) {
  EXPECT_EQ(text(make(*dict({{"mfg", "HP"}}))), nullopt);
  EXPECT_EQ(text(make(*dict({{" MFG", "HP"}}))), nullopt);
  EXPECT_EQ(text(make(*dict({{"usb_G", "HP"}}))), nullopt) << "no usb_G here";
  EXPECT_EQ(text(model(*dict({{"ty", "LaserJet"}}))), nullopt) << "no ty here";
  EXPECT_EQ(text(make(*dict({{"MFG", ""}, {"product", "(A B)"}}))), "") << "empty counts";
  // A dictionary from the string form has lower-cased keys: only pdl and product are found.
  auto fromString = PMStringAdditions::dictionaryValue(
      *S("MFG:HP;MDL:X;CMD:PCL;pdl:application/pdf;product:(Acme Jet)"));
  ASSERT_TRUE(fromString);
  EXPECT_EQ(text(make(*fromString)), "Acme");
  EXPECT_EQ(text(commandSet(*fromString)), "application/pdf");
}

TEST(DictionaryAccessors, StoredValuesComeBackThemselves) {
  auto stored = S("  HP ");
  auto number = qr::Number::integer(42);
  auto d = qr::make<qr::MutableDictionary>();
  d->set("MFG", stored);
  d->set("SN", number);
  EXPECT_EQ(make(*d).get(), stored.get());
  EXPECT_EQ(serialNumber(*d).get(), number.get());
}

TEST(DictionaryAccessors, ProductRuleAndItsOpenCases) {
  auto d = dict({{"product", "(Hewlett-Packard LaserJet 4000)"}});
  EXPECT_EQ(text(make(*d)), "Hewlett-Packard");
  EXPECT_EQ(text(model(*d)), "LaserJet 4000");
  EXPECT_EQ(text(product(*d)), "(HP LaserJet 4000)");
  auto deskjet = dict({{"product", "(deskjet 990c)"}});
  EXPECT_EQ(text(make(*deskjet)), "hp");
  EXPECT_EQ(text(softwareUpdateScaneID(*deskjet)), "MANUFACTURER:hp;MODEL:deskjet 990c");
  EXPECT_EQ(text(make(*dict({{"product", " x)"}}))), nullopt);
  EXPECT_EQ(text(model(*dict({{"product", "(x "}}))), nullopt);
  EXPECT_EQ(text(make(*dict({{"product", ""}}))), nullopt);
  EXPECT_EQ(text(product(*dict({{"product", ""}, {"MFG", "A"}, {"MDL", "B"}}))), "")
      << "a present product entry is used even when empty";
  EXPECT_EQ(text(model(*dict({{"product", "(\xC3\x89pson \xF0\x9F\x96\xA8)"}}))),
            "\xF0\x9F\x96\xA8");
}

TEST(DictionaryAccessors, ProductAndIdentifierMixNarrowAndWideText) {
  auto d = dict({{"MFG", "\xC3\x89pson"}, {"MDL", "\xC3\x89pson Stylus"}});
  EXPECT_EQ(text(softwareUpdateScaneID(*d)), "MANUFACTURER:\xC3\x89pson;MODEL:Stylus");
  EXPECT_EQ(text(product(*dict({{"MFG", "hewlett-packard"}, {"MDL", "\xC3\xA9"}}))),
            "(HP \xC3\xA9)");
  EXPECT_EQ(text(softwareUpdateScaneID(*dict({{"MFG", "A"}}))), nullopt);
}

TEST(DictionaryAccessors, NonStringValuesAreReadAsTheirDescription) {
  auto d = qr::make<qr::MutableDictionary>();
  d->set("MFG", qr::Number::integer(7));
  d->set("MDL", qr::Boolean::trueValue());
  EXPECT_EQ(text(product(*d)), "(7 true)");
  EXPECT_EQ(text(softwareUpdateScaneID(*d)), "MANUFACTURER:7;MODEL:true");
  auto c = qr::make<qr::MutableDictionary>();
  c->set("CMD", qr::Number::integer(5));
  EXPECT_FALSE(supportsPCL(*c));
  EXPECT_FALSE(supportsPostscript(*c));
}

TEST(DictionaryAccessors, CapabilityTests) {
  auto pdl = dict({{"pdl", "application/postscript,application/pdf"}});
  EXPECT_EQ(text(commandSet(*pdl)), "application/postscript,application/pdf");
  EXPECT_TRUE(supportsPostscript(*pdl));
  EXPECT_FALSE(supportsPCL(*pdl));
  // The dictionary value may hold ";": each part is an item of its own.
  EXPECT_TRUE(supportsPostscript(*dict({{"CMD", "PCL;PS"}})));
  EXPECT_FALSE(supportsPostscript(*dict({{"CMD", "PCL,PS"}})));
  EXPECT_TRUE(supportsPCL(*dict({{"CMD", "pcl6"}})));
}

TEST(DictionaryAccessors, EmptyDictionary) {
  auto d = qr::make<qr::MutableDictionary>();
  EXPECT_EQ(text(stringValue(*d)), "");
  EXPECT_EQ(text(product(*d)), "");
  EXPECT_EQ(text(make(*d)), nullopt);
  EXPECT_EQ(text(model(*d)), nullopt);
  EXPECT_EQ(text(commandSet(*d)), nullopt);
  EXPECT_EQ(text(serialNumber(*d)), nullopt);
  EXPECT_EQ(text(compatibleIDs(*d)), nullopt);
  EXPECT_EQ(text(softwareUpdateScaneID(*d)), nullopt);
  EXPECT_TRUE(supportsPostscript(*d));
  EXPECT_FALSE(supportsPCL(*d));
}

TEST(DictionaryAccessors, StringValueFollowsEnumerationOrderUnescaped) {
  EXPECT_EQ(text(stringValue(*dict({{"MFG", "HP"}, {"MDL", "X"}}))), "MFG:HP;MDL:X");
  EXPECT_EQ(text(stringValue(*dict({{"MDL", "X"}, {"MFG", "HP"}}))), "MDL:X;MFG:HP");
  EXPECT_EQ(text(stringValue(*dict({{"a:b", "c;d"}, {"\xC3\xA9", "\xF0\x9F\x96\xA8"}}))),
            "a:b:c;d;\xC3\xA9:\xF0\x9F\x96\xA8");
  auto d = qr::make<qr::MutableDictionary>();
  d->set("n", qr::Number::integer(-3));
  d->set(qr::Number::integer(1), S("one"));
  EXPECT_EQ(text(stringValue(*d)), "n:-3;1:one");
  // A wide value with a lone surrogate is written as it is.
  auto lone = qr::make<qr::MutableDictionary>();
  lone->set("k", qr::String::fromUTF16(u"\xD800"));
  auto written = stringValue(*lone);
  ASSERT_EQ(written->length(), 3u);
  EXPECT_EQ(written->at(2), 0xD800);
}
