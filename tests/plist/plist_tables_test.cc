// What the random round trips cannot reach: the exact canonical XML form, the
// spellings other writers use, hostile input for every reader, the values no
// reader would accept, and the bounds on nesting and expansion.
#include <gtest/gtest.h>
#include <malloc.h>
#include <sys/mman.h>
#include <unistd.h>

#include <cstring>

#include "plist/property_list.h"
#include "plist/xml_expat_reader.h"
#include "plist/xml_plain_scanner.h"
#include "support/plist_identity.h"
#include "values/url.h"
#include "values/uuid.h"

using namespace qr;
using namespace qrtest;
using namespace std::literals;

namespace {

std::string P(std::string_view body) { return "<plist>" + std::string(body) + "</plist>"; }
std::string repeat(std::string_view s, size_t n) {
  for (std::string out;; out += s)
    if (n-- == 0) return out;
}
std::string be(uint64_t v, size_t n) { return n ? be(v >> 8, n - 1) + char(v & 0xFF) : ""; }
// Binary objects, and files with a table of 4-byte offsets.
std::string marker(int type, uint64_t count) {
  return count < 15 ? be(type << 4 | count, 1) : be(type << 4 | 15, 1) + "\x13" + be(count, 8);
}
std::string ascii(std::string_view s) { return marker(0x5, s.size()) + std::string(s); }
// An array, or a dictionary of its keys then its values.
std::string refs(int type, std::vector<uint64_t> r, size_t size = 1) {
  std::string out = marker(type, type == 0xD ? r.size() / 2 : r.size());
  for (auto x : r) out += be(x, size);
  return out;
}
std::string bplist(const std::vector<std::string>& objects, size_t refSize = 1, uint64_t top = 0) {
  std::string file = "bplist00", table;
  for (const auto& o : objects) table += be(file.size(), 4), file += o;
  return file + table + std::string(6, '\0') + "\x04" + char(refSize) + be(objects.size(), 8) +
         be(top, 8) + be(file.size(), 8);
}
std::string poke(std::string f, size_t i, uint64_t v, size_t n) {
  return f.replace(i, n, be(v, n));
}
std::string utf16(std::string_view utf8, bool little) {  // with a byte-order mark
  std::string out = little ? "\xFF\xFE" : "\xFE\xFF";
  for (char16_t u : String::make(utf8)->utf16())
    out += little ? be(u & 0xFF, 1) + be(u >> 8, 1) : be(u, 2);
  return out;
}
int modesReading(const std::string& doc) {
  return bool(readPropertyList(doc)) + bool(readPropertyList(doc, Mutability::MutableContainers)) +
         bool(readPropertyList(doc, Mutability::MutableContainersAndLeaves));
}

}  // namespace

TEST(XMLPropertyList, WritesOneCanonicalForm) {
  auto list = A({I(-42), S("Tom & Jerry <\r>"), A({}), D({}), make<Date>(-1.5), R(0.5)});
  // U+FF5E sorts after the surrogates of U+1F5A8; dates print in whole seconds, rounded down.
  auto d = D({{"\xEF\xBD\x9E", Boolean::falseValue()},
              {"\xF0\x9F\x96\xA8", list},
              {"b", Data::copy(repeat("x", 52))}});
  // clang-format off
  EXPECT_EQ(writeXMLPropertyList(*d),
      "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n<dict>\n"
      "\t<key>b</key>\n\t<data>\n\t" + repeat("eHh4", 17) + "\n\teA==\n\t</data>\n"
      "\t<key>\xF0\x9F\x96\xA8</key>\n\t<array>\n\t\t<integer>-42</integer>\n"
      "\t\t<string>Tom &amp; Jerry &lt;&#13;&gt;</string>\n\t\t<array/>\n\t\t<dict/>\n"
      "\t\t<date>2000-12-31T23:59:58Z</date>\n\t\t<real>0.5</real>\n\t</array>\n"
      "\t<key>\xEF\xBD\x9E</key>\n\t<false/>\n</dict>\n</plist>\n");
}

