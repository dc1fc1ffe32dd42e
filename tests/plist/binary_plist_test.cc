#include <gtest/gtest.h>

#include <cmath>
#include <cstdio>
#include <optional>
#include <string>
#include <vector>

#include "plist/property_list.h"
#include "values/array.h"
#include "values/boolean.h"
#include "values/data.h"
#include "values/date.h"
#include "values/dictionary.h"
#include "values/number.h"
#include "values/string.h"

using namespace qr;

namespace {

constexpr Mutability kAllMutabilities[] = {Mutability::Immutable, Mutability::MutableContainers,
                                           Mutability::MutableContainersAndLeaves};

// ---- building files by hand ----

std::string bigEndian(uint64_t v, size_t n) {
  std::string out(n, '\0');
  for (size_t i = n; i-- > 0; v >>= 8) out[i] = static_cast<char>(v & 0xFF);
  return out;
}

void put(std::string& file, size_t at, uint64_t v, size_t n) {
  file.replace(at, n, bigEndian(v, n));
}

std::string marker(int type, uint64_t count) {
  if (count < 15) return std::string(1, static_cast<char>(type << 4 | count));
  return std::string(1, static_cast<char>(type << 4 | 0xF)) + "\x13" + bigEndian(count, 8);
}
std::string ascii(std::string_view s) { return marker(0x5, s.size()) + std::string(s); }
std::string utf16(std::u16string_view s) {
  std::string out = marker(0x6, s.size());
  for (char16_t c : s) out += bigEndian(c, 2);
  return out;
}
std::string integer(int64_t v) { return "\x13" + bigEndian(static_cast<uint64_t>(v), 8); }
std::string array(std::vector<uint64_t> refs, size_t refSize = 1) {
  std::string out = marker(0xA, refs.size());
  for (auto r : refs) out += bigEndian(r, refSize);
  return out;
}
std::string dict(std::vector<uint64_t> keys, std::vector<uint64_t> values) {
  std::string out = marker(0xD, keys.size());
  for (auto r : keys) out += bigEndian(r, 1);
  for (auto r : values) out += bigEndian(r, 1);
  return out;
}

struct Layout {
  uint8_t offsetSize = 4;
  uint8_t refSize = 1;
  uint64_t top = 0;
};
constexpr size_t kTrailerCount = 8, kTrailerTop = 16, kTrailerTable = 24;

// Header, the objects in order, the offset table and the trailer.
std::string bplist(const std::vector<std::string>& objects, Layout layout = {}) {
  std::string file = "bplist00";
  std::string table;
  for (const auto& o : objects) {
    table += bigEndian(file.size(), layout.offsetSize);
    file += o;
  }
  uint64_t tableOffset = file.size();
  file += table;
  file += std::string(6, '\0');
  file += static_cast<char>(layout.offsetSize);
  file += static_cast<char>(layout.refSize);
  file += bigEndian(objects.size(), 8) + bigEndian(layout.top, 8) + bigEndian(tableOffset, 8);
  return file;
}
void setTrailer(std::string& file, size_t field, uint64_t v) {
  put(file, file.size() - 32 + field, v, 8);
}
uint64_t tableOffset(const std::string& file) {
  uint64_t v = 0;
  for (size_t i = file.size() - 8; i < file.size(); ++i)
    v = v << 8 | static_cast<unsigned char>(file[i]);
  return v;
}

bool readsInNoMode(const std::string& file) {
  for (auto m : kAllMutabilities)
    if (readBinaryPropertyList(file, m)) return false;
  return true;
}

// ---- expected values ----

Ref<Object> S(std::string_view s) { return String::make(s); }
Ref<Object> I(int64_t v) { return Number::integer(v); }
Ref<Object> A(std::vector<Ref<Object>> items) { return make<Array>(std::move(items)); }
Ref<Object> D(std::vector<std::pair<std::string, Ref<Object>>> entries) {
  std::vector<std::pair<Ref<Object>, Ref<Object>>> pairs;
  for (auto& [k, v] : entries) pairs.emplace_back(String::make(k), v);
  return Dictionary::build(std::move(pairs));
}

// The standard output of a python3 program; none when there is no python3.
std::optional<std::string> runPython(const std::string& program) {
  if (std::system("command -v python3 >/dev/null 2>&1") != 0) return std::nullopt;
  FILE* p = popen(("python3 -c '" + program + "'").c_str(), "r");
  if (!p) return std::nullopt;
  std::string out;
  char buf[65536];
  size_t n;
  while ((n = std::fread(buf, 1, sizeof buf, p)) > 0) out.append(buf, n);
  if (pclose(p) != 0) return std::nullopt;
  return out;
}

}  // namespace

