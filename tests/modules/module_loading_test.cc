// The module factory, interface loading, and the I/O, printer and browser
// modules, proven by what the fixture plug-ins record of every call made into
// them: which entries, in which order, with which arguments.
#include <gtest/gtest.h>

#include <cstdio>
#include <stdexcept>
#include <tuple>

#include "bundles/c_bridge.h"
#include "fixtures/fixture_support.h"
#include "hosts/pm_host.h"
#include "modules/io_module.h"
#include "modules/pbm_module.h"

using namespace qr;
using namespace qr::test;
using Factory = QuarrinModuleFactory;

namespace {

using Modules = FixtureTest;

std::string kindOf(const Ref<QuarrinModule>& m) {
  return cast<IOModule>(m) ? "io" : cast<PMModule>(m) ? "pm" : cast<PBMModule>(m) ? "pbm" : "-";
}

TEST_F(Modules, ABundleBecomesTheFirstKindItDeclaresAFactoryFor) {
  // What pluginForURL makes, then what the I/O, printer and browser lookups make.
  auto kinds = [](const char* fixture) {
    auto url = fixtureURL(fixture);
    return kindOf(Factory::pluginForURL(url.get())) + " " +
           kindOf(Factory::IOMModuleForURL(url.get())) + " " +
           kindOf(Factory::PMModuleForURL(url.get())) + " " +
           kindOf(Factory::PBMModuleForURL(url.get()));
  };
  // I/O under a lower-case key, printer with B first, browser with no factory.
  EXPECT_EQ(kinds("c_declarations"), "io io pm -");
  EXPECT_EQ(kinds("m_no_kind"), "- - - -") << "only the browser version type";
  EXPECT_EQ(Factory::PMModuleForURL(fixtureURL("c_declarations").get())->factoryID()->string(),
            FIXTURE_FACTORY_B);
  EXPECT_FALSE(Factory::pluginForURL(nullptr));
  EXPECT_FALSE(Factory::pluginForPath(QUARRIN_SOURCE_DIR)) << "no plug-in";
  EXPECT_EQ(kindOf(Factory::pluginForPath(fixtureBundle("c_iom").c_str())), "io");
  EXPECT_TRUE(calls_.lines().empty()) << "classifying a bundle runs none of its code";
}

TEST_F(Modules, EachLoadCreatesQueriesAndReleasesAtMostOnceAndCountsAFailureOnce) {
  // Fixture, whether it loads, the one line logged (a raise, or the query's
  // result), instances created and released.
  std::tuple<const char*, bool, const char*, size_t, size_t> cases[] = {
      {"c_iom", true, nullptr, 1, 1},
      {"c_pm", true, nullptr, 1, 1},
      {"c_pbm", true, nullptr, 1, 1},
      {"m_qi_noiface", false, "code:4 facility:0 severity:1", 1, 1},
      {"m_qi_facility", false, "code:14 facility:7 severity:1", 1, 1},
      {"m_qi_high_bits", false, "code:14 facility:7 severity:1", 1, 1},
      {"m_qi_null", false, nullptr, 1, 1},
      {"m_qi_raises", false, "[FixtureError] creating an interface", 1, 1},  // once stored
      {"c_factory_null", false, nullptr, 1, 0},
      {"c_factory_raises", false, "[FixtureError] creating an interface", 1, 0},
      {"no_executable", false, nullptr, 0, 0},
      {"broken_executable", false, nullptr, 0, 0},
  };
  for (auto [fixture, loads, logged, created, released] : cases) {
    SCOPED_TRACE(fixture);
    auto module = Factory::pluginForURL(fixtureURL(fixture).get());
    int failures = Factory::loadFailures();
    size_t told = log_.count("interface");
    EXPECT_EQ(module->loadPluginInterface(), loads);
    EXPECT_EQ(module->loadPluginInterface(), loads);
    EXPECT_EQ(Factory::loadFailures() - failures, loads ? 0 : 1);
    std::string name = std::string(fixture) + " ";
    EXPECT_EQ(calls_.count(name + "create"), created);
    EXPECT_EQ(calls_.count(name + "QueryInterface"), released) << "each instance queried";
    EXPECT_EQ(calls_.count(name + "Release"), released);
    EXPECT_EQ(log_.count("interface") - told, logged ? 1u : 0u);
    std::string last = log_.lines().empty() ? "" : log_.lines().back();
    EXPECT_TRUE(!logged || (last.find(logged) != last.npos && last.find(fixture) != last.npos))
        << last;
  }
  auto throws = Factory::pluginForURL(fixtureURL("cxx_factory_throws").get());
  EXPECT_THROW(throws->loadPluginInterface(), std::runtime_error) << "not the platform exception";
}

TEST_F(Modules, AnIOModuleRecordsThePlugInsAnswerWhenTheCallSucceedsAndAnswersFromIt) {
  // Fixture, browser path and type as three accesses see them, calls made, cache entry.
  std::tuple<const char*, const char*, size_t, const char*> cases[] = {
      {"c_iom", "../USBBrowser.plugin USB ../USBBrowser.plugin", 1,
       "{Bundle Version = 1.0; kIOMConnectionType = USB; kIOMBrowserPath = ../USBBrowser.plugin}"},
      // The entry answers the later access of the missing path.
      {"io_no_path", "(null) Serial (null)", 1,
       "{Bundle Version = 1.0; kIOMConnectionType = Serial}"},
      {"io_failing", "B.plugin USB B.plugin", 1, "(null)"},
      // It raised after naming the type: that is kept, and the path asked for again.
      {"io_raises", "(null) USB (null)", 2, "(null)"},
  };
  for (auto [fixture, answers, asked, recorded] : cases) {
    SCOPED_TRACE(fixture);
    std::string name = std::string(fixture) + " ";
    for (int run = 0; run < (std::string(recorded) == "(null)" ? 1 : 2); ++run) {
      auto io = Factory::IOMModuleForURL(fixtureURL(fixture).get());
      std::string seen = describe(io->pbmPath().get()) + " ";
      seen += describe(io->connectionType().get()) + " " + describe(io->pbmPath().get());
      EXPECT_EQ(seen, answers);
      EXPECT_EQ(describe(cache().cacheDictionary()->get(io->pluginURL()->absoluteString())),
                recorded);
      EXPECT_EQ(calls_.count(name + "GetConnectionInfo"), asked) << "a later run asks the entry";
      EXPECT_EQ(calls_.count(name + "create"), 1u);
    }
  }
  EXPECT_EQ(log_.count("[FixtureError] on call to 'GetConnectionInfo' for " + quoted("io_raises")),
            2u);
}

// The "Printer Browser Kind" of each entry, with "+<mark>" when it is borrowed.
std::string kinds(const Array* info) {
  std::string out;
  for (size_t i = 0; info && i < info->count(); ++i) {
    auto* entry = cast<Dictionary>(info->at(i));
    out += (i ? "," : "") + describe(entry->get("Printer Browser Kind"));
    if (auto* mark = entry->get("USBParasite")) out += "+" + describe(mark);
  }
  return out;
}

// "[<type>: <kinds>]" for each answer in the module's cache entry.
std::string recorded(const PMModule& pm) {
  auto* entry = cache().cacheDictionary()->getAs<Dictionary>(pm.pluginURL()->absoluteString());
  std::string out = entry ? "" : "(none)";
  if (entry)
    entry->forEach([&](const Object& key, const Object& value) {
      if (auto* info = cast<Array>(&value)) out += "[" + describe(&key) + ": " + kinds(info) + "]";
    });
  return out;
}

TEST_F(Modules, APrinterModuleAnswersEachConnectionTypeRecordsItAndAnswersAgainFromTheCache) {
  // Fixture, type asked, answer, the types the plug-in is asked in turn, cache entry.
  std::tuple<const char*, const char*, const char*, const char*, const char*> cases[] = {
      {"c_pm", "USB", "Fixture Laser 1,Fixture Laser 2", "USB",
       "[USB: Fixture Laser 1,Fixture Laser 2]"},
      // Either network discovery type stands for the other; both file as DNSSD.
      {"pm_dnssd", "DNSSD", "dnssd-own", "DNSSD", "[DNSSD: dnssd-own]"},
      {"pm_dnssd", "Quellnet", "dnssd-own", "Quellnet DNSSD", "[DNSSD: dnssd-own]"},
      {"pm_quellnet", "DNSSD", "quellnet-own", "DNSSD Quellnet", "[DNSSD: quellnet-own]"},
      {"pm_quellnet", "Quellnet", "quellnet-own", "Quellnet", "[DNSSD: quellnet-own]"},
      // Without an answer of their own they borrow the USB one, else EPSON USB's, marked.
      {"pm_usb_only", "DNSSD", "usb-1+True,usb-2+True", "DNSSD Quellnet USB",
       "[DNSSD: ][USB: usb-1,usb-2]"},
      {"pm_usb_only", "Quellnet", "usb-1+True,usb-2+True", "Quellnet DNSSD USB",
       "[DNSSD: ][USB: usb-1,usb-2]"},
      {"pm_epson_only", "DNSSD", "epson-1+True", "DNSSD Quellnet USB EPSON USB",
       "[DNSSD: ][USB: ][EPSON USB: epson-1]"},
      {"pm_serial", "Quellnet", "", "Quellnet DNSSD USB EPSON USB",
       "[DNSSD: ][USB: ][EPSON USB: ]"},
      {"pm_usb_only", "EPSON USB", "", "EPSON USB", "[EPSON USB: ]"},
      {"pm_raises", "USB", "", "USB", "[USB: ]"},  // what it handed out before raising is dropped
      {"m_qi_noiface", "USB", "", "", "(none)"},   // cannot load
  };
  for (auto [fixture, type, answer, asked, entry] : cases) {
    SCOPED_TRACE(std::string(fixture) + " " + type);
    cache().setCacheDict(make<MutableDictionary>());
    size_t from = calls_.lines().size();
    auto pm = Factory::PMModuleForURL(fixtureURL(fixture).get());
    auto info = pm->createBrowserInfoForConnectionType(*String::make(type));
    EXPECT_EQ(kinds(info.get()), answer);
    std::string types;
    for (const auto& call : calls_.of(fixture, from))
      types += (types.empty() ? "" : " ") + call.substr(call.find('=') + 1);
    EXPECT_EQ(types, asked);
    EXPECT_EQ(recorded(*pm), entry);
    if (std::string(entry) == "(none)") continue;

    // A later run answers the same from the cache alone.
    from = calls_.lines().size();
    auto again = Factory::PMModuleForURL(fixtureURL(fixture).get());
    EXPECT_EQ(kinds(again->createBrowserInfoForConnectionType(*String::make(type)).get()), answer);
    EXPECT_EQ(calls_.lines().size(), from);
  }
  EXPECT_EQ(log_.count("on call to"), 1u);
  EXPECT_EQ(log_.count("[FixtureError] on call to 'CreateBrowserInfo' for " + quoted("pm_raises")),
            1u);
}

Ref<MutableDictionary> entry(const char* kind, const char* info = nullptr,
                             const char* deviceID = nullptr) {
  auto d = make<MutableDictionary>();
  d->set("Printer Browser Kind", String::make(kind));
  if (info) d->set("Printer Browser Info", String::make(info));
  if (deviceID) d->set("Printer Browser DeviceID", String::make(deviceID));
  return d;
}

// An entry that refers to the full one under key, as lookup dictionaries do.
Ref<Dictionary> referring(const char* key, const Ref<MutableDictionary>& to) {
  auto d = make<MutableDictionary>();
  d->set(key, make<LookupInfoItem>(nullptr, to.get()));
  return d;
}

TEST_F(Modules, AnIconIsTheEntrysOwnElseThatOfTheFirstAnswerWithTheSameKindInfoAndDeviceID) {
  auto carrying = entry("bare");
  carrying->set("Printer Browser Icons", Data::copy(std::string_view("own")));
  std::tuple<const char*, const char*, Ref<Dictionary>, const char*> cases[] = {
      {"pm_icon", "USB", carrying, "own"},
      {"m_qi_noiface", "USB", entry("with-file"), "(none)"},
      {"pm_icon", "USB", entry("with-file"), "TIFF"},
      {"pm_icon", "USB", entry("no-url"), "(none)"},           // a file name but no bundle
      {"pm_icon", "DNSSD", entry("with-file"), "TIFF"},        // borrowed from USB
      {"pm_icon", "EPSON USB", entry("with-file"), "(none)"},  // only network types borrow
      {"pm_icon", "USB", entry("bare"), "(none)"},             // the first match decides
      {"pm_icon", "USB", entry("with-data"), "(none)"},
      {"pm_icon", "USB", entry("with-data", "info"), "ICON"},
      {"pm_icon", "USB", entry("with-data", "info", "MDL:x;"), "(none)"},
      {"pm_icon", "USB", referring("PrBrowser Lookup Reference", entry("with-data", "info")),
       "ICON"},
      {"pm_icon", "USB", referring("PrBrowser Selection Reference", entry("with-file")), "TIFF"},
  };
  for (const auto& [fixture, type, browserInfo, icon] : cases) {
    SCOPED_TRACE(std::string(fixture) + " " + describe(browserInfo.get()));
    std::string created = std::string(fixture) + " create";
    size_t before = calls_.count(created);
    auto pm = Factory::PMModuleForURL(fixtureURL(fixture).get());
    auto data = pm->iconDataForConnectionType(*String::make(type), *browserInfo);
    std::string got = data ? std::string(data->view()) : "(none)";
    EXPECT_EQ(got.starts_with("II") ? "TIFF" : got, icon);
    EXPECT_EQ(calls_.count(created) - before, browserInfo.get() == carrying.get() ? 0u : 1u);
  }
  EXPECT_FALSE(cache().cacheDictionary()->get(fixtureURL("pm_icon")->absoluteString()))
      << "the icon lookup records nothing";
}

int32_t clientSync(void*) { return 0; }
int32_t clientSelStatus(void*, bool) { return 0; }
int32_t otherLookup(void*, uint32_t, QrDictionaryRef*) { return 0; }
void* const kPane = reinterpret_cast<void*>(0xabc0);
const uint32_t kTitle = kPBMTitleOnlyFlags;

template <class P>
std::string text(P* pointer) {
  char buffer[32];
  std::snprintf(buffer, sizeof buffer, "%p", reinterpret_cast<const void*>(pointer));
  return buffer;
}

Ref<PBMModule> browser(std::string_view name) {
  return QuarrinModuleFactory::PBMModuleForURL(fixtureURL(name).get());
}

// A printer module host holding c_pm: two "USB" entries, none for other wired types.
Ref<PMHost> usbHost() {
  auto host = make<PMHost>();
  host->addPlugin(QuarrinModuleFactory::PMModuleForURL(fixtureURL("c_pm").get()),
                  fixtureURL("c_pm").get());
  return host;
}

int32_t open(PBMModule& module, const char* type, LookupListSource* host, uint32_t flags,
             PMPrBrowserGetLookupSpecProc lookup = nullptr) {
  return module.loadPluginInterface(type ? String::make(type).get() : nullptr, host, nullptr, flags,
                                    lookup, clientSync, clientSelStatus, kPane, nullptr);
}

// What a full open over the host of usbHost() records.
std::vector<std::string> fullOpen(uint32_t flags) {
  return {
      "Prologue flags=" + std::to_string(flags),
      "Initialize context=20823 version=1 getLookupSpec=" + text(&PBMModule::defaultGetLookupSpec) +
          " syncRequest=" + text(&clientSync) + " selStatus=" + text(&clientSelStatus) +
          " userPane=" + text(kPane) + " numLookupSpecs=2",
      "lookupSpec index=0 status=0 connectionType=USB count=3",
      "lookupSpec index=1 status=0 connectionType=USB count=3"};
}

// A lookup list source serving one fixed list, or none.
struct Source final : LookupListSource {
  Ref<LookupInfoList> list;
  LookupInfoList* GetLookupInfoList(const String&) override { return list.get(); }
};

TEST_F(Modules, AnOpenCallsPrologueAloneForTheTitleElsePrologueAndInitializeWithTheLookups) {
  auto usb = usbHost(), empty = make<PMHost>();
  Source none, itemless;
  itemless.list = make<LookupInfoList>(String::make("USB"));
  itemless.list->addItem(make<LookupInfoItem>(nullptr, nullptr));
  // Fixture, type, host, flags, status, the flags Prologue gets (0: not called),
  // what follows a successful Prologue (1: the callbacks record is made, 2:
  // Initialize asks for every lookup through it too), and what the module's
  // lookup function then answers for the first lookup.
  std::tuple<const char*, const char*, LookupListSource*, uint32_t, int32_t, uint32_t, int, int32_t>
      cases[] = {
          {"c_pbm", "USB", usb.get(), kTitle, 0, 1, 0, 0},
          {"pbm_prologue_fails", "USB", nullptr, kTitle, -5, 1, 0, kPBMNoHost},
          {"c_pbm", "USB", &none, kTitle, 0, 1, 0, kPBMNoList},
          {"c_pbm", "USB", &itemless, kTitle, 0, 1, 0, kPBMNoList},
          {"c_pbm", "USB", usb.get(), 3, 0, 3, 2, 0},
          {"c_pbm", "USB", empty.get(), 3, kPBMNoLookupSpecs, 0, 0, kPBMBadIndex},
          {"c_pbm", "USB", empty.get(), kTitle | 8, kPBMNoLookupSpecs, 0, 0, kPBMBadIndex},
          {"c_pbm", "USB", nullptr, 3, kPBMNoLookupSpecs, 0, 0, kPBMNoHost},
          {"c_pbm", "FireWire", usb.get(), 3, kPBMNoLookupSpecs, 0, 0, kPBMBadIndex},
          {"pbm_prologue_fails", "USB", usb.get(), 3, -5, 3, 0, 0},
          {"pbm_raises", "USB", usb.get(), 3, kPBMNotLoaded, 3, 0, 0},
          {"pbm_no_initialize", "USB", usb.get(), 3, kPBMNotLoaded, 3, 1, 0},
          {"pbm_by_connection", "USB", usb.get(), 3, kPBMNotLoaded, 0, 0, kPBMNoConnectionType},
      };
  for (auto [fixture, type, host, flags, status, prologue, after, lookup] : cases) {
    SCOPED_TRACE(std::string(fixture) + " " + type + " " + std::to_string(flags));
    size_t from = calls_.lines().size();
    auto module = browser(fixture);
    EXPECT_EQ(open(*module, type, host, flags), status);
    EXPECT_EQ(module->browserCallbacks() != nullptr, after > 0);
    QrDictionaryRef first = nullptr;
    EXPECT_EQ(PBMModule::defaultGetLookupSpec(module.get(), 0, &first), lookup);
    EXPECT_EQ(adoptFromC<Dictionary>(first) != nullptr, lookup == 0);

    // The other entries reach a loaded plug-in with the context Prologue stored.
    bool loaded = module->interfaceLoaded(), raises = std::string(fixture) == "pbm_raises";
    int32_t forwarded = loaded && !raises ? 0 : kPBMNotLoaded;
    EXPECT_EQ(module->Sync(), forwarded);
    EXPECT_EQ(module->GetSelectedPrinters(nullptr), forwarded);
    EXPECT_EQ(module->Terminate(-7), forwarded);
    auto expected = fullOpen(prologue);
    expected.resize(after == 2 ? 4 : prologue ? 1 : 0);
    std::string context = prologue ? "context=20823" : "context=0";
    if (loaded)
      expected.insert(expected.end(), {"Sync " + context, "GetSelectedPrinters " + context,
                                       "Terminate " + context + " status=-7"});
    EXPECT_EQ(calls_.of(fixture, from), expected);
  }
  for (const char* entry : {"Prologue", "Sync", "GetSelectedPrinters", "Terminate"})
    EXPECT_EQ(log_.count(std::string("on call to '") + entry + "' for " + quoted("pbm_raises")),
              1u);
  auto unloaded = browser("c_pbm");
  EXPECT_EQ(unloaded->Initialize(nullptr, nullptr, nullptr, 0), kPBMNotLoaded);
  EXPECT_EQ(unloaded->Prologue(1, nullptr, nullptr, nullptr, nullptr, nullptr), kPBMNotLoaded);
  EXPECT_EQ(log_.count("pbmInterface->initialize:0x00000000"), 1u) << "pbm_no_initialize's alone";
}

TEST_F(Modules, TheLookupSpecFunctionHandsOutAnImmutableCopyOfTheItem) {
  auto usb = usbHost();
  auto full = browser("c_pbm"), other = browser("c_pbm");
  ASSERT_EQ(open(*full, "USB", usb.get(), 3), 0);
  LookupInfoList* list = usb->GetLookupInfoList(*String::make("USB"));
  auto* untouched = reinterpret_cast<QrDictionaryRef>(&list);
  std::tuple<void*, uint32_t, int32_t, const char*> cases[] = {
      {full.get(), 0, 0, "Fixture Laser 1"},
      {full.get(), 1, 0, "Fixture Laser 2"},
      {nullptr, 0, kPBMNotLoaded, "untouched"},
      {reinterpret_cast<void*>(UINTPTR_MAX), 0, kPBMNotLoaded, "untouched"},
  };
  for (auto [refCon, index, status, kind] : cases) {
    QrDictionaryRef result = untouched;
    EXPECT_EQ(PBMModule::defaultGetLookupSpec(refCon, index, &result), status) << kind;
    Ref<Dictionary> copy = result == untouched ? nullptr : adoptFromC<Dictionary>(result);
    EXPECT_EQ(result == untouched ? "untouched"
                                  : describe(copy ? copy->get("Printer Browser Kind") : nullptr),
              kind);
    if (!copy) continue;
    EXPECT_FALSE(cast<MutableDictionary>(copy)) << "the plug-in gets an immutable copy";
    EXPECT_EQ(copy->get("PrBrowser Lookup Reference"), list->getItemAtIndex(index));
  }
  EXPECT_EQ(PBMModule::defaultGetLookupSpec(full.get(), 0, nullptr), kPBMParamErr);

  // The first full open's record serves every later one; a client's own
  // lookup function goes into the record when it is the first.
  size_t from = calls_.lines().size();
  ASSERT_EQ(open(*full, "USB", usb.get(), 7, otherLookup), 0);
  EXPECT_EQ(calls_.of("c_pbm", from), fullOpen(7));
  ASSERT_EQ(open(*other, "USB", usb.get(), 3, otherLookup), 0);
  EXPECT_EQ(calls_.count("c_pbm lookupSpec index=0 status=0 connectionType=(null) count=0"), 1u);
}

}  // namespace