TEST(XMLPropertyList, PlainScannerReadsWhatExpatReadsOrDeclines) {
  using xmlplist::PlainScan;
  constexpr auto Read = PlainScan::Read, Bad = PlainScan::Malformed, No = PlainScan::Declined;
  const std::string head = "\xEF\xBB\xBF<?xml version='1.0' encoding='utf-8' standalone='no'?>\r\n"
                           "<!DOCTYPE plist PUBLIC \"-//A//DTD PLIST 1.0//EN\" \"http://a/p.dtd\">";
  const std::pair<std::string, PlainScan::Outcome> rows[] = {
      // clang-format off
      {head + "<plist version=\"1.0\"><dict/></plist>\n", Read},
      {P("<string> a\tb\r\nc\rd &amp;&lt;&gt;&quot;&apos;&#65;&#x1F5A8;&#13;\n</string>"), Read},
      {P("<array><array/><dict></dict><string/><data>\r\nAAEC\r\n</data></array>"), Read},
      {P("<dict ><key >k</key\n><true ></true ></dict >"), Read},
      {P("<string>\x7F\xC2\x85\xEF\xBF\xBD\xF4\x8F\xBF\xBF]]</string>"), Read},
      {P(repeat("<array>", 512) + repeat("</array>", 512)), Read},
      {P(repeat("<array>", 513) + repeat("</array>", 513)), Bad},
      {P("<array><key>k</key></array>"), Bad}, {P("<dict><key>k</key></dict>"), Bad},
      {P("<array></dict>"), Bad}, {P("<array>x</array>"), Bad}, {P("<unknown/>"), Bad},
      {P("<integer>1x</integer>"), Bad}, {"<plist/>", Bad}, {P("<string>a<b/></string>"), Bad},
      {P("<true/>") + "<!-- after -->", No}, {P("<string><![CDATA[x]]></string>"), No},
      {P("<array><!-- c --></array>"), No}, {"<!DOCTYPE plist [ ]>" + P("<true/>"), No},
      {"<?xml version=\"1.0\" encoding=\"ISO-8859-1\"?>" + P("<string>\xE9</string>"), No},
      {"\xFF\xFE<\0p\0"s, No}, {"<?xml version=\"1.0\"?><?pi x?>" + P("<true/>"), No},
      {"<plist xmlns=\"x\"><true/></plist>", No}, {P("<string a=\"b\">x</string>"), No},
      {P("<array>&#32;</array>"), No}, {P("<string>&e;</string>"), No},
      {P("<string>]]></string>"), No}, {P("<string>\xFF</string>"), No},
      {P("<string>\xEF\xBF\xBE</string>"), No}, {P("<string>\xED\xA0\x80</string>"), No},
      {P("<string>&#0;</string>"), No}, {P("<string>&#xD800;</string>"), No},
      {P("<string>\x01</string>"), No}, {"<plist><string>\xFF</string>", No}};
  // clang-format on
  for (const auto& [doc, outcome] : rows) {
    for (auto m : kAllMutabilities) {
      PlainScan scan = xmlplist::scanPlainXMLPropertyList(doc, m);
      Ref<Object> expat = readXMLPropertyListWithExpat(doc, m);
      EXPECT_EQ(scan.outcome, outcome) << doc;
      if (outcome == No) continue;
      EXPECT_EQ(bool(expat), outcome == Read) << doc;
      EXPECT_TRUE(identical(scan.value.get(), expat.get(), &m)) << doc;
    }
  }
  // Every prefix of the short rows, placed against an unreadable page so that
  // a read past the end faults: whatever the scanner makes of it, expat agrees.
  const size_t page = size_t(sysconf(_SC_PAGESIZE));
  auto* pages = static_cast<char*>(
      mmap(nullptr, 2 * page, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0));
  ASSERT_NE(pages, MAP_FAILED);
  ASSERT_EQ(mprotect(pages + page, page, PROT_NONE), 0);
  for (const auto& row : rows) {
    const std::string& doc = row.first;
    for (size_t n = 0; doc.size() <= page && n <= doc.size(); ++n) {
      std::string_view text(pages + page - n, n);
      std::memcpy(pages + page - n, doc.data(), n);
      PlainScan scan = xmlplist::scanPlainXMLPropertyList(text, Mutability::Immutable);
      if (scan.outcome == No) continue;
      Ref<Object> expat = readXMLPropertyListWithExpat(text, Mutability::Immutable);
      EXPECT_TRUE(identical(scan.value.get(), expat.get())) << doc.substr(0, n);
      EXPECT_EQ(bool(expat), scan.outcome == Read) << doc.substr(0, n);
    }
  }
  munmap(pages, 2 * page);
}

