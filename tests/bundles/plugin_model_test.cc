#include "bundles/plugin_model.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <quarrin/plugin.h>

#include <stdexcept>

#include "bundles/c_bridge.h"
#include "fixtures/fixture_support.h"
#include "support/plugin_instance.h"
#include "support/temp_dir.h"
#include "values/exception.h"
#include "values/string.h"

using namespace qr;
using qr::test::CapturedLog;
using qr::test::fixtureBundle;
using qr::test::FixtureCalls;
using ::testing::Contains;
using ::testing::HasSubstr;

namespace {

Ref<UUID> uuid(const char* text) { return UUID::fromString(text); }

Ref<PlugIn> openFixture(const char* name) {
  return PlugIn::create(*URL::fileURL(fixtureBundle(name), true));
}

std::vector<std::string> factoriesOf(PlugIn& plugin, const char* type) {
  std::vector<std::string> out;
  auto factories = plugin.factoriesForType(*uuid(type));
  for (const auto& item : *factories) out.push_back(cast<UUID>(item.get())->string());
  return out;
}

}  // namespace

TEST(PlugInDeclarations, FactoriesComeInThePlugInsOrderAndSkipMalformedOnes) {
  auto plugin = openFixture("c_declarations");
  ASSERT_TRUE(plugin);
  using V = std::vector<std::string>;
  EXPECT_EQ(factoriesOf(*plugin, QR_PM_TYPE_ID), (V{FIXTURE_FACTORY_B, FIXTURE_FACTORY_A}));
  EXPECT_EQ(factoriesOf(*plugin, QR_IOM_TYPE_ID), V{FIXTURE_FACTORY_A}) << "key in lower case";
  EXPECT_EQ(factoriesOf(*plugin, FIXTURE_TYPE_OTHER),
            (V{FIXTURE_FACTORY_C, FIXTURE_FACTORY_UNDECLARED}));
  ASSERT_TRUE(plugin->factoriesForType(*uuid(QR_PBM_TYPE_ID)))
      << "a declared type with an empty list is not an undeclared one";
  EXPECT_EQ(factoriesOf(*plugin, QR_PBM_TYPE_ID), V{});
  EXPECT_FALSE(plugin->factoriesForType(*uuid(QR_PBM_VERSION_ID)));
}

TEST(PlugInDeclarations, DirectoriesWithoutAReadableInfoDictionaryAreNoPlugIns) {
  qrtest::TempDir dir;
  auto create = [&] { return PlugIn::create(*URL::fileURL(dir / "P.plugin", true)); };
  EXPECT_FALSE(create()) << "no directory";
  std::filesystem::create_directories(dir / "P.plugin/Contents");
  EXPECT_FALSE(create()) << "no Info dictionary";
  dir.write("P.plugin/Contents/Info.plist", "<plist><dict><key>");
  EXPECT_FALSE(create()) << "a broken one";
}

TEST(PlugInInstances, CAndCxxInstancesOfferTheirInterfaceThroughTheLayout) {
  struct {
    const char* fixture;
    const char* connectionType;
    const char* pbmPath;
    uint32_t refsLeft;  // the C instance's QueryInterface adds a reference; the C++ one's not
  } cases[] = {{"c_iom", "USB", "../USBBrowser.plugin", 1}, {"cxx_iom", "CXX", "(null)", 0}};
  for (const auto& c : cases) {
    SCOPED_TRACE(c.fixture);
    FixtureCalls calls;
    void* instance =
        qrtest::createInstance(fixtureBundle(c.fixture), FIXTURE_FACTORY_A, QR_IOM_TYPE_ID);
    ASSERT_TRUE(instance);
    void* interface = reinterpret_cast<void*>(1);
    EXPECT_EQ(qrtest::queryInterface(instance, QR_PM_INTERFACE_ID, &interface), QR_E_NOINTERFACE);
    EXPECT_EQ(interface, nullptr);
    ASSERT_EQ(qrtest::queryInterface(instance, QR_IOM_INTERFACE_ID, &interface), QR_S_OK);
    ASSERT_TRUE(interface);

    QrStringRef type = nullptr, path = nullptr;
    EXPECT_EQ((*static_cast<const QrIOModuleVTbl**>(interface))->GetConnectionInfo(&type, &path),
              0);
    EXPECT_EQ(describe(fromCAs<String>(type)), c.connectionType);
    EXPECT_EQ(describe(fromCAs<String>(path)), c.pbmPath);
    EXPECT_EQ(qrtest::release(instance), c.refsLeft);
    EXPECT_EQ(calls.count(std::string(c.fixture) + " QueryInterface"), 2u);
    EXPECT_EQ(calls.count(std::string(c.fixture) + " Release"), 1u);
  }
}

