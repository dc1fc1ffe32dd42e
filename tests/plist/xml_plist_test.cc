#include <gtest/gtest.h>

#include <cmath>
#include <string>

#include "plist/property_list.h"
#include "support/plist_identity.h"
#include "values/array.h"
#include "values/boolean.h"
#include "values/data.h"
#include "values/date.h"
#include "values/dictionary.h"
#include "values/number.h"
#include "values/string.h"
#include "values/url.h"
#include "values/uuid.h"

using namespace qr;
using qrtest::identical;

namespace {

const char kHead[] = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n";
const char kDoctype[] =
    "<!DOCTYPE plist PUBLIC \"-//Apple//DTD PLIST 1.0//EN\" "
    "\"http://www.apple.com/DTDs/PropertyList-1.0.dtd\">\n";

std::string plist(const std::string& body) { return kHead + body + "\n</plist>\n"; }

Ref<Object> read(const std::string& xml, Mutability m = Mutability::Immutable) {
  return readXMLPropertyList(xml, m);
}

Ref<Object> readValue(const std::string& body) { return read(plist(body)); }

std::string nested(const char* open, const char* close, size_t depth, const char* leaf) {
  std::string s;
  for (size_t i = 0; i < depth; ++i) s += open;
  s += leaf;
  for (size_t i = 0; i < depth; ++i) s += close;
  return s;
}

// Every kind of value, with the awkward corners of each.
Ref<Object> sampleValue() {
  auto d = make<MutableDictionary>();
  d->set("plain", String::make("Acme LaserJet"));
  d->set("markup", String::make("a < b && c > d \"quoted\" 'single'"));
  d->set("white space", String::make(" \tline one\nline two\r\nline three\r "));
  d->set("astral \xF0\x9F\x96\xA8",
         String::make("Gr\xC3\xBC\xC3\x9F \xF0\x9F\x98\x80 \xEF\xBF\xBD"));
  d->set("empty", String::empty());
  auto ints = make<MutableArray>();
  for (int64_t v : {int64_t(0), int64_t(-1), INT64_MAX, INT64_MIN})
    ints->append(Number::integer(v));
  ints->append(Number::unsignedInteger(UINT64_MAX));
  ints->append(Number::unsignedInteger(uint64_t(INT64_MAX) + 1));
  d->set("integers", ints);
  auto reals = make<MutableArray>();
  for (double v :
       {0.1, -0.0, 1e300, 5e-324, 1.0 / 3, 1.0, -2.5e-7, HUGE_VAL, -HUGE_VAL, double(NAN)})
    reals->append(Number::real(v));
  d->set("reals", reals);
  d->set("yes", Boolean::trueValue());
  d->set("no", Boolean::falseValue());
  d->set("when", Date::fromISO8601("1969-07-20T20:17:40Z"));
  std::string bytes;
  for (int i = 0; i < 200; ++i) bytes += static_cast<char>(i * 7);
  auto blobs = make<MutableArray>();
  for (size_t n : {0u, 1u, 2u, 3u, 51u, 52u, 200u}) blobs->append(Data::copy(bytes.substr(0, n)));
  d->set("data", blobs);
  auto inner = make<MutableDictionary>();
  inner->set("list", make<MutableArray>());
  inner->set("map", make<MutableDictionary>());
  d->set("empties", inner);
  return d;
}

}  // namespace

TEST(XMLPropertyList, EveryKindOfValueSurvivesARoundTrip) {
  auto value = sampleValue();
  auto xml = writeXMLPropertyList(*value);
  ASSERT_TRUE(xml);
  for (auto m : {Mutability::Immutable, Mutability::MutableContainers,
                 Mutability::MutableContainersAndLeaves}) {
    auto back = read(*xml, m);
    ASSERT_TRUE(back) << *xml;
    EXPECT_TRUE(identical(back.get(), value.get())) << *xml;
    auto again = writeXMLPropertyList(*back);
    ASSERT_TRUE(again);
    EXPECT_EQ(*again, *xml) << "the canonical form is a fixed point";
  }
}

