// Printer browser modules, proven by what the fixture browsers record of every
// entry called: which entries, in which order, with which arguments.
#include <gtest/gtest.h>

#include <cstdio>

#include "bundles/c_bridge.h"
#include "cache/module_cache.h"
#include "fixtures/fixture_support.h"
#include "hosts/pm_host.h"
#include "modules/module_factory.h"
#include "modules/pbm_module.h"

using namespace qr;
using qr::test::CapturedLog;
using qr::test::fixtureBundle;
using qr::test::FixtureCalls;
using qr::test::fixtureURL;

namespace {

template <class P>
std::string text(P* pointer) {
  char buffer[32];
  std::snprintf(buffer, sizeof buffer, "%p", reinterpret_cast<const void*>(pointer));
  return buffer;
}

int32_t clientSync(void*) { return 0; }
int32_t clientSelStatus(void*, bool) { return 0; }
int gOtherLookupCalls = 0;
int32_t otherLookup(void*, uint32_t, QrDictionaryRef*) { return ++gOtherLookupCalls, 0; }

void* const kPane = reinterpret_cast<void*>(0xabc0);
void* const kRefCon = reinterpret_cast<void*>(0x7770);
// The context every fixture's Prologue stores (0x5157).
constexpr const char* kContext = "context=20823";

class PBMModules : public ::testing::Test {
 protected:
  void SetUp() override {
    QuarrinModuleCache::defaultCache().setCacheDict(make<MutableDictionary>());
  }

  static Ref<PBMModule> browser(std::string_view name) {
    return QuarrinModuleFactory::PBMModuleForURL(fixtureURL(name).get());
  }
  // A printer module host holding c_pm, which has two "USB" entries and none
  // for other wired types.
  static Ref<PMHost> usbHost() {
    auto host = make<PMHost>();
    auto url = fixtureURL("c_pm");
    host->addPlugin(QuarrinModuleFactory::PMModuleForURL(url.get()), url.get());
    return host;
  }
  // What the fixture recorded, its name taken off; the interface load
  // (create, QueryInterface, Release) left out unless asked for.
  std::vector<std::string> entries(std::string_view fixture, bool withLoad = false,
                                   const FixtureCalls* calls = nullptr) const {
    std::vector<std::string> out;
    std::string prefix = std::string(fixture) + " ";
    for (const auto& line : (calls ? calls : &calls_)->lines()) {
      if (line.rfind(prefix, 0) != 0) continue;
      std::string entry = line.substr(prefix.size());
      bool load = entry.rfind("create ", 0) == 0 || entry.rfind("QueryInterface ", 0) == 0 ||
                  entry.rfind("Release ", 0) == 0;
      if (withLoad || !load) out.push_back(entry);
    }
    return out;
  }
  static int32_t fullOpen(PBMModule& module, const char* type, PMHost* host, uint32_t flags = 3,
                          PMPrBrowserGetLookupSpecProc lookup = nullptr,
                          PMPrBrowserSyncRequestProc sync = clientSync) {
    QrStringRef title = nullptr;
    return module.loadPluginInterface(String::make(type).get(), host, kRefCon, flags, lookup, sync,
                                      clientSelStatus, kPane, &title);
  }
  size_t logged(const std::string& text) const {
    size_t n = 0;
    for (const auto& line : log_.lines()) n += line.find(text) != std::string::npos;
    return n;
  }