TEST(PropertyList, ReadsWhatOtherWritersWrite) {
  auto* W = &String::fromUTF16;
  const std::string table =
      "/* c */ \"Print\" = \"Drucken\"; // the value is the key\n'OK';\n"
      "Size = \"Gr\xC3\xB6\xC3\x9F\\\"\"; \"\xF0\x9F\x96\xA8\" = 1; \"\xF0\x9F\x96\xA8\" = 2;";
  auto strings = D({{"Print", S("Drucken")},
                    {"OK", S("OK")},
                    {"Size", S("Gr\xC3\xB6\xC3\x9F\"")},
                    {"\xF0\x9F\x96\xA8", S("2")}});
  const std::pair<std::string, Ref<Object>> rows[] = {
      {"<?xml version=\"1.0\"?><!DOCTYPE plist SYSTEM \"plist.dtd\"><!--c-->" + P("<true> </true>"),
       Boolean::trueValue()},
      {utf16("\n" + P("<string>\xF0\x9F\x96\xA8</string>"), 0), S("\xF0\x9F\x96\xA8")},
      {P("<integer>0xAaBbCcDdEeFf</integer>"), I(0xAABBCCDDEEFF)},
      {P("<real>+inf</real>"), R(HUGE_VAL)},
      {P("<integer>0X0123456789</integer>"), I(0x123456789)},
      {P("<integer> +7 </integer>"), I(7)},
      {P("<real>-1e999</real>"), R(-HUGE_VAL)},
      {P("<data> AAEC\n Aw== </data>"), B("\0\1\2\3"sv)},
      {P("<string><![CDATA[<raw> & ]]>x&#x1F5A8;&#13;</string>"), S("<raw> & x\xF0\x9F\x96\xA8\r")},
      {P("<data>AAE</data>"), B("\0\1"sv)},
      {P("<date> 2001-01-01T00:00:45Z </date>"), make<Date>(45.)},
      {P("<dict><key>k</key><true/><key>k</key><string>z</string></dict>"), D({{"k", S("z")}})},
      // binary forms plistlib never writes: 4-byte reals, 16-byte integers, lone surrogates,
      // 2-byte references, and a key repeated in another encoding
      {bplist({"\x22\x3F\xC0\0\0"s}), R(1.5)},
      {bplist({"\x14" + be(0, 8) + be(5, 8)}), I(5)},
      {bplist({"\x14" + be(UINT64_MAX, 8) + be(1ull << 63, 8)}), I(INT64_MIN)},
      {bplist({"\x62\xD8\0\0x"s}), W(u"\xD800x")},
      {bplist({refs(0xA, {1, 1}, 2), "\x10\0"s}, 2), A({I(0), I(0)})},
      {bplist({refs(0xD, {1, 3, 2, 4}), ascii("k"), "\x09", "\x61\0k"s, "\x10\0"s}),
       D({{"k", I(0)}})},
      // text: escapes (at most three octal and four hex digits), strings tables in every encoding
      {R"("\" \\ \n\t\r\a\b\f\v \' \x \101\0 \377 \1234 \U00e9\UD83D\UDE00 \U12345 \UdEaD")",
       W(u"\" \\ \n\t\r\a\b\f\v ' x A\0 \u00ff S4 \u00e9\U0001F600 \u12345 \xDEAD"sv)},
      {table, strings},
      {"\xEF\xBB\xBF" + table, strings},
      {utf16(table, 1), strings},
      {utf16(table, 0), strings},
      {"\xEF\xBB\xBF //\n", D({})},
      {utf16("<0a0B>", 1), B("\n\v")}};
  // clang-format on
  for (const auto& [doc, want] : rows)
    for (auto m : kAllMutabilities)
      EXPECT_TRUE(identical(readPropertyList(doc, m).get(), want.get(), &m)) << doc;
}

