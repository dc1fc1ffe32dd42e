#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "plist/property_list.h"
#include "values/array.h"
#include "values/data.h"
#include "values/dictionary.h"
#include "values/string.h"

using namespace qr;

namespace {

constexpr Mutability kAllMutabilities[] = {Mutability::Immutable, Mutability::MutableContainers,
                                           Mutability::MutableContainersAndLeaves};

Ref<Object> S(std::string_view s) { return String::make(s); }
Ref<Object> A(std::vector<Ref<Object>> items) { return make<Array>(std::move(items)); }
Ref<Object> D(std::vector<std::pair<std::string, Ref<Object>>> entries) {
  std::vector<std::pair<Ref<Object>, Ref<Object>>> pairs;
  for (auto& [k, v] : entries) pairs.emplace_back(String::make(k), v);
  return Dictionary::build(std::move(pairs));
}

Ref<Object> read(std::string_view text, Mutability m = Mutability::Immutable) {
  return readTextPropertyList(text, m);
}

// The text as UTF-16 with a byte-order mark.
std::string utf16(std::string_view utf8, bool little) {
  std::u16string units;
  EXPECT_TRUE(decodeUTF8(utf8, units));
  std::string out = little ? "\xFF\xFE" : "\xFE\xFF";
  for (char16_t u : units) {
    char hi = static_cast<char>(u >> 8), lo = static_cast<char>(u & 0xFF);
    out += little ? std::string{lo, hi} : std::string{hi, lo};
  }
  return out;
}

}  // namespace

TEST(TextPropertyList, ReadsNestedValues) {
  auto v = read(R"(
    // Printer presets
    {
      name = "Acme LaserJet";
      model = Acme-4/x_1.0$+:;
      trays = ( upper, "lower tray", );
      empty = ();
      blob = < 0fAB 12
               ff >;
      /* an inner
         dictionary */ options = { duplex = YES; "sides" = ( ( ) ); };
    })");
  auto expected = D({
      {"name", S("Acme LaserJet")},
      {"model", S("Acme-4/x_1.0$+:")},
      {"trays", A({S("upper"), S("lower tray")})},
      {"empty", A({})},
      {"blob", Data::copy(std::string_view("\x0f\xab\x12\xff"))},
      {"options", D({{"duplex", S("YES")}, {"sides", A({A({})})}})},
  });
  EXPECT_TRUE(equal(v, expected)) << describe(v.get());
  EXPECT_TRUE(equal(read("\"just text\""), S("just text")));
  EXPECT_TRUE(equal(read("'single quoted'"), S("single quoted")));
  EXPECT_TRUE(equal(read("(a,b)"), A({S("a"), S("b")})));
  EXPECT_TRUE(equal(read("<>"), Data::copy(std::string_view())));
  EXPECT_TRUE(equal(read("{}"), D({})));
}

TEST(TextPropertyList, DecodesEscapes) {
  auto v = read(R"("q\" b\\ n\n t\t r\r a\a b\b f\f v\v o\101\0 \U00e9 \UD83D\UDE00 \' \x")");
  ASSERT_TRUE(v);
  std::u16string expected = u"q\" b\\ n\n t\t r\r a\a b\b f\f v\v oA" + std::u16string(1, u'\0') +
                            u" \u00e9 \U0001F600 ' x";
  EXPECT_EQ(static_cast<String*>(v.get())->utf16(), expected);
  EXPECT_TRUE(equal(read(R"("\377")"), String::fromUTF16(u"\u00ff")));
  EXPECT_TRUE(equal(read(R"("\1234")"), S("S4"))) << "at most three octal digits";
  EXPECT_TRUE(equal(read(R"("\U12345")"), String::fromUTF16(u"\u12345")))
      << "at most four hex digits";
}

TEST(TextPropertyList, ReadsStringsTablesInEveryEncoding) {
  const std::string table =
      "/* Printing dialog */\n"
      "\"Print\" = \"Drucken\";\n"
      "// the shorthand: the value is the key\n"
      "\"OK\";\n"
      "Cancel = \"Abbrechen\";\n"
      "\"Size\" = \"Gr\xC3\xB6\xC3\x9F"
      "e \\\"A4\\\"\";\n"
      "\"Emoji\" = \"\xF0\x9F\x96\xA8\";\n";
  auto expected = D({
      {"Print", S("Drucken")},
      {"OK", S("OK")},
      {"Cancel", S("Abbrechen")},
      {"Size", S("Gr\xC3\xB6\xC3\x9F"
                 "e \"A4\"")},
      {"Emoji", S("\xF0\x9F\x96\xA8")},
  });
  for (const std::string& bytes :
       {table, "\xEF\xBB\xBF" + table, utf16(table, true), utf16(table, false)}) {
    for (auto m : kAllMutabilities) {
      auto v = read(bytes, m);
      EXPECT_TRUE(equal(v, expected)) << describe(v.get());
    }
    PropertyListFormat format = PropertyListFormat::Binary;
    EXPECT_TRUE(equal(readPropertyList(bytes, Mutability::Immutable, &format), expected));
    EXPECT_EQ(format, PropertyListFormat::Text);
  }
  // Nothing but comments and space is an empty table.
  for (std::string_view empty : {"", "  \n", "/* nothing */ // here\n", "\xEF\xBB\xBF"})
    EXPECT_TRUE(equal(read(empty), D({}))) << empty;
  EXPECT_FALSE(readPropertyList("")) << "no bytes at all is no property list";
}

