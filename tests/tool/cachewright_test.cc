// Runs the built cachewright against a temporary framework and store.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>

#include "platform/dictionary.h"
#include "platform/property_list.h"
#include "platform/string.h"
#include "support/run_program.h"
#include "support/temp_dir.h"
#include "tool/cachewright.h"

using namespace qr;
using qrtest::ProgramOptions;
using qrtest::ProgramResult;

namespace {

const char kEmptyCacheXML[] =
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n<dict/>\n</plist>\n";

const char kOneEntryCacheXML[] =
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n<dict>\n"
    "\t<key>file:///nowhere/A.plugin/</key>\n\t<dict>\n"
    "\t\t<key>Bundle Version</key>\n\t\t<string>1.0</string>\n"
    "\t\t<key>kIOMConnectionType</key>\n\t\t<string>USB</string>\n"
    "\t</dict>\n</dict>\n</plist>\n";

class Cachewright : public ::testing::Test {
 protected:
  ProgramResult run(std::vector<std::string> args, std::string input = {},
                    std::string stdoutPath = {}) {
    ProgramOptions o;
    o.args = std::move(args);
    o.input = std::move(input);
    o.stdoutPath = std::move(stdoutPath);
    o.env["CACHEWRIGHT_FRAMEWORK"] = framework();
    o.env["CACHEWRIGHT_PREFS"] = store();
    return qrtest::runProgram(QUARRIN_BINARY_DIR "/src/cachewright", o);
  }
  std::string framework() const { return dir_ / "Zephrin.framework"; }
  std::string store() const { return dir_ / "prefs/printing-prefs.plist"; }
  bool storeExists() const { return std::filesystem::exists(store()); }

  // The store as the program left it.
  Ref<Dictionary> storedPrefs() const { return cast<Dictionary>(readPropertyListFile(store())); }
  void writeStore(std::string_view cacheXMLBody) {
    qrtest::writeText(store(), std::string("<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
                                           "<plist version=\"1.0\">\n<dict>\n"
                                           "<key>pmcache 5</key>\n") +
                                   std::string(cacheXMLBody) + "</dict>\n</plist>\n");
  }

  qrtest::TempDir dir_;
};

TEST_F(Cachewright, BadOptionsPrintUsageAndTouchNothing) {
  for (auto args : std::vector<std::vector<std::string>>{{"-x"}, {"-?"}, {"-s", "-q"}}) {
    auto r = run(args);
    EXPECT_EQ(r.status, 1) << args[0];
    EXPECT_NE(r.err.find(kCachewrightUsage), std::string::npos) << r.err;
    EXPECT_TRUE(r.out.empty());
    EXPECT_FALSE(storeExists());
  }
  EXPECT_EQ(std::string(kCachewrightUsage),
            "Usage: cachewright [-s]\n    -s               Use stdin/stdout to read/write cache "
            "dictionary.\n");
}

TEST_F(Cachewright, StreamModeWithNothingAnywherePrintsAnEmptyCache) {
  for (auto args :
       std::vector<std::vector<std::string>>{{"-s"}, {"-s", "-s"}, {"-s", dir_ / "cache.plist"}}) {
    auto r = run(args);
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out, kEmptyCacheXML);
    EXPECT_NE(r.err.find("Could not load internal printer module cache."), std::string::npos);
    EXPECT_FALSE(storeExists()) << "stream mode never writes the store";
    EXPECT_FALSE(std::filesystem::exists(dir_ / "cache.plist"));
  }
}

TEST_F(Cachewright, StreamModeReadsXMLAndBinaryInput) {
  auto r = run({"-s"}, kOneEntryCacheXML);
  EXPECT_EQ(r.status, 0);
  EXPECT_EQ(r.out, kOneEntryCacheXML);
  EXPECT_EQ(r.err, "") << "a cache from standard input is not loaded from anywhere else";

  // The same dictionary in binary form: {"k": {"Bundle Version": "1.0"}}.
  static const unsigned char kBinary[] = {
      0x62, 0x70, 0x6c, 0x69, 0x73, 0x74, 0x30, 0x30, 0xd1, 0x01, 0x02, 0x51, 0x6b, 0xd1, 0x03,
      0x04, 0x5e, 0x42, 0x75, 0x6e, 0x64, 0x6c, 0x65, 0x20, 0x56, 0x65, 0x72, 0x73, 0x69, 0x6f,
      0x6e, 0x53, 0x31, 0x2e, 0x30, 0x08, 0x0b, 0x0d, 0x10, 0x1f, 0x00, 0x00, 0x00, 0x00, 0x00,
      0x00, 0x01, 0x01, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x05, 0x00, 0x00, 0x00, 0x00,
      0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x23};
  std::string binary(reinterpret_cast<const char*>(kBinary), sizeof kBinary);
  ASSERT_TRUE(readBinaryPropertyList(binary, Mutability::Immutable)) << "fixture is well formed";
  r = run({"-s"}, binary);
  EXPECT_EQ(r.status, 0);
  EXPECT_NE(r.out.find("<key>k</key>"), std::string::npos) << r.out;
  EXPECT_NE(r.out.find("<string>1.0</string>"), std::string::npos);
}

