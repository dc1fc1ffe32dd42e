// Value operations, a table each. Deep copy, equality and mutability of whole
// trees are checked on random trees in tests/plist/, with the values that are
// no property lists.
#include <gtest/gtest.h>

#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <functional>

#include "support/plist_identity.h"
#include "values/url.h"
#include "values/uuid.h"

using namespace qr;
using namespace qrtest;

TEST(String, ConvertsBetweenUTF8AndUTF16) {
  std::string r = "\xEF\xBF\xBD";  // U+FFFD
  // Lone surrogates print as U+FFFD; everything else converts back unit for unit.
  const std::pair<std::u16string_view, std::string> rows[] = {
      // clang-format off
      {u"", ""}, {u"\xD800\xDC00", "\xF0\x90\x80\x80"}, {u"\xDBFF\xDFFF", "\xF4\x8F\xBF\xBF"},
      {u"G\u00fc\u07ff\u0800\uffff", "G\xC3\xBC\xDF\xBF\xE0\xA0\x80\xEF\xBF\xBF"},
      {u"x\xD800", "x" + r}, {u"\xDFFF\xD800\xDBFF", r + r + r}};
  // Ill-formed UTF-8 (overlong, a surrogate, past U+10FFFF, truncated, stray
  // bytes) is refused, or has each bad byte replaced.
  const std::pair<std::string_view, std::string> bad[] = {
      {"\xC0\xAF", r + r}, {"\xE0\x80\x80", r + r + r}, {"\xED\xA0\x80", r + r + r},
      {"\xF4\x90\x80\x80z", r + r + r + r + "z"}, {"ab\xE2\x82", "ab" + r + r},
      {"\x80\xF8", r + r}};
  // clang-format on
  for (auto& [units, utf8] : rows) {
    auto s = String::fromUTF16(units);
    bool back = String::fromUTF8(utf8)->utf16() == units;
    EXPECT_TRUE(s->length() == units.size() && s->utf8() == utf8 &&
                back == (utf8.find(r) == utf8.npos))
        << utf8;
  }
  for (auto& [bytes, made] : bad)
    EXPECT_TRUE(!String::fromUTF8(bytes) && String::make(bytes)->utf8() == made) << bytes;
}

TEST(Object, EqualityAndHash) {
  auto date = [](double s) -> Ref<Object> { return make<Date>(s); };
  auto u = [](uint64_t v) -> Ref<Object> { return Number::unsignedInteger(v); };
  auto wide = String::make("\xC3\xA9")->mutableCopy();  // wide storage, then ASCII text
  wide->replace(0, 1, *String::make("Ink Jet"));
  const std::tuple<Ref<Object>, Ref<Object>, bool> rows[] = {
      // clang-format off
      {I(3), R(3.0), true}, {I(3), R(3.5), false}, {R(0.5), R(0.5), true}, {R(0.5), R(0.25), false},
      {R(-0.0), R(0.0), true}, {R(NAN), R(NAN), false}, {u(UINT64_MAX), I(-1), false},
      {u(UINT64_MAX), R(0x1p64), false}, {I(INT64_MIN), R(-0x1p63), true},
      {I(INT64_MAX), R(0x1p63), false}, {Boolean::trueValue(), I(1), false},
      {date(0), date(0), true},
      {date(0), date(1), false}, {date(0), R(0), false}, {S("a"), S("b"), false},
      {S("a"), S("ab"), false}, {wide, S("Ink Jet"), true}, {B("ab"), B("ab"), true},
      {B("ab"), B("a"), false}, {B("a"), S("a"), false}, {A({I(1)}), A({I(2)}), false},
      {A({I(1), S("x")}), A({R(1.0), S("x")}), true}, {D({{"a", I(1)}}), D({{"a", I(2)}}), false},
      {D({{"a", I(1)}, {"b", I(2)}}), D({{"b", I(2)}, {"a", R(1)}}), true},
      {D({{"a", I(1)}}), D({{"b", I(1)}}), false}};
  // clang-format on
  for (auto& [a, b, same] : rows)
    EXPECT_TRUE(a->isEqual(*b) == same && b->isEqual(*a) == same &&
                (!same || a->hash() == b->hash()))
        << describe(a.get()) << " vs " << describe(b.get());
}

