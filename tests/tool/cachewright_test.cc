// Runs the built cachewright against a temporary framework and store.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>

#include "plist/property_list.h"
#include "support/run_program.h"
#include "support/temp_dir.h"
#include "tool/cachewright.h"
#include "values/dictionary.h"
#include "values/string.h"

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

TEST_F(Cachewright, ExitStatusOutputAndFilesForEachCommandLine) {
  // {"k": {"Bundle Version": "1.0"}} in binary form: objects, offsets, trailer.
  const std::string binary =
      "bplist00\xd1\x01\x02Qk\xd1\x03\x04^Bundle VersionS1.0\x08\x0b\x0d\x10\x1f" +
      std::string(6, '\0') + "\x01\x01" + std::string(7, '\0') + "\x05" + std::string(15, '\0') +
      "#";
  ASSERT_TRUE(readBinaryPropertyList(binary, Mutability::Immutable)) << "fixture is well formed";
  const std::string usage = kCachewrightUsage,
                    noCache = "Could not load internal printer module cache.";
  const std::string path = dir_ / "cache.plist";
  auto holds = [](const std::string& part) -> ::testing::Matcher<std::string> {
    if (part.empty()) return ::testing::IsEmpty();
    return ::testing::HasSubstr(part);
  };
  struct {
    std::vector<std::string> args;
    std::string input;
    int status;
    std::string out;  // contained in standard output; empty: nothing there
    std::string err;  // contained in standard error; empty: nothing there
  } cases[] = {
      // Bad options print the usage and touch nothing.
      {{"-x"}, "", 1, "", usage},
      {{"-?"}, "", 1, "", usage},
      {{"-s", "-q"}, "", 1, "", usage},
      // Stream mode with nothing anywhere prints an empty cache, and never writes the store.
      {{"-s"}, "", 0, kEmptyCacheXML, noCache},
      {{"-s", "-s"}, "", 0, kEmptyCacheXML, noCache},
      {{"-s", path}, "", 0, kEmptyCacheXML, noCache},
      // A cache from standard input is not loaded from anywhere else.
      {{"-s"}, kOneEntryCacheXML, 0, kOneEntryCacheXML, ""},
      {{"-s"},
       binary,
       0,
       "<key>k</key>\n\t<dict>\n\t\t<key>Bundle Version</key>\n\t\t<string>1.0</string>",
       ""},
      // Default mode with discovery off never even loads the cache.
      {{}, "", 0, "", ""},
      {{path, "extra"}, "", 0, "", ""},
      {{"cache.plist"}, "", 0, "", ""},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(::testing::PrintToString(c.args) + " < " + c.input.substr(0, 20));
    auto r = run(c.args, c.input);
    EXPECT_EQ(r.status, c.status);
    EXPECT_THAT(r.out, holds(c.out));
    EXPECT_THAT(r.err, holds(c.err));
    EXPECT_FALSE(storeExists());
    EXPECT_FALSE(std::filesystem::exists(path));
  }
  EXPECT_EQ(usage,
            "Usage: cachewright [-s]\n    -s               Use stdin/stdout to read/write cache "
            "dictionary.\n");
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
