// Printer modules: browser info through the cache, the network discovery
// rules, and the icon lookup.
#include <gtest/gtest.h>

#include "cache/module_cache.h"
#include "fixtures/fixture_support.h"
#include "modules/lookup_reference.h"
#include "modules/module_factory.h"
#include "modules/pm_module.h"

using namespace qr;
using qr::test::CapturedLog;
using qr::test::fixtureBundle;
using qr::test::FixtureCalls;

namespace {

class PMModuleTest : public ::testing::Test {
 protected:
  void SetUp() override { cache().setCacheDict(make<MutableDictionary>()); }
  static QuarrinModuleCache& cache() { return QuarrinModuleCache::defaultCache(); }
  static Ref<PMModule> module(std::string_view name) {
    return QuarrinModuleFactory::PMModuleForURL(URL::fileURL(fixtureBundle(name), true).get());
  }
  static Ref<MutableArray> ask(PMModule& m, std::string_view type) {
    return m.createBrowserInfoForConnectionType(*String::make(type));
  }
  // The "Printer Browser Kind" of each entry, and whether it is marked borrowed.
  static std::vector<std::string> kinds(const Array* info) {
    std::vector<std::string> out;
    if (!info) return out;
    for (const auto& e : *info) {
      auto* d = cast<Dictionary>(e.get());
      std::string kind = d->getAs<String>("Printer Browser Kind")->utf8();
      if (auto* mark = d->getAs<String>("USBParasite")) kind += "+" + mark->utf8();
      out.push_back(kind);
    }
    return out;
  }
  static std::vector<std::string> cached(const PMModule& m, std::string_view type) {
    auto* entry = cache().cacheDictionary()->getAs<Dictionary>(m.pluginURL()->absoluteString());
    auto* info = entry ? entry->getAs<Array>(type) : nullptr;
    if (!info) return {"<none>"};
    return kinds(info);
  }

