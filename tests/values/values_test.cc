#include <gtest/gtest.h>

#include "platform/format.h"
#include "values/array.h"
#include "values/boolean.h"
#include "values/data.h"
#include "values/date.h"
#include "values/deep_copy.h"
#include "values/dictionary.h"
#include "values/number.h"
#include "values/string.h"
#include "values/url.h"
#include "values/uuid.h"

using namespace qr;

TEST(String, CountsUTF16CodeUnitsWhateverTheStorage) {
  auto ascii = String::make("Acme");
  auto bmp = String::make("Gr\xC3\xBC\xC3\x9F");     // Grüß
  auto astral = String::make("a\xF0\x9F\x96\xA8z");  // a🖨z
  EXPECT_TRUE(ascii->isNarrow());
  EXPECT_EQ(ascii->length(), 4u);
  EXPECT_EQ(bmp->length(), 4u);
  EXPECT_EQ(astral->length(), 4u);  // the printer emoji is a surrogate pair
  EXPECT_EQ(astral->at(1), 0xD83D);
  EXPECT_EQ(astral->substring(1, 2)->utf8(), "\xF0\x9F\x96\xA8");
  EXPECT_EQ(astral->utf8(), "a\xF0\x9F\x96\xA8z");
  // A lone surrogate survives in the string and comes out as U+FFFD.
  auto lone = String::fromUTF16(u"x\xD800");
  EXPECT_EQ(lone->length(), 2u);
  EXPECT_EQ(lone->utf8(), "x\xEF\xBF\xBD");
}

TEST(String, RejectsIllFormedUTF8) {
  EXPECT_FALSE(String::fromUTF8("\xC0\xAF"));          // overlong
  EXPECT_FALSE(String::fromUTF8("\xED\xA0\x80"));      // encoded surrogate
  EXPECT_FALSE(String::fromUTF8("\xF4\x90\x80\x80"));  // beyond U+10FFFF
  EXPECT_FALSE(String::fromUTF8("abc\xE2\x82"));       // truncated
  EXPECT_EQ(String::make("a\xFF")->utf8(), "a\xEF\xBF\xBD");
}

TEST(String, MutableAndImmutableTextCompareEqualAndHashAlike) {
  auto m = make<MutableString>();
  m->appendUTF8("Laser");
  m->append(*String::make("Jet \xC3\xA9"));  // widens
  m->replace(0, 5, *String::make("Ink"));
  EXPECT_EQ(m->utf8(), "InkJet \xC3\xA9");
  auto narrowToo = make<MutableString>(*String::make("InkJet"));
  auto wideAscii = make<MutableString>();
  wideAscii->append(*String::make("\xC3\xA9"));
  wideAscii->replace(0, 1, *String::make("InkJet"));  // wide storage, ASCII content
  EXPECT_FALSE(wideAscii->isNarrow());
  EXPECT_TRUE(wideAscii->isEqual(*narrowToo));
  EXPECT_EQ(wideAscii->hash(), String::make("InkJet")->hash());
  EXPECT_EQ(String::make("a")->compare(*String::make("b")), -1);
  EXPECT_EQ(String::make("\xEF\xBD\x81")->compare(*String::make("\xF0\x9F\x98\x80")), 1)
      << "code-unit order puts U+FF41 after a surrogate pair";
}

TEST(Number, IntegersAndRealsCompareByValue) {
  EXPECT_TRUE(Number::integer(3)->isEqual(*Number::real(3.0)));
  EXPECT_EQ(Number::integer(3)->hash(), Number::real(3.0)->hash());
  EXPECT_FALSE(Number::integer(3)->isEqual(*Number::real(3.5)));
  auto big = Number::unsignedInteger(UINT64_MAX);
  EXPECT_TRUE(big->isUnsigned());
  EXPECT_FALSE(big->isEqual(*Number::integer(-1)));
  EXPECT_EQ(big->uint64Value(), UINT64_MAX);
  EXPECT_FALSE(Boolean::trueValue()->isEqual(*Number::integer(1)));
}

