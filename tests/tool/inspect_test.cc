// quarrin-inspect as a black box over sound, broken and hanging bundles, in
// text and as JSON lines.
#include <gtest/gtest.h>

#include <filesystem>
#include <regex>

#include "fixtures/fixture_support.h"
#include "support/run_program.h"

namespace {

const std::string kDemo = QUARRIN_BINARY_DIR "/examples/demo/Printers/";

TEST(Inspect, TextJsonAndExitStatusForEachKindOfBundle) {
  qrtest::TempDir dir;
  std::filesystem::copy(qr::test::fixtureBundle("c_iom"), dir / "unversioned.plugin",
                        std::filesystem::copy_options::recursive);
  const std::string info = dir / "unversioned.plugin/Contents/Info.plist";
  qrtest::writeText(info, std::regex_replace(qrtest::readText(info),
                                             std::regex("<key>CFBundleShortVersion[^/]*/key>\\s*"
                                                        "<string>[^<]*</string>"),
                                             ""));
  const struct {
    const char* what;
    std::string bundle;
    std::map<std::string, std::string> env;
    int status;
    std::string text;  // in the text output
    std::string json;  // in the JSON line
  } rows[] = {
      {"sound I/O module",
       kDemo + "IOModules/USB.plugin",
       {},
       0,
       "connection type USB, browser Contents/PlugIns/USBBrowser.plugin, status 0",
       R"("kinds":["iom"],"iom":{"connectionType":"USB","browserPath":)"
       R"("Contents/PlugIns/USBBrowser.plugin","status":0},"pm":null,"problems":[]})"},
      {"printer module with an icon",
       kDemo + "PrinterModules/AurelLaser.plugin",
       {},
       0,
       "USB: Aurel Laser 400: icon laser.png found",
       R"("kinds":["pm"],"iom":null,"pm":{"USB":[{"Printer Browser Kind":"Aurel Laser 400",)"},
      {"no short version",
       dir / "unversioned.plugin",
       {},
       1,
       "no short version (CFBundleShortVersionString)",
       R"("version":null,)"},
      {"interface query fails",
       qr::test::fixtureBundle("m_qi_noiface"),
       {},
       1,
       "the pm interface cannot be had: QueryInterface returned 0x80000004",
       R"("pm":null,)"},
      {"crashes",
       kDemo + "PrinterModules/BrokenExample.plugin",
       {},
       1,
       "crashed with SIGSEGV in CreateBrowserInfo",
       R"("problems":["crashed with SIGSEGV)"},
      {"hangs",
       qr::test::fixtureBundle("c_pm"),
       {{"QUARRIN_FIXTURE_FAULT", "c_pm:hang@CreateBrowserInfo"},
        {"CACHEWRIGHT_PLUGIN_TIMEOUT", "1"}},
       1,
       "timed out after 1 s in CreateBrowserInfo",
       R"(timed out after 1 s)"},
      {"no bundle", dir.path(), {}, 2, "", ""},
  };
  const std::regex keysInOrder(
      R"(\{"path":.*,"url":.*,"identifier":.*,"version":.*,"executable":.*,"kinds":\[.*\],)"
      R"("iom":.*,"pm":.*,"problems":\[.*\]\}\n)");
  for (const auto& r : rows) {
    SCOPED_TRACE(r.what);
    for (bool json : {false, true}) {
      qrtest::ProgramOptions o;
      if (json) o.args.push_back("--json");
      o.args.insert(o.args.end(), {"--type", "USB", r.bundle});
      o.env = r.env;
      o.env["CACHEWRIGHT_PREFS"] = dir / "no-store.plist";
      auto result = qrtest::runProgram(QUARRIN_BINARY_DIR "/src/quarrin-inspect", o);
      EXPECT_EQ(result.status, r.status) << result.err;
      if (r.status == 2) {
        EXPECT_EQ(result.out, "");
        EXPECT_NE(result.err.find("is not a bundle"), std::string::npos);
        continue;
      }
      EXPECT_NE(result.out.find(json ? r.json : r.text), std::string::npos) << result.out;
      if (json) {
        EXPECT_TRUE(std::regex_match(result.out, keysInOrder)) << result.out;
      } else if (r.status == 0) {
        EXPECT_NE(result.out.find("no problems found"), std::string::npos);
      }
    }
  }
  EXPECT_EQ(qrtest::runProgram(QUARRIN_BINARY_DIR "/src/quarrin-inspect", {}).status, 2);
}

}  // namespace
