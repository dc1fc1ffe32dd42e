// The dictionary form of device ID strings, the capability tests and percent
// escaping.
#include <gtest/gtest.h>

#include "device_id_test_support.h"
#include "deviceid/percent_escape.h"
#include "deviceid/string_additions.h"
#include "values/dictionary.h"

using namespace deviceid_test;
using namespace PMStringAdditions;
using std::nullopt;

namespace {

// "key=value|..." in the dictionary's order, to compare whole dictionaries.
std::string entries(const qr::Ref<qr::MutableDictionary>& d) {
  if (!d) return "(null)";
  std::string out;
  d->forEach([&](const qr::Object& k, const qr::Object& v) {
    if (!out.empty()) out += '|';
    out += k.description() + "=" + v.description();
  });
  return out;
}

}  // namespace

TEST(DictionaryForm, SplitsTrimsAndLowerCasesKeys) {
  EXPECT_EQ(entries(dictionaryValue(*S("MFG:HP;MDL:LaserJet;"))), "mfg=HP|mdl=LaserJet|=");
  EXPECT_EQ(entries(dictionaryValue(*S("A:1:2"))), "a=1:2");
  EXPECT_EQ(entries(dictionaryValue(*S("MFG:HP;mfg:Acme"))), "mfg=Acme");
  EXPECT_EQ(entries(dictionaryValue(*S(""))), "(null)");
  EXPECT_EQ(entries(dictionaryValue(*S(" \r\n Key \t: \x0B Va l \xE2\x80\xA8;Lone\n"))),
            "key=Va l|lone=");
  EXPECT_EQ(entries(dictionaryValue(*S(";;"))), "=");
  // The last of equal keys wins but keeps the first one's place.
  EXPECT_EQ(entries(dictionaryValue(*S("A:1;B:2;a:3"))), "a=3|b=2");
}

TEST(DictionaryForm, LowerCasingAndTrimmingFollowUnicode) {
  // Full lower-casing: capital I with dot above becomes i and a combining dot.
  EXPECT_EQ(entries(dictionaryValue(*S("\xC4\xB0"
                                       "D:1"))),
            "i\xCC\x87"
            "d=1");
  EXPECT_EQ(entries(dictionaryValue(*S("\xC3\x89TAT:Pr\xC3\x8AT"))), "\xC3\xA9tat=Pr\xC3\x8AT");
  EXPECT_EQ(entries(dictionaryValue(*S("\xF0\x90\x90\x80:x"))), "\xF0\x90\x90\xA8=x");
  // Ideographic space, next line and paragraph separator are trimmed.
  EXPECT_EQ(entries(dictionaryValue(*S("\xE3\x80\x80k\xC2\x85:\xE2\x80\xA9v"))), "k=v");
  auto wide = dictionaryValue(*wideASCII("MFG:HP"));
  ASSERT_TRUE(wide);
  EXPECT_EQ(entries(wide), "mfg=HP");
  EXPECT_TRUE(wide->get("mfg"));
}

TEST(DictionaryForm, AnySeparators) {
  auto form = [](const char* text, const char* key, const char* component) {
    return entries(dictionaryValueForKeySeperator(*S(text), *S(key), *S(component)));
  };
  EXPECT_EQ(form("a=1&b=2", "=", "&"), "a=1|b=2");
  EXPECT_EQ(form("a=>1,b", "=>", ","), "b=") << "a long key separator leaves its component out";
  EXPECT_EQ(form("a::1;;b", ":", ";;"), "a=:1|b=");
  EXPECT_EQ(form("A:1;B:2", "", ";"), "a:1=|b:2=") << "an empty key separator is never found";
  EXPECT_EQ(form("A:1;B:2", ":", ""), "a=1;B:2") << "an empty separator leaves one component";
  EXPECT_EQ(form("K\xC2\xB7V\xC2\xA6K2\xC2\xB7V2", "\xC2\xB7", "\xC2\xA6"), "k=V|k2=V2");
  // A separator outside the basic plane is two code units long.
  EXPECT_EQ(form("a\xF0\x9F\x96\xA8"
                 "1;b",
                 "\xF0\x9F\x96\xA8", ";"),
            "b=");
  EXPECT_EQ(form("", ":", ";"), "(null)");
}

