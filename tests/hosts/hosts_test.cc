// Hosts and records answered from the module cache, so no plug-in code runs.
#include <gtest/gtest.h>
#include <quarrin/plugin.h>

#include "cache/module_cache.h"
#include "hosts/iom_host.h"
#include "hosts/pbm_host.h"
#include "hosts/pm_host.h"
#include "modules/module_factory.h"
#include "platform/log.h"
#include "support/plugin_bundle.h"

using namespace qr;

namespace {

const char kFactory[] = "11111111-2222-3333-4444-555555555555";

class Hosts : public ::testing::Test {
 protected:
  void SetUp() override {
    cache().setCacheDict(make<MutableDictionary>());
    previousSink_ = setLogSink([](std::string_view) {});
  }
  void TearDown() override { setLogSink(previousSink_); }
  static QuarrinModuleCache& cache() { return QuarrinModuleCache::defaultCache(); }

  Ref<URL> bundle(const std::string& name, const char* type) {
    std::string path = dir_ / name;
    qrtest::writePluginBundle(path, {{type, {kFactory}}}, "1.0");
    return URL::fileURL(path, true);
  }
  Ref<QuarrinModule> module(const Ref<URL>& url) {
    return QuarrinModuleFactory::pluginForURL(url.get());
  }

  static Ref<MutableArray> info(std::initializer_list<const char*> kinds) {
    auto array = make<MutableArray>();
    for (const char* kind : kinds) {
      auto entry = make<MutableDictionary>();
      entry->set("Printer Browser Kind", String::make(kind));
      array->append(entry);
    }
    return array;
  }