TEST(BinaryPropertyList, ReadsWhatPythonPlistlibWrites) {
  auto file = runPython(R"py(
import datetime, plistlib, sys
v = {
  "empty_array": [], "empty_dict": {}, "empty_string": "", "empty_data": b"",
  "ascii": "LaserJet 4", "bmp": "Gr\u00fc\u00df", "astral": "a\U0001F5A8z",
  "ints": [0, 1, 255, 256, 65535, 65536, 2**32 - 1, 2**32, 2**63 - 1, 2**63, 2**64 - 1,
           -1, -255, -2**63],
  "reals": [0.5, -2.5e300, 1e-310, float("inf")],
  "dates": [datetime.datetime(2024, 2, 29, 12, 30, 15), datetime.datetime(1970, 1, 1)],
  "data": bytes(range(256)) * 3,
  "bools": [True, False],
  "nested": {"a": [[{"b": [1, "x", {}]}]], "strings": ["s%d" % i for i in range(40)]},
  "repeated": ["same", "same", 7, 7],
  "wide": {"k%03d" % i: i * 1000 for i in range(300)},
}
sys.stdout.buffer.write(plistlib.dumps(v, fmt=plistlib.FMT_BINARY))
)py");
  if (!file) GTEST_SKIP() << "python3 with plistlib is not available";

  std::string bytes;
  for (int i = 0; i < 256; ++i) bytes += static_cast<char>(i);
  std::vector<Ref<Object>> strings;
  for (int i = 0; i < 40; ++i) strings.push_back(S("s" + std::to_string(i)));
  std::vector<std::pair<std::string, Ref<Object>>> wide;
  for (int i = 0; i < 300; ++i) {
    char key[8];
    std::snprintf(key, sizeof key, "k%03d", i);
    wide.emplace_back(key, I(i * 1000));
  }
  auto expected = D({
      {"empty_array", A({})},
      {"empty_dict", D({})},
      {"empty_string", S("")},
      {"empty_data", Data::copy(std::string_view())},
      {"ascii", S("LaserJet 4")},
      {"bmp", S("Gr\xC3\xBC\xC3\x9F")},
      {"astral", S("a\xF0\x9F\x96\xA8z")},
      {"ints", A({I(0), I(1), I(255), I(256), I(65535), I(65536), I(4294967295), I(4294967296),
                  I(INT64_MAX), Number::unsignedInteger(1ull << 63),
                  Number::unsignedInteger(UINT64_MAX), I(-1), I(-255), I(INT64_MIN)})},
      {"reals", A({Number::real(0.5), Number::real(-2.5e300), Number::real(1e-310),
                   Number::real(HUGE_VAL)})},
      {"dates", A({Date::fromISO8601("2024-02-29T12:30:15Z"), Date::fromUnixTime(0)})},
      {"data", Data::copy(bytes + bytes + bytes)},
      {"bools", A({Boolean::trueValue(), Boolean::falseValue()})},
      {"nested",
       D({{"a", A({A({D({{"b", A({I(1), S("x"), D({})})}})})})}, {"strings", A(strings)}})},
      {"repeated", A({S("same"), S("same"), I(7), I(7)})},
      {"wide", D(wide)},
  });

  for (auto m : kAllMutabilities) {
    auto v = readBinaryPropertyList(*file, m);
    ASSERT_TRUE(v) << "mutability " << static_cast<int>(m);
    EXPECT_TRUE(equal(v, expected)) << describe(v.get());
    auto d = cast<Dictionary>(v);
    auto top64 = dynamic_cast<Number*>(d->getAs<Array>("ints")->at(10));
    EXPECT_TRUE(top64->isUnsigned());
    EXPECT_EQ(top64->uint64Value(), UINT64_MAX);
    auto repeated = d->getAs<Array>("repeated");
    bool freshLeaves = m == Mutability::MutableContainersAndLeaves;
    EXPECT_EQ(repeated->at(0) == repeated->at(1), !freshLeaves)
        << "one string object, shared unless mutable leaves were asked for";
    EXPECT_EQ(dynamic_cast<MutableDictionary*>(d.get()) != nullptr, m != Mutability::Immutable);
    EXPECT_EQ(dynamic_cast<MutableString*>(d->get("ascii")) != nullptr, freshLeaves);
    EXPECT_EQ(dynamic_cast<MutableData*>(d->get("data")) != nullptr, freshLeaves);
  }
  PropertyListFormat format = PropertyListFormat::XML;
  EXPECT_TRUE(equal(readPropertyList(*file, Mutability::Immutable, &format), expected));
  EXPECT_EQ(format, PropertyListFormat::Binary);
}

