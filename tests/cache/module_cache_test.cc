#include "cache/module_cache.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>

#include "fixtures/fixture_support.h"
#include "plist/property_list.h"
#include "support/temp_dir.h"
#include "values/data.h"

using namespace qr;

namespace {

class ModuleCache : public ::testing::Test {
 protected:
  void SetUp() override {
    setenv("CACHEWRIGHT_PREFS", (dir_ / "prefs.plist").c_str(), 1);
    setenv("CACHEWRIGHT_FRAMEWORK", (dir_ / "Zephrin.framework").c_str(), 1);
  }

  // A module bundle with the given short version (none when empty).
  Ref<URL> module(const std::string& name, std::string_view version) {
    std::string path = dir_ / (name + ".plugin");
    qrtest::writeText(path + "/Contents/Info.plist",
                      qrtest::infoPlist("com.example." + name, version));
    return URL::fileURL(path, true);
  }

  // A cache that starts from an empty dictionary instead of loading the store.
  std::unique_ptr<QuarrinModuleCache> emptyCache() {
    auto cache = std::make_unique<QuarrinModuleCache>();
    cache->setCacheDict(make<MutableDictionary>());
    cache->setDirty(false);
    return cache;
  }

  static Ref<MutableArray> browserInfo(std::string_view kind, bool withIcon) {
    auto entry = make<MutableDictionary>();
    entry->set("Printer Browser Kind", String::make(kind));
    if (withIcon) entry->set("Printer Browser Icons", Data::copy(std::string_view("PNG")));
    auto info = make<MutableArray>();
    info->append(entry);
    return info;
  }

  size_t countLogged(std::string_view text) const {
    return std::ranges::count_if(log_.lines(), [&](const std::string& line) {
      return line.find(text) != std::string::npos;
    });
  }
  // A descriptor reading the bytes given.
  static int pipeWith(std::string_view bytes) {
    int ends[2];
    if (pipe(ends) != 0) return -1;
    if (write(ends[1], bytes.data(), bytes.size()) != ssize_t(bytes.size())) std::abort();
    close(ends[1]);
    return ends[0];
  }