  qrtest::TempDir dir_;
  LogSink previousSink_;
};

TEST_F(Hosts, TheRegistryKeysModulesByNormalFormAndReleasesThemOnce) {
  auto url = bundle("P.plugin", QR_PM_TYPE_ID);
  Ref<QuarrinModule> first = module(url), second = module(url);
  {
    auto host = make<PMHost>();
    host->addPlugin(first, nullptr);
    EXPECT_EQ(host->loadedPlugins()->count(), 0u);

    auto base = URL::fileURL(dir_.path(), true);
    auto relative = URL::fileURL("P.plugin", true, base);
    host->addPlugin(first, url.get());
    host->addPlugin(second, relative.get());
    EXPECT_EQ(host->loadedPlugins()->count(), 1u);
    EXPECT_EQ(host->pmInterfaceForURL(url.get()), second.get()) << "the later module replaces";
    EXPECT_EQ(first->retainCount(), 1u);
    EXPECT_EQ(second->retainCount(), 2u);
  }
  EXPECT_EQ(second->retainCount(), 1u) << "the host let its reference go exactly once";
}

TEST_F(Hosts, ConnectionRecordsComeFromModulesThatNameBothValues) {
  auto host = make<IOMHost>();
  EXPECT_EQ(host->connectionInfoList()->count(), 0u);
  EXPECT_EQ(host->connectionInfoList(), host->connectionInfoList()) << "built once";

  auto host2 = make<IOMHost>();
  auto usb1 = bundle("USB1.plugin", QR_IOM_TYPE_ID), usb2 = bundle("USB2.plugin", QR_IOM_TYPE_ID);
  auto serial = bundle("Serial.plugin", QR_IOM_TYPE_ID);
  cache().addInfoForIOModule(usb1.get(), String::make("USB").get(),
                             String::make("../B.plugin").get());
  cache().addInfoForIOModule(usb2.get(), String::make("USB").get(),
                             String::make("/opt/B.plugin").get());
  cache().addInfoForIOModule(serial.get(), String::make("Serial").get(), nullptr);
  for (const auto& url : {usb1, usb2, serial}) host2->addPlugin(module(url), url.get());

  MutableArray* list = host2->connectionInfoList();
  ASSERT_EQ(list->count(), 2u) << "a module without a browser path gives no record";
  auto* a = cast<ConnectionInfo>(list->at(0));
  auto* b = cast<ConnectionInfo>(list->at(1));
  EXPECT_TRUE(a->connectionType()->equals("USB"));
  EXPECT_TRUE(b->connectionType()->equals("USB"));
  EXPECT_EQ(a->PBMURL()->absoluteString(), URL::fileURL(dir_ / "B.plugin", true)->absoluteString());
  EXPECT_EQ(b->PBMURL()->absoluteString(), "file:///opt/B.plugin/");
  EXPECT_EQ(a->IOMURL()->absoluteString(), usb1->absoluteString());

  EXPECT_EQ(host2->iomURLForConnectionType(*String::make("USB"))->absoluteString(),
            usb1->absoluteString());
  EXPECT_EQ(host2->iomURLForConnectionType(*String::make("Serial"))->absoluteString(),
            serial->absoluteString())
      << "found through its cache entry";
  EXPECT_FALSE(host2->iomURLForConnectionType(*String::make("FireWire")));
}

TEST_F(Hosts, LookupListsAreFilledOnceAndItemsReferBackToThemselves) {
  auto host = make<PMHost>();
  auto laser = bundle("Laser.plugin", QR_PM_TYPE_ID), ink = bundle("Ink.plugin", QR_PM_TYPE_ID);
  cache().addInfo(info({"laser-a", "laser-b"}).get(), laser.get(), String::make("USB").get());
  cache().addInfo(info({"ink"}).get(), ink.get(), String::make("USB").get());
  cache().addInfo(nullptr, ink.get(), String::make("Serial").get());
  cache().addInfo(nullptr, laser.get(), String::make("Serial").get());
  for (const auto& url : {laser, ink}) host->addPlugin(module(url), url.get());

  auto usb = String::make("USB");
  LookupInfoList* list = host->GetLookupInfoList(*usb);
  ASSERT_EQ(list->maxIndex(), 3u);
  EXPECT_EQ(host->GetLookupInfoList(*usb), list);
  LookupInfoItem* item = list->getItemAtIndex(1);
  MutableDictionary* lookup = item->lookupInfo();
  EXPECT_TRUE(cast<String>(lookup->get("connectionType"))->equals("USB"));
  EXPECT_EQ(lookup->get("PrBrowser Lookup Reference"), item);
  EXPECT_TRUE(cast<String>(lookup->get("Printer Browser Kind"))->equals("laser-b"));
  EXPECT_EQ(item->pmURL()->absoluteString(), laser->absoluteString());
  EXPECT_FALSE(item->getIcon()) << "the cache keeps no icons";

  Ref<Dictionary> copy = item->copyLookupInfoDict();
  EXPECT_FALSE(cast<MutableDictionary>(copy));
  EXPECT_EQ(copy->get("PrBrowser Lookup Reference"), item);
  lookup->set("Printer Browser Kind", String::make("edited"));
  auto again = cache().getInfoForPrinterModule(laser.get(), usb.get());
  EXPECT_TRUE(
      cast<String>(cast<Dictionary>(again->at(1))->get("Printer Browser Kind"))->equals("laser-b"))
      << "an item's dictionary is its own";

  LookupInfoList* serial = host->GetLookupInfoList(*String::make("Serial"));
  EXPECT_EQ(serial->maxIndex(), 0u);
  EXPECT_EQ(host->lookupLists()->count(), 2u);
  EXPECT_EQ(host->lookupLists()->at(0), list) << "in the order first requested";
  cache().addInfo(info({"late"}).get(), ink.get(), String::make("Serial").get());
  EXPECT_EQ(host->GetLookupInfoList(*String::make("Serial")), serial);
  EXPECT_EQ(serial->maxIndex(), 1u) << "an empty list asks every module again";
}

TEST_F(Hosts, AnItemOutlivesItsListThroughACopy) {
  Ref<Dictionary> copy;
  {
    auto list = make<LookupInfoList>(String::make("USB"));
    auto entry = make<MutableDictionary>();
    entry->set("k", String::make("v"));
    list->addItem(make<LookupInfoItem>(URL::fileURL("/x.plugin", true).get(), entry.get()));
    copy = list->getItemAtIndex(0)->copyLookupInfoDict();
    EXPECT_FALSE(entry->get("PrBrowser Lookup Reference")) << "the argument is not changed";
  }
  auto* item = cast<LookupInfoItem>(copy->get("PrBrowser Lookup Reference"));
  ASSERT_TRUE(item);
  EXPECT_TRUE(cast<String>(item->lookupInfo()->get("k"))->equals("v"));
}

TEST_F(Hosts, TheBrowserHostLoadsAModuleOnceAndFindsItByNormalForm) {
  auto host = make<PBMHost>();
  auto url = bundle("Browser.plugin", QR_PBM_TYPE_ID);
  Ref<PBMModule> first = host->pbmInterfaceForURL(url.get());
  ASSERT_TRUE(first);
  auto relative = URL::fileURL("Browser.plugin", true, URL::fileURL(dir_.path(), true));
  EXPECT_EQ(host->pbmInterfaceForURL(relative.get()), first);
  EXPECT_EQ(host->loadedPlugins()->count(), 1u);
  EXPECT_FALSE(host->pbmInterfaceForURL(bundle("P.plugin", QR_PM_TYPE_ID).get()));
  EXPECT_FALSE(host->pbmInterfaceForURL(nullptr));
}

}  // namespace
