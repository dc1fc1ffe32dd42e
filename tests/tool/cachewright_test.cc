// cachewright as a black box, with module discovery off: arguments, standard
// input, the store and the framework's default cache in; exit status, output,
// log and the files it leaves out.
#include <gtest/gtest.h>

#include <filesystem>

#include "plist/property_list.h"
#include "support/run_program.h"
#include "tool/cachewright.h"
#include "values/dictionary.h"

using namespace qr;

namespace {

// A property list as cachewright writes it, around a dictionary.
std::string plist(std::string_view dict) {
  return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n" +
         std::string(dict) + "</plist>\n";
}

const char kEmpty[] = "<dict/>\n";
const char kOne[] =
    "<dict>\n\t<key>file:///nowhere/A.plugin/</key>\n\t<dict>\n"
    "\t\t<key>Bundle Version</key>\n\t\t<string>1.0</string>\n\t</dict>\n</dict>\n";

TEST(Cachewright, ExitStatusOutputLogAndFilesForEachInvocation) {
  const std::string one = plist(kOne), noCache = "Could not load internal printer module cache.";
  struct {
    std::vector<std::string> args;  // a leading "/" is inside the run's directory
    std::string input;
    const char* store;     // cache in the store before the run (nullptr: no store)
    const char* resource;  // the framework's default cache (nullptr: none)
    int status;
    const char* out;     // the cache on standard output (nullptr: nothing)
    std::string err;     // contained in standard error ("": nothing)
    const char* stored;  // the cache in the store after the run (nullptr: untouched)
    const char* file;    // the one file written into the run's directory (nullptr: none)
    bool full = false;   // standard output is /dev/full
  } rows[] = {
      {{"-x"}, "", kOne, nullptr, 1, nullptr, kCachewrightUsage, nullptr, nullptr},
      {{"-s", "-q"}, "", nullptr, nullptr, 1, nullptr, kCachewrightUsage, nullptr, nullptr},
      {{"-s"}, "", nullptr, nullptr, 0, kEmpty, noCache, nullptr, nullptr},
      {{"-s"}, "", nullptr, "<array/>\n", 0, kEmpty, noCache, nullptr, nullptr},
      {{"-s", "/c.plist"}, "", nullptr, nullptr, 0, kEmpty, noCache, nullptr, nullptr},
      {{"-s"}, one, kEmpty, kEmpty, 0, kOne, "", nullptr, nullptr},
      {{"-s"}, "{{{", kOne, nullptr, 0, kOne, "", nullptr, nullptr},
      {{"-s"}, "(\"a\")", kOne, nullptr, 0, kOne, "not a dictionary", nullptr, nullptr},
      {{"-s"}, "", nullptr, kOne, 0, kOne, "", nullptr, nullptr},
      {{"-s"}, "", kEmpty, kOne, 0, kEmpty, "", nullptr, nullptr},
      {{"-s"}, "", kOne, nullptr, 1, nullptr, "Could not write", nullptr, nullptr, true},
      {{}, "", kOne, nullptr, 0, nullptr, "", nullptr, nullptr},
      {{"/c.plist", "x"}, "", kOne, nullptr, 0, nullptr, "", nullptr, nullptr},
      {{"c.plist"}, "", kOne, nullptr, 0, nullptr, "", nullptr, nullptr},
      {{"/c.plist"}, "", kOne, kOne, 0, nullptr, "", kEmpty, kEmpty},
      {{"/none/c.plist"}, "", kOne, nullptr, 1, nullptr, "", kEmpty, nullptr},
      {{"/caf\xE9.plist"}, "", nullptr, nullptr, 1, nullptr, "", kEmpty, nullptr},
  };
  for (const auto& r : rows) {
    SCOPED_TRACE(::testing::PrintToString(r.args) + " < " + r.input);
    qrtest::TempDir dir, files;
    const std::string store = dir / "prefs.plist";
    if (r.store)
      dir.write("prefs.plist",
                plist("<dict><key>pmcache 5</key>" + std::string(r.store) + "</dict>"));
    if (r.resource) dir.write("Z.framework/Resources/com.varnex.pmcache.xml", plist(r.resource));
    const std::string storeBefore = qrtest::readText(store);
    qrtest::ProgramOptions o;
    for (const auto& a : r.args) o.args.push_back(a.starts_with("/") ? files.path() + a : a);
    o.env = {{"CACHEWRIGHT_FRAMEWORK", dir / "Z.framework"}, {"CACHEWRIGHT_PREFS", store}};
    o.input = r.input;
    o.stdoutPath = r.full ? "/dev/full" : "";
    auto result = qrtest::runProgram(QUARRIN_BINARY_DIR "/src/cachewright", o);

    EXPECT_EQ(result.status, r.status);
    EXPECT_EQ(result.out, r.out ? plist(r.out) : "");
    EXPECT_TRUE(r.err.empty() ? result.err.empty() : result.err.find(r.err) != std::string::npos)
        << result.err;
    auto prefs = cast<Dictionary>(readPropertyListFile(store));
    if (r.stored)
      EXPECT_TRUE(prefs &&
                  prefs->get("pmcache 5")
                      ->isEqual(*readPropertyList(plist(r.stored), Mutability::Immutable)));
    else
      EXPECT_EQ(qrtest::readText(store), storeBefore);
    std::vector<std::string> written;
    for (const auto& e : std::filesystem::directory_iterator(files.path()))
      written.push_back(qrtest::readText(e.path()));
    EXPECT_EQ(written, r.file ? std::vector{plist(r.file)} : std::vector<std::string>{});
  }
}

}  // namespace
