// Connection record titles and their order, derived from the fixture browser
// modules: strings tables in the current localization, the browser's own
// title, the fallbacks, and first-party browsers first.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <optional>

#include "cache/module_cache.h"
#include "fixtures/fixture_support.h"
#include "hosts/connection_info.h"

using namespace qr;
using qr::test::CapturedLog;
using qr::test::fixtureBundle;
using qr::test::FixtureCalls;

namespace {

constexpr const char* kLocaleVariables[] = {"LANGUAGE", "LC_ALL", "LC_MESSAGES", "LANG"};

class ConnectionTitles : public ::testing::Test {
 protected:
  void SetUp() override {
    QuarrinModuleCache::defaultCache().setCacheDict(make<MutableDictionary>());
    for (size_t i = 0; i < std::size(kLocaleVariables); ++i) {
      if (const char* value = std::getenv(kLocaleVariables[i])) saved_[i] = value;
      unsetenv(kLocaleVariables[i]);
    }
  }
  void TearDown() override {
    for (size_t i = 0; i < std::size(kLocaleVariables); ++i) {
      if (saved_[i])
        setenv(kLocaleVariables[i], saved_[i]->c_str(), 1);
      else
        unsetenv(kLocaleVariables[i]);
    }
  }

  static Ref<ConnectionInfo> record(const std::string& pbmPath, const char* type = "USB") {
    return ConnectionInfo::connectionInfoWithInfo(String::make(type),
                                                  URL::fileURL(fixtureBundle("c_iom"), true),
                                                  URL::fileURL(pbmPath, true));
  }
  static std::string utf8(const Ref<String>& s) { return s ? s->utf8() : "(nil)"; }