  qrtest::TempDir dir_;
  qr::test::CapturedLog log_;
};

TEST_F(ModuleCache, AnEntryIsCurrentOnlyWhileTheBundleVersionIsUnchanged) {
  auto cache = emptyCache();
  auto url = module("Laser", "1.0");
  auto usb = String::make("USB"), net = String::make("DNSSD");
  cache->addInfo(browserInfo("laser", false).get(), url.get(), usb.get());
  cache->addInfo(browserInfo("laser-net", false).get(), url.get(), net.get());
  ASSERT_TRUE(cache->getInfoForPrinterModule(url.get(), usb.get()));
  cache->setDirty(false);

  module("Laser", "1.1");
  EXPECT_FALSE(cache->getInfoForPrinterModule(url.get(), usb.get()));
  EXPECT_TRUE(cache->dirty());
  EXPECT_EQ(cache->cacheDictionary()->count(), 0u) << "the whole entry goes, every connection";
  EXPECT_FALSE(cache->getInfoForPrinterModule(url.get(), net.get()));

  cache->addInfo(browserInfo("laser2", false).get(), url.get(), usb.get());
  auto* entry = cache->cacheDictionary()->getAs<Dictionary>(url->absoluteString());
  ASSERT_TRUE(entry);
  EXPECT_EQ(entry->count(), 2u);
  EXPECT_TRUE(cast<String>(entry->get("Bundle Version"))->equals("1.1"));
}

TEST_F(ModuleCache, ACurrentEntryWithoutTheConnectionKeepsEverything) {
  auto cache = emptyCache();
  auto url = module("Ink", "2");
  cache->addInfo(browserInfo("ink", false).get(), url.get(), String::make("USB").get());
  cache->setDirty(false);
  EXPECT_FALSE(cache->getInfoForPrinterModule(url.get(), String::make("Quellnet").get()));
  EXPECT_FALSE(cache->dirty());
  EXPECT_EQ(cache->cacheDictionary()->count(), 1u);
}

TEST_F(ModuleCache, IconsAreStrippedOnTheWayInAndOutAndCopiesAreIndependent) {
  auto cache = emptyCache();
  auto url = module("Photo", "1");
  auto usb = String::make("USB");
  auto given = browserInfo("photo", true);
  cache->addInfo(given.get(), url.get(), usb.get());
  EXPECT_TRUE(cast<Dictionary>(given->at(0))->get("Printer Browser Icons"))
      << "the caller's array is not changed";

  // An icon that reached the dictionary some other way is still not handed out.
  auto* stored = cache->cacheDictionary()->getAs<Dictionary>(url->absoluteString());
  auto* storedInfo = cast<MutableArray>(stored->get("USB"));
  ASSERT_TRUE(storedInfo);
  EXPECT_FALSE(cast<Dictionary>(storedInfo->at(0))->get("Printer Browser Icons"));
  cast<MutableDictionary>(storedInfo->at(0))
      ->set("Printer Browser Icons", Data::copy(std::string_view("x")));

  auto out = cache->getInfoForPrinterModule(url.get(), usb.get());
  ASSERT_TRUE(out);
  auto* first = cast<MutableDictionary>(out->at(0));
  ASSERT_TRUE(first) << "handed out fully mutable";
  EXPECT_FALSE(first->get("Printer Browser Icons"));
  EXPECT_TRUE(cast<MutableString>(first->get("Printer Browser Kind")));
  first->set("Printer Browser Kind", String::make("changed"));
  auto again = cache->getInfoForPrinterModule(url.get(), usb.get());
  EXPECT_TRUE(
      cast<String>(cast<Dictionary>(again->at(0))->get("Printer Browser Kind"))->equals("photo"));
}

TEST_F(ModuleCache, NilInfoIsARecordedEmptyAnswerAndNilConnectionStoresNothing) {
  auto cache = emptyCache();
  auto url = module("Quiet", "1");
  auto usb = String::make("USB");
  cache->addInfo(nullptr, url.get(), usb.get());
  auto out = cache->getInfoForPrinterModule(url.get(), usb.get());
  ASSERT_TRUE(out) << "an empty array, not nil";
  EXPECT_EQ(out->count(), 0u);

  auto other = module("NoConn", "1");
  cache->setDirty(false);
  cache->addInfo(browserInfo("x", false).get(), other.get(), nullptr);
  EXPECT_TRUE(cache->dirty());
  auto* entry = cache->cacheDictionary()->getAs<Dictionary>(other->absoluteString());
  ASSERT_TRUE(entry);
  EXPECT_EQ(entry->count(), 0u) << "neither value nor version";
  cache->setDirty(false);
  EXPECT_FALSE(cache->getInfoForPrinterModule(other.get(), usb.get()))
      << "an entry without a version is never current";
  EXPECT_FALSE(cache->cacheDictionary()->get(other->absoluteString())) << "and is dropped";
  EXPECT_TRUE(cache->dirty());
}

TEST_F(ModuleCache, IOModuleEntriesKeepEarlierValuesAndAlwaysTheirVersion) {
  auto cache = emptyCache();
  auto url = module("IO", "3.0");
  Ref<String> connection = String::make("sentinel"), browser = String::make("sentinel");
  cache->addInfoForIOModule(url.get(), nullptr, nullptr);
  ASSERT_TRUE(cache->getInfoForIOModule(url.get(), &connection, &browser));
  EXPECT_FALSE(connection);
  EXPECT_FALSE(browser);

  cache->addInfoForIOModule(url.get(), String::make("USB").get(), String::make("B.plugin").get());
  cache->addInfoForIOModule(url.get(), nullptr, String::make("C.plugin").get());
  ASSERT_TRUE(cache->getInfoForIOModule(url.get(), &connection, nullptr));
  EXPECT_TRUE(connection->equals("USB"));
  ASSERT_TRUE(cache->getInfoForIOModule(url.get(), nullptr, &browser));
  EXPECT_TRUE(browser->equals("C.plugin"));

  auto missing = module("Gone", "1");
  connection = String::make("untouched");
  EXPECT_FALSE(cache->getInfoForIOModule(missing.get(), &connection, nullptr));
  EXPECT_TRUE(connection->equals("untouched"));
  EXPECT_FALSE(cache->getInfoForIOModule(nullptr, &connection, nullptr));
}

TEST_F(ModuleCache, AMissingShortVersionIsLoggedAtEveryAddAndLookup) {
  auto cache = emptyCache();
  auto url = module("NoVersion", "");
  auto usb = String::make("USB");
  cache->addInfo(browserInfo("x", false).get(), url.get(), usb.get());
  cache->addInfoForIOModule(url.get(), usb.get(), nullptr);
  EXPECT_FALSE(cache->getInfoForPrinterModule(url.get(), usb.get()));
  EXPECT_EQ(countLogged("Module is missing short version: " + url->absoluteString()), 3u);
  // The stale entry is gone, so a lookup finds nothing to compare and logs nothing.
  EXPECT_FALSE(cache->getInfoForPrinterModule(url.get(), usb.get()));
  EXPECT_EQ(countLogged("Module is missing short version"), 3u);
}

TEST_F(ModuleCache, TheChangedFlagFollowsLoadingWritingAndEqualReplacement) {
  QuarrinModuleCache cache;
  EXPECT_FALSE(cache.writeCache()) << "an untouched cache writes nothing";
  EXPECT_FALSE(std::filesystem::exists(dir_ / "prefs.plist"));

  auto snapshot = cache.cacheDictionary();  // loads: nothing stored, no resource
  EXPECT_EQ(countLogged("Could not load internal printer module cache."), 1u);
  EXPECT_EQ(snapshot->count(), 0u);
  EXPECT_TRUE(cache.dirty());
  EXPECT_TRUE(cache.writeCache());
  EXPECT_FALSE(cache.writeCache());
  auto stored = cast<Dictionary>(readPropertyListFile(dir_ / "prefs.plist"));
  ASSERT_TRUE(stored && stored->getAs<Dictionary>("pmcache 5"));

  auto equalContents = make<MutableDictionary>();
  cache.setCacheDict(equalContents);
  EXPECT_FALSE(cache.dirty()) << "equal contents change nothing";
  auto different = make<MutableDictionary>();
  different->set("file:///x/", make<MutableDictionary>());
  cache.setCacheDict(different);
  EXPECT_TRUE(cache.dirty());
  cache.setDirty(false);
  auto sameAgain = make<MutableDictionary>();
  sameAgain->set("file:///x/", make<MutableDictionary>());
  cache.setCacheDict(sameAgain);
  EXPECT_FALSE(cache.dirty());
  // The object held is still the first of the equal ones.
  cast<MutableDictionary>(different)->set("file:///y/", make<MutableDictionary>());
  EXPECT_EQ(cache.cacheDictionary()->count(), 2u);
}

TEST_F(ModuleCache, AStoredCacheWinsOverTheDefaultResource) {
  qrtest::writeText(dir_ / "Zephrin.framework/Resources/com.varnex.pmcache.xml",
                    "<plist version=\"1.0\"><dict><key>from-resource</key><dict/></dict></plist>");
  {
    QuarrinModuleCache cache;
    EXPECT_TRUE(cache.cacheDictionary()->get("from-resource"));
    EXPECT_TRUE(cache.writeCache());
  }
  qrtest::writeText(dir_ / "Zephrin.framework/Resources/com.varnex.pmcache.xml",
                    "<plist version=\"1.0\"><dict><key>changed</key><dict/></dict></plist>");
  QuarrinModuleCache cache;
  auto dict = cache.cacheDictionary();
  EXPECT_TRUE(dict->get("from-resource")) << "loaded from the store";
  EXPECT_FALSE(dict->get("changed"));
  EXPECT_EQ(countLogged("Could not load"), 0u);
}

TEST_F(ModuleCache, ReadingEmptyOrUnparsableInputChangesNothing) {
  QuarrinModuleCache cache;
  for (std::string_view input : {"", "{{{"}) {
    int fd = pipeWith(input);
    EXPECT_FALSE(cache.readFromFd(fd)) << input;
    close(fd);
  }
  EXPECT_TRUE(log_.lines().empty());
  EXPECT_FALSE(cache.dirty());
}

TEST_F(ModuleCache, WhatIsWrittenToADescriptorReadsBackEqualInAFreshProcess) {
  auto cache = emptyCache();
  auto url = module("RoundTrip", "1.2.3");
  cache->addInfo(browserInfo("r\xC3\xA9seau", true).get(), url.get(), String::make("DNSSD").get());
  cache->addInfoForIOModule(module("IO", "9").get(), String::make("USB").get(), nullptr);
  std::string file = dir_ / "cache.xml";
  int fd = open(file.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
  ASSERT_TRUE(cache->writeToFd(fd));
  close(fd);
  auto expected = cache->cacheDictionary();

  pid_t child = fork();
  if (child == 0) {
    QuarrinModuleCache fresh;
    bool changed = fresh.readFromFd(open(file.c_str(), O_RDONLY));
    _exit(changed && fresh.cacheDictionary()->isEqual(*expected) ? 0 : 1);
  }
  int status = 0;
  waitpid(child, &status, 0);
  EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
}

}  // namespace