  FixtureCalls calls_;
  CapturedLog log_;
};

using Kinds = std::vector<std::string>;

TEST_F(PMModuleTest, ARecordedEmptyAnswerIsAnAnswerAndLoadsNothing) {
  auto pm = module("c_pm");
  cache().addInfo(nullptr, pm->pluginURL().get(), String::make("USB").get());
  auto info = ask(*pm, "USB");
  ASSERT_TRUE(info);
  EXPECT_EQ(info->count(), 0u);
  EXPECT_TRUE(calls_.lines().empty());
}

TEST_F(PMModuleTest, AnOrdinaryTypeWithNoAnswerRecordsAnEmptyArray) {
  auto pm = module("pm_nothing");
  EXPECT_FALSE(ask(*pm, "USB"));
  EXPECT_EQ(cached(*pm, "USB"), Kinds{});
  EXPECT_EQ(calls_.count("pm_nothing CreateBrowserInfo"), 1u);
}

TEST_F(PMModuleTest, QuellnetIsAnsweredAndFiledAsDNSSD) {
  auto fromCache = module("pm_nothing");
  auto entry = make<MutableArray>();
  auto d = make<MutableDictionary>();
  d->set("Printer Browser Kind", String::make("cached-dnssd"));
  entry->append(d);
  cache().addInfo(entry.get(), fromCache->pluginURL().get(), String::make("DNSSD").get());
  EXPECT_EQ(kinds(ask(*fromCache, "Quellnet").get()), Kinds{"cached-dnssd"});
  EXPECT_TRUE(calls_.lines().empty());

  auto asked = module("pm_quellnet");
  EXPECT_EQ(kinds(ask(*asked, "Quellnet").get()), Kinds{"quellnet-own"});
  EXPECT_EQ(cached(*asked, "DNSSD"), Kinds{"quellnet-own"});
  EXPECT_EQ(cached(*asked, "Quellnet"), Kinds{"<none>"});
}

TEST_F(PMModuleTest, DNSSDFallsBackToTheModulesQuellnetAnswer) {
  auto pm = module("pm_quellnet");
  EXPECT_EQ(kinds(ask(*pm, "DNSSD").get()), Kinds{"quellnet-own"});
  EXPECT_EQ(cached(*pm, "DNSSD"), Kinds{"quellnet-own"});
  auto lines = calls_.lines();
  EXPECT_EQ(calls_.count("pm_quellnet CreateBrowserInfo connectionType=DNSSD"), 1u);
  EXPECT_EQ(calls_.count("pm_quellnet CreateBrowserInfo connectionType=Quellnet"), 1u);
}

TEST_F(PMModuleTest, TheRecordedDNSSDAnswerDoesNotDependOnWhichTypeIsAskedFirst) {
  auto first = module("pm_dnssd");
  EXPECT_EQ(kinds(ask(*first, "DNSSD").get()), Kinds{"dnssd-own"});
  EXPECT_EQ(kinds(ask(*first, "Quellnet").get()), Kinds{"dnssd-own"});
  EXPECT_EQ(cached(*first, "DNSSD"), Kinds{"dnssd-own"});

  cache().setCacheDict(make<MutableDictionary>());
  auto second = module("pm_dnssd");
  EXPECT_EQ(kinds(ask(*second, "Quellnet").get()), Kinds{"dnssd-own"});
  EXPECT_EQ(kinds(ask(*second, "DNSSD").get()), Kinds{"dnssd-own"});
  EXPECT_EQ(cached(*second, "DNSSD"), Kinds{"dnssd-own"})
      << "asking Quellnet first must not overwrite the module's own DNSSD answer";
}

TEST_F(PMModuleTest, NetworkDiscoveryBorrowsTheUSBAnswerMarked) {
  auto pm = module("pm_usb_only");
  EXPECT_EQ(kinds(ask(*pm, "DNSSD").get()), (Kinds{"usb-1+True", "usb-2+True"}));
  EXPECT_EQ(cached(*pm, "DNSSD"), Kinds{});
  EXPECT_EQ(cached(*pm, "USB"), (Kinds{"usb-1", "usb-2"})) << "the cache keeps them unmarked";

  // A later run answers the same from the cache alone.
  auto again = module("pm_usb_only");
  EXPECT_EQ(kinds(ask(*again, "Quellnet").get()), (Kinds{"usb-1+True", "usb-2+True"}));
  EXPECT_EQ(calls_.count("pm_usb_only create"), 1u);

  auto epson = module("pm_epson_only");
  EXPECT_EQ(kinds(ask(*epson, "DNSSD").get()), Kinds{"epson-1+True"});
  EXPECT_EQ(cached(*epson, "EPSON USB"), Kinds{"epson-1"});

  auto nothing = module("pm_nothing");
  auto none = ask(*nothing, "DNSSD");
  EXPECT_TRUE(!none || none->count() == 0);
  EXPECT_EQ(cached(*nothing, "USB"), Kinds{});
  EXPECT_EQ(cached(*nothing, "EPSON USB"), Kinds{});
}

TEST_F(PMModuleTest, AModuleThatCannotLoadRecordsNothing) {
  auto pm = module("m_qi_noiface");
  EXPECT_FALSE(ask(*pm, "USB"));
  EXPECT_FALSE(cache().cacheDictionary()->get(pm->pluginURL()->absoluteString()));
  EXPECT_FALSE(pm->iconDataForConnectionType(*String::make("USB"), *make<Dictionary>()));
}

TEST_F(PMModuleTest, ARaisingPluginGivesNoAnswerAndIsLogged) {
  auto pm = module("pm_raises");
  EXPECT_FALSE(ask(*pm, "USB"));
  EXPECT_EQ(cached(*pm, "USB"), Kinds{});
  ASSERT_FALSE(log_.lines().empty());
  EXPECT_NE(log_.lines()[0].find("[FixtureError] on call to 'CreateBrowserInfo'"),
            std::string::npos);
}

TEST_F(PMModuleTest, AnswersBelongToTheCaller) {
  auto pm = module("c_pm");
  auto info = ask(*pm, "USB");
  ASSERT_EQ(info->count(), 2u);
  auto* entry = cast<MutableDictionary>(info->at(0));
  ASSERT_TRUE(entry);
  EXPECT_TRUE(cast<MutableString>(entry->get("Printer Browser Kind")));
  entry->set("Printer Browser Kind", String::make("changed"));
  EXPECT_EQ(kinds(ask(*pm, "USB").get()), (Kinds{"Fixture Laser 1", "Fixture Laser 2"}));
}

// A reference object like the printer module host's lookup items.
class Reference final : public LookupReference {
 public:
  explicit Reference(Ref<Dictionary> info) : info_(std::move(info)) {}
  Dictionary* referencedLookupInfo() const override { return info_.get(); }

