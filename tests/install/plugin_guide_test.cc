// The plug-ins of doc/plugin-guide.md, built from the guide's own code blocks
// by its own build script against the installed SDK, then checked with
// quarrin-inspect and asked by a cachewright run.
#include <gtest/gtest.h>

#include <filesystem>
#include <map>

#include "support/installation.h"
#include "support/installed_sdk.h"

using namespace qr;

namespace {

const std::string kBundles[] = {"GuideUSB", "GuideLaser"};
const std::string kScanner = QUARRIN_BINARY_DIR "/src/cachewright-scanner";

// The guide's code blocks marked "```<language> file=<name>", by name.
std::map<std::string, std::string> guideFiles() {
  const std::string text = qrtest::readText(QUARRIN_SOURCE_DIR "/doc/plugin-guide.md");
  std::map<std::string, std::string> files;
  for (size_t open = text.find("\n```"); open != std::string::npos;) {
    size_t body = text.find('\n', open + 1), close = text.find("\n```", body);
    if (close == std::string::npos) break;
    std::string info = text.substr(open + 4, body - open - 4);
    if (auto at = info.find(" file="); at != std::string::npos)
      files[info.substr(at + 6)] = text.substr(body + 1, close - body);
    open = text.find("\n```", close + 4);
  }
  return files;
}

// The folder holding Printers/<bundle>.plugin as the guide's script left them,
// made once per test program; `error` says why when that failed.
struct GuideBuild {
  std::string dir, error;
};

const GuideBuild& guideBuild() {
  static qrtest::TempDir dir;
  static const GuideBuild build = [] {
    const qrtest::InstalledSDK& sdk = qrtest::installedSDK();
    if (sdk.pkgConfigPath.empty()) return GuideBuild{"", "no installed SDK:\n" + sdk.log};
    auto files = guideFiles();
    std::string names;
    for (const auto& [name, text] : files) {
      names += name + " ";
      dir.write(name, text);
    }
    if (names !=
        "Info.plist.in guide_bundles.sh guide_instance.h guide_io_module.c "
        "guide_printer_module.c ")
      return GuideBuild{"", "the guide's marked blocks are " + names};
    dir.write("laser.png", qrtest::readText(QUARRIN_SOURCE_DIR "/examples/resources/laser.png"));
    // The guide's code must also be clean C99 with every warning an error.
    qrtest::ProgramOptions o;
    o.args = {"-ec",
              "cd \"$1\"\n"
              "cc() { command cc -std=c99 -pedantic-errors -Wall -Wextra -Werror \"$@\"; }\n"
              ". ./guide_bundles.sh",
              "sh", dir.path()};
    o.env["PKG_CONFIG_PATH"] = sdk.pkgConfigPath;
    auto r = qrtest::runProgram("/bin/sh", o);
    if (r.status != 0) return GuideBuild{"", "the guide's script failed:\n" + r.out + r.err};
    for (const auto& name : kBundles) {
      std::string info =
          qrtest::readText(dir / ("Printers/" + name + ".plugin/Contents/Info.plist"));
      if (info.find("</plist>") == std::string::npos || info.find('@') != std::string::npos)
        return GuideBuild{"", name + " has an unfilled Info.plist:\n" + info};
    }
    return GuideBuild{dir.path(), ""};
  }();
  return build;
}

// An installation holding the guide's two bundles.
void install(const qrtest::Installation& installation, const GuideBuild& build) {
  for (const auto& name : kBundles)
    std::filesystem::copy(build.dir + "/Printers/" + name + ".plugin", installation.bundle(name),
                          std::filesystem::copy_options::recursive);
}

TEST(PluginGuide, QuarrinInspectFindsNoProblemInEitherBundle) {
  const std::string inspect = QUARRIN_BINARY_DIR "/src/quarrin-inspect";
  if (!std::filesystem::exists(inspect)) GTEST_SKIP() << inspect << " is not built yet";
  const GuideBuild& build = guideBuild();
  ASSERT_EQ(build.error, "");
  qrtest::Installation installation({});
  install(installation, build);
  for (const auto& name : kBundles) {
    qrtest::ProgramOptions o;
    o.args = {installation.bundle(name)};
    o.env = {{"CACHEWRIGHT_FRAMEWORK", installation.dir() / "Z.framework"},
             {"CACHEWRIGHT_PREFS", installation.store()},
             {"CACHEWRIGHT_SCANNER", kScanner}};
    auto r = qrtest::runProgram(inspect, o);
    EXPECT_EQ(r.status, 0) << name << "\n" << r.out << r.err;
    EXPECT_NE(r.out.find("no problems found"), std::string::npos) << r.out;
  }
}

TEST(PluginGuide, ARunRecordsTheIOModulesAnswerAndThePrinterModulesBrowserInfo) {
  const GuideBuild& build = guideBuild();
  ASSERT_EQ(build.error, "");
  qrtest::Installation installation({});
  install(installation, build);
  auto r = installation.run({}, {{"CACHEWRIGHT_SCANNER", kScanner}});
  EXPECT_EQ(r.status, 1) << r.err;
  EXPECT_EQ(r.err.find("Guide"), std::string::npos) << "a line about a guide plug-in:\n" << r.err;

  Ref<Dictionary> cache = installation.stored("pmcache 5");
  ASSERT_TRUE(cache);
  auto* iom = cache->getAs<Dictionary>(installation.key("GuideUSB"));
  ASSERT_TRUE(iom) << describe(cache.get());
  EXPECT_EQ(describe(iom->get("kIOMConnectionType")), "USB");
  EXPECT_EQ(describe(iom->get("kIOMBrowserPath")), "Contents/PlugIns/GuideBrowser.plugin");

  auto* pm = cache->getAs<Dictionary>(installation.key("GuideLaser"));
  ASSERT_TRUE(pm) << describe(cache.get());
  EXPECT_EQ(pm->count(), 2u) << "a version and the one connection type asked";
  auto* usb = pm->getAs<Array>("USB");
  ASSERT_TRUE(usb && usb->count() == 1) << describe(pm);
  auto* entry = cast<Dictionary>(usb->at(0));
  ASSERT_TRUE(entry);
  EXPECT_EQ(describe(entry->get("Printer Browser Kind")), "Example Laser 10");
  EXPECT_EQ(describe(entry->get("Printer Browser DeviceID")),
            "MFG:Example;MDL:Laser 10;CMD:PCL,PS;");
  EXPECT_EQ(describe(entry->get("Printer Browser Icons Filename")), "laser.png");
  // The URL the module works out for itself is the one the host knows it by.
  EXPECT_EQ(describe(entry->get("PM URL String")), installation.key("GuideLaser"));
}

}  // namespace
