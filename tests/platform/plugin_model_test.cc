#include "platform/plugin_model.h"

#include <gtest/gtest.h>
#include <quarrin/plugin.h>
#include <stdlib.h>

#include <cstring>
#include <filesystem>
#include <stdexcept>

#include "fixtures/fixture_support.h"
#include "platform/c_bridge.h"
#include "platform/exception.h"
#include "platform/file_io.h"
#include "platform/string.h"

using namespace qr;
using qr::test::CapturedLog;
using qr::test::fixtureBundle;
using qr::test::FixtureCalls;

namespace {

Ref<UUID> uuid(const char* text) { return UUID::fromString(text); }

Ref<PlugIn> openFixture(const char* name) {
  return PlugIn::create(*URL::fileURL(fixtureBundle(name), true));
}

std::vector<std::string> uuidStrings(const Ref<Array>& array) {
  std::vector<std::string> out;
  for (const auto& item : *array) out.push_back(cast<UUID>(item.get())->string());
  return out;
}

bool mentions(const std::string& line, const char* text) {
  return line.find(text) != std::string::npos;
}

// Calls slot 1 of the instance's table the way a module host does.
int32_t queryInterface(void* instance, const char* interfaceID, void** out) {
  auto* table = *static_cast<const QrIUnknownVTbl**>(instance);
  QrUUIDBytes iid;
  std::memcpy(iid.bytes, uuid(interfaceID)->bytes().data(), 16);
  return table->QueryInterface(instance, iid, out);
}

uint32_t release(void* instance) {
  return (*static_cast<const QrIUnknownVTbl**>(instance))->Release(instance);
}

Ref<String> lentString(QrStringRef s) { return Ref<String>(fromCAs<String>(s)); }

}  // namespace

TEST(PlugInDeclarations, FactoriesComeInThePlugInsOrderAndSkipMalformedOnes) {
  auto plugin = openFixture("c_declarations");
  ASSERT_TRUE(plugin);
  EXPECT_EQ(uuidStrings(plugin->factoriesForType(*uuid(QR_PM_TYPE_ID))),
            (std::vector<std::string>{FIXTURE_FACTORY_B, FIXTURE_FACTORY_A}));
  // The type key is written in lower case in this bundle.
  EXPECT_EQ(uuidStrings(plugin->factoriesForType(*uuid(QR_IOM_TYPE_ID))),
            (std::vector<std::string>{FIXTURE_FACTORY_A}));
  EXPECT_EQ(uuidStrings(plugin->factoriesForType(*uuid(FIXTURE_TYPE_OTHER))),
            (std::vector<std::string>{FIXTURE_FACTORY_C, FIXTURE_FACTORY_UNDECLARED}));

  auto none = plugin->factoriesForType(*uuid(QR_PBM_TYPE_ID));
  ASSERT_TRUE(none) << "a declared type with an empty list is not an undeclared one";
  EXPECT_EQ(none->count(), 0u);
  EXPECT_FALSE(plugin->factoriesForType(*uuid(QR_PBM_VERSION_ID)));
}

TEST(PlugInDeclarations, DirectoriesWithoutAReadableInfoDictionaryAreNoPlugIns) {
  auto dir =
      std::filesystem::temp_directory_path() / ("quarrin-not-a-plugin-" + std::to_string(getpid()));
  std::filesystem::create_directories(dir / "Contents");
  EXPECT_FALSE(PlugIn::create(*URL::fileURL(dir.string(), true)));
  ASSERT_TRUE(writeFile((dir / "Contents/Info.plist").string(), "<plist><dict><key>"));
  EXPECT_FALSE(PlugIn::create(*URL::fileURL(dir.string(), true)));
  std::filesystem::remove_all(dir);
  EXPECT_FALSE(PlugIn::create(*URL::fileURL(dir.string(), true)));
}

TEST(PlugInInstances, CInstanceOffersItsInterfaceThroughTheLayout) {
  FixtureCalls calls;
  auto plugin = openFixture("c_iom");
  ASSERT_TRUE(plugin);
  void* instance = plugin->createInstance(*uuid(FIXTURE_FACTORY_A), *uuid(QR_IOM_TYPE_ID));
  ASSERT_TRUE(instance);

  void* interface = reinterpret_cast<void*>(1);
  EXPECT_EQ(queryInterface(instance, QR_PM_INTERFACE_ID, &interface), QR_E_NOINTERFACE);
  EXPECT_EQ(interface, nullptr);
  ASSERT_EQ(queryInterface(instance, QR_IOM_INTERFACE_ID, &interface), QR_S_OK);
  ASSERT_TRUE(interface);

  auto* table = *static_cast<const QrIOModuleVTbl**>(interface);
  QrStringRef type = nullptr, path = nullptr;
  EXPECT_EQ(table->GetConnectionInfo(&type, &path), 0);
  EXPECT_EQ(lentString(type)->utf8(), "USB");
  EXPECT_EQ(lentString(path)->utf8(), "../USBBrowser.plugin");
  EXPECT_EQ(release(instance), 1u) << "the interface keeps the instance";

  EXPECT_EQ(calls.count("c_iom create factory=FixtureFactory type=" QR_IOM_TYPE_ID), 1u);
  EXPECT_EQ(calls.count("c_iom QueryInterface"), 2u);
  EXPECT_EQ(calls.count("c_iom Release"), 1u);
}