 private:
  Ref<Dictionary> info_;
};

Ref<MutableDictionary> browserEntry(std::string_view kind) {
  auto d = make<MutableDictionary>();
  d->set("Printer Browser Kind", String::make(kind));
  return d;
}

TEST_F(PMModuleTest, IconsComeFromTheEntryItselfOrTheFirstMatchingAnswer) {
  auto pm = module("pm_icon");
  auto usb = String::make("USB");

  auto carrying = browserEntry("anything");
  carrying->set("Printer Browser Icons", Data::copy(std::string_view("own")));
  EXPECT_EQ(pm->iconDataForConnectionType(*usb, *carrying)->view(), "own");
  EXPECT_TRUE(calls_.lines().empty()) << "no load for an entry that carries its icon";

  auto fromFile = pm->iconDataForConnectionType(*usb, *browserEntry("with-file"));
  ASSERT_TRUE(fromFile);
  EXPECT_EQ(fromFile->view().substr(0, 2), "II") << "TIFF data";

  EXPECT_FALSE(pm->iconDataForConnectionType(*usb, *browserEntry("bare")))
      << "the first match decides although the second carries data";
  EXPECT_FALSE(pm->iconDataForConnectionType(*usb, *browserEntry("broken-file")));
  EXPECT_FALSE(pm->iconDataForConnectionType(*usb, *browserEntry("missing-file")));
  EXPECT_FALSE(pm->iconDataForConnectionType(*usb, *browserEntry("with-data")))
      << "a key present on one side only is a difference";
  auto withInfo = browserEntry("with-data");
  withInfo->set("Printer Browser Info", String::make("info"));
  EXPECT_EQ(pm->iconDataForConnectionType(*usb, *withInfo)->view(), "ICON");

  // The back-reference is followed to the full entry.
  auto holder = make<MutableDictionary>();
  holder->set("PrBrowser Lookup Reference", make<Reference>(withInfo));
  EXPECT_EQ(pm->iconDataForConnectionType(*usb, *holder)->view(), "ICON");
  auto selection = make<MutableDictionary>();
  selection->set("PrBrowser Selection Reference", make<Reference>(browserEntry("with-file")));
  EXPECT_TRUE(pm->iconDataForConnectionType(*usb, *selection));
  EXPECT_EQ(calls_.count("pm_icon create"), 1u);
}

TEST_F(PMModuleTest, IconLookupForNetworkDiscoveryUsesTheUSBAnswer) {
  auto pm = module("pm_icon");
  auto icon = pm->iconDataForConnectionType(*String::make("DNSSD"), *browserEntry("with-file"));
  ASSERT_TRUE(icon);
  EXPECT_EQ(calls_.count("pm_icon CreateBrowserInfo connectionType=USB"), 1u);
  EXPECT_FALSE(cache().cacheDictionary()->get(pm->pluginURL()->absoluteString()))
      << "the icon lookup records nothing";
}

}  // namespace