TEST_F(Cachewright, StreamModeFallsBackToTheStoreOnGarbageOrNonDictionaryInput) {
  writeStore("<dict><key>from-store</key><dict/></dict>\n");
  for (std::string input : {std::string("this is not a property list {"),
                            std::string("<?xml version=\"1.0\"?><plist version=\"1.0\"><array>"
                                        "<string>x</string></array></plist>")}) {
    auto r = run({"-s"}, input);
    EXPECT_EQ(r.status, 0);
    EXPECT_NE(r.out.find("<key>from-store</key>"), std::string::npos) << r.out;
  }
  auto r = run({"-s"}, "( \"an\", \"array\" )");
  EXPECT_NE(r.err.find("not a dictionary"), std::string::npos) << r.err;
}

TEST_F(Cachewright, TheDefaultCacheResourceIsUsedOnlyWithoutAStoredCache) {
  qrtest::writeText(framework() + "/Resources/com.varnex.pmcache.xml", kOneEntryCacheXML);
  auto r = run({"-s"});
  EXPECT_EQ(r.out, kOneEntryCacheXML);
  EXPECT_EQ(r.err, "");
  writeStore("<dict/>\n");
  r = run({"-s"});
  EXPECT_EQ(r.out, kEmptyCacheXML);
}

TEST_F(Cachewright, AShortOrFailedWriteToStandardOutputIsAFailure) {
  qrtest::writeText(framework() + "/Resources/com.varnex.pmcache.xml", kOneEntryCacheXML);
  auto r = run({"-s"}, {}, "/dev/full");
  EXPECT_EQ(r.status, 1);
  EXPECT_NE(r.err.find("Could not write the printer module cache to standard output."),
            std::string::npos)
      << r.err;
}

TEST_F(Cachewright, DefaultModeWithDiscoveryOffLeavesTheStoreAlone) {
  for (auto args : std::vector<std::vector<std::string>>{
           {}, {dir_ / "cache.plist", "extra"}, {"cache.plist"}}) {
    auto r = run(args);
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.err, "") << "the cache is never even loaded";
    EXPECT_FALSE(storeExists());
    EXPECT_FALSE(std::filesystem::exists(dir_ / "cache.plist"));
  }
}

TEST_F(Cachewright, PathModeStoresAndWritesTheSameEmptyCache) {
  writeStore("<dict><key>old</key><dict/></dict>\n");
  auto r = run({dir_ / "cache.plist"});
  EXPECT_EQ(r.status, 0) << r.err;
  EXPECT_EQ(qrtest::readText(dir_ / "cache.plist"), kEmptyCacheXML);
  auto prefs = storedPrefs();
  ASSERT_TRUE(prefs);
  auto* cache = prefs->getAs<Dictionary>("pmcache 5");
  ASSERT_TRUE(cache);
  EXPECT_EQ(cache->count(), 0u) << "path mode starts from an empty cache";
}

TEST_F(Cachewright, PathModeWithAnUnwritablePathStillStoresButFails) {
  auto r = run({dir_ / "missing-dir/cache.plist"});
  EXPECT_EQ(r.status, 1);
  EXPECT_TRUE(storeExists());
  if (geteuid() != 0) {  // root writes through permissions
    std::filesystem::create_directories(dir_ / "ro");
    chmod((dir_ / "ro").c_str(), 0500);
    EXPECT_EQ(run({dir_ / "ro/cache.plist"}).status, 1);
  }
}

TEST_F(Cachewright, PathModeWithAPathThatIsNotUTF8KeepsTheStoreStatus) {
  std::string path = dir_ / "caf\xE9.plist";
  auto r = run({path});
  EXPECT_EQ(r.status, 1) << "the cache changed, so it was stored";
  EXPECT_FALSE(std::filesystem::exists(path));
  EXPECT_TRUE(storeExists());
}

}  // namespace
