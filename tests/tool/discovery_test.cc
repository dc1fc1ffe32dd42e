#include "tool/discovery.h"

#include <gtest/gtest.h>
#include <quarrin/plugin.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>

#include "store/prefs_store.h"
#include "support/plugin_bundle.h"
#include "support/temp_dir.h"

using namespace qr;
using qrtest::writePluginBundle;

namespace {

const char kFactory1[] = "11111111-2222-3333-4444-555555555555";
const char kFactory2[] = "11111111-2222-3333-4444-666666666666";

class Discovery : public ::testing::Test {
 protected:
  void SetUp() override {
    setenv("CACHEWRIGHT_PREFS", (dir_ / "prefs.plist").c_str(), 1);
    setenv("CACHEWRIGHT_FRAMEWORK", (dir_ / "Zephrin.framework").c_str(), 1);
    forgetDiscoverySettings();
    support("YES");
  }
  void TearDown() override { forgetDiscoverySettings(); }

  void support(const char* value) {
    setPrintingPref(*String::make("support_quarrin"), *String::make(value), 5);
  }
  // Search settings: roots, exact exclusions and exclusion patterns.
  void settings(const std::vector<std::string>& roots,
                const std::vector<std::string>& excluded = {},
                const std::vector<std::string>& patterns = {}) {
    auto list = [](const char* key, const std::vector<std::string>& items) {
      std::string xml = std::string("<key>") + key + "</key><array>";
      for (const auto& i : items) xml += "<string>" + i + "</string>";
      return xml + "</array>";
    };
    qrtest::writeText(dir_ / "Zephrin.framework/Resources/com.varnex.pm.xml",
                      "<plist version=\"1.0\"><dict>" + list("PM Search Directories", roots) +
                          list("PM Exclude Directories", excluded) +
                          list("PM Exclude Matches", patterns) + "</dict></plist>");
  }
  void printerModule(const std::string& path) {
    writePluginBundle(path, {{QR_PM_TYPE_ID, {kFactory1}}});
  }

  struct Found {
    std::vector<std::string> pm, iom, pbm;
  };
  Found discover(int maxLevel = 200) {
    PMHost pm;
    IOMHost iom;
    PBMHost pbm;
    discoverModules(maxLevel, pm, iom, pbm);
    auto paths = [](const QuarrinHost& host) {
      std::vector<std::string> out;
      host.loadedPlugins()->forEach([&](const Object& key, const Object&) {
        out.push_back(*static_cast<const URL&>(key).fileSystemPath());
      });
      std::sort(out.begin(), out.end());
      return out;
    };
    return {paths(pm), paths(iom), paths(pbm)};
  }