TEST(PlugInInstances, EachFactoryUUIDReachesItsOwnFunction) {
  FixtureCalls calls;
  auto plugin = openFixture("c_declarations");
  ASSERT_TRUE(plugin);
  auto pm = uuid(QR_PM_TYPE_ID);
  void* first = plugin->createInstance(*uuid(FIXTURE_FACTORY_B), *pm);
  void* second = plugin->createInstance(*uuid(FIXTURE_FACTORY_A), *pm);
  ASSERT_TRUE(first && second);
  EXPECT_NE(first, second);
  EXPECT_EQ(release(first), 0u);
  EXPECT_EQ(release(second), 0u);
  auto lines = calls.lines();
  ASSERT_GE(lines.size(), 2u);
  EXPECT_EQ(lines[0], "c_declarations create factory=FixtureOtherFactory type=" QR_PM_TYPE_ID);
  EXPECT_EQ(lines[1], "c_declarations create factory=FixtureFactory type=" QR_PM_TYPE_ID);
}

TEST(PlugInInstances, CxxInstanceWorksAlike) {
  FixtureCalls calls;
  auto plugin = openFixture("cxx_iom");
  ASSERT_TRUE(plugin);
  void* instance = plugin->createInstance(*uuid(FIXTURE_FACTORY_A), *uuid(QR_IOM_TYPE_ID));
  ASSERT_TRUE(instance);
  void* interface = nullptr;
  ASSERT_EQ(queryInterface(instance, QR_IOM_INTERFACE_ID, &interface), QR_S_OK);
  QrStringRef type = nullptr;
  EXPECT_EQ((*static_cast<const QrIOModuleVTbl**>(interface))->GetConnectionInfo(&type, nullptr),
            0);
  EXPECT_EQ(lentString(type)->utf8(), "CXX");
  EXPECT_EQ(release(instance), 0u);
  EXPECT_EQ(calls.count("cxx_iom Release refs=0"), 1u);
}

TEST(PlugInFailures, FactoryReturningNullGivesNullAndOneLogLine) {
  FixtureCalls calls;
  CapturedLog log;
  auto plugin = openFixture("c_factory_null");
  ASSERT_TRUE(plugin);
  EXPECT_EQ(plugin->createInstance(*uuid(FIXTURE_FACTORY_A), *uuid(QR_IOM_TYPE_ID)), nullptr);
  EXPECT_EQ(calls.count("c_factory_null create"), 1u);
  ASSERT_EQ(log.lines().size(), 1u);
  EXPECT_TRUE(mentions(log.lines()[0], "c_factory_null.plugin"));
  EXPECT_TRUE(mentions(log.lines()[0], "FixtureFactory"));
}

TEST(PlugInFailures, MissingOrBrokenSharedObjectIsLoggedOnceForEveryAttempt) {
  for (const char* name : {"no_executable", "broken_executable"}) {
    CapturedLog log;
    auto plugin = openFixture(name);
    ASSERT_TRUE(plugin) << name;
    for (int attempt = 0; attempt < 3; ++attempt)
      EXPECT_EQ(plugin->createInstance(*uuid(FIXTURE_FACTORY_A), *uuid(QR_IOM_TYPE_ID)), nullptr);
    ASSERT_EQ(log.lines().size(), 1u) << name;
    EXPECT_TRUE(mentions(log.lines()[0], name)) << log.lines()[0];
  }
}

TEST(PlugInFailures, MissingFunctionAndUndeclaredFactoriesGiveNullAndOneLineEach) {
  FixtureCalls calls;
  auto plugin = openFixture("c_declarations");
  ASSERT_TRUE(plugin);
  auto other = uuid(FIXTURE_TYPE_OTHER);
  struct Case {
    const char* factory;
    const Ref<UUID>& type;
    const char* logged;
  } cases[] = {
      {FIXTURE_FACTORY_C, other, "NoSuchFunction"},
      {FIXTURE_FACTORY_UNDECLARED, other, FIXTURE_FACTORY_UNDECLARED},
      // Declared, but not for this type.
      {FIXTURE_FACTORY_A, other, FIXTURE_TYPE_OTHER},
  };
  for (const Case& c : cases) {
    CapturedLog log;
    EXPECT_EQ(plugin->createInstance(*uuid(c.factory), *c.type), nullptr) << c.factory;
    ASSERT_EQ(log.lines().size(), 1u) << c.factory;
    EXPECT_TRUE(mentions(log.lines()[0], c.logged)) << log.lines()[0];
  }
  EXPECT_EQ(calls.count("c_declarations create"), 0u);
}

TEST(PlugInFailures, QrRaiseCrossesCFramesAsThePlatformException) {
  auto plugin = openFixture("c_factory_raises");
  ASSERT_TRUE(plugin);
  try {
    plugin->createInstance(*uuid(FIXTURE_FACTORY_A), *uuid(QR_IOM_TYPE_ID));
    FAIL() << "the factory's QrRaise did not arrive";
  } catch (const qr::Exception& e) {
    EXPECT_EQ(e.name(), "FixtureError");
    EXPECT_EQ(e.reason(), "FixtureFactory of c_factory_raises");
  }
}

TEST(PlugInFailures, OtherCxxExceptionsPassThroughUnchanged) {
  auto plugin = openFixture("cxx_factory_throws");
  ASSERT_TRUE(plugin);
  try {
    plugin->createInstance(*uuid(FIXTURE_FACTORY_A), *uuid(QR_IOM_TYPE_ID));
    FAIL() << "nothing was thrown";
  } catch (const qr::Exception&) {
    FAIL() << "a std::runtime_error arrived as the platform exception";
  } catch (const std::runtime_error& e) {
    EXPECT_STREQ(e.what(), "factory of cxx_factory_throws");
  }
}
