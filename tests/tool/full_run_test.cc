// Whole cachewright runs over an installation of fixture plug-ins, judged by
// which plug-ins ran and by the cache the runs leave in the store.
#include <gtest/gtest.h>

#include <fcntl.h>
#include <sys/stat.h>

#include <set>

#include "support/installation.h"

using namespace qr;

namespace {

const std::set<std::string> kInstalled = {"c_iom", "io_dnssd", "c_pm", "pm_dnssd", "pm_usb_only"};

TEST(FullRun, WarmRunsLoadNothingABumpReloadsOneModuleAndPathModeAsksAll) {
  qrtest::Installation install({kInstalled.begin(), kInstalled.end()});
  const std::string store = install.store();
  // The fixtures that ran, and the cache in the store afterwards.
  auto run = [&](std::vector<std::string> args, int status) {
    qr::test::FixtureCalls calls;
    auto r = install.run(std::move(args));
    EXPECT_EQ(r.status, status) << r.err;
    std::set<std::string> ran;
    for (const auto& line : calls.lines()) ran.insert(line.substr(0, line.find(' ')));
    return std::pair{ran, install.stored("pmcache 5")};
  };
  auto key = [&](const std::string& name) { return install.key(name); };
  const qrtest::TempDir& dir = install.dir();

  auto [cold, first] = run({}, 1);
  EXPECT_EQ(cold, kInstalled);
  ASSERT_EQ(first->count(), kInstalled.size());
  EXPECT_TRUE(first->getAs<Dictionary>(key("pm_dnssd"))->get("DNSSD")) << "asked per connection";
  auto [warm, second] = run({}, 1);  // loading the cache counts as a change
  EXPECT_TRUE(warm.empty());
  EXPECT_TRUE(second->isEqual(*first));

  // c_pm's new version drops its whole entry, a planted connection type too.
  std::string prefs = qrtest::readText(store);
  prefs.insert(prefs.find("<dict>", prefs.find(key("c_pm"))) + 6, "<key>Stale</key><array/>");
  qrtest::writeText(store, prefs);
  install.setVersion("c_pm", "2.0");
  auto [bumped, third] = run({}, 1);
  EXPECT_EQ(bumped, std::set<std::string>{"c_pm"});
  auto* entry = third->getAs<Dictionary>(key("c_pm"));
  EXPECT_EQ(describe(entry->get("Bundle Version")), "2.0");
  EXPECT_FALSE(entry->get("Stale"));
  EXPECT_TRUE(third->get(key("pm_usb_only"))->isEqual(*first->get(key("pm_usb_only"))));

  auto [all, fourth] = run({dir / "cache.plist"}, 0);
  EXPECT_EQ(all, kInstalled);
  EXPECT_TRUE(readPropertyListFile(dir / "cache.plist")->isEqual(*fourth));
  EXPECT_TRUE(fourth->isEqual(*third));

  // A store that cannot be written is no "cache stored" (1): it is 2, and the old store stays.
  std::filesystem::remove(store + ".lock");
  std::filesystem::create_directory(store + ".lock");
  const std::string before = qrtest::readText(store);
  install.setVersion("c_pm", "3.0");
  auto failed = install.run({});
  EXPECT_EQ(failed.status, 2) << failed.err;
  EXPECT_NE(failed.err.find("Cannot open the lock file"), std::string::npos);
  EXPECT_EQ(qrtest::readText(store), before);
}

// A bundle's Info dictionary comes from the store's stamp record while the
// file keeps the stamp it had; any rewrite, even one in the same second at
// the same size with the times set back, is seen.
TEST(FullRun, UnchangedInfoFilesAreTakenFromTheRecordAndEveryRewriteIsSeen) {
  const std::string kRecord = "cachewright bundle stamps";
  const struct {
    const char* what;
    const char* rewriteWith;  // null: the file is left alone
    const char* expected;     // the version the cache then holds
  } rows[] = {
      {"untouched: the record is believed", nullptr, "1.9"},
      {"another version, same size and times", "1.2", "1.2"},
      {"the same bytes again, same times", "1.1", "1.1"},
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(row.what);
    qrtest::Installation install({"c_iom", "c_pm"});
    const std::string info = install.bundle("c_pm") + "/Contents/Info.plist";
    const timespec times[2] = {{1'600'000'000, 5}, {1'600'000'000, 5}};
    auto setVersion = [&](const char* version) {
      install.setVersion("c_pm", version);
      ASSERT_EQ(utimensat(AT_FDCWD, info.c_str(), times, 0), 0);
    };
    setVersion("1.1");
    ASSERT_EQ(install.run({}).status, 1);
    auto record = install.stored(kRecord);
    auto* kept = record ? record->getAs<Dictionary>(install.bundle("c_pm")) : nullptr;
    ASSERT_TRUE(kept);
    EXPECT_TRUE(kept->getAs<Dictionary>("Info")->isEqual(*readPropertyListFile(info)));

    auto prefs = cast<Dictionary>(readPropertyListFile(install.store()))->mutableCopy();
    auto planted = deepCopy(*prefs->get(kRecord), Mutability::MutableContainersAndLeaves);
    cast<MutableDictionary>(
        cast<MutableDictionary>(cast<MutableDictionary>(planted.get())->get(install.bundle("c_pm")))
            ->get("Info"))
        ->set("CFBundleShortVersionString", String::make("1.9"));
    prefs->set(kRecord, planted);
    ASSERT_TRUE(writePropertyListFile(*prefs, install.store()));
    if (row.rewriteWith) setVersion(row.rewriteWith);

    ASSERT_EQ(install.run({}).status, 1);
    auto cache = install.stored("pmcache 5");
    EXPECT_EQ(describe(cache->getAs<Dictionary>(install.key("c_pm"))->get("Bundle Version")),
              row.expected);
  }
  // A file modified moments ago proves nothing by its stamp: it is not kept.
  qrtest::Installation fresh({"c_iom", "c_pm"});
  ASSERT_EQ(fresh.run({}).status, 1);
  auto record = fresh.stored(kRecord);
  EXPECT_FALSE(record && record->get(fresh.bundle("c_pm")));
}

}  // namespace