TEST(Date, ISO8601RoundTripsAndRejectsImpossibleDates) {
  auto d = Date::fromISO8601("2026-12-06T07:01:02Z");
  ASSERT_TRUE(d);
  EXPECT_EQ(d->iso8601(), "2026-12-06T07:01:02Z");
  EXPECT_EQ(Date::fromISO8601("2001-01-01T00:00:00Z")->secondsSinceReference(), 0.0);
  EXPECT_EQ(Date(-1.5).iso8601(), "2000-12-31T23:59:58Z");
  EXPECT_FALSE(Date::fromISO8601("2023-02-29T00:00:00Z"));
  EXPECT_FALSE(Date::fromISO8601("2024-13-01T00:00:00Z"));
  EXPECT_FALSE(Date::fromISO8601("2024-01-01 00:00:00Z"));
}

TEST(Dictionary, KeepsInsertionOrderThroughRemovalsAndGrowth) {
  auto d = make<MutableDictionary>();
  for (int i = 0; i < 100; ++i) d->set(Number::integer(i), String::make(std::to_string(i)));
  for (int i = 0; i < 100; i += 2) EXPECT_TRUE(d->remove(*Number::integer(i)));
  EXPECT_FALSE(d->remove(*Number::integer(0)));
  d->set(Number::integer(1), String::make("one"));   // replaced in place
  d->set(Number::integer(0), String::make("zero"));  // appended at the end
  EXPECT_EQ(d->count(), 51u);
  std::vector<int64_t> order;
  d->forEach([&](const Object& k, const Object&) {
    order.push_back(static_cast<const Number&>(k).int64Value());
  });
  ASSERT_EQ(order.size(), 51u);
  EXPECT_EQ(order.front(), 1);
  EXPECT_EQ(order[1], 3);
  EXPECT_EQ(order.back(), 0);
  EXPECT_EQ(describe(d->get(*Number::real(1.0))), "one");
  EXPECT_EQ(d->get(*Number::integer(2)), nullptr);
}

TEST(Dictionary, StringKeysMatchByValueAcrossStorageAndLookupForms) {
  auto d = make<MutableDictionary>();
  d->set("Bundle Version", String::make("1.0"));
  d->set(String::make("caf\xC3\xA9"), Boolean::trueValue());
  auto key = make<MutableString>();
  key->appendUTF8("Bundle Version");
  EXPECT_EQ(describe(d->get(*key)), "1.0");
  EXPECT_EQ(d->get("caf\xC3\xA9"), Boolean::trueValue().get());
  EXPECT_EQ(d->get("cafe"), nullptr);
  auto other = make<MutableDictionary>();
  other->set(String::make("caf\xC3\xA9"), Boolean::trueValue());
  other->set("Bundle Version", String::make("1.0"));
  EXPECT_TRUE(d->isEqual(*other)) << "equality ignores order";
  other->set("Bundle Version", String::make("1.1"));
  EXPECT_FALSE(d->isEqual(*other));
}

TEST(DeepCopy, HonoursTheMutabilityOptionAndRefusesNonPropertyLists) {
  auto inner = make<MutableDictionary>();
  inner->set("k", String::make("v"));
  auto outer = make<MutableArray>();
  outer->append(inner);
  outer->append(Data::copy(std::string_view("\x01\x02")));

  auto frozen = deepCopy(*outer, Mutability::Immutable);
  ASSERT_TRUE(frozen);
  EXPECT_FALSE(cast<MutableArray>(frozen));
  EXPECT_FALSE(cast<MutableDictionary>(Ref<Object>(cast<Array>(frozen)->at(0))));
  EXPECT_TRUE(frozen->isEqual(*outer));

  auto containers = deepCopy(*outer, Mutability::MutableContainers);
  auto* dict = cast<MutableDictionary>(cast<Array>(containers)->at(0));
  ASSERT_TRUE(dict);
  EXPECT_FALSE(cast<MutableString>(dict->get("k")));
  EXPECT_NE(dict, inner.get());

  auto leaves = deepCopy(*outer, Mutability::MutableContainersAndLeaves);
  auto* leafDict = cast<MutableDictionary>(cast<Array>(leaves)->at(0));
  EXPECT_TRUE(cast<MutableString>(leafDict->get("k")));
  EXPECT_TRUE(cast<MutableData>(cast<Array>(leaves)->at(1)));

  outer->append(URL::fileURL("/tmp", true));
  EXPECT_FALSE(deepCopy(*outer, Mutability::Immutable));
  auto numberKeyed = make<MutableDictionary>();
  numberKeyed->set(Number::integer(1), String::make("x"));
  EXPECT_FALSE(deepCopy(*numberKeyed, Mutability::Immutable));
}