  FixtureCalls calls_;
  CapturedLog log_;
};

TEST_F(PBMModules, TheTitleOnlyOpenCallsPrologueAloneWithFlagsOne) {
  auto host = usbHost();
  auto module = browser("c_pbm");
  QrStringRef title = nullptr;
  EXPECT_EQ(module->loadPluginInterface(String::make("USB").get(), host.get(), kRefCon,
                                        kPBMTitleOnlyFlags, nullptr, clientSync, clientSelStatus,
                                        kPane, &title),
            0);
  const std::vector<std::string> prologueOnly = {"Prologue flags=1"};
  EXPECT_EQ(entries("c_pbm"), prologueOnly);
  ASSERT_TRUE(fromCAs<String>(title));
  EXPECT_TRUE(fromCAs<String>(title)->equals("Fixture Browser"));
  EXPECT_FALSE(module->browserCallbacks());
  EXPECT_EQ(calls_.count("c_pm"), 0u) << "no lookup list is asked for";
  EXPECT_TRUE(module->connectionType()->equals("USB") && module->pmHost() == host.get());

  auto failing = browser("pbm_prologue_fails");
  EXPECT_EQ(failing->loadPluginInterface(nullptr, nullptr, nullptr, kPBMTitleOnlyFlags, nullptr,
                                         nullptr, nullptr, nullptr, &title),
            -5);
  EXPECT_EQ(entries("pbm_prologue_fails"), prologueOnly);
}

TEST_F(PBMModules, AFullOpenWithoutLookupSpecsLoadsButCallsNoEntry) {
  auto empty = make<PMHost>(), host = usbHost();
  for (auto [pmHost, type] : {std::pair{empty.get(), "USB"}, std::pair{(PMHost*)nullptr, "USB"},
                              std::pair{host.get(), "FireWire"}}) {
    FixtureCalls calls;
    auto module = browser("c_pbm");
    EXPECT_EQ(fullOpen(*module, type, pmHost), kPBMNoLookupSpecs) << type;
    EXPECT_EQ(entries("c_pbm", true, &calls).size(), 3u) << "create, query, release: " << type;
    EXPECT_EQ(entries("c_pbm", false, &calls).size(), 0u) << type;
    EXPECT_TRUE(module->connectionType()->equals(type)) << "stored before the list is asked";
    EXPECT_FALSE(module->browserCallbacks());
  }
}

TEST_F(PBMModules, AFullOpenHandsTheLookupSpecsThroughOneRecordKeptForLaterOpens) {
  auto host = usbHost();
  auto module = browser("c_pbm");
  ASSERT_EQ(fullOpen(*module, "USB", host.get()), 0);
  const PMPrBrowserCallbacks* record = module->browserCallbacks();
  ASSERT_TRUE(record);
  std::vector<std::string> initialized = {
      std::string("Initialize ") + kContext + " refCon=" + text(module.get()) + " callbacks=" +
          text(record) + " version=1 getLookupSpec=" + text(&PBMModule::defaultGetLookupSpec) +
          " syncRequest=" + text(&clientSync) + " selStatus=" + text(&clientSelStatus) +
          " userPane=" + text(kPane) + " numLookupSpecs=2",
      "lookupSpec index=0 status=0 connectionType=USB count=4",
      "lookupSpec index=1 status=0 connectionType=USB count=4"};
  std::vector<std::string> expected = {"Prologue flags=3"};
  expected.insert(expected.end(), initialized.begin(), initialized.end());
  EXPECT_EQ(entries("c_pbm"), expected);

  // A second open brings other functions; the first record serves unchanged.
  ASSERT_EQ(fullOpen(*module, "USB", host.get(), 7, otherLookup, nullptr), 0);
  expected.push_back("Prologue flags=7");
  expected.insert(expected.end(), initialized.begin(), initialized.end());
  EXPECT_EQ(entries("c_pbm"), expected);
  EXPECT_EQ(gOtherLookupCalls, 0);
  EXPECT_EQ(calls_.count("c_pbm create"), 1u) << "the interface is loaded once";
}

TEST_F(PBMModules, TheLookupSpecFunctionReportsEveryFailureByItsStatus) {
  auto host = usbHost();
  auto module = browser("c_pbm");
  ASSERT_EQ(fullOpen(*module, "USB", host.get()), 0);
  LookupInfoList* list = host->GetLookupInfoList(*String::make("USB"));
  auto* const untouched = reinterpret_cast<QrDictionaryRef>(&list);
  QrDictionaryRef result;
  auto lookup = [&](void* refCon, uint32_t index) {
    result = untouched;
    return PBMModule::defaultGetLookupSpec(refCon, index, &result);
  };

  ASSERT_EQ(lookup(module.get(), 0), 0);
  Ref<Dictionary> copied = adoptFromC<Dictionary>(result);
  ASSERT_TRUE(copied);
  EXPECT_FALSE(cast<MutableDictionary>(copied)) << "the plug-in gets an immutable copy";
  EXPECT_NE(copied.get(), list->getItemAtIndex(0)->lookupInfo());
  EXPECT_TRUE(copied->getAs<String>("connectionType")->equals("USB"));
  EXPECT_EQ(copied->get("PrBrowser Lookup Reference"), list->getItemAtIndex(0));
  EXPECT_TRUE(copied->getAs<String>("Printer Browser Kind")->equals("Fixture Laser 1"));

  EXPECT_EQ(lookup(module.get(), 2), kPBMBadIndex);
  EXPECT_FALSE(result);
  EXPECT_EQ(PBMModule::defaultGetLookupSpec(module.get(), 0, nullptr), kPBMParamErr);
  for (void* bad : {static_cast<void*>(nullptr), reinterpret_cast<void*>(UINTPTR_MAX)}) {
    EXPECT_EQ(lookup(bad, 0), kPBMNotLoaded);
    EXPECT_EQ(result, untouched) << "a bad reference value leaves the result alone";
  }
  list->getItemAtIndex(1)->setLookupInfo(nullptr);  // nothing left to copy
  EXPECT_EQ(lookup(module.get(), 1), kPBMNoList);
  EXPECT_FALSE(result);
  module->setConnectionType(nullptr);
  EXPECT_EQ(lookup(module.get(), 0), kPBMNoConnectionType);
  EXPECT_FALSE(result);

  auto hostless = browser("c_pbm");
  QrStringRef title = nullptr;
  ASSERT_EQ(
      hostless->loadPluginInterface(String::make("USB").get(), nullptr, nullptr, kPBMTitleOnlyFlags,
                                    nullptr, nullptr, nullptr, nullptr, &title),
      0);
  EXPECT_EQ(lookup(hostless.get(), 0), kPBMNoHost);
  EXPECT_FALSE(result);
}

TEST_F(PBMModules, AFailedPrologueOrAMissingInitializeStopsTheOpen) {
  auto host = usbHost();
  auto failing = browser("pbm_prologue_fails");
  EXPECT_EQ(fullOpen(*failing, "USB", host.get()), -5);
  EXPECT_EQ(entries("pbm_prologue_fails"), std::vector<std::string>{"Prologue flags=3"});
  EXPECT_FALSE(failing->browserCallbacks()) << "no record without a successful Prologue";

  auto noInit = browser("pbm_no_initialize");
  EXPECT_EQ(fullOpen(*noInit, "USB", host.get()), kPBMNotLoaded);
  EXPECT_EQ(entries("pbm_no_initialize"), std::vector<std::string>{"Prologue flags=3"});
  char message[96];
  std::snprintf(message, sizeof message,
                "pbmInterface: 0x%08x && pbmInterface->initialize:0x00000000",
                static_cast<unsigned>(reinterpret_cast<uintptr_t>(noInit->pluginInterface())));
  EXPECT_EQ(logged(message), 1u);
}

TEST_F(PBMModules, ForwardingNeedsALoadedInterfaceAndPassesTheContext) {
  auto unloaded = browser("c_pbm");
  auto broken = browser("pbm_by_connection");  // declares a browser but has no code
  QrStringRef title = nullptr;
  EXPECT_EQ(
      broken->loadPluginInterface(String::make("Serial").get(), nullptr, kRefCon,
                                  kPBMTitleOnlyFlags, nullptr, nullptr, nullptr, nullptr, &title),
      kPBMNotLoaded);
  EXPECT_FALSE(broken->connectionType()) << "nothing is stored when the load fails";
  for (PBMModule* module : {unloaded.get(), broken.get()}) {
    uint32_t size[4];
    QrArrayRef printers = nullptr;
    EXPECT_EQ(module->Sync(), kPBMNotLoaded);
    EXPECT_EQ(module->GetSelectedPrinters(&printers), kPBMNotLoaded);
    EXPECT_EQ(module->Terminate(0), kPBMNotLoaded);
    EXPECT_EQ(module->Prologue(1, &title, &size[0], &size[1], &size[2], &size[3]), kPBMNotLoaded);
    EXPECT_EQ(module->Initialize(module, nullptr, nullptr, 0), kPBMNotLoaded);
    int16_t rect[4] = {0, 0, 10, 10};
    EXPECT_EQ(module->Resize(rect), 0);
    EXPECT_EQ(module->WorksetPrinters(nullptr), 0);
    EXPECT_FALSE(printers);
  }
  EXPECT_FALSE(unloaded->interfaceLoaded()) << "forwarding never loads";
  EXPECT_TRUE(calls_.lines().empty());
  EXPECT_EQ(logged("pbmInterface:"), 0u) << "an unloaded interface is not a missing entry";

  ASSERT_EQ(unloaded->loadPluginInterface(nullptr, nullptr, nullptr, kPBMTitleOnlyFlags, nullptr,
                                          nullptr, nullptr, nullptr, &title),
            0);
  QrArrayRef printers = nullptr;
  EXPECT_EQ(unloaded->Sync(), 0);
  EXPECT_EQ(unloaded->GetSelectedPrinters(&printers), 0);
  EXPECT_EQ(unloaded->Terminate(-7), 0);
  std::vector<std::string> expected = {"Prologue flags=1", std::string("Sync ") + kContext,
                                       std::string("GetSelectedPrinters ") + kContext,
                                       std::string("Terminate ") + kContext + " status=-7"};
  EXPECT_EQ(entries("c_pbm"), expected);
  Ref<Array> selected = adoptFromC<Array>(printers);
  ASSERT_TRUE(selected);
  EXPECT_TRUE(cast<String>(selected->at(0))->equals("c_pbm"));
}

TEST_F(PBMModules, ARaisingEntryIsLoggedAndReportedAsNotLoaded) {
  auto host = usbHost();
  auto module = browser("pbm_raises");
  std::string url = fixtureURL("pbm_raises")->absoluteString();
  EXPECT_EQ(fullOpen(*module, "USB", host.get()), kPBMNotLoaded);
  EXPECT_FALSE(module->browserCallbacks()) << "a raising Prologue is a failed Prologue";
  EXPECT_EQ(module->Sync(), kPBMNotLoaded);
  EXPECT_EQ(module->Initialize(module.get(), nullptr, nullptr, 0), kPBMNotLoaded);
  std::vector<std::string> expected = {"Prologue flags=3", std::string("Sync ") + kContext};
  auto called = entries("pbm_raises");
  ASSERT_EQ(called.size(), 3u);
  EXPECT_EQ(std::vector<std::string>(called.begin(), called.begin() + 2), expected);
  EXPECT_EQ(called[2].rfind("Initialize ", 0), 0u);
  for (const char* entry : {"Prologue", "Sync", "Initialize"})
    EXPECT_EQ(logged(std::string("[FixtureError] on call to '") + entry + "' for '" + url + "'"),
              1u)
        << entry;
}

}  // namespace
