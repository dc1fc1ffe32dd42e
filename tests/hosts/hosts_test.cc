// The hosts: registries of modules filed by normal form, the connection
// records of the I/O modules with their titles and order, and the lookup
// lists of the printer modules.
#include <gtest/gtest.h>

#include <algorithm>
#include <tuple>

#include "fixtures/fixture_support.h"
#include "hosts/iom_host.h"
#include "hosts/pbm_host.h"
#include "hosts/pm_host.h"

using namespace qr;
using namespace qr::test;

namespace {

using Hosts = FixtureTest;

// A file under the fixture directory, spelled relative to it.
Ref<URL> relativeURL(const std::string& path) {
  return URL::fileURL(path, true, URL::fileURL(QUARRIN_FIXTURE_DIR, true));
}

// What describe() says of an object, URLs under the fixture directory as the
// rest of them: "c_pm.plugin/".
std::string named(const Object* object) {
  std::string text = describe(object), dir = relativeURL(".")->absoluteString();
  for (size_t at; (at = text.find(dir)) != std::string::npos;) text.erase(at, dir.size());
  return text;
}

template <class Host>
Ref<Host> hostOf(std::initializer_list<const char*> fixtures) {
  auto host = make<Host>();
  for (const char* fixture : fixtures)
    host->addPlugin(QuarrinModuleFactory::pluginForURL(fixtureURL(fixture).get()),
                    fixtureURL(fixture).get());
  return host;
}

TEST_F(Hosts, TheRegistryFilesByNormalFormKeepsTheLaterModuleAndReleasesItOnce) {
  auto url = fixtureURL("c_pm");
  Ref<PMModule> first = QuarrinModuleFactory::PMModuleForURL(url.get()),
                second = QuarrinModuleFactory::PMModuleForURL(url.get());
  {
    auto host = make<PMHost>();
    host->addPlugin(first, nullptr);
    EXPECT_EQ(host->loadedPlugins()->count(), 0u);
    host->addPlugin(first, url.get());
    host->addPlugin(second, relativeURL("c_pm.plugin").get());
    EXPECT_EQ(host->loadedPlugins()->count(), 1u);
    EXPECT_EQ(host->pmInterfaceForURL(url.get()), second.get());
    EXPECT_EQ(first->retainCount(), 1u);
    EXPECT_EQ(second->retainCount(), 2u);
  }
  EXPECT_EQ(second->retainCount(), 1u);

  auto browsers = make<PBMHost>();
  Ref<PBMModule> browser = browsers->pbmInterfaceForURL(fixtureURL("c_pbm").get());
  ASSERT_TRUE(browser);
  EXPECT_EQ(browsers->pbmInterfaceForURL(relativeURL("c_pbm.plugin").get()), browser);
  EXPECT_FALSE(browsers->pbmInterfaceForURL(url.get())) << "no browser";
  EXPECT_FALSE(browsers->pbmInterfaceForURL(nullptr));
  EXPECT_EQ(browsers->loadedPlugins()->count(), 1u);
}

TEST_F(Hosts, ConnectionRecordsComeFromTheIOModulesThatNameBothValues) {
  auto host = hostOf<IOMHost>(
      {"c_iom", "io_dnssd", "c_pm", "io_no_path", "io_quellnet", "io_failing", "c_factory_null"});
  MutableArray* list = host->connectionInfoList();
  EXPECT_EQ(named(list),
            "(USB via c_iom.plugin/ browsed by USBBrowser.plugin/, "
            "DNSSD via io_dnssd.plugin/ browsed by file:///opt/none/NetBrowser.plugin/, "
            "Quellnet via io_quellnet.plugin/ browsed by io_quellnet.plugin/QuellBrowser.plugin/, "
            "USB via io_failing.plugin/ browsed by io_failing.plugin/B.plugin/)");
  EXPECT_EQ(host->connectionInfoList(), list);
  for (const char* fixture : {"c_iom", "io_dnssd", "io_no_path", "io_quellnet", "io_failing"})
    EXPECT_EQ(calls_.count(std::string(fixture) + " GetConnectionInfo"), 1u) << fixture;

  // The first record's module, else one whose cache entry names the type.
  for (auto [type, module] :
       {std::pair{"USB", "c_iom.plugin/"}, std::pair{"DNSSD", "io_dnssd.plugin/"},
        std::pair{"Serial", "io_no_path.plugin/"}, std::pair{"FireWire", "(null)"}})
    EXPECT_EQ(named(host->iomURLForConnectionType(*String::make(type)).get()), module) << type;
}

TEST_F(Hosts, ALookupListHoldsEveryModulesEntriesAndIsFilledAgainOnlyWhileEmpty) {
  auto host = hostOf<PMHost>({"c_pm", "c_iom", "pm_serial", "pm_usb_only"});
  std::pair<const char*, std::vector<std::string>> cases[] = {
      {"USB",
       {"Fixture Laser 1 c_pm.plugin/", "Fixture Laser 2 c_pm.plugin/", "usb-1 pm_usb_only.plugin/",
        "usb-2 pm_usb_only.plugin/"}},
      {"Serial", {"serial-1 pm_serial.plugin/"}},  // its entry that is no dictionary is left out
      {"FireWire", {}},
  };
  for (const auto& [type, expected] : cases) {
    LookupInfoList* list = host->GetLookupInfoList(*String::make(type));
    EXPECT_EQ(host->GetLookupInfoList(*String::make(type)), list) << "asked again only if empty";
    std::vector<std::string> items;
    for (uint32_t i = 0; i < list->maxIndex(); ++i) {
      LookupInfoItem* item = list->getItemAtIndex(i);
      MutableDictionary* lookup = item->lookupInfo();
      EXPECT_EQ(describe(lookup->get("connectionType")), type);
      EXPECT_EQ(lookup->get("PrBrowser Lookup Reference"), item);
      items.push_back(describe(lookup->get("Printer Browser Kind")) + " " +
                      named(item->pmURL().get()));
    }
    EXPECT_EQ(items, expected) << type;
    for (const char* fixture : {"c_pm", "pm_serial", "pm_usb_only"})
      EXPECT_EQ(calls_.count(std::string(fixture) + " CreateBrowserInfo connectionType=" + type),
                expected.empty() ? 2u : 1u)
          << fixture << " " << type;
  }
}

TEST_F(Hosts, RecordingAsksAsAListWouldAndLeavesTheSameCache) {
  const char* const fixtures[] = {"c_pm", "pm_serial", "pm_usb_only"};
  const char* const types[] = {"USB", "Serial", "FireWire", "DNSSD", "USB"};
  auto asked = [&](size_t from) {
    std::vector<std::string> out;
    for (const char* fixture : fixtures)
      for (const auto& call : calls_.of(fixture, from)) out.push_back(fixture + (" " + call));
    return out;
  };
  Ref<Dictionary> filled[2];
  std::vector<std::string> calls[2];
  for (int recording = 0; recording < 2; ++recording) {
    cache().setCacheDict(make<MutableDictionary>());
    size_t from = calls_.lines().size();
    auto host = hostOf<PMHost>({"c_pm", "c_iom", "pm_serial", "pm_usb_only"});
    for (const char* type : types)
      recording ? host->recordLookupInfo(*String::make(type))
                : void(host->GetLookupInfoList(*String::make(type)));
    filled[recording] = cache().cacheDictionary();
    calls[recording] = asked(from);
  }
  EXPECT_TRUE(filled[1]->isEqual(*filled[0])) << describe(filled[1].get());
  EXPECT_EQ(calls[1], calls[0]);
  EXPECT_GT(filled[1]->count(), 0u);

  // Modules not yet loaded take the recorded answers and call nothing.
  size_t from = calls_.lines().size();
  auto host = hostOf<PMHost>({"c_pm", "pm_serial", "pm_usb_only"});
  for (const char* type : types) host->recordLookupInfo(*String::make(type));
  EXPECT_EQ(asked(from), std::vector<std::string>{});
  EXPECT_TRUE(cache().cacheDictionary()->isEqual(*filled[0]));
}

// A record whose browser is the fixture of that name, or the path given.
Ref<ConnectionInfo> record(const std::string& browser, const char* type = "USB") {
  bool fixture = browser.find_first_of("/.") == std::string::npos;
  return ConnectionInfo::connectionInfoWithInfo(
      String::make(type), fixtureURL("c_iom"),
      relativeURL(fixture ? browser + ".plugin" : browser));
}

TEST_F(Hosts, ARecordsTitleIsItsBrowsersOwnElseFromItsTableElseItsIdentifier) {
  // Browser, type, whether the title is asked before the identifier, the title
  // ("id": the identifier), title-only opens, and the identifier (none: that of the fixture).
  std::tuple<std::string, const char*, bool, const char*, size_t, const char*> cases[] = {
      {"c_pbm", "USB", true, "Fixture Browser", 1, nullptr},
      {"pbm_lower_title", "USB", true, "delta browser", 1, nullptr},
      {"pbm_first_party", "USB", true, "zebra first party", 1, "com.varnex.print.pbm.Fixture"},
      {"pbm_untitled", "USB", true, "(null)", 2, nullptr},  // asked again
      {"pbm_localized", "USB", true, "Own Title", 1, nullptr},
      // The table names the browser by its identifier, else by the connection type.
      {"pbm_localized", "USB", false, "Localized Browser", 0, nullptr},
      {"pbm_by_connection", "Serial", false, "Serial Ports", 0, nullptr},
      {"pbm_by_connection", "Serial", true, "id", 0, nullptr},  // it has no code
      {"pbm_by_connection", "USB", false, "id", 0, nullptr},
      {"pbm_prologue_fails", "USB", true, "id", 1, nullptr},
      {"pbm_raises", "USB", true, "id", 1, nullptr},
      {"cxx_pbm_throws", "USB", true, "id", 1, nullptr},
      {"c_pm", "USB", true, "id", 0, nullptr},
      {"/nonexistent/Browser", "USB", true, "id", 0, ""},
      {"c_pbm.plugin/Contents/Info.plist", "USB", true, "id", 0, ""},
      {".", "USB", true, "id", 0, "(null)"},  // a directory that is no bundle
  };
  std::vector<Ref<ConnectionInfo>> records;
  for (auto [browser, type, titleFirst, title, prologues, identifier] : cases) {
    SCOPED_TRACE(browser + " " + type + (titleFirst ? " title first" : ""));
    auto r = records.emplace_back(record(browser, type));
    std::string id = identifier ? identifier : "org.quarrin.test." + browser;
    size_t before = calls_.count(browser + " Prologue flags=1");
    if (titleFirst) r->connectionTitle();
    EXPECT_EQ(describe(r->connectionBundleID().get()), id);
    EXPECT_EQ(describe(r->connectionTitle().get()), title == std::string("id") ? id : title);
    EXPECT_EQ(calls_.count(browser + " Prologue flags=1") - before, prologues);
  }
  EXPECT_EQ(log_.count("on call to 'Prologue' for " + quoted("pbm_raises")), 1u);

  // First-party browsers first, then titles ignoring case, then no title.
  std::stable_sort(records.begin(), records.end(),
                   [](const auto& a, const auto& b) { return a->compare(*b) < 0; });
  std::string titles;
  for (const auto& r : records) titles += describe(r->connectionTitle().get()) + "|";
  EXPECT_EQ(titles,
            "zebra first party|||delta browser|Fixture Browser|Localized Browser|"
            "org.quarrin.test.c_pm|org.quarrin.test.cxx_pbm_throws|"
            "org.quarrin.test.pbm_by_connection|org.quarrin.test.pbm_by_connection|"
            "org.quarrin.test.pbm_prologue_fails|org.quarrin.test.pbm_raises|Own Title|"
            "Serial Ports|(null)|(null)|");
  EXPECT_EQ(records[1]->compare(*records[2]), 0);
  EXPECT_EQ(records[14]->compare(*records[15]), 1) << "without titles each sorts after the other";
  EXPECT_EQ(records[15]->compare(*records[14]), 1);
}

}  // namespace