TEST(DeepCopy, ACycleFailsInsteadOfRecursingForever) {
  auto a = make<MutableArray>();
  a->append(a);
  EXPECT_FALSE(deepCopy(*a, Mutability::Immutable));
  a->removeAll();  // break the cycle so the array can be freed
}

TEST(UUID, ParsesEitherCaseAndPrintsUpperCase) {
  auto u = UUID::fromString("3a1b2c3d-4e5f-6071-8293-a4b5c6d7e8f9");
  ASSERT_TRUE(u);
  EXPECT_EQ(u->string(), "3A1B2C3D-4E5F-6071-8293-A4B5C6D7E8F9");
  EXPECT_EQ(u->bytes()[0], 0x3A);
  EXPECT_EQ(u->bytes()[15], 0xF9);
  EXPECT_TRUE(u->isEqual(*UUID::fromString(u->string())));
  EXPECT_FALSE(UUID::fromString("3a1b2c3d-4e5f-6071-8293-a4b5c6d7e8f"));
  EXPECT_FALSE(UUID::fromString("3a1b2c3d-4e5f-6071-8293_a4b5c6d7e8f9"));
  EXPECT_FALSE(UUID::fromString("3a1b2c3d-4e5f-6071-8293-a4b5c6d7e8fg"));
}

TEST(URL, FileURLsEscapeBytesAndResolveAgainstABase) {
  auto dir = URL::fileURL("/usr/lib/My Printers/Caf\xC3\xA9.plugin", true);
  EXPECT_EQ(dir->absoluteString(), "file:///usr/lib/My%20Printers/Caf%C3%A9.plugin/");
  EXPECT_EQ(*dir->fileSystemPath(), "/usr/lib/My Printers/Caf\xC3\xA9.plugin");
  EXPECT_TRUE(dir->hasDirectoryPath());

  auto rel = URL::fileURL("../Browsers/USB.plugin", true, dir);
  EXPECT_EQ(rel->relativeString(), "../Browsers/USB.plugin/");
  EXPECT_EQ(rel->absoluteString(), "file:///usr/lib/My%20Printers/Browsers/USB.plugin/");
  EXPECT_EQ(*rel->fileSystemPath(), "/usr/lib/My Printers/Browsers/USB.plugin");
  auto abs = URL::fileURL("/opt/B.plugin", true, dir);
  EXPECT_EQ(abs->absoluteString(), "file:///opt/B.plugin/");

  // Same place, different spelling: unequal until both are made absolute.
  EXPECT_FALSE(rel->isEqual(*rel->absoluteURL()));
  EXPECT_TRUE(rel->absoluteURL()->isEqual(*URL::withString(rel->absoluteString())));

  EXPECT_FALSE(URL::withString("file:///a b"));
  EXPECT_FALSE(URL::withString("file:///a%2"));
  EXPECT_FALSE(URL::withString("relative/without/base"));
  EXPECT_FALSE(URL::withString("http://host/x")->fileSystemPath());
  EXPECT_FALSE(URL::withString("file:///a%00b")->fileSystemPath());
}

TEST(Format, PrintsObjectsNilAndIntegersAsTheMessagesExpect) {
  auto url = URL::fileURL("/x.plugin", true);
  Ref<String> nil;
  EXPECT_EQ(format("[%@] creating an interface for '%@'", String::make("Boom"), url),
            "[Boom] creating an interface for 'file:///x.plugin/'");
  EXPECT_EQ(format("Module is missing short version: %@", nil),
            "Module is missing short version: (null)");
  EXPECT_EQ(format("code:%d facility:%d 0x%08x %d%%", 4, 7, 0xABCu, -1),
            "code:4 facility:7 0x00000abc -1%");
}