TEST(TextPropertyList, DetectsUTF16XMLAsXML) {
  PropertyListFormat format = PropertyListFormat::Text;
  readPropertyList(utf16("  <?xml version=\"1.0\" encoding=\"UTF-16\"?><plist/>", true),
                   Mutability::Immutable, &format);
  EXPECT_EQ(format, PropertyListFormat::XML);
  readPropertyList(utf16("<plist version=\"1.0\"/>", false), Mutability::Immutable, &format);
  EXPECT_EQ(format, PropertyListFormat::XML);
  readPropertyList("<0a0b>", Mutability::Immutable, &format);
  EXPECT_EQ(format, PropertyListFormat::Text);
}

TEST(TextPropertyList, RepeatedKeyKeepsTheLastValue) {
  for (auto m : kAllMutabilities) {
    auto d = cast<Dictionary>(read("{ a = 1; b = 2; a = 3; }", m));
    ASSERT_TRUE(d);
    EXPECT_EQ(d->count(), 2u);
    EXPECT_TRUE(equal(Ref<Object>(d->get("a")), S("3")));
    d = cast<Dictionary>(read("\"a\" = \"1\"; \"a\";", m));
    ASSERT_TRUE(d);
    EXPECT_TRUE(equal(Ref<Object>(d->get("a")), S("a")));
  }
}

TEST(TextPropertyList, HonoursMutability) {
  const char* text = "{ list = ( x, <00> ); inner = { k = v; }; }";
  for (auto m : kAllMutabilities) {
    auto d = cast<Dictionary>(read(text, m));
    ASSERT_TRUE(d);
    bool containers = m != Mutability::Immutable;
    bool leaves = m == Mutability::MutableContainersAndLeaves;
    auto list = d->getAs<Array>("list");
    EXPECT_EQ(dynamic_cast<MutableDictionary*>(d.get()) != nullptr, containers);
    EXPECT_EQ(dynamic_cast<MutableArray*>(list) != nullptr, containers);
    EXPECT_EQ(dynamic_cast<MutableDictionary*>(d->get("inner")) != nullptr, containers);
    EXPECT_EQ(dynamic_cast<MutableString*>(list->at(0)) != nullptr, leaves);
    EXPECT_EQ(dynamic_cast<MutableData*>(list->at(1)) != nullptr, leaves);
    for (const auto& key : d->keys())
      EXPECT_FALSE(dynamic_cast<MutableString*>(key.get())) << "keys stay immutable";
  }
  auto table = cast<MutableDictionary>(read("\"k\";", Mutability::MutableContainersAndLeaves));
  ASSERT_TRUE(table);
  EXPECT_TRUE(dynamic_cast<MutableString*>(table->get("k")));
}

TEST(TextPropertyList, RejectsMalformedTextAndBadEncodings) {
  const std::string_view malformed[] = {
      "{ a = b; } trailing", "(a) (b)", "\"unterminated", "\"escape at end\\", "/* open comment",
      "{ a = b; /* open }", "{ a = b;", "{ a b; }", "{ a = ; }", "{ (x) = y; }", "{ <00> = y; }",
      "{ {} = y; }", "( , )", "( a b )", "( a,, )", "( a", "<0>", "<0g>", "<00", "\"\\U\"",
      "\"\\400\"", "a = b; c", "=", ";", "#", "{ a = b; } }",
      // A last pair without ';', then no pair; the shorthand belongs to strings tables only.
      "\"a\" = \"b\"", "\"a\" = \"b\"; junk", "{ a; }",
      // Not UTF-8, overlong, an encoded surrogate, a truncated sequence.
      "\"a\xFFz\"", "\"\xC0\xAF\"", "\"\xED\xA0\x80\"", "\"\xE2\x82\"",
      std::string_view("\xFF\xFE\"\0a", 5),  // odd number of UTF-16 bytes
      std::string_view("( a \0 )", 7)};      // NUL outside a string
  for (std::string_view bad : malformed)
    for (auto m : kAllMutabilities) EXPECT_FALSE(read(bad, m)) << bad;
}

TEST(TextPropertyList, NestingIsBoundedWithoutDeepRecursion) {
  for (auto m : kAllMutabilities) {
    EXPECT_FALSE(read(std::string(100000, '('), m));
    EXPECT_FALSE(read(std::string(100000, '(') + std::string(100000, ')'), m));
    std::string dicts;
    for (int i = 0; i < 100000; ++i) dicts += "{a=";
    EXPECT_FALSE(read(dicts, m));
  }
  // The top value is at depth 1: a leaf may sit at the bound, not past it.
  size_t n = kMaxPropertyListDepth - 1;
  EXPECT_TRUE(read(std::string(n, '(') + "x" + std::string(n, ')')));
  EXPECT_FALSE(read(std::string(n + 1, '(') + "x" + std::string(n + 1, ')')));
  EXPECT_TRUE(read(std::string(n + 1, '(') + std::string(n + 1, ')')));
}