TEST(PropertyList, EveryReaderRejectsHostileInput) {
  const std::string good = bplist({refs(0xD, {1, 2, 3, 4}), ascii("name"), ascii("list"),
                                   ascii("Acme"), refs(0xA, {5, 6}), "\x10\x07", "\x61\0\xE9"s});
  ASSERT_TRUE(readPropertyList(good));
  size_t end = good.size() - 32, table = end - 7 * 4;  // the trailer, the offset table
  std::vector<std::string> bad = {
      // clang-format off
      "", "<?xml version=\"1.0\"?><dict/>", "<plist><array> ", P(""), P("<dict/><dict/>"),
      P("<key>k</key>"),
      P("<dict><key>k</key></dict>"), P("<dict><true/></dict>"),
      P("<dict><key>a</key><key>b</key></dict>"),
      P("<array><key>k</key></array>"), P("<array>stray<true/></array>"),
      P("<array><plist/></array>"),
      P("<unknown/>"), P("<string>a<b/></string>"),
      // a DOCTYPE may name a DTD, never declare anything or need one read
      "<!DOCTYPE plist [ ]>" + P("<true/>"),
      "<!DOCTYPE plist [<!ENTITY e \"x\">]>" + P("<string>&e;</string>"),
      "<!DOCTYPE plist SYSTEM \"plist.dtd\">" + P("<string>&e;</string>"),
      // binary trailer fields: object count, top object, table offset, entry sizes; the version
      poke(good, end + 8, 0, 8), poke(good, end + 8, 8, 8), poke(good, end + 8, UINT64_MAX, 8),
      poke(good, end + 16, 7, 8), poke(good, end + 16, UINT64_MAX, 8), poke(good, end + 24, 0, 8),
      poke(good, end + 24, 7, 8), poke(good, end + 24, table + 1, 8), poke(good, end + 24, end, 8),
      poke(good, end + 24, UINT64_MAX - 3, 8), poke(good, end + 6, 0, 1), poke(good, end + 6, 9, 1),
      poke(good, end + 7, 0, 1), poke(good, end + 7, 9, 1), poke(good, 7, '1', 1),
      // an offset into the header, the table, the trailer, or past the end
      poke(good, table + 12, 0, 4), poke(good, table + 12, 7, 4), poke(good, table + 12, table, 4),
      poke(good, table + 12, end + 31, 4), poke(good, table + 12, 0xFFFFFFFF, 4),
      // references past the last object or into the offset table; one just past the last,
      // where the trailer's unused first bytes would name a real object
      bplist({refs(0xA, {0, 2}), ascii("x")}), bplist({refs(0xD, {1, 9}), ascii("x")}),
      bplist({refs(0xD, {9, 1}), ascii("x")}), bplist({refs(0xA, {1, 256}, 2), ascii("x")}, 2),
      bplist({marker(0xA, 5) + "\x01", ascii("x")}),
      poke(bplist({ascii("x"), refs(0xA, {0, 2})}, 1, 1), 21, 8, 4),
      poke(bplist({ascii("x"), refs(0xD, {0, 2})}, 1, 1), 21, 8, 4),
      // cycles; keys that are not strings; null as a value; sets; data one byte short
      bplist({refs(0xA, {0})}), bplist({refs(0xA, {1}), refs(0xA, {2}), refs(0xA, {0})}),
      bplist({refs(0xD, {1, 0}), ascii("k")}), bplist({refs(0xA, {1, 2}), "\x09", refs(0xA, {2})}),
      bplist({refs(0xD, {1, 2}), "\x10\x01", "\x09"}), bplist({refs(0xD, {1, 2}), "\x41z", "\x09"}),
      bplist({refs(0xD, {1, 2}), refs(0xA, {}), "\x09"}),
      bplist({refs(0xD, {1, 2}), "\x50", "\0"s}),
      bplist({"\xC1\x01", "\x09"}), bplist({"\xB1\x01", "\x09"}),
      bplist({marker(4, 9) + "12345678"}),
      // text
      "{ a = b; } trailing", "(a) (b)", "\"unterminated", "\"escape at end\\", "/* open comment",
      "{ a = b; /* open }", "a = b; /* open", "{ a = b;", "{ a b; }", "{ a = ; }", "{ (x) = y; }",
      "{ <00> = y; }", "{ {} = y; }", "( , )", "( a b )", "( a,, )", "( a", "<0>", "<0g>", "<00",
      "\"\\U\"", "\"\\400\"", "a = b; c", "=", ";", "#", "{ a = b; } }", "\"a\" = \"b\"", "{ a; }",
      "\"a\" = \"b\"; junk", "\"a\xFFz\"", "\"\xC0\xAF\"", "\"\xED\xA0\x80\"", "\"\xE2\x82\"",
      "\xFF\xFE\"\0a"s, "( a \0 )"s};
  const std::pair<std::string, std::vector<std::string>> leaves[] = {
      {"integer", {"", "12a", "1 2", "--1", "18446744073709551616", "-9223372036854775809", "0x",
                   "0x10000000000000000", "0xG", "0xg", "0x@", "0x`", "0x/", "0x:"}},
      {"real", {"", "1.5x", "+-1", "0x10"}}, {"data", {"AAECA", "A===", "AA==AA==", "AA*A"}},
      {"date", {"2023-02-29T00:00:00Z", "1900-02-29T00:00:00Z", "2024-04-31T00:00:00Z",
                "2024-13-01T00:00:00Z", "2024-01-01T24:00:00Z", "2024-01-01 00:00:00Z",
                "2024-1-01T00:00:00Z", "2024-01-01T00:0a:00Z", "2024-01-01Z"}}, {"true", {"yes"}}};
  for (const auto& [tag, bodies] : leaves)
    for (const auto& body : bodies) bad.push_back(P("<" + tag + ">" + body + "</" + tag + ">"));
  // Binary objects that are no values (null, fill, a UID, unknown markers, integers past
  // 64 bits, short reals and dates, non-ASCII ASCII, a count that is no integer), alone and
  // in an array, and counts far beyond the file, which must fail before allocating.
  for (std::string object : {"\0"s, "\x0F"s, "\x0C"s, "\x80\x01"s, "\x70"s, "\x90"s, "\xE0"s,
                             "\x15" + repeat("\0"s, 32), "\x14" + be(1, 8) + be(0, 8),
                             "\x14" + be(UINT64_MAX, 8) + be(1, 8), "\x21\0\0"s, "\x32\0\0\0\0"s,
                             "\x53" "a\xE9z"s, "\x4F\x20\0"s, "\x4F\x14" + repeat("\0"s, 16)})
    bad.insert(bad.end(), {bplist({object}), bplist({refs(0xA, {1}), object})});
  for (int type : {0x4, 0x5, 0x6, 0xA, 0xD})
    for (uint64_t count : {uint64_t{1} << 40, uint64_t{1} << 62, UINT64_MAX})
      bad.push_back(bplist({marker(type, count) + "\x01\x01"}));
  // clang-format on
  for (size_t n = 8; n < good.size(); ++n) bad.push_back(good.substr(0, n));  // truncated
  for (size_t i = 0; i < bad.size(); ++i) EXPECT_EQ(modesReading(bad[i]), 0) << i << ": " << bad[i];
}

