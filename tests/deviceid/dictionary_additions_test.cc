// Device ID questions asked of dictionaries of device properties.
#include <gtest/gtest.h>

#include "device_id_test_support.h"
#include "deviceid/dictionary_additions.h"
#include "deviceid/string_additions.h"
#include "values/boolean.h"
#include "values/dictionary.h"
#include "values/number.h"

using namespace deviceid_test;
using namespace PMDictionaryAdditions;
using std::nullopt;

namespace {

// A dictionary of strings from "KEY=value|KEY=value", in that order.
qr::Ref<qr::MutableDictionary> dict(std::string_view entries) {
  auto d = qr::make<qr::MutableDictionary>();
  while (!entries.empty()) {
    std::string_view entry = entries.substr(0, entries.find('|'));
    size_t equals = entry.find('=');
    d->set(entry.substr(0, equals), S(entry.substr(equals + 1)));
    entries.remove_prefix(std::min(entries.size(), entry.size() + 1));
  }
  return d;
}

}  // namespace

TEST(DictionaryAccessors, FieldsByKeyPreferenceAndTheProductRule) {
  // The key list decides, not the dictionary's order; keys match exactly (no
  // usb_G or ty here); an empty value counts. The product rule: deskjet
  // belongs to HP, a first space first gives no make, last no model.
  expectCases("make", make,
              {{"MFG=HP|MDL=LaserJet 4000", "HP"},
               {"MANUFACTURER=Acme|MFG=HP", "HP"},
               {"usb_MANUFACTURER=U|usb_MFG=M", "M"},
               {"mfg=HP", nullopt},
               {" MFG=HP", nullopt},
               {"usb_G=HP", nullopt},
               {"MFG=|product=(A B)", ""},
               {"product=(Hewlett-Packard LaserJet 4000)", "Hewlett-Packard"},
               {"product=(deskjet 990c)", "hp"},
               {"product= x)", nullopt},
               {"product=", nullopt},
               {"", nullopt}},
              dict);
  expectCases("model", model,
              {{"MFG=HP|MDL=LaserJet 4000", "LaserJet 4000"},
               {"ty=LaserJet", nullopt},
               {"product=(Hewlett-Packard LaserJet 4000)", "LaserJet 4000"},
               {"product=(x ", nullopt},
               {"product=(\xC3\x89pson \xF0\x9F\x96\xA8)", "\xF0\x9F\x96\xA8"},
               {"", nullopt}},
              dict);
  // A present product entry is used even when empty; narrow and wide text mix.
  expectCases("product", product,
              {{"MFG=HP|MDL=LaserJet 4000", "(HP LaserJet 4000)"},
               {"product=(Hewlett-Packard LaserJet 4000)", "(HP LaserJet 4000)"},
               {"product=|MFG=A|MDL=B", ""},
               {"MFG=hewlett-packard|MDL=\xC3\xA9", "(HP \xC3\xA9)"},
               {"", ""}},
              dict);
  expectCases(
      "softwareUpdateScaneID", softwareUpdateScaneID,
      {{"MFG=HP|MDL=LaserJet 4000", "MANUFACTURER:HP;MODEL:LaserJet 4000"},
       {"product=(deskjet 990c)", "MANUFACTURER:hp;MODEL:deskjet 990c"},
       {"MFG=\xC3\x89pson|MDL=\xC3\x89pson Stylus", "MANUFACTURER:\xC3\x89pson;MODEL:Stylus"},
       {"MFG=A", nullopt},
       {"", nullopt}},
      dict);
  expectCases(
      "commandSet", commandSet,
      {{"pdl=p|usb_COMMAND SET=u", "u"},
       {"pdl=application/postscript,application/pdf", "application/postscript,application/pdf"},
       {"", nullopt}},
      dict);
  expectCases("serialNumber", serialNumber, {{"usb_SN=2|SERN=1", "1"}, {"", nullopt}}, dict);
  expectCases("compatibleIDs", compatibleIDs,
              {{"usb_COMPATIBLITY ID=c", "c"}, {"COMPATIBILITY ID=c", nullopt}, {"", nullopt}},
              dict);
  // Enumeration order, unescaped.
  expectCases("stringValue", stringValue,
              {{"MFG=HP|MDL=X", "MFG:HP;MDL:X"},
               {"MDL=X|MFG=HP", "MDL:X;MFG:HP"},
               {"a:b=c;d|\xC3\xA9=\xF0\x9F\x96\xA8", "a:b:c;d;\xC3\xA9:\xF0\x9F\x96\xA8"},
               {"", ""}},
              dict);

  // A dictionary from the string form has lower-cased keys: only pdl and product are found.
  auto fromString = PMStringAdditions::dictionaryValue(
      *S("MFG:HP;MDL:X;CMD:PCL;pdl:application/pdf;product:(Acme Jet)"));
  ASSERT_TRUE(fromString);
  EXPECT_EQ(text(make(*fromString)), "Acme");
  EXPECT_EQ(text(commandSet(*fromString)), "application/pdf");
}

TEST(DictionaryAccessors, ValuesThatAreNotPlainStrings) {
  // Stored values come back themselves.
  auto stored = S("  HP ");
  auto number = qr::Number::integer(42);
  auto d = qr::make<qr::MutableDictionary>();
  d->set("MFG", stored);
  d->set("SN", number);
  EXPECT_EQ(make(*d).get(), stored.get());
  EXPECT_EQ(serialNumber(*d).get(), number.get());
  // Others are read as their description.
  d->set("MFG", qr::Number::integer(7));
  d->set("MDL", qr::Boolean::trueValue());
  EXPECT_EQ(text(product(*d)), "(7 true)");
  EXPECT_EQ(text(softwareUpdateScaneID(*d)), "MANUFACTURER:7;MODEL:true");
  d->set(qr::Number::integer(1), S("one"));
  EXPECT_EQ(text(stringValue(*d)), "MFG:7;SN:42;MDL:true;1:one");
  auto c = qr::make<qr::MutableDictionary>();
  c->set("CMD", qr::Number::integer(5));
  EXPECT_FALSE(supportsPCL(*c));
  EXPECT_FALSE(supportsPostscript(*c));
  // A wide value with a lone surrogate is written as it is.
  auto lone = qr::make<qr::MutableDictionary>();
  lone->set("k", qr::String::fromUTF16(u"\xD800"));
  auto written = stringValue(*lone);
  ASSERT_EQ(written->length(), 3u);
  EXPECT_EQ(written->at(2), 0xD800);
}

TEST(DictionaryAccessors, CapabilityTests) {
  // The dictionary value may hold ";": each part is an item of its own.
  struct {
    const char* entries;
    bool pcl, postscript;
  } cases[] = {{"pdl=application/postscript,application/pdf", false, true},
               {"CMD=PCL;PS", true, true},
               {"CMD=PCL,PS", true, false},
               {"CMD=pcl6", true, false},
               {"", false, true}};
  for (const auto& c : cases) {
    EXPECT_EQ(supportsPCL(*dict(c.entries)), c.pcl) << c.entries;
    EXPECT_EQ(supportsPostscript(*dict(c.entries)), c.postscript) << c.entries;
  }
}