TEST(XMLPropertyList, WritesTheCanonicalFormByteForByte) {
  auto d = make<MutableDictionary>();
  // Inserted out of order; U+FF5E sorts after the surrogate pair of U+1F5A8.
  d->set("\xEF\xBD\x9E", Boolean::falseValue());
  d->set("\xF0\x9F\x96\xA8", Number::real(0.5));
  d->set("b", Data::copy(std::string(52, 'x')));
  auto list = make<MutableArray>();
  list->append(Number::integer(-42));
  list->append(String::make("Tom & Jerry <\r>"));
  list->append(make<MutableArray>());
  list->append(make<MutableDictionary>());
  list->append(Date::fromISO8601("2001-01-01T00:00:00Z"));
  d->set("a", list);
  const char* expected =
      "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
      "<plist version=\"1.0\">\n"
      "<dict>\n"
      "\t<key>a</key>\n"
      "\t<array>\n"
      "\t\t<integer>-42</integer>\n"
      "\t\t<string>Tom &amp; Jerry &lt;&#13;&gt;</string>\n"
      "\t\t<array/>\n"
      "\t\t<dict/>\n"
      "\t\t<date>2001-01-01T00:00:00Z</date>\n"
      "\t</array>\n"
      "\t<key>b</key>\n"
      "\t<data>\n"
      "\teHh4eHh4eHh4eHh4eHh4eHh4eHh4eHh4eHh4eHh4eHh4eHh4eHh4eHh4eHh4eHh4eHh4\n"
      "\teA==\n"
      "\t</data>\n"
      "\t<key>\xF0\x9F\x96\xA8</key>\n"
      "\t<real>0.5</real>\n"
      "\t<key>\xEF\xBD\x9E</key>\n"
      "\t<false/>\n"
      "</dict>\n"
      "</plist>\n";
  auto xml = writeXMLPropertyList(*d);
  ASSERT_TRUE(xml);
  EXPECT_EQ(*xml, expected);
  EXPECT_EQ(*writeXMLPropertyList(*String::make("top")),
            std::string(kHead) + "<string>top</string>\n</plist>\n");
}

TEST(XMLPropertyList, ReadsWhatOtherWritersProduce) {
  // With a DOCTYPE line, comments, CDATA, hex integers and spaced base64.
  auto v = read(std::string(kHead).insert(39, kDoctype) +
                "<!-- made elsewhere --><dict>\n"
                "  <key>hex</key><integer>0xFF</integer>\n"
                "  <key>plus</key><integer> +7 </integer>\n"
                "  <key>cdata</key><string><![CDATA[<raw> & ]]>x&#x1F5A8;</string>\n"
                "  <key>blob</key><data>\n  AAEC\n  Aw==\n</data>\n"
                "  <key>inf</key><real>-infinity</real>\n"
                "  <key>big</key><real>1e999</real>\n"
                "  <key>when</key><date>2024-02-29T12:00:00Z</date>\n"
                "  <key>dup</key><string>first</string>\n"
                "  <key>dup</key><string>last</string>\n"
                "</dict></plist>");
  auto* d = cast<Dictionary>(v.get());
  ASSERT_TRUE(d);
  EXPECT_EQ(d->getAs<Number>("hex")->int64Value(), 255);
  EXPECT_EQ(d->getAs<Number>("plus")->int64Value(), 7);
  EXPECT_EQ(d->getAs<String>("cdata")->utf8(), "<raw> & x\xF0\x9F\x96\xA8");
  EXPECT_EQ(d->getAs<Data>("blob")->view(), std::string_view("\0\1\2\3", 4));
  EXPECT_EQ(d->getAs<Number>("inf")->doubleValue(), -HUGE_VAL);
  EXPECT_EQ(d->getAs<Number>("big")->doubleValue(), HUGE_VAL);
  EXPECT_EQ(d->getAs<Date>("when")->iso8601(), "2024-02-29T12:00:00Z");
  EXPECT_EQ(d->getAs<String>("dup")->utf8(), "last");
  EXPECT_EQ(d->count(), 8u);
  EXPECT_TRUE(cast<Number>(readValue("<integer>18446744073709551615</integer>"))->isUnsigned());
  EXPECT_EQ(cast<Number>(readValue("<integer>-9223372036854775808</integer>"))->int64Value(),
            INT64_MIN);
  EXPECT_TRUE(std::isnan(cast<Number>(readValue("<real>nan</real>"))->doubleValue()));
  EXPECT_EQ(cast<Number>(readValue("<real>+inf</real>"))->doubleValue(), HUGE_VAL);
  // UTF-16 with a byte-order mark.
  std::u16string utf16 =
      u"\xFEFF<?xml version=\"1.0\" encoding=\"UTF-16\"?><plist><string>"
      u"\xD83D\xDDA8</string></plist>";
  std::string bytes(reinterpret_cast<const char*>(utf16.data()), utf16.size() * 2);
  EXPECT_EQ(cast<String>(read(bytes))->utf8(), "\xF0\x9F\x96\xA8");
}

