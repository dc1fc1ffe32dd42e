// Runs examples/run-demo.sh over the demo installation of this build and
// checks what it shows: the cache the runs built, that a warm run loads no
// plug-in, and the connection records in display order.
#include <gtest/gtest.h>

#include <cstdint>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include "plist/property_list.h"
#include "support/run_program.h"
#include "support/temp_dir.h"
#include "values/array.h"
#include "values/dictionary.h"
#include "values/string.h"

using namespace qr;

namespace {

const std::string kDemo = QUARRIN_BINARY_DIR "/examples/demo";
const std::string kPrinters = "file://" + kDemo + "/Printers/";

class Demo : public ::testing::Test {
 protected:
  // The demo runs once for all the tests below.
  static void SetUpTestSuite() {
    work_ = std::make_unique<qrtest::TempDir>();
    qrtest::ProgramOptions o;
    o.args = {QUARRIN_SOURCE_DIR "/examples/run-demo.sh", QUARRIN_BINARY_DIR, work_->path()};
    o.unsetEnv = {"CACHEWRIGHT_FRAMEWORK", "CACHEWRIGHT_PREFS", "QUARRIN_SAMPLE_TRACE"};
    result_ = std::make_unique<qrtest::ProgramResult>(qrtest::runProgram("/bin/bash", o));
    cache_ = cast<Dictionary>(readPropertyListFile(work_->path() + "/cache.plist"));
  }
  static void TearDownTestSuite() {
    cache_.reset();
    result_.reset();
    work_.reset();
  }

  // The lines of the demo's output that begin with prefix, in order.
  static std::vector<std::string> linesStartingWith(std::string_view prefix) {
    std::vector<std::string> lines;
    std::istringstream in(result_->out);
    for (std::string line; std::getline(in, line);)
      if (line.rfind(prefix, 0) == 0) lines.push_back(line);
    return lines;
  }

  static Dictionary* entry(const std::string& bundle) {
    return cache_ ? cache_->getAs<Dictionary>(kPrinters + bundle + "/") : nullptr;
  }
  static size_t count(const std::string& bundle, std::string_view connection) {
    Dictionary* e = entry(bundle);
    Array* info = e ? e->getAs<Array>(connection) : nullptr;
    return info ? info->count() : SIZE_MAX;
  }
  static std::string text(Dictionary* d, std::string_view key) {
    String* s = d ? d->getAs<String>(key) : nullptr;
    return s ? s->utf8() : "(none)";
  }