TEST(BinaryPropertyList, ReadsFilesWithWideReferencesAndOffsets) {
  // 70,000 objects need four-byte references and offsets.
  auto file = runPython(
      "import plistlib, sys; "
      "sys.stdout.buffer.write(plistlib.dumps(list(range(70000)), fmt=plistlib.FMT_BINARY))");
  if (!file) GTEST_SKIP() << "python3 with plistlib is not available";
  auto a = cast<Array>(readBinaryPropertyList(*file, Mutability::Immutable));
  ASSERT_TRUE(a);
  ASSERT_EQ(a->count(), 70000u);
  for (size_t i = 0; i < a->count(); i += 997)
    EXPECT_EQ(static_cast<Number*>(a->at(i))->int64Value(), static_cast<int64_t>(i));
}

TEST(BinaryPropertyList, DecodesEachScalarForm) {
  auto one = [](const std::string& object) {
    return readBinaryPropertyList(bplist({object}), Mutability::Immutable);
  };
  EXPECT_TRUE(equal(one("\x10\xFF"), I(255)));
  EXPECT_TRUE(equal(one(std::string("\x11\x80\x00", 3)), I(32768)));
  EXPECT_TRUE(equal(one("\x12\xFF\xFF\xFF\xFF"), I(4294967295)));
  EXPECT_TRUE(equal(one("\x13\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFE"), I(-2)));
  EXPECT_TRUE(equal(one("\x14" + bigEndian(0, 8) + bigEndian(5, 8)), I(5)));
  EXPECT_TRUE(
      equal(one("\x14" + bigEndian(UINT64_MAX, 8) + bigEndian(1ull << 63, 8)), I(INT64_MIN)));
  EXPECT_TRUE(equal(one(std::string("\x22\x3F\xC0\x00\x00", 5)), Number::real(1.5)));
  EXPECT_TRUE(
      equal(one(std::string("\x23\x40\x04\x00\x00\x00\x00\x00\x00", 9)), Number::real(2.5)));
  EXPECT_TRUE(equal(one(std::string("\x33\x00\x00\x00\x00\x00\x00\x00\x00", 9)),
                    Date::fromISO8601("2001-01-01T00:00:00Z")));
  EXPECT_TRUE(equal(one("\x08"), Boolean::falseValue()));
  EXPECT_TRUE(equal(one("\x09"), Boolean::trueValue()));
  EXPECT_TRUE(equal(one(utf16(u"\xD800x")), String::fromUTF16(u"\xD800x")))
      << "UTF-16 strings keep any code units, lone surrogates included";
  // A 2-byte extended count.
  EXPECT_TRUE(equal(one("\x4F\x11" + bigEndian(300, 2) + std::string(300, 'z')),
                    Data::copy(std::string(300, 'z'))));
}

