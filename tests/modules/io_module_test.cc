// I/O modules answer from a current cache entry, else ask their plug-in once.
#include <gtest/gtest.h>

#include "cache/module_cache.h"
#include "fixtures/fixture_support.h"
#include "modules/io_module.h"
#include "modules/module_factory.h"

using namespace qr;
using qr::test::CapturedLog;
using qr::test::fixtureBundle;
using qr::test::FixtureCalls;

namespace {

class IOModuleTest : public ::testing::Test {
 protected:
  void SetUp() override { cache().setCacheDict(make<MutableDictionary>()); }
  static QuarrinModuleCache& cache() { return QuarrinModuleCache::defaultCache(); }
  static Ref<IOModule> module(std::string_view name) {
    return QuarrinModuleFactory::IOMModuleForURL(URL::fileURL(fixtureBundle(name), true).get());
  }
  Dictionary* entryOf(const IOModule& m) {
    return cache().cacheDictionary()->getAs<Dictionary>(m.pluginURL()->absoluteString());
  }
  FixtureCalls calls_;
  CapturedLog log_;
};

TEST_F(IOModuleTest, ACurrentEntryAnswersWithoutLoadingTheCode) {
  auto io = module("c_iom");
  cache().addInfoForIOModule(io->pluginURL().get(), String::make("Cached").get(),
                             String::make("Cached.plugin").get());
  EXPECT_TRUE(io->connectionType()->equals("Cached"));
  EXPECT_TRUE(io->pbmPath()->equals("Cached.plugin"));
  EXPECT_TRUE(calls_.lines().empty());
}

TEST_F(IOModuleTest, AValueMissingFromTheEntryIsLookedUpAgainAtEveryAccess) {
  auto io = module("c_iom");
  cache().addInfoForIOModule(io->pluginURL().get(), nullptr, String::make("B.plugin").get());
  EXPECT_FALSE(io->connectionType());
  cache().addInfoForIOModule(io->pluginURL().get(), String::make("Later").get(), nullptr);
  EXPECT_TRUE(io->connectionType()->equals("Later"))
      << "the empty field sent it to the cache again";
  EXPECT_TRUE(calls_.lines().empty());
}

TEST_F(IOModuleTest, APluginAnswerIsRecordedWithTheBundleVersion) {
  auto io = module("io_no_path");
  EXPECT_FALSE(io->pbmPath());
  EXPECT_TRUE(io->connectionType()->equals("Serial"));
  EXPECT_FALSE(io->pbmPath());
  Dictionary* entry = entryOf(*io);
  ASSERT_TRUE(entry);
  EXPECT_EQ(entry->count(), 2u);
  EXPECT_TRUE(entry->getAs<String>("Bundle Version")->equals("1.0"));
  EXPECT_TRUE(entry->getAs<String>("kIOMConnectionType")->equals("Serial"));
  EXPECT_EQ(calls_.count("io_no_path GetConnectionInfo"), 1u)
      << "later accesses of the missing path are answered by the entry";
  EXPECT_EQ(calls_.count("io_no_path create"), 1u);
}

TEST_F(IOModuleTest, AFailedCallKeepsItsValuesButRecordsNothing) {
  auto io = module("io_failing");
  EXPECT_TRUE(io->connectionType()->equals("USB"));
  EXPECT_TRUE(io->pbmPath()->equals("B.plugin"));
  EXPECT_FALSE(entryOf(*io)) << "the next run asks the plug-in again";
}

TEST_F(IOModuleTest, ARaisingPluginIsLoggedOnceAndKeepsWhatItWroteFirst) {
  auto io = module("io_raises");
  EXPECT_TRUE(io->connectionType()->equals("USB"));
  EXPECT_FALSE(entryOf(*io));
  auto lines = log_.lines();
  ASSERT_EQ(lines.size(), 1u);
  EXPECT_EQ(lines[0], "[FixtureError] on call to 'GetConnectionInfo' for '" +
                          io->pluginURL()->absoluteString() + "'");
}

TEST_F(IOModuleTest, AModuleThatCannotLoadAnswersNothingAndLoadsOnce) {
  auto io = module("c_factory_null");
  EXPECT_FALSE(io->connectionType());
  EXPECT_FALSE(io->pbmPath());
  EXPECT_EQ(calls_.count("c_factory_null create"), 1u);
  EXPECT_FALSE(entryOf(*io));
}

TEST_F(IOModuleTest, DestroyingTheModuleReleasesItsStringsOnce) {
  Ref<String> type, path;
  uint32_t typeCount, pathCount;
  {
    auto io = module("c_iom");
    type = io->connectionType();
    path = io->pbmPath();
    ASSERT_TRUE(type && path);
    typeCount = type->retainCount();
    pathCount = path->retainCount();
  }
  EXPECT_EQ(type->retainCount(), typeCount - 1);
  EXPECT_EQ(path->retainCount(), pathCount - 1);
}

}  // namespace
