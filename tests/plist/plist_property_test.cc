// Random property lists through every deep copy, every reader and Python's plistlib.
#include <gtest/gtest.h>

#include <bit>
#include <cstdio>
#include <random>

#include "plist/property_list.h"
#include "support/plist_identity.h"
#include "support/temp_dir.h"

using namespace qr;
using namespace qrtest;

namespace {

// Seeded trees of every kind of value; each leg turns off what its other side cannot carry.
struct Gen {
  std::mt19937_64 rng;
  bool scalars = true;  // numbers, booleans and dates: the text format has none
  // plistlib's XML writer turns CR into LF, and its binary writer merges -0.0 into 0.0.
  bool plistlib = false;
  bool nan = false;  // whether a NaN was made (and perhaps kept)
  int budget = 0;    // containers still to make

  uint64_t pick(uint64_t n) { return rng() % n; }

  Ref<String> string() {
    static const std::u16string_view kPieces[] = {
        u"\r", u"&",      u"<",      u">",      u"\t",         u"\n",         u"]]>",       u"\"",
        u"\\", u"\u00e9", u"\uff5e", u"\ufffd", u"\U0001F5A8", u"\U00010000", u"\U0010FFFF"};
    size_t first = plistlib, end = pick(2) ? 9 : 15;  // half of the strings are ASCII
    std::u16string s;
    for (size_t n = pick(400) ? pick(pick(2) ? 6 : 40) : 60000; n-- > 0;)
      s += pick(3) ? std::u16string(1, u"aZ09_$+:.- "[pick(11)])
                   : kPieces[first + pick(end - first)];
    return pick(4) ? String::fromUTF16(s) : String::fromUTF16(s)->mutableCopy();
  }

  Ref<Object> leaf() {
    static const int64_t kInts[] = {0, -1, INT64_MIN, INT64_MAX};
    static const double kReals[] = {0.0, -0.0, 0.1, 5e-324, -1e300, HUGE_VAL, -HUGE_VAL, NAN};
    std::vector<uint8_t> bytes(pick(400) ? pick(pick(2) ? 4 : 120) : 300000);
    int64_t i = pick(4) ? int64_t(rng()) >> pick(64) : kInts[pick(4)];
    double d = pick(2) ? kReals[pick(8)] : std::bit_cast<double>(rng());
    for (auto& b : bytes) b = static_cast<uint8_t>(rng());
    uint64_t kind = pick(scalars ? 6 : 2);
    if (kind == 0) return string();
    if (kind == 1) return pick(4) ? make<Data>(bytes) : make<MutableData>(bytes);
    if (kind == 2) return Boolean::of(pick(2));
    // Dates: whole seconds, years 1 to 9999.
    if (kind == 3) return make<Date>(double(int64_t(pick(315537897600)) - 63113904000));
    if (kind == 4) return pick(4) ? Number::integer(i) : Number::unsignedInteger(uint64_t(i));
    nan = nan || std::isnan(d);
    return R(plistlib && d == 0 ? 0.0 : d);
  }

  Ref<Object> value(size_t depth) {
    if (depth >= kMaxPropertyListDepth || pick(3) == 0 || budget-- <= 0) return leaf();
    std::vector<Ref<Object>> items;
    for (size_t n = pick(6); n-- > 0;) items.push_back(value(depth + 1));
    if (pick(2)) return pick(2) ? A(items) : Ref<Object>(make<MutableArray>(items));
    auto d = make<MutableDictionary>();
    for (auto& v : items) d->set(string(), v);
    return pick(2) ? Ref<Object>(d) : d->copy();
  }