TEST(BinaryPropertyList, RejectsWhatIsNotAValue) {
  for (std::string object : {
           std::string(1, '\0'),     // null
           std::string("\x0F"),      // fill
           std::string("\x0C"),      // unknown singleton
           std::string("\x80\x01"),  // UID
           std::string("\x70"),      // no such type in this version
           std::string("\x90"), std::string("\xE0"), std::string("\xF0"),
           std::string("\x15") + std::string(32, '\0'),          // 32-byte integer
           "\x14" + bigEndian(1, 8) + bigEndian(0, 8),           // 2^64 and beyond
           "\x14" + bigEndian(UINT64_MAX, 8) + bigEndian(1, 8),  // below -2^63
           std::string("\x21\x00\x00", 3),                       // 2-byte real
           std::string("\x32\x00\x00\x00\x00", 5),               // 4-byte date
           std::string("\x53"
                       "a\xE9z"),               // non-ASCII in ASCII string
           std::string("\x4F\x20\x00"),         // count not an integer
           "\x4F\x14" + std::string(16, '\0'),  // 16-byte count
       }) {
    EXPECT_TRUE(readsInNoMode(bplist({object}))) << testing::PrintToString(object);
    // Inside a container too.
    EXPECT_TRUE(readsInNoMode(bplist({array({1}), object}))) << testing::PrintToString(object);
  }
  // Sets, whatever they hold.
  EXPECT_TRUE(readsInNoMode(bplist({"\xC1\x01", "\x09"})));
  EXPECT_TRUE(readsInNoMode(bplist({"\xB1\x01", "\x09"})));
  // Keys must be strings.
  EXPECT_TRUE(readsInNoMode(bplist({dict({1}, {2}), "\x10\x01", ascii("v")})));
  EXPECT_TRUE(readsInNoMode(bplist({dict({1}, {2}), "\x41z", ascii("v")})));
  EXPECT_TRUE(readsInNoMode(bplist({dict({1}, {2}), array({}), ascii("v")})));
  EXPECT_TRUE(readsInNoMode(bplist({dict({1}, {2}), ascii("k"), std::string(1, '\0')})))
      << "null as a dictionary value";
}

TEST(BinaryPropertyList, RepeatedKeyKeepsTheLastValue) {
  for (auto m : kAllMutabilities) {
    auto d = cast<Dictionary>(readBinaryPropertyList(
        bplist({dict({1, 3}, {2, 4}), ascii("k"), ascii("first"), utf16(u"k"), ascii("last")}), m));
    ASSERT_TRUE(d);
    EXPECT_EQ(d->count(), 1u);
    EXPECT_TRUE(equal(Ref<Object>(d->get("k")), S("last")));
  }
}

