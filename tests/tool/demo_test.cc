// Runs examples/run-demo.sh over the demo installation of this build: cold,
// path-mode and warm runs, and the cache they leave.
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
  const std::string all = "plug-ins loaded: AurelLaser BriskInkjet CorvoLabel DNSSD USB\n";
  size_t at = 0;
  for (const std::string& run : {"exit 1 (cache stored); " + all, "exit 0 (file written); " + all,
                                 std::string("exit 1 (cache stored); plug-ins loaded: none\n")}) {
    at = r.out.find(run, at);
    ASSERT_NE(at, std::string::npos) << run << r.out;
  }
  EXPECT_EQ(r.out.find("log: "), std::string::npos) << "no run complained";
  auto file = cast<Dictionary>(readPropertyListFile(work / "cache.plist"));
  auto store = cast<Dictionary>(readPropertyListFile(work / "printing-prefs.plist"));
  ASSERT_TRUE(file && store && store->get("pmcache 5"));
  EXPECT_EQ(file->count(), 5u) << "every module but the excluded one";
  EXPECT_TRUE(store->get("pmcache 5")->isEqual(*file));
}
