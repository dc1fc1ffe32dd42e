// Whole cachewright runs over an installation of fixture plug-ins, judged by
// what the plug-ins record and by the cache the runs leave.
#include <gtest/gtest.h>

#include <filesystem>
#include <map>

#include "cache/module_cache.h"

#include "fixtures/fixture_support.h"
#include "plist/property_list.h"
#include "support/run_program.h"
#include "support/temp_dir.h"
#include "tool/discovery.h"
#include "values/array.h"
#include "values/deep_copy.h"
#include "values/dictionary.h"
#include "values/url.h"

using namespace qr;
using qr::test::fixtureBundle;
using qr::test::FixtureCalls;

namespace {

namespace fs = std::filesystem;

const char* const kInstalled[] = {"c_iom",    "io_dnssd",    "io_quellnet", "c_pm",
                                  "pm_dnssd", "pm_quellnet", "pm_usb_only", "pm_epson_only"};

class FullRun : public ::testing::Test {
 protected:
  void SetUp() override {
    for (const char* name : kInstalled) install(name);
    qrtest::writeText(dir_ / "Zephrin.framework/Resources/com.varnex.pm.xml",
                      "<plist version=\"1.0\"><dict><key>PM Search Directories</key><array>"
                      "<string>" +
                          printers() + "</string></array></dict></plist>");
    qrtest::writeText(store(),
                      "<plist version=\"1.0\"><dict><key>support_quarrin</key><string>YES</string>"
                      "</dict></plist>");
  }

  std::string printers() const { return dir_ / "Printers"; }
  std::string store() const { return dir_ / "prefs.plist"; }
  std::string bundle(std::string_view name) const {
    return printers() + "/" + std::string(name) + ".plugin";
  }
  std::string key(std::string_view name) const {
    return URL::fileURL(bundle(name), true)->absoluteString();
  }
  void install(std::string_view name) {
    fs::create_directories(printers());
    fs::copy(fixtureBundle(name), bundle(name), fs::copy_options::recursive);
  }
  void setVersion(std::string_view name, std::string_view version) {
    std::string info = bundle(name) + "/Contents/Info.plist";
    std::string text = qrtest::readText(info);
    std::string from = "<key>CFBundleShortVersionString</key>\n\t<string>1.0</string>";
    auto at = text.find(from);
    ASSERT_NE(at, std::string::npos);
    std::string to = version.empty() ? std::string()
                                     : "<key>CFBundleShortVersionString</key>\n\t<string>" +
                                           std::string(version) + "</string>";
    text.replace(at, from.size(), to);
    qrtest::writeText(info, text);
  }

  qrtest::ProgramResult run(std::vector<std::string> args = {}) {
    qrtest::ProgramOptions o;
    o.args = std::move(args);
    o.env["CACHEWRIGHT_FRAMEWORK"] = dir_ / "Zephrin.framework";
    o.env["CACHEWRIGHT_PREFS"] = store();
    return qrtest::runProgram(QUARRIN_BINARY_DIR "/src/cachewright", o);
  }
  Ref<Dictionary> storedCache() const {
    auto prefs = cast<Dictionary>(readPropertyListFile(store()));
    return prefs ? Ref<Dictionary>(prefs->getAs<Dictionary>("pmcache 5")) : nullptr;
  }
  // The "Printer Browser Kind" values of one cached answer, marks included.
  std::vector<std::string> cachedKinds(std::string_view module, std::string_view type) const {
    auto cache = storedCache();
    auto* entry = cache ? cache->getAs<Dictionary>(key(module)) : nullptr;
    auto* info = entry ? entry->getAs<Array>(type) : nullptr;
    if (!info) return {"<none>"};
    std::vector<std::string> out;
    for (const auto& e : *info) {
      auto* d = cast<Dictionary>(e.get());
      out.push_back(d->getAs<String>("Printer Browser Kind")->utf8() +
                    (d->get("USBParasite") ? "+marked" : ""));
    }
    return out;
  }
  size_t created(const FixtureCalls& calls) const {
    size_t n = 0;
    for (const auto& line : calls.lines()) n += line.find(" create ") != std::string::npos;
    return n;
  }