  FixtureCalls calls_;
  CapturedLog log_;
  std::optional<std::string> saved_[std::size(kLocaleVariables)];
};

TEST_F(ConnectionTitles, TheStringsTableNamesTheBrowserWhenTheIdentifierIsAskedFirst) {
  setenv("LANG", "de_DE.UTF-8", 1);
  auto german = record(fixtureBundle("pbm_localized"));
  EXPECT_EQ(utf8(german->connectionBundleID()), "org.quarrin.test.localized");
  EXPECT_EQ(utf8(german->connectionTitle()), "Lokaler Browser") << "from the UTF-16 table";
  EXPECT_FALSE(german->PBMFromVarnex());
  EXPECT_EQ(calls_.count("pbm_localized"), 0u) << "a table title runs no plug-in code";

  unsetenv("LANG");
  auto english = record(fixtureBundle("pbm_localized"));
  EXPECT_FALSE(english->PBMFromVarnex()) << "asks the identifier, and so the table";
  EXPECT_EQ(utf8(english->connectionTitle()), "Localized Browser");

  // No key for the identifier: the connection type is the next key.
  auto serial = record(fixtureBundle("pbm_by_connection"), "Serial");
  EXPECT_EQ(utf8(serial->connectionBundleID()), "org.quarrin.test.by_connection");
  EXPECT_EQ(utf8(serial->connectionTitle()), "Serial Ports");
  // No key at all; the browser has no code, so its identifier names it.
  auto usb = record(fixtureBundle("pbm_by_connection"), "USB");
  EXPECT_EQ(utf8(usb->connectionBundleID()), "org.quarrin.test.by_connection");
  EXPECT_EQ(utf8(usb->connectionTitle()), "org.quarrin.test.by_connection");
}

TEST_F(ConnectionTitles, TheBrowserNamesItselfWhenTheTitleIsAskedFirst) {
  setenv("LANG", "de_DE.UTF-8", 1);
  auto localized = record(fixtureBundle("pbm_localized"));
  EXPECT_EQ(utf8(localized->connectionTitle()), "Own Title");
  EXPECT_EQ(utf8(localized->connectionBundleID()), "org.quarrin.test.localized");
  EXPECT_EQ(utf8(localized->connectionTitle()), "Own Title") << "a title once found stays";
  EXPECT_EQ(calls_.count("pbm_localized Prologue flags=1"), 1u);
  EXPECT_EQ(calls_.count("pbm_localized Prologue"), 1u);
  EXPECT_EQ(calls_.count("pbm_localized Initialize"), 0u);

  EXPECT_EQ(utf8(record(fixtureBundle("c_pbm"))->connectionTitle()), "Fixture Browser");
  // Success without a title leaves none; the browser is asked again next time.
  auto untitled = record(fixtureBundle("pbm_untitled"));
  EXPECT_FALSE(untitled->connectionTitle());
  EXPECT_FALSE(untitled->connectionTitle());
  EXPECT_EQ(calls_.count("pbm_untitled Prologue flags=1"), 2u);
}

TEST_F(ConnectionTitles, TheIdentifierStandsInForATitleTheBrowserCannotGive) {
  for (const std::string& missing : {std::string("/nonexistent/Browser.plugin"),
                                     fixtureBundle("c_pbm") + "/Contents/Info.plist"}) {
    for (bool titleFirst : {false, true}) {
      auto r = record(missing);
      if (titleFirst) r->connectionTitle();
      EXPECT_EQ(utf8(r->connectionBundleID()), "") << missing;
      EXPECT_FALSE(r->PBMFromVarnex());
      EXPECT_EQ(utf8(r->connectionTitle()), "") << missing;
    }
  }

  struct Case {
    const char* fixture;
    const char* identifier;
  } cases[] = {
      {"pbm_prologue_fails", "org.quarrin.test.pbm_prologue_fails"},  // Prologue fails
      {"pbm_raises", "org.quarrin.test.pbm_raises"},                  // Prologue raises
      {"c_pm", "org.quarrin.test.c_pm"},                              // not a browser
      // No code to ask; the table title found on the way is replaced.
      {"pbm_by_connection", "org.quarrin.test.by_connection"},
  };
  for (const auto& c : cases) {
    auto r = record(fixtureBundle(c.fixture), "Serial");
    EXPECT_EQ(utf8(r->connectionTitle()), c.identifier);
    EXPECT_EQ(utf8(r->connectionBundleID()), c.identifier);
  }
  EXPECT_EQ(calls_.count("pbm_raises Prologue flags=1"), 1u);
  std::string raised = "[FixtureError] on call to 'Prologue' for '" +
                       URL::fileURL(fixtureBundle("pbm_raises"), true)->absoluteString() + "'";
  auto lines = log_.lines();
  EXPECT_EQ(std::count(lines.begin(), lines.end(), raised), 1);

  // A directory that is no bundle has no identifier, so no title either.
  auto plain = record(QUARRIN_FIXTURE_DIR);
  EXPECT_FALSE(plain->connectionTitle());
  EXPECT_FALSE(plain->connectionBundleID());
  EXPECT_FALSE(plain->PBMFromVarnex());
}

TEST_F(ConnectionTitles, FirstPartyBrowsersComeFirstThenTitlesIgnoringCaseThenNoTitle) {
  std::vector<Ref<ConnectionInfo>> records = {
      record(fixtureBundle("pbm_untitled")),
      record(fixtureBundle("c_pbm")),                        // "Fixture Browser"
      record(fixtureBundle("pbm_by_connection"), "Serial"),  // table: "Serial Ports"
      record(QUARRIN_FIXTURE_DIR),                           // no identifier, no title
      record(fixtureBundle("pbm_lower_title")),              // "delta browser"
      record(fixtureBundle("pbm_first_party")),              // "zebra first party"
      record("/nonexistent/Browser.plugin"),                 // ""
      record(fixtureBundle("pbm_localized")),                // table: "Localized Browser"
  };
  std::sort(records.begin(), records.end(),
            [](const auto& a, const auto& b) { return a->compare(*b) < 0; });
  std::vector<std::string> titles;
  for (const auto& r : records) titles.push_back(utf8(r->connectionTitle()));
  std::vector<std::string> expected = {
      "zebra first party", "",      "delta browser", "Fixture Browser", "Localized Browser",
      "Serial Ports",      "(nil)", "(nil)"};
  EXPECT_EQ(titles, expected);
  EXPECT_TRUE(records[0]->PBMFromVarnex());

  // Two records without titles each sort after the other.
  EXPECT_EQ(records[6]->compare(*records[7]), 1);
  EXPECT_EQ(records[7]->compare(*records[6]), 1);
  EXPECT_EQ(records[5]->compare(*records[6]), -1);
  EXPECT_EQ(records[6]->compare(*records[5]), 1);
  EXPECT_EQ(records[2]->compare(*records[3]), -1);
  EXPECT_EQ(records[3]->compare(*records[2]), 1);
  auto sameTitle = record(fixtureBundle("c_pbm"));
  EXPECT_EQ(records[3]->compare(*sameTitle), 0);
}

}  // namespace