TEST(BinaryPropertyList, FailsCleanlyOnDamagedLayout) {
  const std::string good =
      bplist({dict({1, 2}, {3, 4}), ascii("name"), ascii("list"), ascii("Acme"), array({5, 6}),
              integer(7), utf16(u"\x00e9t\x00e9")});
  ASSERT_TRUE(readBinaryPropertyList(good, Mutability::Immutable));

  for (size_t n = 0; n < good.size(); ++n)
    EXPECT_TRUE(readsInNoMode(good.substr(0, n))) << "truncated to " << n << " bytes";

  // Trailer fields out of range.
  for (auto [field, value] : std::vector<std::pair<size_t, uint64_t>>{
           {kTrailerCount, 0},
           {kTrailerCount, 8},  // more entries than the offset table holds
           {kTrailerCount, UINT64_MAX},
           {kTrailerTop, 7},
           {kTrailerTop, UINT64_MAX},
           {kTrailerTable, 0},
           {kTrailerTable, 7},
           {kTrailerTable, tableOffset(good) + 1},  // table runs into the trailer
           {kTrailerTable, good.size()},
           {kTrailerTable, UINT64_MAX - 3},
       }) {
    std::string bad = good;
    setTrailer(bad, field, value);
    EXPECT_TRUE(readsInNoMode(bad)) << "field " << field << " = " << value;
  }
  for (size_t at : {size_t{6}, size_t{7}})
    for (int size : {0, 9, 255}) {
      std::string bad = good;
      bad[bad.size() - 32 + at] = static_cast<char>(size);
      EXPECT_TRUE(readsInNoMode(bad)) << "size byte " << at << " = " << size;
    }
  std::string version = good;
  version[7] = '1';
  EXPECT_TRUE(readsInNoMode(version));

  // Offsets into the header, the offset table, the trailer and past the end.
  for (uint64_t offset : {uint64_t{0}, uint64_t{7}, tableOffset(good), good.size() - 1,
                          good.size() + 100, uint64_t{0xFFFFFFFF}}) {
    std::string bad = good;
    put(bad, tableOffset(good) + 4 * 3, offset, 4);
    EXPECT_TRUE(readsInNoMode(bad)) << "offset " << offset;
  }
  // References past the last object, from an array and from a dictionary.
  EXPECT_TRUE(readsInNoMode(bplist({array({0, 2}), ascii("x")})));
  EXPECT_TRUE(readsInNoMode(bplist({dict({1}, {9}), ascii("x")})));
  EXPECT_TRUE(readsInNoMode(bplist({dict({9}, {1}), ascii("x")})));
  EXPECT_TRUE(readBinaryPropertyList(bplist({array({1, 1}, 2), ascii("x")}, {.refSize = 2}),
                                     Mutability::Immutable));
  EXPECT_TRUE(readsInNoMode(bplist({array({1, 0x100}, 2), ascii("x")}, {.refSize = 2})));
  // A container whose references run into the offset table.
  EXPECT_TRUE(readsInNoMode(bplist({marker(0xA, 5) + "\x01", ascii("x")})));
}

TEST(BinaryPropertyList, HugeDeclaredCountsFailBeforeAllocating) {
  // Each claims far more than the file holds; a reader that trusted the count
  // would ask for terabytes (which the sanitizer build reports as an error).
  for (int type : {0x4, 0x5, 0x6, 0xA, 0xD})
    for (uint64_t count : {uint64_t{1} << 40, uint64_t{1} << 62, UINT64_MAX})
      EXPECT_TRUE(readsInNoMode(bplist({marker(type, count) + "\x01\x01"})))
          << "type " << type << " count " << count;
  EXPECT_TRUE(readsInNoMode(bplist({marker(0x4, 100) + std::string(99, 'x')}))) << "one byte short";
}

TEST(BinaryPropertyList, ReferenceCyclesFail) {
  EXPECT_TRUE(readsInNoMode(bplist({array({0})})));
  EXPECT_TRUE(readsInNoMode(bplist({array({1}), array({2}), array({0})})));
  EXPECT_TRUE(readsInNoMode(bplist({dict({1}, {0}), ascii("self")})));
  EXPECT_TRUE(readsInNoMode(bplist({array({1, 2}), ascii("x"), dict({1}, {2})})));
}

TEST(BinaryPropertyList, NestingIsBoundedWithoutRecursingPastTheBound) {
  auto chain = [](size_t arrays) {
    std::vector<std::string> objects;
    for (size_t i = 0; i < arrays; ++i) objects.push_back(array({i + 1}, 4));
    objects.push_back(ascii("leaf"));
    return bplist(objects, {.offsetSize = 4, .refSize = 4});
  };
  EXPECT_TRUE(readsInNoMode(chain(100000)));
  // The leaf at the deepest allowed level, then one level too deep.
  for (auto m : kAllMutabilities) {
    EXPECT_TRUE(readBinaryPropertyList(chain(kMaxPropertyListDepth - 1), m));
    EXPECT_FALSE(readBinaryPropertyList(chain(kMaxPropertyListDepth), m));
  }
  // A shallow path reaches an object first; a deeper path to the same object
  // must still respect the bound.
  std::vector<std::string> objects;
  size_t n = kMaxPropertyListDepth;
  for (size_t i = 0; i < n; ++i) objects.push_back(array({i + 1}, 2));
  objects.push_back(ascii("leaf"));
  objects[0] = array({n - 1, 1}, 2);  // the last array at depth 2, then at depth n
  auto file = bplist(objects, {.offsetSize = 4, .refSize = 2});
  for (auto m : kAllMutabilities) EXPECT_FALSE(readBinaryPropertyList(file, m));
}