  static inline std::unique_ptr<qrtest::TempDir> work_;
  static inline std::unique_ptr<qrtest::ProgramResult> result_;
  static inline Ref<Dictionary> cache_;
};

TEST_F(Demo, ColdRunsLoadEveryModuleAndTheWarmRunNone) {
  ASSERT_EQ(result_->status, 0) << result_->err;
  auto runs = linesStartingWith("$ cachewright");
  ASSERT_EQ(runs.size(), 4u) << result_->out;
  EXPECT_NE(runs[0].find("cachewright -s < /dev/null"), std::string::npos) << runs[0];
  EXPECT_NE(result_->out.find("<plist version=\"1.0\">\n<dict/>\n</plist>\nexit 0\n"),
            std::string::npos)
      << "stream mode with nothing installed prints an empty cache";
  const std::string all = "plug-ins loaded: AurelLaser BriskInkjet CorvoLabel DNSSD USB";
  EXPECT_NE(runs[1].find("exit 1 (cache stored); " + all), std::string::npos) << runs[1];
  EXPECT_NE(runs[2].find("exit 0 (file written); " + all), std::string::npos) << runs[2];
  EXPECT_NE(runs[3].find("exit 1 (cache stored); plug-ins loaded: none"), std::string::npos)
      << runs[3];
  EXPECT_NE(result_->out.find("(after the warm run the store holds the same cache as before)"),
            std::string::npos);
  // No run had anything to complain about.
  EXPECT_EQ(result_->out.find("log: "), std::string::npos) << result_->out;
}

TEST_F(Demo, TheCacheHoldsEveryAnswerOfTheInstalledModules) {
  ASSERT_TRUE(cache_) << result_->out << result_->err;
  Dictionary* usb = entry("IOModules/USB.plugin");
  Dictionary* dnssd = entry("IOModules/DNSSD.plugin");
  EXPECT_EQ(text(usb, "kIOMConnectionType"), "USB");
  EXPECT_EQ(text(usb, "kIOMBrowserPath"), "Contents/PlugIns/USBBrowser.plugin");
  EXPECT_EQ(text(usb, "Bundle Version"), "2.1");
  EXPECT_EQ(text(dnssd, "kIOMConnectionType"), "DNSSD");
  EXPECT_EQ(text(dnssd, "kIOMBrowserPath"), kDemo + "/Printers/Browsers/NetworkBrowser.plugin");

  EXPECT_EQ(count("PrinterModules/AurelLaser.plugin", "USB"), 2u);
  EXPECT_EQ(count("PrinterModules/AurelLaser.plugin", "DNSSD"), 1u);
  EXPECT_EQ(text(entry("PrinterModules/AurelLaser.plugin"), "Bundle Version"), "3.0.2");
  // Asked for "DNSSD", the inkjet module answers only for "Quellnet"; that
  // answer is filed under "DNSSD" and no "Quellnet" entry is made.
  EXPECT_EQ(count("PrinterModules/BriskInkjet.plugin", "USB"), 1u);
  EXPECT_EQ(count("PrinterModules/BriskInkjet.plugin", "DNSSD"), 1u);
  EXPECT_EQ(count("PrinterModules/BriskInkjet.plugin", "Quellnet"), SIZE_MAX);
  // The label module has no network answer: its own empty one is recorded,
  // never the USB entries the run lends it.
  EXPECT_EQ(count("PrinterModules/CorvoLabel.plugin", "USB"), 1u);
  EXPECT_EQ(count("PrinterModules/CorvoLabel.plugin", "DNSSD"), 0u);
  // Excluded by the search settings; the browsers are no cache entries.
  EXPECT_FALSE(entry("PrinterModules/Retired/RetiredLaser.plugin"));
  EXPECT_EQ(cache_->count(), 5u);

  // The icon file entry keeps its name and bundle URL; the inkjet module's
  // embedded icon data never reaches the cache.
  auto* laserUSB = entry("PrinterModules/AurelLaser.plugin")->getAs<Array>("USB");
  auto* first = cast<Dictionary>(laserUSB->at(0));
  EXPECT_EQ(text(first, "Printer Browser Icons Filename"), "laser.png");
  EXPECT_EQ(text(first, "PM URL String"), kPrinters + "PrinterModules/AurelLaser.plugin/");
  std::string xml = qrtest::readText(work_->path() + "/cache.plist");
  EXPECT_NE(xml.find("<string>inkjet.png</string>"), std::string::npos);
  EXPECT_EQ(xml.find("<key>Printer Browser Icons</key>"), std::string::npos);
  EXPECT_EQ(xml.find("USBParasite"), std::string::npos);

  // The store holds what the file holds.
  auto store = cast<Dictionary>(readPropertyListFile(work_->path() + "/printing-prefs.plist"));
  ASSERT_TRUE(store);
  ASSERT_TRUE(store->get("pmcache 5"));
  EXPECT_TRUE(store->get("pmcache 5")->isEqual(*cache_));
}

TEST_F(Demo, ConnectionRecordsListFirstPartyBrowsersFirstWithLocalizedTitles) {
  // The listing in English, then in German: two records each.
  std::vector<std::string> records;
  for (const auto& line : linesStartingWith(""))
    if (line.rfind("USB ", 0) == 0 || line.rfind("DNSSD ", 0) == 0) records.push_back(line);
  ASSERT_EQ(records.size(), 4u) << result_->out;
  // "Nearby..." sorts before "USB..." by title, but the first-party browser comes first.
  for (size_t i : {0, 2}) {
    EXPECT_EQ(records[i].rfind("USB      USB Printers ", 0), 0u) << records[i];
    EXPECT_NE(records[i].find(" com.varnex.print.pbm.USBBrowser "), std::string::npos);
    EXPECT_NE(
        records[i].find(
            " file://$DEMO/Printers/IOModules/USB.plugin/Contents/PlugIns/USBBrowser.plugin/"),
        std::string::npos);
    EXPECT_NE(records[i + 1].find(" org.quarrin.sample.NetworkBrowser "), std::string::npos);
    EXPECT_NE(records[i + 1].find(" file://$DEMO/Printers/Browsers/NetworkBrowser.plugin/"),
              std::string::npos);
  }
  // The third-party browser is titled by its strings tables: by bundle
  // identifier in English, by connection type in German.
  EXPECT_EQ(records[1].rfind("DNSSD    Nearby Network Printers ", 0), 0u) << records[1];
  EXPECT_EQ(records[3].rfind("DNSSD    Drucker im Netzwerk ", 0), 0u) << records[3];
  // Only the browser titled by its own code had to be loaded.
  EXPECT_NE(result_->out.find("(plug-ins loaded for their titles: USBBrowser)"), std::string::npos);
}

}  // namespace