  // Sometimes wrapped to a random depth, up to the readers' limit.
  Ref<Object> tree(int size) {
    budget = size;
    size_t depth = pick(6) ? 1 : 1 + pick(kMaxPropertyListDepth);
    Ref<Object> v = value(depth);
    while (--depth > 0) v = pick(2) ? A({v}) : D({{"k", v}});
    return v;
  }
};

// The text format, with space or a comment before each token and every unit
// outside printable ASCII escaped, in octal or hex.
std::string toText(const Object& v, Gen& g) {
  static const char* kGaps[] = {"", " ", "\n\t", "/* c */", "// c\n"};
  std::string out = kGaps[g.pick(5)];
  if (auto* s = cast<String>(&v)) {
    auto units = s->utf16();
    out += '"';
    for (char16_t c : units) {
      char escaped[8];
      std::snprintf(escaped, sizeof escaped, c < 0x100 && g.pick(2) ? "\\%03o" : "\\U%04x", c);
      out += c >= 0x20 && c < 0x7F && c != '"' && c != '\\' ? std::string(1, char(c)) : escaped;
    }
    return out + '"';
  }
  if (auto* d = cast<Data>(&v)) {
    out += '<';
    for (uint8_t b : d->span())
      out += std::string(g.pick(4) ? "" : " ") + "0123456789aBcDeF"[b >> 4] +
             "0123456789AbCdEf"[b & 15];
    return out + '>';
  }
  if (auto* a = cast<Array>(&v)) {
    out += '(';
    for (const auto& item : *a) out += toText(*item, g) + ",";
    if (!a->isEmpty() && g.pick(2)) out.pop_back();  // the last comma is optional
    return out + ')';
  }
  out += '{';
  cast<Dictionary>(&v)->forEach(
      [&](const Object& k, const Object& x) { out += toText(k, g) + "=" + toText(x, g) + ";"; });
  return out + '}';
}

void expectRead(std::string_view bytes, PropertyListFormat format, const Ref<Object>& want,
                bool nan, bool canonical = false) {
  for (auto m : kAllMutabilities) {
    PropertyListFormat f;
    auto got = readPropertyList(bytes, m, &f);
    EXPECT_TRUE(identical(got.get(), want.get(), &m)) << bytes.substr(0, 2000);
    EXPECT_EQ(f, format);
    EXPECT_TRUE(nan || (equal(got, want) && equal(want, got)));
    EXPECT_TRUE(!got || !canonical || writeXMLPropertyList(*got) == bytes) << "not a fixed point";
  }
}

}  // namespace

TEST(PropertyList, RandomTreesSurviveEveryCopyEveryReaderAndPlistlib) {
  std::vector<std::pair<Ref<Object>, bool>> forPython;  // with whether they hold a NaN
  std::string docs;
  for (uint64_t seed = 0; seed < 300; ++seed) {
    SCOPED_TRACE(seed);
    // Every third tree is also for plistlib.
    Gen g{std::mt19937_64(seed), true, seed % 3 == 0}, t{std::mt19937_64(seed), false};
    auto tree = g.tree(seed % 50), strings = t.tree(seed % 50);
    for (auto m : kAllMutabilities) {
      auto copy = deepCopy(*tree, m);
      EXPECT_TRUE(identical(copy.get(), tree.get(), &m));
      EXPECT_TRUE(equal(copy, tree) && equal(tree, copy));
    }
    std::string xml = writeXMLPropertyList(*tree).value();
    std::string bin = writeBinaryPropertyList(*tree).value();
    expectRead(xml, PropertyListFormat::XML, tree, g.nan, true);
    expectRead(bin, PropertyListFormat::Binary, tree, g.nan);
    expectRead(toText(*strings, t), PropertyListFormat::Text, strings, false);
    if (seed % 3 != 0) continue;
    forPython.emplace_back(tree, g.nan);
    for (auto* doc : {&xml, &bin}) docs += std::to_string(doc->size()) + '\n' + *doc;
  }
  // plistlib reads each document we write (XML and binary) and writes it again as both.
  if (std::system("python3 -c 'import plistlib' 2>/dev/null") != 0) GTEST_SKIP() << "no python3";
  const char kProgram[] = R"(import plistlib as p, sys
sys.setrecursionlimit(10000)
d, i = sys.stdin.buffer.read(), 0
while i < len(d):
  j = d.index(b'\n', i) + 1; i = j + int(d[i:j])
  for out in (p.dumps(p.loads(d[j:i]), fmt=f) for f in (p.FMT_XML, p.FMT_BINARY)):
    sys.stdout.buffer.write(b'%d\n' % len(out) + out))";
  TempDir dir;
  std::string run = "python3 " + dir.write("p", kProgram) + " <" + dir.write("in", docs) + " >";
  ASSERT_EQ(std::system((run + dir / "out").c_str()), 0);
  std::string out = readText(dir / "out");
  size_t at = 0;
  for (size_t i = 0; i < 4 * forPython.size(); ++i) {
    size_t line = out.find('\n', at), n = std::stoul(out.substr(at, line - at));
    auto& [tree, nan] = forPython[i / 4];
    expectRead(out.substr(line + 1, n),
               i % 2 ? PropertyListFormat::Binary : PropertyListFormat::XML, tree, nan);
    at = line + 1 + n;
  }
  EXPECT_EQ(at, out.size());
}
