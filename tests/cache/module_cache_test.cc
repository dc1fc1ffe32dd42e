// The module cache over bundles whose short version each case sets.
#include "cache/module_cache.h"

#include <gtest/gtest.h>

#include "fixtures/fixture_support.h"
#include "support/temp_dir.h"
#include "values/data.h"

using namespace qr;

namespace {

class ModuleCache : public ::testing::Test {
 protected:
  // The bundle name.plugin with the given short version (none when empty).
  Ref<URL> module(const std::string& name, std::string_view version) {
    dir_.write(name + ".plugin/Contents/Info.plist", qrtest::infoPlist("com.example.m", version));
    return URL::fileURL(dir_ / (name + ".plugin"), true);
  }
  static Ref<MutableArray> info(std::string_view kind) {
    auto entry = make<MutableDictionary>();
    entry->set("Printer Browser Kind", String::make(kind));
    entry->set("Printer Browser Icons", Data::copy(std::string_view("PNG")));
    auto array = make<MutableArray>();
    array->append(entry);
    return array;
  }
  static Ref<String> str(const char* text) { return text ? String::make(text) : nullptr; }

  qrtest::TempDir dir_;
};

TEST_F(ModuleCache, AnEntryServesOnlyWhileItsBundleVersionIsUnchanged) {
  struct {
    bool io;             // I/O module calls instead of printer module ones
    const char* stored;  // short version when the answer is added ("": none)
    const char* now;     // short version when "USB" is looked up
    const char* conn;    // connection type of the answer
    bool found, kept;    // kept: the module's entry is still in the cache
  } rows[] = {
      {false, "1.0", "1.0", "USB", true, true},
      {false, "1.0", "1.0", "DNSSD", false, true},
      {false, "1.0", "1.1", "USB", false, false},  // with every other connection type
      {false, "1.0", "", "USB", false, false},
      {false, "", "", "USB", false, false},
      {false, "", "1.0", "USB", false, false},
      {false, "1.0", "1.0", nullptr, false, false},  // nothing stamped it
      {true, "2", "2", "USB", true, true},
      {true, "2", "2", nullptr, true, true},
      {true, "2", "3", "USB", false, false},
      {true, "", "", "USB", false, false},
  };
  int n = 0;
  for (const auto& r : rows) {
    SCOPED_TRACE(n);
    qr::test::CapturedLog log;
    auto cache = make<QuarrinModuleCache>();
    cache->setCacheDict(make<MutableDictionary>());  // never loads the store
    auto url = module("M" + std::to_string(n++), r.stored), other = module("Other", "1");
    cache->addInfoForIOModule(other.get(), str("USB").get(), nullptr);
    if (r.io) {
      cache->addInfoForIOModule(url.get(), str(r.conn).get(), str("B.plugin").get());
    } else {
      cache->addInfo(info("a").get(), url.get(), str(r.conn).get());
      if (r.conn) cache->addInfo(info("b").get(), url.get(), str("Quellnet").get());
    }
    module("M" + std::to_string(n - 1), r.now);
    cache->setDirty(false);
    Ref<String> conn = str("unset"), browser;
    bool found = r.io ? cache->getInfoForIOModule(url.get(), &conn, &browser)
                      : bool(cache->getInfoForPrinterModule(url.get(), str("USB").get()));
    EXPECT_EQ(found, r.found);
    EXPECT_EQ(cache->cacheDictionary()->count(), r.kept ? 2u : 1u);
    EXPECT_EQ(cache->dirty(), !r.kept);
    if (r.io && r.found) {
      EXPECT_EQ(describe(conn.get()) + describe(browser.get()),
                describe(str(r.conn).get()) + "B.plugin");
    }
    // A lookup of a module without a version says which module it was.
    EXPECT_EQ(log.lines().empty(), *r.stored && *r.now);
    for (const auto& line : log.lines())
      EXPECT_EQ(line, "Module is missing short version: " + url->absoluteString());
    // Dropping an entry marks the cache changed only when there was one to drop.
    cache->setDirty(false);
    cache->removeEntry(url.get());
    EXPECT_EQ(cache->dirty(), r.kept);
    EXPECT_EQ(cache->cacheDictionary()->count(), 1u);
  }
}

TEST_F(ModuleCache, AnswersLoseTheirIconsAndAreHandedOutAsFreshCopies) {
  auto cache = make<QuarrinModuleCache>();
  cache->setCacheDict(make<MutableDictionary>());
  auto url = module("Photo", "1");
  auto usb = str("USB");
  auto given = info("photo");
  cache->addInfo(given.get(), url.get(), usb.get());
  EXPECT_TRUE(cast<Dictionary>(given->at(0))->get("Printer Browser Icons")) << "caller's copy";
  auto* stored = cache->cacheDictionary()->getAs<Dictionary>(url->absoluteString());
  auto* kept = cast<MutableDictionary>(stored->getAs<Array>("USB")->at(0));
  EXPECT_FALSE(kept->get("Printer Browser Icons"));
  kept->set("Printer Browser Icons", Data::copy(std::string_view("x")));  // came in another way

  auto out = cache->getInfoForPrinterModule(url.get(), usb.get());
  auto* first = cast<MutableDictionary>(out->at(0));
  ASSERT_TRUE(first && cast<MutableString>(first->get("Printer Browser Kind")));
  EXPECT_FALSE(first->get("Printer Browser Icons"));
  first->set("Printer Browser Kind", str("changed"));
  auto again = cache->getInfoForPrinterModule(url.get(), usb.get());
  EXPECT_EQ(describe(cast<Dictionary>(again->at(0))->get("Printer Browser Kind")), "photo");

  cache->addInfo(nullptr, url.get(), usb.get());
  EXPECT_EQ(cache->getInfoForPrinterModule(url.get(), usb.get())->count(), 0u) << "no answer";
  cache->addInfo(given.get(), nullptr, usb.get());
  cache->addInfoForIOModule(nullptr, usb.get(), nullptr);
  EXPECT_FALSE(cache->getInfoForIOModule(nullptr, nullptr, nullptr));
  EXPECT_EQ(cache->cacheDictionary()->count(), 1u);
}

}  // namespace