TEST(XMLPropertyList, RepeatedKeysAndShortStringsShareOneObjectUnlessMutable) {
  std::string xml = plist(
      "<array><dict><key>Make</key><string>Acme</string></dict>"
      "<dict><key>Make</key><string>Acme</string></dict></array>");
  auto v = cast<Array>(read(xml));
  ASSERT_TRUE(v);
  auto* d0 = cast<Dictionary>(v->at(0));
  auto* d1 = cast<Dictionary>(v->at(1));
  EXPECT_EQ(d0->keys()[0].get(), d1->keys()[0].get());
  EXPECT_EQ(d0->get("Make"), d1->get("Make"));
  auto m = cast<Array>(read(xml, Mutability::MutableContainersAndLeaves));
  auto* s0 = cast<MutableString>(cast<Dictionary>(m->at(0))->get("Make"));
  auto* s1 = cast<MutableString>(cast<Dictionary>(m->at(1))->get("Make"));
  ASSERT_TRUE(s0 && s1);
  EXPECT_NE(s0, s1) << "each mutable leaf is its own object";
  s0->appendUTF8("!");
  EXPECT_EQ(s1->utf8(), "Acme");
}

TEST(XMLPropertyList, EscapesAtEveryPositionOfShortAndLongText) {
  // The writer scans text in blocks; a character needing an escape, or one
  // that XML cannot carry, must be found wherever it sits.
  for (size_t length = 1; length <= 40; ++length) {
    for (size_t at = 0; at < length; ++at) {
      for (char c : {'&', '<', '>', '\r', '\t', '\n'}) {
        std::string text(length, 'x');
        text[at] = c;
        auto xml = writeXMLPropertyList(*String::make(text));
        ASSERT_TRUE(xml);
        auto back = cast<String>(read(*xml));
        ASSERT_TRUE(back) << *xml;
        EXPECT_EQ(back->utf8(), text) << *xml;
      }
      std::string bad(length, 'x');
      bad[at] = '\x1F';
      EXPECT_FALSE(writeXMLPropertyList(*String::make(bad))) << length << " " << at;
    }
  }
}