  qrtest::TempDir dir_;
};

using Paths = std::vector<std::string>;

TEST_F(Discovery, EachKindGoesToItsHostAndNestedPluginsAreNeverFound) {
  std::string root = dir_ / "Printers";
  printerModule(root + "/A.plugin");
  printerModule(root + "/A.plugin/Contents/PlugIns/B.plugin");
  writePluginBundle(root + "/Vendor/IO.plugin",
                    {{QR_PM_TYPE_ID, {kFactory1}}, {QR_IOM_TYPE_ID, {kFactory2}}});
  writePluginBundle(root + "/Vendor/Browser.plugin", {{QR_PBM_TYPE_ID, {kFactory1}}});
  qrtest::writeText(root + "/Thing.plugin/readme.txt", "not a plug-in");
  printerModule(root + "/Thing.plugin/Inner.plugin");
  qrtest::writeText(root + "/File.plugin", "a plain file");
  settings({root});
  Found f = discover();
  EXPECT_EQ(f.pm, Paths{root + "/A.plugin"});
  EXPECT_EQ(f.iom, Paths{root + "/Vendor/IO.plugin"}) << "an I/O factory wins over a printer one";
  EXPECT_EQ(f.pbm, Paths{root + "/Vendor/Browser.plugin"});
}

TEST_F(Discovery, DiscoveryNeedsTheExactWordYES) {
  printerModule(dir_ / "P/A.plugin");
  settings({dir_ / "P"});
  support("yes");
  EXPECT_TRUE(discover().pm.empty());
  forgetDiscoverySettings();
  support("YES");
  EXPECT_EQ(discover().pm.size(), 1u);
}

TEST_F(Discovery, ExclusionsCompareWholePathsAndPatternsMatchAcrossSlashes) {
  std::string root = dir_ / "Printers";
  printerModule(root + "/Foo/A.plugin");
  printerModule(root + "/Foobar/B.plugin");
  printerModule(root + "/Old/C.plugin");
  printerModule(root + "/Vendor/Old/Deep/D.plugin");
  printerModule(root + "/Older/E.plugin");
  settings({root}, {root + "/Foo"}, {"*/Old/*"});
  EXPECT_EQ(discover().pm, (Paths{root + "/Foobar/B.plugin", root + "/Older/E.plugin"}));

  // A search root spelled with a trailing slash is not the excluded path.
  forgetDiscoverySettings();
  settings({root + "/Foo/"}, {root + "/Foo"});
  EXPECT_EQ(discover().pm, Paths{root + "/Foo/A.plugin"});
}

TEST_F(Discovery, TheDepthLimitSkipsDirectoriesAtMaxLevel) {
  std::string root = dir_ / "R";
  printerModule(root + "/One.plugin");        // depth 1
  printerModule(root + "/a/Two.plugin");      // depth 2
  printerModule(root + "/a/b/Three.plugin");  // depth 3
  settings({root});
  EXPECT_EQ(discover(2).pm, Paths{root + "/One.plugin"});
  forgetDiscoverySettings();
  EXPECT_EQ(discover(3).pm.size(), 2u);
  forgetDiscoverySettings();
  printerModule(dir_ / "Root.plugin");
  settings({dir_ / "Root.plugin"});
  EXPECT_EQ(discover().pm, Paths{dir_ / "Root.plugin"}) << "a search root can itself be a plug-in";
}

TEST_F(Discovery, LinksAreFollowedLoopsEndAndMissingRootsAreSkipped) {
  std::string root = dir_ / "Printers";
  std::string elsewhere = dir_ / "Elsewhere/Real.plugin";
  printerModule(elsewhere);
  std::filesystem::create_directories(root);
  std::filesystem::create_directory_symlink(elsewhere, root + "/Linked.plugin");
  std::filesystem::create_directory_symlink(root, root + "/loop");
  printerModule(root + "/Here.plugin");
  settings({dir_ / "missing", root});
  Found f = discover();
  EXPECT_EQ(f.pm, (Paths{root + "/Here.plugin", root + "/Linked.plugin"}))
      << "registered under the link's path, each once";
}

TEST_F(Discovery, AnUnreadableDirectoryEndsOnlyItsOwnBranch) {
  if (geteuid() == 0) GTEST_SKIP() << "root reads every directory";
  std::string root = dir_ / "Printers";
  printerModule(root + "/Closed/A.plugin");
  printerModule(root + "/Open/B.plugin");
  std::filesystem::permissions(root + "/Closed", std::filesystem::perms::none);
  settings({root});
  EXPECT_EQ(discover().pm, Paths{root + "/Open/B.plugin"});
  std::filesystem::permissions(root + "/Closed", std::filesystem::perms::owner_all);
}

TEST_F(Discovery, NoSettingsOrNoRootsMeansNoWalk) {
  printerModule(dir_ / "P/A.plugin");
  EXPECT_TRUE(discover().pm.empty()) << "no framework resource";
  forgetDiscoverySettings();
  settings({});
  EXPECT_TRUE(discover().pm.empty());
  ASSERT_TRUE(moduleSearchSettings());
}

}  // namespace