TEST(BinaryPropertyList, SharedObjectsAreNotExpanded) {
  // A 1000-element array whose every element is the same 64 KiB data object.
  std::vector<uint64_t> refs(1000, 1);
  auto file = bplist({array(refs, 2), marker(0x4, 65536) + std::string(65536, 'p')},
                     {.offsetSize = 4, .refSize = 2});
  auto a = cast<Array>(readBinaryPropertyList(file, Mutability::Immutable));
  ASSERT_TRUE(a);
  ASSERT_EQ(a->count(), 1000u);
  for (size_t i = 1; i < a->count(); ++i) ASSERT_EQ(a->at(i), a->at(0));
  // Immutable leaves stay shared in mutable containers.
  auto m = cast<MutableArray>(readBinaryPropertyList(file, Mutability::MutableContainers));
  ASSERT_TRUE(m);
  EXPECT_EQ(m->at(999), m->at(0));
  // 1000 fresh copies would be 64 MiB from a 66 KiB file.
  EXPECT_FALSE(readBinaryPropertyList(file, Mutability::MutableContainersAndLeaves));

  // The same array shared 1000 times: immutable results share it; mutable
  // ones would need 1000 separate arrays, far past the budget for the file.
  std::vector<uint64_t> inner;
  for (uint64_t i = 0; i < 100; ++i) inner.push_back(2 + i);
  std::vector<std::string> objects = {array(refs, 2), array(inner, 2)};
  for (int i = 0; i < 100; ++i) objects.push_back("\x10" + std::string(1, static_cast<char>(i)));
  file = bplist(objects, {.offsetSize = 4, .refSize = 2});
  a = cast<Array>(readBinaryPropertyList(file, Mutability::Immutable));
  ASSERT_TRUE(a);
  EXPECT_EQ(a->at(0), a->at(999));
  EXPECT_EQ(static_cast<Array*>(a->at(0))->count(), 100u);
  EXPECT_FALSE(readBinaryPropertyList(file, Mutability::MutableContainers));
  EXPECT_FALSE(readBinaryPropertyList(file, Mutability::MutableContainersAndLeaves));
  // Doubling at every level: 2^60 nodes as a tree from a file of 60 arrays.
  objects.clear();
  for (uint64_t i = 0; i < 60; ++i) objects.push_back(array({i + 1, i + 1}));
  objects.push_back(ascii("x"));
  for (auto mode : kAllMutabilities)
    EXPECT_FALSE(readBinaryPropertyList(bplist(objects), mode)) << static_cast<int>(mode);
}

TEST(BinaryPropertyList, MutableResultsDoNotAliasContainers) {
  // The dictionary is referenced twice; a change through one path must not show through the other.
  auto file = bplist({array({1, 1}), dict({2}, {3}), ascii("k"), ascii("v")});
  auto a = cast<Array>(readBinaryPropertyList(file, Mutability::MutableContainers));
  ASSERT_TRUE(a);
  auto first = cast<MutableDictionary>(Ref<Object>(a->at(0)));
  ASSERT_TRUE(first);
  EXPECT_NE(a->at(0), a->at(1));
  first->set("k", S("changed"));
  EXPECT_TRUE(equal(Ref<Object>(static_cast<Dictionary*>(a->at(1))->get("k")), S("v")));
}