  qrtest::TempDir dir_;
};

using Kinds = std::vector<std::string>;

TEST_F(FullRun, AFirstRunAsksEveryModuleAndASecondLoadsNone) {
  Ref<Dictionary> first;
  {
    FixtureCalls calls;
    auto r = run();
    EXPECT_EQ(r.status, 1) << r.err;
    EXPECT_EQ(created(calls), std::size(kInstalled));
    EXPECT_EQ(calls.count("c_iom GetConnectionInfo"), 1u);
    // Once for USB, and again for each network discovery type it has no answer
    // for: a loaded plug-in lends its USB answer afresh.
    EXPECT_EQ(calls.count("c_pm CreateBrowserInfo connectionType=USB"), 3u);
    first = storedCache();
    ASSERT_TRUE(first);
    EXPECT_EQ(first->count(), std::size(kInstalled));
  }
  FixtureCalls calls;
  auto r = run();
  EXPECT_EQ(r.status, 1) << "loading the cache marks it changed";
  EXPECT_TRUE(calls.lines().empty()) << "no plug-in code ran";
  EXPECT_TRUE(storedCache()->isEqual(*first));
}

TEST_F(FullRun, ANewVersionReloadsThatModuleAloneAndReplacesItsWholeEntry) {
  run();
  auto before = storedCache();
  // Plant an extra connection type in c_pm's entry: it must go with the entry.
  auto prefs = cast<MutableDictionary>(
      deepCopy(*readPropertyListFile(store()), Mutability::MutableContainersAndLeaves));
  prefs->getAs<MutableDictionary>("pmcache 5")
      ->getAs<MutableDictionary>(key("c_pm"))
      ->set("Stale Type", make<MutableArray>());
  ASSERT_TRUE(writePropertyListFile(*prefs, store()));
  setVersion("c_pm", "2.0");
  FixtureCalls calls;
  run();
  EXPECT_EQ(created(calls), 1u);
  EXPECT_EQ(calls.count("c_pm create"), 1u);
  auto after = storedCache();
  auto* entry = after->getAs<Dictionary>(key("c_pm"));
  ASSERT_TRUE(entry);
  EXPECT_TRUE(entry->getAs<String>("Bundle Version")->equals("2.0"));
  EXPECT_FALSE(entry->get("Stale Type"));
  EXPECT_TRUE(after->get(key("pm_usb_only"))->isEqual(*before->get(key("pm_usb_only"))));
}

TEST_F(FullRun, PathModeAsksEveryModuleAgainAndWritesTheSameCacheToTheFile) {
  run();
  FixtureCalls calls;
  std::string file = dir_ / "cache.plist";
  auto r = run({file});
  EXPECT_EQ(r.status, 0);
  EXPECT_EQ(created(calls), std::size(kInstalled));
  auto written = cast<Dictionary>(readPropertyListFile(file));
  ASSERT_TRUE(written);
  EXPECT_TRUE(written->isEqual(*storedCache()));
}

TEST_F(FullRun, AModuleWithoutVersionIsAskedInEveryRun) {
  setVersion("pm_usb_only", "");
  for (int i = 0; i < 2; ++i) {
    FixtureCalls calls;
    auto r = run();
    EXPECT_EQ(calls.count("pm_usb_only create"), 1u) << "run " << i;
    EXPECT_EQ(created(calls), i == 0 ? std::size(kInstalled) : 1u);
    EXPECT_NE(r.err.find("Module is missing short version: " + key("pm_usb_only")),
              std::string::npos);
  }
}

TEST_F(FullRun, NetworkDiscoveryAnswersAreFiledAsTheirOwnNeverBorrowed) {
  run();
  EXPECT_EQ(cachedKinds("pm_dnssd", "DNSSD"), Kinds{"dnssd-own"});
  EXPECT_EQ(cachedKinds("pm_quellnet", "DNSSD"), Kinds{"quellnet-own"});
  EXPECT_EQ(cachedKinds("pm_quellnet", "Quellnet"), Kinds{"<none>"});
  EXPECT_EQ(cachedKinds("pm_usb_only", "DNSSD"), Kinds{});
  EXPECT_EQ(cachedKinds("pm_usb_only", "USB"), (Kinds{"usb-1", "usb-2"}));
  EXPECT_EQ(cachedKinds("pm_epson_only", "EPSON USB"), Kinds{"epson-1"});
  EXPECT_EQ(cachedKinds("c_pm", "DNSSD"), Kinds{});

  auto cache = storedCache();
  auto* io = cache->getAs<Dictionary>(key("c_iom"));
  ASSERT_TRUE(io);
  EXPECT_TRUE(io->getAs<String>("kIOMConnectionType")->equals("USB"));
  EXPECT_TRUE(io->getAs<String>("kIOMBrowserPath")->equals("../USBBrowser.plugin"));
}

TEST_F(FullRun, LookupListsLendUSBAnswersToNetworkDiscoveryMarked) {
  setenv("CACHEWRIGHT_FRAMEWORK", (dir_ / "Zephrin.framework").c_str(), 1);
  setenv("CACHEWRIGHT_PREFS", store().c_str(), 1);
  forgetDiscoverySettings();
  QuarrinModuleCache::defaultCache().setCacheDict(make<MutableDictionary>());
  auto pm = make<PMHost>();
  auto iom = make<IOMHost>();
  auto pbm = make<PBMHost>();
  discoverModules(200, *pm, *iom, *pbm);
  EXPECT_EQ(iom->connectionInfoList()->count(), 3u);

  std::map<std::string, std::vector<std::string>> byModule;
  LookupInfoList* list = pm->GetLookupInfoList(*String::make("DNSSD"));
  for (uint32_t i = 0; i < list->maxIndex(); ++i) {
    LookupInfoItem* item = list->getItemAtIndex(i);
    auto* info = item->lookupInfo();
    EXPECT_TRUE(info->getAs<String>("connectionType")->equals("DNSSD"));
    std::string kind = info->getAs<String>("Printer Browser Kind")->utf8();
    if (auto* mark = info->getAs<String>("USBParasite")) kind += "+" + mark->utf8();
    byModule[item->pmURL()->absoluteString()].push_back(kind);
  }
  EXPECT_EQ(byModule[key("pm_usb_only")], (Kinds{"usb-1+True", "usb-2+True"}));
  EXPECT_EQ(byModule[key("pm_epson_only")], Kinds{"epson-1+True"});
  EXPECT_EQ(byModule[key("pm_dnssd")], Kinds{"dnssd-own"});
  EXPECT_EQ(byModule[key("pm_quellnet")], Kinds{"quellnet-own"});
  EXPECT_EQ(byModule[key("c_pm")], (Kinds{"Fixture Laser 1+True", "Fixture Laser 2+True"}));
  forgetDiscoverySettings();
}

}  // namespace
