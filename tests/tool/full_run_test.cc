// Whole cachewright runs over an installation of fixture plug-ins, judged by
// which plug-ins ran and by the cache the runs leave in the store.
#include <gtest/gtest.h>

#include <filesystem>
#include <regex>
#include <set>

#include "fixtures/fixture_support.h"
#include "plist/property_list.h"
#include "support/run_program.h"
#include "values/dictionary.h"

using namespace qr;

namespace {

const std::set<std::string> kInstalled = {"c_iom", "io_dnssd", "c_pm", "pm_dnssd", "pm_usb_only"};

TEST(FullRun, WarmRunsLoadNothingABumpReloadsOneModuleAndPathModeAsksAll) {
  qrtest::TempDir dir;
  const std::string printers = dir / "Printers", store = dir / "prefs.plist";
  std::filesystem::create_directories(printers);
  for (const auto& name : kInstalled)
    std::filesystem::copy(qr::test::fixtureBundle(name), printers + "/" + name + ".plugin",
                          std::filesystem::copy_options::recursive);
  dir.write("Z.framework/Resources/com.varnex.pm.xml",
            "<plist version=\"1.0\"><dict><key>PM Search Directories</key><array><string>" +
                printers + "</string></array></dict></plist>");
  dir.write("prefs.plist",
            "<plist version=\"1.0\"><dict><key>support_quarrin</key><string>YES</string>"
            "</dict></plist>");
  // The fixtures that ran, and the cache in the store afterwards.
  auto run = [&](std::vector<std::string> args, int status) {
    qr::test::FixtureCalls calls;
    qrtest::ProgramOptions o;
    o.args = std::move(args);
    o.env = {{"CACHEWRIGHT_FRAMEWORK", dir / "Z.framework"}, {"CACHEWRIGHT_PREFS", store}};
    auto r = qrtest::runProgram(QUARRIN_BINARY_DIR "/src/cachewright", o);
    EXPECT_EQ(r.status, status) << r.err;
    std::set<std::string> ran;
    for (const auto& line : calls.lines()) ran.insert(line.substr(0, line.find(' ')));
    auto prefs = cast<Dictionary>(readPropertyListFile(store));
    return std::pair{ran, Ref<Dictionary>(prefs->getAs<Dictionary>("pmcache 5"))};
  };
  auto key = [&](const std::string& name) {
    return "file://" + printers + "/" + name + ".plugin/";
  };

  auto [cold, first] = run({}, 1);
  EXPECT_EQ(cold, kInstalled);
  ASSERT_EQ(first->count(), kInstalled.size());
  EXPECT_TRUE(first->getAs<Dictionary>(key("pm_dnssd"))->get("DNSSD")) << "asked per connection";
  auto [warm, second] = run({}, 1);  // loading the cache counts as a change
  EXPECT_TRUE(warm.empty());
  EXPECT_TRUE(second->isEqual(*first));

  // c_pm's new version drops its whole entry, a planted connection type too.
  std::string prefs = qrtest::readText(store), info = printers + "/c_pm.plugin/Contents/Info.plist";
  prefs.insert(prefs.find("<dict>", prefs.find(key("c_pm"))) + 6, "<key>Stale</key><array/>");
  qrtest::writeText(store, prefs);
  qrtest::writeText(info, std::regex_replace(
                              qrtest::readText(info),
                              std::regex("(ShortVersionString</key>\\s*<string>)[^<]*"), "$012.0"));
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
}

}  // namespace