TEST(CapabilityTests, PCLAnywhereAndPostscriptByNameOrAsAnItem) {
  struct Case {
    const char* deviceID;
    bool pcl, postscript;
  };
  const Case cases[] = {
      {"MFG:HP;MDL:LaserJet 4000;CMD:PJL,PCL,POSTSCRIPT;", true, true},
      {"CMD:PS", false, true},
      {"CMD:ps", false, true},
      {"CMD:PJL,POSTSCRIPT", false, true},
      {"CMD:PCL,PS", true, false},
      {"CMD:PCL", true, false},
      {"CMD:PCL6", true, false},
      {"CMD:pclxl", true, false},
      {"CMD:PJL PS PCL", true, true},
      {"CMD:PS ", false, false},
      {"CMD: PS", false, false},
      {"CMD:", false, false},
      {"MFG:HP", false, true},
      {"", false, true},
      {"pdl:application/postscript,application/pdf", false, true},
      {"CMD:P\xC5\xBF", false, true},  // long s folds to s
      {"CMD:PostScript\xF0\x9F\x96\xA8", false, true},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.deviceID);
    EXPECT_EQ(supportsPCL(*S(c.deviceID)), c.pcl);
    EXPECT_EQ(supportsPostscript(*S(c.deviceID)), c.postscript);
    EXPECT_EQ(supportsPCL(*wideASCII(c.deviceID)), c.pcl);
    EXPECT_EQ(supportsPostscript(*wideASCII(c.deviceID)), c.postscript);
  }
}

TEST(Escaping, EscapesTheTwelveAndEverythingAURLMayNotCarry) {
  auto esc = [](const char* utf8, qr::TextEncoding e = qr::TextEncoding::UTF8) {
    return text(pmStringByAddingPercentEscapesUsingEncoding(*S(utf8), e));
  };
  EXPECT_EQ(esc(" "), "%20");
  EXPECT_EQ(esc("@?&+,;=/():\\"), "%40%3F%26%2B%2C%3B%3D%2F%28%29%3A%5C");
  EXPECT_EQ(esc("aZ09-_.!~*'$"), "aZ09-_.!~*'$");
  EXPECT_EQ(esc("%#<>\"{}|^`[]\x7F\t"), "%25%23%3C%3E%22%7B%7D%7C%5E%60%5B%5D%7F%09");
  EXPECT_EQ(esc(""), "");
  EXPECT_EQ(esc("caf\xC3\xA9 \xF0\x9F\x96\xA8"), "caf%C3%A9%20%F0%9F%96%A8");
  EXPECT_EQ(esc("caf\xC3\xA9", qr::TextEncoding::ISOLatin1), "caf%E9");
  EXPECT_EQ(esc("\xE2\x82\xAC", qr::TextEncoding::Windows1252), "%80");
  EXPECT_EQ(esc("a b", qr::TextEncoding::UTF16), "a%00%20b");
  EXPECT_EQ(esc("\xF0\x9F\x96\xA8", qr::TextEncoding::UTF16), "%D8%3D%DD%A8");
  EXPECT_EQ(esc("a/b", qr::TextEncoding::ASCII), "a%2Fb");
  // Text the encoding cannot hold, and encodings we do not define.
  EXPECT_EQ(esc("caf\xC3\xA9", qr::TextEncoding::ASCII), nullopt);
  EXPECT_EQ(esc("\xE2\x82\xAC", qr::TextEncoding::ISOLatin1), nullopt);
  EXPECT_EQ(esc("x", static_cast<qr::TextEncoding>(0)), nullopt);
  EXPECT_EQ(esc("x", static_cast<qr::TextEncoding>(99)), nullopt);
  // A lone surrogate cannot be written in any encoding.
  auto lone = qr::String::fromUTF16(u"a\xD800");
  EXPECT_FALSE(pmStringByAddingPercentEscapesUsingEncoding(*lone, qr::TextEncoding::UTF8));
  EXPECT_FALSE(pmStringByAddingPercentEscapesUsingEncoding(*lone, qr::TextEncoding::UTF16));
}

TEST(Escaping, AnyICUConverterByName) {
  EXPECT_EQ(qr::percentEscape(*S("a b\xC3\xA9"), "ibm-037"), "a%40b%51") << "EBCDIC bytes";
  EXPECT_EQ(qr::percentEscape(*S("\xE6\x97\xA5"), "Shift_JIS"), "%93%FA");
  EXPECT_EQ(qr::percentEscape(*S("x"), "no-such-encoding"), nullopt);
  EXPECT_TRUE(qr::isKnownConverterName("latin1"));
  EXPECT_FALSE(qr::isKnownConverterName("no-such-encoding"));
  EXPECT_EQ(qr::textEncodingNamed("UTF-8"), qr::TextEncoding::UTF8);
  EXPECT_EQ(qr::textEncodingNamed("iso-latin-1"), qr::TextEncoding::ISOLatin1);
  EXPECT_EQ(qr::textEncodingNamed("latin-1"), nullopt);
}