TEST(PropertyList, OnlyPropertyListsThatReadBackAreWritten) {
  auto numberKeyed = make<MutableDictionary>();
  numberKeyed->set(I(1), S("x"));
  Ref<Object> deepest = S("leaf");
  for (size_t i = 1; i < kMaxPropertyListDepth; ++i) deepest = A({deepest});
  // A lone high surrogate last in a heap block whose next byte would make a pair.
  void* block = std::malloc(sizeof(String) + 5);
  for (size_t i = 0; i < malloc_usable_size(block); ++i)
    static_cast<volatile char*>(block)[i] = '\xDC';
  std::free(block);
  Ref<Object> highLast = String::fromUTF16(u"a\xD800");
  // Each value, whether it is a property list (deep copy works) and whether it is written.
  const std::tuple<Ref<Object>, bool, bool> rows[] = {
      // clang-format off
      {highLast, true, false}, {URL::fileURL("/", true), false, false}, {numberKeyed, false, false},
{A({make<Object>()}), false, false}, {A({deepest}), false, false},
      {make<UUID>(UUID::Bytes{}), false, false},
      {deepest, true, true}, {D({{"tab\x01", I(1)}}), true, false}, {S("nul \0"sv), true, false},
      {S("\xEF\xBF\xBE"), true, false}, {String::fromUTF16(u"\xDC00 low"), true, false},
      {String::fromUTF16(u"\xD800\xD800"), true, false}, {make<Date>(NAN), true, false},
      {Date::fromUnixTime(-62167219201.0), true, false},
      {Date::fromUnixTime(253402300800.), true, false},
      {S("\t\n\r\x7F\xEF\xBF\xBD"), true, true}, {S("\xC2\x80"), true, true},
      {Date::fromISO8601("0000-01-01T00:00:00Z"), true, true}};
  // clang-format on
  for (const auto& [v, plist, written] : rows) {
    EXPECT_EQ(isPropertyList(*v), plist) << describe(v.get());
    for (auto m : kAllMutabilities) EXPECT_EQ(bool(deepCopy(*v, m)), plist) << describe(v.get());
    EXPECT_EQ(bool(writeXMLPropertyList(*v)), written) << describe(v.get());
    EXPECT_EQ(bool(writeXMLPropertyList(*D({{"k", A({v})}}))), written && v != deepest);
    // The binary form carries every property list, and reads back to the same bytes.
    auto bin = writeBinaryPropertyList(*v);
    auto back = bin ? readBinaryPropertyList(*bin, Mutability::Immutable) : nullptr;
    EXPECT_TRUE(bool(bin) == plist && (!bin || (back && writeBinaryPropertyList(*back) == bin)));
    EXPECT_EQ(bool(writeBinaryPropertyList(*D({{"k", A({v})}}))), plist && v != deepest);
  }
}

