// An answer the store cannot carry costs only its own entry, and a store that
// cannot be written leaves the cache marked unstored.
#include <gtest/gtest.h>

#include "cache/module_cache.h"
#include "platform/log.h"
#include "plist/property_list.h"
#include "support/temp_dir.h"
#include "values/array.h"

using namespace qr;

namespace {

Ref<MutableArray> answer(std::string_view kind) {
  auto entry = make<MutableDictionary>();
  entry->set("Printer Browser Kind", String::make(kind));
  auto info = make<MutableArray>();
  info->append(entry);
  return info;
}

TEST(UnstorableAnswer, IsLeftOutAndTheRestIsStored) {
  qrtest::TempDir dir;
  qrtest::EnvGuard env;
  env.set("CACHEWRIGHT_PREFS", dir / "prefs.plist");
  std::vector<std::string> logged;
  LogSink old = setLogSink([&](std::string_view line) {
    if (line.find("cannot carry") != line.npos) logged.emplace_back(line);
  });

  auto sound = URL::fileURL(dir / "Sound.plugin", true);
  auto bad = URL::fileURL(dir / "Bad.plugin", true);
  auto badIOM = URL::fileURL(dir / "BadIO.plugin", true);
  QuarrinModuleCache cache;
  cache.setCacheDict(make<MutableDictionary>());
  cache.addInfo(answer("laser").get(), sound.get(), String::make("USB").get());
  cache.addInfo(answer("ink\x01jet").get(), bad.get(), String::make("USB").get());
  cache.addInfoForIOModule(badIOM.get(), String::fromUTF16(u"US\xFFFE").get(), nullptr);
  setLogSink(old);

  ASSERT_EQ(logged.size(), 2u);
  EXPECT_NE(logged[0].find("Bad.plugin"), std::string::npos) << logged[0];
  EXPECT_NE(logged[0].find("USB"), std::string::npos) << logged[0];
  EXPECT_NE(logged[1].find("BadIO.plugin"), std::string::npos) << logged[1];
  ASSERT_TRUE(cache.writeCache());
  auto store = cast<Dictionary>(readPropertyListFile(dir / "prefs.plist"));
  auto* stored = store ? store->getAs<Dictionary>("pmcache 5") : nullptr;
  ASSERT_TRUE(stored);
  EXPECT_TRUE(stored->get(sound->absoluteString()));
  EXPECT_FALSE(stored->get(bad->absoluteString()));
  EXPECT_FALSE(stored->get(badIOM->absoluteString()));

  // A store that cannot be written leaves the cache dirty, so the run can tell.
  env.set("CACHEWRIGHT_PREFS", "/dev/null/prefs.plist");
  cache.addInfo(answer("laser").get(), sound.get(), String::make("DNSSD").get());
  EXPECT_FALSE(cache.writeCache());
  EXPECT_TRUE(cache.dirty());
}

}  // namespace