TEST(PlugInInstances, EachFactoryUUIDReachesItsOwnFunction) {
  FixtureCalls calls;
  auto bundle = fixtureBundle("c_declarations");
  void* first = qrtest::createInstance(bundle, FIXTURE_FACTORY_B, QR_PM_TYPE_ID);
  void* second = qrtest::createInstance(bundle, FIXTURE_FACTORY_A, QR_PM_TYPE_ID);
  ASSERT_TRUE(first && second);
  EXPECT_NE(first, second);
  EXPECT_EQ(qrtest::release(first), 0u);
  EXPECT_EQ(qrtest::release(second), 0u);
  EXPECT_THAT(calls.lines(),
              ::testing::ElementsAre(
                  "c_declarations create factory=FixtureOtherFactory type=" QR_PM_TYPE_ID,
                  "c_declarations create factory=FixtureFactory type=" QR_PM_TYPE_ID,
                  "c_declarations Release refs=0", "c_declarations Release refs=0"));
}

TEST(PlugInFailures, NoInstanceAndOneLogLineForEachWayOfFailing) {
  FixtureCalls calls;
  struct {
    const char* fixture;
    const char* factory;
    const char* type;
    int attempts;                     // a shared object that cannot be loaded is reported only once
    std::vector<const char*> logged;  // what the one line names
  } cases[] = {
      {"c_factory_null",
       FIXTURE_FACTORY_A,
       QR_IOM_TYPE_ID,
       1,
       {"c_factory_null.plugin", "FixtureFactory"}},
      {"no_executable", FIXTURE_FACTORY_A, QR_IOM_TYPE_ID, 3, {"no_executable"}},
      {"broken_executable", FIXTURE_FACTORY_A, QR_IOM_TYPE_ID, 3, {"broken_executable"}},
      {"c_declarations", FIXTURE_FACTORY_C, FIXTURE_TYPE_OTHER, 1, {"NoSuchFunction"}},
      {"c_declarations",
       FIXTURE_FACTORY_UNDECLARED,
       FIXTURE_TYPE_OTHER,
       1,
       {FIXTURE_FACTORY_UNDECLARED}},
      // Declared, but not for this type.
      {"c_declarations", FIXTURE_FACTORY_A, FIXTURE_TYPE_OTHER, 1, {FIXTURE_TYPE_OTHER}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(std::string(c.fixture) + " " + c.factory);
    CapturedLog log;
    auto plugin = openFixture(c.fixture);
    ASSERT_TRUE(plugin);
    for (int attempt = 0; attempt < c.attempts; ++attempt)
      EXPECT_EQ(plugin->createInstance(*uuid(c.factory), *uuid(c.type)), nullptr);
    EXPECT_EQ(log.lines().size(), 1u);
    for (const char* text : c.logged) EXPECT_THAT(log.lines(), Contains(HasSubstr(text)));
  }
  EXPECT_EQ(calls.count("c_factory_null create"), 1u);
  EXPECT_EQ(calls.count("c_declarations create"), 0u);
}

TEST(PlugInFailures, QrRaiseArrivesAsThePlatformExceptionOtherExceptionsUnchanged) {
  try {
    qrtest::createInstance(fixtureBundle("c_factory_raises"), FIXTURE_FACTORY_A, QR_IOM_TYPE_ID);
    ADD_FAILURE() << "the factory's QrRaise did not arrive";
  } catch (const qr::Exception& e) {
    EXPECT_EQ(e.name(), "FixtureError");
    EXPECT_EQ(e.reason(), "FixtureFactory of c_factory_raises");
  }
  try {
    qrtest::createInstance(fixtureBundle("cxx_factory_throws"), FIXTURE_FACTORY_A, QR_IOM_TYPE_ID);
    ADD_FAILURE() << "nothing was thrown";
  } catch (const qr::Exception&) {
    ADD_FAILURE() << "a std::runtime_error arrived as the platform exception";
  } catch (const std::runtime_error& e) {
    EXPECT_STREQ(e.what(), "factory of cxx_factory_throws");
  }
}