TEST(BinaryPropertyList, EqualKeysAndShortStringsAreWrittenOnce) {
  // Distinct objects of equal text, as a tree built in memory holds them.
  const std::string shortText(32, 's'), longText(33, 'l');
  auto tree = A({D({{longText, S(shortText)}}), D({{longText, S(shortText)}}), S(longText),
                 S(longText), S(shortText)});
  auto back = cast<Array>(readBinaryPropertyList(*writeBinaryPropertyList(*tree), {}));
  ASSERT_TRUE(back && back->isEqual(*tree));
  auto first = cast<Dictionary>(back->at(0)), second = cast<Dictionary>(back->at(1));
  EXPECT_EQ(first->keys()[0], second->keys()[0]);
  EXPECT_EQ(first->get(longText), second->get(longText));
  EXPECT_EQ(first->get(longText), back->at(4));
  EXPECT_NE(back->at(2), back->at(3)) << "long values are not looked for";
  // A string alone is the file's one object.
  auto alone = writeBinaryPropertyList(*S(shortText));
  EXPECT_EQ(be(1, 8), alone->substr(alone->size() - 24, 8));
}

TEST(PropertyList, EveryReaderBoundsNestingAndBinaryResultsShareNothingMutable) {
  // The top value is at depth 1: a value may sit at the bound, not past it.
  const std::tuple<std::string, std::string, std::string> nests[] = {
      // clang-format off
      {"<array>", "<true/>", "</array>"}, {"<array>", "", "</array>"}, {"(", "x", ")"},
      {"(", "", ")"},
      {"<dict><key>k</key>", "<true/>", "</dict>"}, {"{a=", "x", ";}"}};
  // clang-format on
  auto chain = [](size_t arrays, size_t refSize) {
    std::vector<std::string> objects;
    for (size_t i = 0; i < arrays; ++i) objects.push_back(refs(0xA, {i + 1}, refSize));
    objects.push_back(ascii("leaf"));
    return objects;
  };
  for (size_t n : {size_t{511}, size_t{512}, size_t{513}, size_t{100000}}) {
    for (const auto& [open, leaf, close] : nests) {
      std::string doc = repeat(open, n) + leaf + repeat(close, n);
      EXPECT_EQ(modesReading(open[0] == '<' ? P(doc) : doc), n + !leaf.empty() > 512 ? 0 : 3);
    }
    EXPECT_EQ(modesReading(bplist(chain(n, 4), 4)), n + 1 > 512 ? 0 : 3);
  }
  // An array reached first at depth 2 must still fail at depth 513.
  auto objects = chain(kMaxPropertyListDepth, 2);
  objects[0] = refs(0xA, {kMaxPropertyListDepth - 1, 1}, 2);
  EXPECT_EQ(modesReading(bplist(objects, 2)), 0);
  // Keys count towards what a file may expand to: a dictionary of 1,000 keys
  // referenced R times makes 2,001 R nodes. 700 references pass the room of an
  // immutable result (four nodes a byte of the file and a million more), 35
  // that of a mutable one (four a byte and 4,096 more).
  auto keyed = [](size_t references) {
    std::vector<uint64_t> dict, top(references, 1);
    for (uint64_t k = 0; k < 1000; ++k) dict.push_back(2 + k);
    dict.insert(dict.end(), 1000, 1002);
    std::vector<std::string> objects{refs(0xA, top, 2), refs(0xD, dict, 2)};
    for (int k = 0; k < 1000; ++k) objects.push_back(ascii("k" + std::to_string(k)));
    objects.push_back(ascii("v"));
    return bplist(objects, 2);
  };
  EXPECT_EQ(modesReading(keyed(700)), 0);
  EXPECT_EQ(modesReading(keyed(35)), 1);
  // Mutable results share nothing mutable: a dictionary and a string each referenced twice.
  auto file = bplist({refs(0xA, {1, 1, 3, 3}), refs(0xD, {2, 3}), ascii("k"), ascii("v")});
  auto m = cast<Array>(readBinaryPropertyList(file, Mutability::MutableContainersAndLeaves));
  cast<MutableDictionary>(m->at(0))->set("k", S("changed"));
  cast<MutableString>(m->at(2))->appendUTF8("!");
  auto want = A({D({{"k", S("changed")}}), D({{"k", S("v")}}), S("v!"), S("v")});
  EXPECT_TRUE(identical(m.get(), want.get()));
}