TEST(MutableArray, IndexBounds) {
  // Past the end: an insert may append there, a set or a removal may not.
  auto a = make<MutableArray>(std::vector<Ref<Object>>{I(1)});
  EXPECT_THROW(a->insert(2, I(9)), std::out_of_range);
  EXPECT_THROW(a->set(1, I(9)), std::out_of_range);
  EXPECT_THROW(a->removeAt(1), std::out_of_range);
  a->insert(1, I(2));
  a->set(1, I(3));
  a->removeAt(0);
  EXPECT_TRUE(identical(a.get(), A({I(3)}).get()));
}

// Lookup by UTF-8 text finds keys whatever their storage: narrow, wide, or
// wide holding only ASCII.
TEST(Dictionary, TextLookupFindsKeysOfEveryStorage) {
  auto wideASCII = String::make("\xC3\xA9")->mutableCopy();
  wideASCII->replace(0, 1, *String::make("Kind"));
  auto d = make<MutableDictionary>();
  for (Ref<Object> key : {S("USB"), S("Caf\xC3\xA9 \xE2\x82\xAC"), Ref<Object>(wideASCII)})
    d->set(key, I(1));
  for (const char* text : {"USB", "Caf\xC3\xA9 \xE2\x82\xAC", "Kind"})
    EXPECT_TRUE(d->get(text)) << text;
  EXPECT_FALSE(d->get("Caf\xC3\xA9"));
}

// Random sets and removals against a model, across the sizes where the index
// comes and goes; after each step the immutable forms built from the same
// pairs (with repeats) and copied must agree with it, in order.
TEST(Dictionary, EveryFormAgreesWithAModelThroughSetsAndRemovals) {
  std::srand(7);
  auto d = make<MutableDictionary>();
  std::vector<std::pair<std::string, int>> model;  // insertion order
  std::vector<std::pair<Ref<Object>, Ref<Object>>> history;
  for (int step = 0; step < 3000; ++step) {
    std::string key = "k" + std::to_string(std::rand() % (step < 1500 ? 40 : 12));
    auto at = std::find_if(model.begin(), model.end(), [&](auto& e) { return e.first == key; });
    if (std::rand() % 3 == 0) {
      EXPECT_EQ(std::rand() % 2 ? d->remove(key) : d->remove(*S(key)), at != model.end());
      if (at != model.end()) model.erase(at);
      history.clear();
      for (auto& [k, v] : model) history.emplace_back(S(k), I(v));
    } else {
      d->set(S(key), I(step));
      if (at != model.end())
        at->second = step;
      else
        model.emplace_back(key, step);
      history.emplace_back(S(key), I(step));
    }
    auto pairs = history;
    Ref<Dictionary> forms[] = {d, Dictionary::build(std::move(pairs)), d->copy(), d->mutableCopy()};
    for (const auto& form : forms) {
      ASSERT_EQ(form->count(), model.size()) << step;
      std::vector<std::pair<std::string, int>> seen;
      form->forEach([&](const Object& k, const Object& v) {
        seen.emplace_back(static_cast<const String&>(k).utf8(),
                          int(static_cast<const Number&>(v).int64Value()));
      });
      ASSERT_EQ(seen, model) << step;
      for (int k = 0; k < 42; k += 5) {
        std::string text = "k" + std::to_string(k);
        auto in =
            std::find_if(model.begin(), model.end(), [&](auto& e) { return e.first == text; });
        ASSERT_EQ(form->get(text) != nullptr, in != model.end()) << step << text;
        ASSERT_EQ(form->get(*S(text)), form->get(text));
      }
      ASSERT_TRUE(form->isEqual(*forms[0]));
    }
  }
}

TEST(UUID, ParsesEitherCaseAndRefusesAnythingElse) {
  const std::pair<const char*, const char*> rows[] = {
      {"0b1c0f8e-3d2a-4c47-9a0e-6f1d2c3b4a01", "0B1C0F8E-3D2A-4C47-9A0E-6F1D2C3B4A01"},
      {"AbCdEf01-2345-6789-aBcD-eF0123456789", "ABCDEF01-2345-6789-ABCD-EF0123456789"},
      {"0B1C0F8E-3D2A-4C47-9A0E-6F1D2C3B4A0G", nullptr},
      {"0B1C0F8E3D2A-4C47-9A0E-6F1D2C3B4A01-", nullptr},
      {"0B1C0F8E-3D2A-4C47-9A0E-6F1D2C3B4A0", nullptr}};
  for (auto [text, canonical] : rows) {
    auto uuid = UUID::fromString(text);
    EXPECT_EQ(uuid ? uuid->string() : "", canonical ? canonical : "") << text;
  }
}