TEST(XMLPropertyList, RejectsMalformedOrUnsafeDocuments) {
  const std::string bad[] = {
      "",
      "<?xml version=\"1.0\"?>",
      "<dict/>",                                         // no plist root
      "<plist><dict/></plist><plist/>",                  // a second root
      "<plist><dict/></plist>garbage",                   // text after the root
      plist(""),                                         // no value
      plist("<dict/><dict/>"),                           // two values
      plist("<dict><key>k</key></dict>"),                // key without value
      plist("<dict><string>v</string></dict>"),          // value without key
      plist("<dict><key>a</key><key>b</key></dict>"),    // two keys in a row
      plist("<array><key>k</key></array>"),              // key outside a dictionary
      plist("<key>k</key>"),                             //
      plist("<array>stray<true/></array>"),              // text between elements
      plist("<unknown/>"),                               // unknown element
      plist("<array><plist/></array>"),                  // nested root
      plist("<string>a<b/></string>"),                   // element inside a leaf
      plist("<true>yes</true>"),                         //
      plist("<integer></integer>"),                      // integers
      plist("<integer>12a</integer>"),                   //
      plist("<integer>1 2</integer>"),                   //
      plist("<integer>18446744073709551616</integer>"),  // 2^64
      plist("<integer>-9223372036854775809</integer>"),  // below INT64_MIN
      plist("<integer>0x</integer>"),                    //
      plist("<integer>0x10000000000000000</integer>"),   //
      plist("<real></real>"),                            // reals
      plist("<real>1.5x</real>"),                        //
      plist("<real>+-1</real>"),                         //
      plist("<real>0x10</real>"),                        //
      plist("<data>AAECA</data>"),                       // base64
      plist("<data>A===</data>"),                        //
      plist("<data>AA==AA==</data>"),                    //
      plist("<data>AA*A</data>"),                        //
      plist("<date>2024-02-30T00:00:00Z</date>"),        // dates
      plist("<date>2024-01-01T00:00:00</date>"),         //
      plist("<string>\xC3\x28</string>"),                // invalid UTF-8
      plist("<string>\xED\xA0\x80</string>"),            // encoded surrogate
      plist("<string>&undefined;</string>"),             // undeclared entity
      plist("<string>&#0;</string>"),                    // not an XML character
      std::string(kHead).insert(39, "<!DOCTYPE plist [ ]>\n") + "<true/></plist>",
      std::string(kHead).insert(39, "<!DOCTYPE plist [<!ENTITY e \"x\">]>\n") +
          "<string>&e;</string></plist>",
      std::string(kHead).insert(39, "<!DOCTYPE plist SYSTEM \"plist.dtd\">\n") +
          "<string>&e;</string></plist>",         // would need the external DTD
      "<plist><array>" + std::string(1000, ' '),  // truncated
  };
  for (const auto& doc : bad) EXPECT_FALSE(read(doc)) << doc;
  // Billion laughs never gets as far as expanding anything.
  std::string laughs = "<?xml version=\"1.0\"?><!DOCTYPE plist [<!ENTITY a \"aaaaaaaaaa\">";
  for (char c = 'b'; c <= 'j'; ++c) {
    laughs += std::string("<!ENTITY ") + c + " \"";
    for (int i = 0; i < 10; ++i) laughs += std::string("&") + char(c - 1) + ";";
    laughs += "\">";
  }
  EXPECT_FALSE(read(laughs + "]><plist><string>&j;</string></plist>"));
}

TEST(XMLPropertyList, BoundsNestingDepth) {
  // The top-level value is at depth one; a leaf may sit at the limit.
  size_t limit = kMaxPropertyListDepth;
  EXPECT_TRUE(readValue(nested("<array>", "</array>", limit - 1, "<true/>")));
  EXPECT_FALSE(readValue(nested("<array>", "</array>", limit, "<true/>")));
  EXPECT_TRUE(readValue(nested("<array>", "</array>", limit, "")));
  EXPECT_FALSE(readValue(nested("<dict><key>k</key>", "</dict>", limit, "<true/>")));
  // Far deeper input fails cleanly instead of exhausting the stack.
  EXPECT_FALSE(readValue(nested("<array>", "</array>", 100000, "")));
  EXPECT_FALSE(readValue(nested("<array>", "", 100000, "")));

  Ref<Object> deep = String::make("leaf");
  for (size_t i = 1; i < limit; ++i) deep = make<Array>(std::vector<Ref<Object>>{deep});
  auto xml = writeXMLPropertyList(*deep);
  ASSERT_TRUE(xml);
  EXPECT_TRUE(read(*xml));
  deep = make<Array>(std::vector<Ref<Object>>{deep});
  EXPECT_FALSE(writeXMLPropertyList(*deep));
}

