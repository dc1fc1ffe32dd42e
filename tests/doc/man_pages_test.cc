// The built man pages render with groff without a single warning: a page
// scdoc turned into roff that groff misreads would show wrong text to readers.
#include <gtest/gtest.h>

#include <string>

#include "support/run_program.h"

TEST(ManPages, RenderWithoutWarnings) {
#ifndef QUARRIN_MAN_PAGE_DIR
  GTEST_SKIP() << "scdoc was not found when the build was configured";
#else
  const std::string groff = QUARRIN_GROFF;
  if (groff.empty()) GTEST_SKIP() << "groff was not found when the build was configured";
  for (const char* page : {"cachewright.8", "pmdeviceid.1", "quarrin-inspect.1"}) {
    const std::string path = std::string(QUARRIN_MAN_PAGE_DIR) + "/" + page;
    qrtest::ProgramOptions options;
    options.args = {"-ww", "-man", "-Tutf8", "-z", path};
    auto result = qrtest::runProgram(groff, options);
    EXPECT_EQ(result.status, 0) << page;
    EXPECT_EQ(result.err, "") << page;
  }
#endif
}
