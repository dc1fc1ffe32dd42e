// The module factory and interface loading, counted by what the fixture
// plug-ins record of every call made into them.
#include <gtest/gtest.h>

#include <stdexcept>

#include "cache/module_cache.h"
#include "fixtures/fixture_support.h"
#include "modules/io_module.h"
#include "modules/module_factory.h"
#include "modules/pbm_module.h"
#include "modules/pm_module.h"

using namespace qr;
using qr::test::CapturedLog;
using qr::test::fixtureBundle;
using qr::test::FixtureCalls;
using qr::test::fixtureURL;

namespace {

size_t countContaining(const std::vector<std::string>& lines, std::string_view text) {
  size_t n = 0;
  for (const auto& l : lines) n += l.find(text) != std::string::npos;
  return n;
}

class ModuleLoading : public ::testing::Test {
 protected:
  void SetUp() override {
    QuarrinModuleCache::defaultCache().setCacheDict(make<MutableDictionary>());
    QuarrinModuleFactory::resetLoadFailures();
  }
  FixtureCalls calls_;
  CapturedLog log_;
};

TEST_F(ModuleLoading, TheUUIDsAreMadeOnceAndReadAsTheirTextForms) {
  EXPECT_EQ(QuarrinModuleFactory::pmTypeID(), QuarrinModuleFactory::pmTypeID());
  EXPECT_EQ(QuarrinModuleFactory::pmTypeID()->string(), "5D69ED5E-D5B5-11D3-9EFF-00050209D9C1");
  EXPECT_EQ(QuarrinModuleFactory::pmIntfID()->string(), "5EDEC4FA-D5B5-11D3-AAF2-00050209D9C1");
  EXPECT_EQ(QuarrinModuleFactory::iomTypeID()->string(), "EE5A5E5C-C2DD-11D3-84B5-00050209D9C1");
  EXPECT_EQ(QuarrinModuleFactory::iomIntfID()->string(), "F4F7510C-C2DD-11D3-93A5-00050209D9C1");
  EXPECT_EQ(QuarrinModuleFactory::pbmTypeID()->string(), "23F71E46-95CC-1226-AC04-000502ADB00B");
  EXPECT_EQ(QuarrinModuleFactory::pbmVersID()->string(), "1D6BF822-95D0-1226-A8ED-000502ADB00B");
  EXPECT_EQ(QuarrinModuleFactory::pbmIntfID()->string(), "86544C22-95D0-1226-91D5-000502ADB00B");
}

TEST_F(ModuleLoading, TheKindFollowsTheDeclaredFactoriesInAFixedOrder) {
  EXPECT_TRUE(cast<IOModule>(QuarrinModuleFactory::pluginForURL(fixtureURL("c_iom").get())));
  EXPECT_TRUE(cast<PMModule>(QuarrinModuleFactory::pluginForURL(fixtureURL("c_pm").get())));
  EXPECT_TRUE(cast<PBMModule>(QuarrinModuleFactory::pluginForURL(fixtureURL("c_pbm").get())));

  auto both = fixtureURL("m_two_kinds");
  EXPECT_TRUE(cast<IOModule>(QuarrinModuleFactory::pluginForURL(both.get())));
  EXPECT_TRUE(QuarrinModuleFactory::PMModuleForURL(both.get()));
  EXPECT_FALSE(QuarrinModuleFactory::PBMModuleForURL(both.get()));
  EXPECT_FALSE(QuarrinModuleFactory::pluginType(QuarrinModuleFactory::pbmVersID(),
                                                fixtureURL("c_pbm").get()));

  EXPECT_FALSE(QuarrinModuleFactory::pluginForURL(fixtureURL("m_no_factories").get()));
  EXPECT_FALSE(QuarrinModuleFactory::pluginForURL(fixtureURL("m_pm_empty_type").get()));
  EXPECT_FALSE(QuarrinModuleFactory::pluginForURL(nullptr));
  EXPECT_FALSE(QuarrinModuleFactory::pluginForPath(QUARRIN_SOURCE_DIR));
  EXPECT_TRUE(QuarrinModuleFactory::pluginForPath(fixtureBundle("c_iom").c_str()));
  EXPECT_TRUE(calls_.lines().empty()) << "classifying a bundle runs none of its code";
}

TEST_F(ModuleLoading, ASoundModuleLoadsOnceWithOneCreationQueryAndRelease) {
  auto module = QuarrinModuleFactory::pluginForURL(fixtureURL("c_iom").get());
  EXPECT_FALSE(module->interfaceLoaded()) << "nothing is loaded before it is asked";
  EXPECT_TRUE(module->loadPluginInterface());
  EXPECT_TRUE(module->interfaceLoaded());
  EXPECT_TRUE(module->loadPluginInterface());
  EXPECT_EQ(calls_.count("c_iom create"), 1u);
  EXPECT_EQ(calls_.count("c_iom QueryInterface iid=F4F7510C-C2DD-11D3-93A5-00050209D9C1"), 1u);
  EXPECT_EQ(calls_.count("c_iom Release"), 1u);
  EXPECT_EQ(calls_.count("c_iom AddRef"), 0u);
  EXPECT_EQ(QuarrinModuleFactory::loadFailures(), 0);
}

TEST_F(ModuleLoading, TheFirstOfTwoFactoriesIsUsed) {
  auto module = QuarrinModuleFactory::PMModuleForURL(fixtureURL("c_declarations").get());
  ASSERT_TRUE(module);
  EXPECT_EQ(module->factoryID()->string(), FIXTURE_FACTORY_B);
  EXPECT_TRUE(module->loadPluginInterface());
  EXPECT_EQ(calls_.count("c_declarations create factory=FixtureOtherFactory"), 1u);
  EXPECT_EQ(calls_.count("c_declarations create factory=FixtureFactory"), 0u);
}

TEST_F(ModuleLoading, AFailedQueryIsLoggedWithCodeFacilityAndSeverityOnce) {
  struct Case {
    const char* fixture;
    const char* message;
  } cases[] = {
      {"m_qi_noiface", "code:4 facility:0 severity:1"},
      {"m_qi_facility", "code:14 facility:7 severity:1"},
      {"m_qi_high_bits", "code:14 facility:7 severity:1"},
  };
  for (const auto& c : cases) {
    auto url = fixtureURL(c.fixture);
    auto module = QuarrinModuleFactory::pluginForURL(url.get());
    EXPECT_FALSE(module->loadPluginInterface());
    EXPECT_FALSE(module->loadPluginInterface()) << "no second attempt";
    std::string expected = "Unble to obtain interface[" + url->absoluteString() +
                           ":(5D69ED5E-D5B5-11D3-9EFF-00050209D9C1,5EDEC4FA-D5B5-11D3-AAF2-"
                           "00050209D9C1)]: " +
                           c.message;
    EXPECT_EQ(countContaining(log_.lines(), expected), 1u) << c.fixture;
    EXPECT_EQ(calls_.count(std::string(c.fixture) + " create"), 1u);
    EXPECT_EQ(calls_.count(std::string(c.fixture) + " Release"), 1u)
        << "released after a failure too";
  }
  EXPECT_EQ(QuarrinModuleFactory::loadFailures(), 3);
}

TEST_F(ModuleLoading, FailuresWithoutAnInterfaceAreCountedButNotAllLogged) {
  for (const char* fixture :
       {"m_qi_null", "c_factory_null", "no_executable", "broken_executable"}) {
    auto module = QuarrinModuleFactory::pluginForURL(fixtureURL(fixture).get());
    ASSERT_TRUE(module) << fixture;
    EXPECT_FALSE(module->loadPluginInterface()) << fixture;
    EXPECT_FALSE(module->loadPluginInterface()) << fixture;
  }
  EXPECT_EQ(QuarrinModuleFactory::loadFailures(), 4);
  EXPECT_EQ(calls_.count("m_qi_null Release"), 1u);
  EXPECT_EQ(countContaining(log_.lines(), "Unble to obtain interface"), 0u);
  QuarrinModuleFactory::resetLoadFailures();
  EXPECT_EQ(QuarrinModuleFactory::loadFailures(), 0);
}

TEST_F(ModuleLoading, ThePlatformExceptionIsCaughtLoggedAndCountedOthersPassThrough) {
  auto raisesInFactory = fixtureURL("c_factory_raises");
  auto module = QuarrinModuleFactory::pluginForURL(raisesInFactory.get());
  EXPECT_FALSE(module->loadPluginInterface());
  EXPECT_EQ(countContaining(log_.lines(), "[FixtureError] creating an interface for '" +
                                              raisesInFactory->absoluteString() + "'"),
            1u);

  auto raisesInQuery = QuarrinModuleFactory::pluginForURL(fixtureURL("m_qi_raises").get());
  EXPECT_FALSE(raisesInQuery->loadPluginInterface());
  EXPECT_FALSE(raisesInQuery->pluginInterface())
      << "the interface stored before raising is dropped";
  EXPECT_EQ(calls_.count("m_qi_raises Release"), 1u) << "the instance is still released";
  EXPECT_EQ(QuarrinModuleFactory::loadFailures(), 2);

  auto throws = QuarrinModuleFactory::pluginForURL(fixtureURL("cxx_factory_throws").get());
  EXPECT_THROW(throws->loadPluginInterface(), std::runtime_error);
}

TEST_F(ModuleLoading, AModuleWithoutFactoryNeverTriesToLoad) {
  auto plugin = PlugIn::create(*fixtureURL("c_pm"));
  auto empty = make<Array>();
  PMModule module(plugin, empty.get(), fixtureURL("c_pm"));
  EXPECT_FALSE(module.loadPluginInterface());
  EXPECT_FALSE(module.loadPluginInterface());
  EXPECT_EQ(QuarrinModuleFactory::loadFailures(), 0);
  QuarrinModule bare(plugin, plugin->factoriesForType(*QuarrinModuleFactory::pmTypeID()).get(),
                     fixtureURL("c_pm"));
  EXPECT_FALSE(bare.loadPluginInterface()) << "a bare module has no kind to load";
  EXPECT_TRUE(calls_.lines().empty());
}

}  // namespace