TEST(XMLPropertyList, HonoursTheMutabilityOption) {
  std::string xml = plist(
      "<dict><key>list</key><array><string>s</string><data>AA==</data>"
      "<dict/></array></dict>");
  auto frozen = cast<Dictionary>(read(xml, Mutability::Immutable));
  ASSERT_TRUE(frozen);
  EXPECT_FALSE(cast<MutableDictionary>(frozen.get()));
  auto* list = frozen->getAs<Array>("list");
  EXPECT_FALSE(cast<MutableArray>(list));
  EXPECT_FALSE(cast<MutableString>(list->at(0)));
  EXPECT_FALSE(cast<MutableDictionary>(list->at(2)));

  auto containers = read(xml, Mutability::MutableContainers);
  auto* d = cast<MutableDictionary>(containers.get());
  ASSERT_TRUE(d);
  auto* mlist = d->getAs<MutableArray>("list");
  ASSERT_TRUE(mlist);
  EXPECT_TRUE(cast<MutableDictionary>(mlist->at(2)));
  EXPECT_FALSE(cast<MutableString>(mlist->at(0)));
  EXPECT_FALSE(cast<MutableData>(mlist->at(1)));

  auto leaves = read(xml, Mutability::MutableContainersAndLeaves);
  auto* llist = cast<MutableDictionary>(leaves.get())->getAs<MutableArray>("list");
  auto* s = cast<MutableString>(llist->at(0));
  ASSERT_TRUE(s);
  s->appendUTF8("!");
  EXPECT_EQ(s->utf8(), "s!");
  EXPECT_TRUE(cast<MutableData>(llist->at(1)));
  EXPECT_FALSE(cast<MutableString>(cast<Dictionary>(leaves.get())->keys()[0].get()))
      << "keys stay immutable";
}

TEST(XMLPropertyList, RefusesToWriteWhatNoReaderWouldAccept) {
  auto wrap = [](Ref<Object> v) {
    auto d = make<MutableDictionary>();
    d->set("k", make<Array>(std::vector<Ref<Object>>{v}));
    return d;
  };
  auto numberKeyed = make<MutableDictionary>();
  numberKeyed->set(Number::integer(1), String::make("x"));
  Ref<Object> refused[] = {
      URL::fileURL("/tmp", true),
      UUID::fromString("3A1B2C3D-4E5F-6071-8293-A4B5C6D7E8F9"),
      make<Object>(),
      numberKeyed,
      String::make(std::string_view("nul \0", 5)),
      String::make("bell \x07"),
      String::make("\xEF\xBF\xBE"),  // U+FFFE
      String::make("\xEF\xBF\xBF"),  // U+FFFF
      String::fromUTF16(u"high \xD800"),
      String::fromUTF16(u"\xDC00 low"),
      String::fromUTF16(u"\xD800\xD800"),
      make<Date>(NAN),
      Date::fromUnixTime(-62167219201.0),  // the second before year 0
      Date::fromUnixTime(253402300800.0),  // year 10000
  };
  for (const auto& v : refused) {
    EXPECT_FALSE(writeXMLPropertyList(*v)) << describe(v.get());
    EXPECT_FALSE(writeXMLPropertyList(*wrap(v))) << describe(v.get());
  }
  auto key = make<MutableDictionary>();
  key->set(String::make("tab\x01"), Boolean::trueValue());
  EXPECT_FALSE(writeXMLPropertyList(*key));
  // The edges that are allowed.
  EXPECT_TRUE(writeXMLPropertyList(*String::make("\t\n\r\x7F\xEF\xBF\xBD")));
  EXPECT_TRUE(writeXMLPropertyList(*Date::fromISO8601("0000-01-01T00:00:00Z")));
  EXPECT_TRUE(writeXMLPropertyList(*Date::fromISO8601("9999-12-31T23:59:59Z")));
}

TEST(XMLPropertyList, LongTextAndDataCrossTheWritersInternalPieces) {
  std::string text;
  for (int i = 0; i < 100000; ++i) text += i % 1000 == 0 ? "&\r<" : "ab\xC3\xA9";
  std::string bytes(300000, '\0');
  for (size_t i = 0; i < bytes.size(); ++i) bytes[i] = static_cast<char>(i * 31 + 7);
  auto a = make<MutableArray>();
  a->append(String::make(text));
  a->append(String::make("a" + text));  // odd alignment
  a->append(Data::copy(bytes));
  auto big = make<MutableArray>();
  for (int i = 0; i < 40000; ++i) big->append(String::make(std::string(100, 'x')));
  a->append(big);  // several megabytes of output
  auto xml = writeXMLPropertyList(*a);
  ASSERT_TRUE(xml);
  auto back = read(*xml);
  EXPECT_TRUE(identical(back.get(), a.get()));
}
