// Whole cachewright runs over an installation of fixture plug-ins, judged by
// which plug-ins ran and by the cache the runs leave in the store.
#include <gtest/gtest.h>

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

}  // namespace
