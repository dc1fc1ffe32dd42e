// Runs examples/run-demo.sh over the demo installation of this build: cold,
// path-mode and warm runs, and the cache they leave, with one broken plug-in
// among the samples.
#include <gtest/gtest.h>

#include "plist/property_list.h"
#include "support/run_program.h"
#include "values/dictionary.h"

using namespace qr;

TEST(Demo, ColdRunsLoadEveryModuleTheWarmRunNoneAndFileAndStoreAgree) {
  qrtest::TempDir work;
  qrtest::ProgramOptions o;
  o.args = {QUARRIN_SOURCE_DIR "/examples/run-demo.sh", QUARRIN_BINARY_DIR, work.path()};
  auto r = qrtest::runProgram("/bin/bash", o);
  ASSERT_EQ(r.status, 0) << r.err;
  const std::string all =
      "plug-ins loaded: AurelLaser BriskInkjet BrokenExample CorvoLabel DNSSD USB\n";
  size_t at = 0;
  for (const std::string& run : {"exit 1 (cache stored); " + all, "exit 0 (file written); " + all,
                                 std::string("exit 1 (cache stored); plug-ins loaded: none\n")}) {
    at = r.out.find(run, at);
    ASSERT_NE(at, std::string::npos) << run << r.out;
  }
  // Only the broken example is complained about: it crashes in the cold and
  // path-mode runs, and the warm run skips it.
  auto count = [&](const std::string& text) {
    size_t n = 0;
    for (size_t i = r.out.find(text); i != std::string::npos; i = r.out.find(text, i + 1)) ++n;
    return n;
  };
  const std::string broken = "'file://$DEMO/Printers/PrinterModules/BrokenExample.plugin/'";
  EXPECT_EQ(count("log: "), 3u) << r.out;
  EXPECT_EQ(count("[SIGSEGV] on call to 'CreateBrowserInfo' for " + broken), 2u);
  EXPECT_EQ(count("Skipping " + broken), 1u);
  auto file = cast<Dictionary>(readPropertyListFile(work / "cache.plist"));
  auto store = cast<Dictionary>(readPropertyListFile(work / "printing-prefs.plist"));
  ASSERT_TRUE(file && store && store->get("pmcache 5"));
  EXPECT_EQ(file->count(), 5u) << "every module but the excluded one";
  EXPECT_TRUE(store->get("pmcache 5")->isEqual(*file));
}