// File URLs of bundles: escaped on the way in, resolved against a base, and
// decoded back to the path.
TEST(URL, FileURLsEscapeResolveAndDecode) {
  auto base = URL::fileURL("/opt/P r/USB.plugin", true);
  const struct {
    Ref<URL> url;
    const char* absolute;
    const char* path;
  } rows[] = {{base, "file:///opt/P%20r/USB.plugin/", "/opt/P r/USB.plugin"},
              {URL::fileURL("../B\xC3\xA9.plugin", true, base), "file:///opt/P%20r/B%C3%A9.plugin/",
               "/opt/P r/B\xC3\xA9.plugin"},
              {URL::withString("file:///x/%4a%4A%2f"), "file:///x/%4a%4A%2f", "/x/JJ"},
              {URL::withString("file:///x/%4G"), nullptr, nullptr},
              {URL::withString("http://example.org/a"), "http://example.org/a", nullptr}};
  for (const auto& r : rows) {
    EXPECT_EQ(r.url ? r.url->absoluteString() : "", r.absolute ? r.absolute : "");
    auto path = r.url ? r.url->fileSystemPath() : std::nullopt;
    EXPECT_EQ(path.value_or(""), r.path ? r.path : "") << (r.absolute ? r.absolute : "");
  }
  // A relative path is taken from the current directory, and relative text
  // replaces the last segment of a base that does not end in "/".
  char* cwd = getcwd(nullptr, 0);
  ASSERT_TRUE(cwd);
  EXPECT_EQ(URL::fileURL("P r.plugin", true)->absoluteString(),
            "file://" + percentEscapePath(cwd) + "/P%20r.plugin/");
  free(cwd);
  EXPECT_EQ(URL::withString("c", URL::withString("file:///a/b"))->absoluteString(), "file:///a/c");
  // Text to decode, and what it decodes to ("!" for malformed).
  const std::pair<std::string_view, std::string_view> escapes[] = {
      {"", ""},     {"a%41b", "aAb"}, {"%2f%2F", "//"},    {"%41", "A"},  {"ab", "ab"},
      {"%", "!"},   {"a%", "!"},      {"%4", "!"},         {"ab%2", "!"}, {"%%41", "!"},
      {"%G1", "!"}, {"%1G", "!"},     {"x%00", {"x\0", 2}}};
  for (auto [text, decoded] : escapes)
    EXPECT_EQ(percentDecode(text).value_or("!"), decoded) << text;
}

TEST(DeepCopy, ATreeServesAsItsOwnCopyOnlyWhenNothingElseHoldsAnyOfIt) {
  const Mutability all = Mutability::MutableContainersAndLeaves;
  Ref<Object> held;  // a part kept alive elsewhere
  using Edit = std::function<void(MutableDictionary&)>;
  const std::pair<Edit, bool> rows[] = {
      {[](MutableDictionary&) {}, true},
      {[&](MutableDictionary& d) { held = d.get("a"); }, false},  // a leaf held elsewhere
      {[&](MutableDictionary& d) { held = d.get("b"); }, false},  // a container held elsewhere
      // Numbers are shared by every copy anyway.
      {[&](MutableDictionary& d) { held = cast<Array>(d.get("b"))->at(0); }, true},
      {[](MutableDictionary& d) { d.set("a", S("frozen")); }, false},
      {[](MutableDictionary& d) { d.set("c", D({})); }, false},
      {[](MutableDictionary& d) {
         d.set(String::make("k")->mutableCopy(), String::make("v")->mutableCopy());
       },
       false},
      {[](MutableDictionary& d) { d.set("e", Ref<Object>(d.get("c"))); }, false},  // one node twice
      {[](MutableDictionary& d) { d.set("u", URL::fileURL("/x", false)); }, false},
  };
  for (size_t i = 0; i < std::size(rows); ++i) {
    held.reset();
    auto tree = cast<MutableDictionary>(
        deepCopy(*D({{"a", S("x")}, {"b", A({I(1), B("d")})}, {"c", D({{"k", S("v")}})}}), all));
    rows[i].first(*tree);
    EXPECT_EQ(isSoleMutableTree(*tree), rows[i].second) << "row " << i;
    if (rows[i].second) {
      EXPECT_TRUE(identical(tree.get(), deepCopy(*tree, all).get(), &all)) << i;
    }
  }
}
