#include "bundles/bundle.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstdio>
#include <thread>

#include "platform/file_io.h"
#include "support/temp_dir.h"
#include "values/string.h"

using namespace qr;
using qrtest::EnvGuard;
using qrtest::infoPlist;
using qrtest::TempDir;

namespace {

const char kEvilExecutable[] = "<key>CFBundleExecutable</key><string>../../lib.so</string>\n";

// Clears every locale variable, then sets the ones given.
void setLocale(EnvGuard& env, std::optional<std::string> lang,
               std::optional<std::string> language = {}, std::optional<std::string> lcAll = {},
               std::optional<std::string> lcMessages = {}) {
  env.set("LANGUAGE", language);
  env.set("LC_ALL", lcAll);
  env.set("LC_MESSAGES", lcMessages);
  env.set("LANG", lang);
}

std::string folderOf(const std::optional<std::string>& path) {
  if (!path) return "(none)";
  std::string dir = path->substr(0, path->rfind('/'));
  return dir.substr(dir.rfind('/') + 1);
}

// Moves the file's times an hour back, so its stamp is no longer "racy".
void ageFile(const std::string& path) {
  struct timespec times[2];
  clock_gettime(CLOCK_REALTIME, &times[0]);
  times[0].tv_sec -= 3600;
  times[1] = times[0];
  ASSERT_EQ(utimensat(AT_FDCWD, path.c_str(), times, 0), 0);
}

std::string versionOf(const std::string& bundle) {
  auto b = Bundle::open(bundle);
  return b && b->shortVersionString() ? b->shortVersionString()->utf8() : "(none)";
}

// UTF-16 with a byte-order mark, in either byte order.
std::string utf16Bytes(std::u16string_view text, bool little) {
  std::string out;
  for (char16_t c : u"\uFEFF" + std::u16string(text)) {
    char hi = char(c >> 8), lo = char(c & 0xFF);
    out += little ? std::string{lo, hi} : std::string{hi, lo};
  }
  return out;
}

}  // namespace

TEST(Bundle, ReadsInfoFromContentsOrFromResourcesOfAFlatBundle) {
  TempDir dir;
  dir.write("Full.plugin/Contents/Info.plist",
            infoPlist("com.example.full", "2.1",
                      "<key>CFBundleExecutable</key><string>full.so</string>\n"));
  dir.write("Flat.bundle/Resources/Info.plist", infoPlist("com.example.flat", "1.0"));
  dir.write("Evil.plugin/Contents/Info.plist", infoPlist("com.example.evil", "1", kEvilExecutable));

  auto full = Bundle::open(dir / "Full.plugin/");
  ASSERT_TRUE(full);
  EXPECT_EQ(full->path(), dir / "Full.plugin") << "trailing slashes are dropped";
  EXPECT_EQ(describe(full->identifier()), "com.example.full");
  EXPECT_EQ(describe(full->shortVersionString()), "2.1");
  EXPECT_EQ(full->executablePath(), dir / "Full.plugin/Contents/Linux/full.so");

  auto flat = Bundle::open(*URL::fileURL(dir / "Flat.bundle", true));
  ASSERT_TRUE(flat);
  EXPECT_EQ(describe(flat->identifier()), "com.example.flat");
  EXPECT_FALSE(flat->executablePath()) << "no CFBundleExecutable";
  EXPECT_FALSE(Bundle::open(dir / "Evil.plugin")->executablePath()) << "it would leave the bundle";
}

TEST(Bundle, NoDirectoryNoBundleAndBrokenInfoNoValues) {
  TempDir dir;
  EXPECT_FALSE(Bundle::open(dir / "Missing.plugin"));
  EXPECT_FALSE(Bundle::open(dir.write("File.plugin", "not a directory")));
  EXPECT_FALSE(Bundle::open(""));

  // A directory is a bundle even when its Info dictionary is missing or broken.
  std::filesystem::create_directories(dir / "Empty.plugin/Contents");
  dir.write("Broken.plugin/Contents/Info.plist", "<plist><dict><key>x</key>");
  dir.write("Array.plugin/Contents/Info.plist", "<plist version=\"1.0\"><array/></plist>");
  for (const char* name : {"Empty.plugin", "Broken.plugin", "Array.plugin"}) {
    auto bundle = Bundle::open(dir / name);
    ASSERT_TRUE(bundle) << name;
    EXPECT_FALSE(bundle->infoDictionary()) << name;
    EXPECT_FALSE(bundle->identifier()) << name;
  }

  // A bundle that goes away is gone for the next open, cached or not.
  dir.write("Gone.plugin/Contents/Info.plist", infoPlist("com.example.gone", "1"));
  ASSERT_TRUE(Bundle::open(dir / "Gone.plugin"));
  std::filesystem::remove_all(dir / "Gone.plugin");
  EXPECT_FALSE(Bundle::open(dir / "Gone.plugin"));
}

TEST(Localization, OrderFollowsTheFirstLocaleVariableThenRegionThenFallbacks) {
  using O = std::optional<std::string>;
  struct Case {
    O lang, language, lcAll, lcMessages;
    const char* region;
    std::string expected;  // folder names without ".lproj"
  } cases[] = {
      {"de_DE.UTF-8", {}, {}, {}, "fr", "de_DE de fr en English Base"},
      {"C", {}, {}, {}, "fr", "fr en English Base"},
      {{}, {}, {}, {}, "", "en English Base"},
      // LANGUAGE lists several; modifiers and code sets go; repeats are dropped.
      {"it_IT",
       "sr_RS@latin:pt_BR.UTF-8:en",
       {},
       {},
       "English",
       "sr_RS sr pt_BR pt en English Base"},
      // LC_ALL outranks LANG, and "POSIX" in it means no language at all.
      {"de_DE", {}, "POSIX", {}, "", "en English Base"},
      // Set but empty counts as unset.
      {"de_DE", {}, "", "nl_BE", "", "nl_BE nl en English Base"},
      // Names that would leave the resources folder are not used.
      {"../../etc", {}, {}, {}, "..", "en English Base"},
  };
  EnvGuard env;
  for (const Case& c : cases) {
    setLocale(env, c.lang, c.language, c.lcAll, c.lcMessages);
    std::string order;
    for (const auto& folder : localizationOrder(c.region))
      order += (order.empty() ? "" : " ") + folder.substr(0, folder.size() - 6);
    EXPECT_EQ(order, c.expected) << "LANG=" << c.lang.value_or("(unset)") << " region " << c.region;
  }
}

TEST(Bundle, ResourcesAreFoundInLocalizationOrderThenAtTheTop) {
  TempDir dir;
  dir.write(
      "R.plugin/Contents/Info.plist",
      infoPlist("com.example.r", "1", "<key>CFBundleDevelopmentRegion</key><string>fr</string>\n"));
  const std::vector<std::string> folders = {"de_DE.lproj", "de.lproj",      "fr.lproj",
                                            "en.lproj",    "English.lproj", "Base.lproj"};
  const std::string resources = "R.plugin/Contents/Resources/";
  dir.write(resources + "x.txt", "");
  dir.write(resources + "only-top.txt", "");
  auto bundle = Bundle::open(dir / "R.plugin");
  ASSERT_TRUE(bundle);

  EnvGuard env;
  for (const char* lang : {"de_DE.UTF-8", "C", "(unset)"}) {
    SCOPED_TRACE(lang);
    for (const auto& folder : folders) dir.write(resources + folder + "/x.txt", "");
    setLocale(env,
              std::string(lang) == "(unset)" ? std::nullopt : std::optional<std::string>(lang));
    // Remove the best match each time: the next in order must be found.
    for (size_t i = std::string(lang) == "de_DE.UTF-8" ? 0 : 2; i < folders.size(); ++i) {
      EXPECT_EQ(folderOf(bundle->resourcePath("x", "txt")), folders[i]);
      std::filesystem::remove(dir / (resources + folders[i] + "/x.txt"));
    }
    EXPECT_EQ(folderOf(bundle->resourcePath("x", "txt")), "Resources");
  }
  EXPECT_EQ(folderOf(bundle->resourcePath("only-top", "txt")), "Resources");
  EXPECT_FALSE(bundle->resourcePath("absent", "txt"));
  EXPECT_FALSE(bundle->resourcePath("../Info", "plist"));
}

TEST(Bundle, StringsTablesComeFromTheCurrentLocalizationInAnyEncoding) {
  TempDir dir;
  const std::string tables = "S.plugin/Contents/Resources/";
  dir.write("S.plugin/Contents/Info.plist", infoPlist("com.example.s", "1"));
  dir.write(
      tables + "de.lproj/Localizable.strings",
      utf16Bytes(u"/* titles */\n\"com.example.s\" = \"Dr\u00FCcker \u00FCber USB\";\n", true));
  dir.write(tables + "fr.lproj/Localizable.strings",
            utf16Bytes(u"\"com.example.s\" = \"Imprimantes \u00E0 USB\";", false));
  dir.write(tables + "en.lproj/Localizable.strings",
            "\"com.example.s\" = \"Printers over USB\";\n\"USB\" = \"USB printers\";\n");
  auto bundle = Bundle::open(dir / "S.plugin");
  ASSERT_TRUE(bundle);
  auto absent = String::make("!identifier");
  auto lookUp = [&](const char* key, const Ref<String>& fallback) {
    Ref<String> s = bundle->localizedString(*String::make(key), fallback);
    return s == fallback ? std::string("(absent)") : describe(s.get());
  };

  EnvGuard env;
  setLocale(env, "de_DE.UTF-8");
  EXPECT_EQ(lookUp("com.example.s", absent),
            "Dr\xC3\xBC"
            "cker \xC3\xBC"
            "ber USB");
  EXPECT_EQ(lookUp("USB", absent), "(absent)") << "the first table found decides";
  setLocale(env, "fr_FR.UTF-8");
  EXPECT_EQ(lookUp("com.example.s", absent), "Imprimantes \xC3\xA0 USB");
  setLocale(env, "C");
  EXPECT_EQ(lookUp("com.example.s", absent), "Printers over USB");
  setLocale(env, std::nullopt);
  EXPECT_EQ(lookUp("USB", absent), "USB printers");
  EXPECT_EQ(lookUp("missing", absent), "(absent)");
  EXPECT_EQ(lookUp("missing", nullptr), "(absent)");

  // A bundle with no table gives the value for an absent key.
  dir.write("T.plugin/Contents/Info.plist", infoPlist("com.example.t", "1"));
  EXPECT_EQ(Bundle::open(dir / "T.plugin")->localizedString(*String::make("x"), absent), absent);
}

TEST(BundleCache, UnchangedInfoIsSharedAndAnyChangeIsSeen) {
  TempDir dir;
  const std::string bundle = dir / "C.plugin";
  std::string info = dir.write("C.plugin/Contents/Info.plist", infoPlist("com.example.c", "1.0"));
  ageFile(info);
  auto first = Bundle::open(bundle);
  auto second = Bundle::open(bundle);
  ASSERT_TRUE(first && second);
  EXPECT_EQ(first->infoDictionary(), second->infoDictionary()) << "not read again";

  // Rewritten in place at once, same size: seen, though within one clock tick.
  qrtest::writeText(info, infoPlist("com.example.c", "1.1"));
  EXPECT_EQ(versionOf(bundle), "1.1");
  EXPECT_EQ(describe(first->shortVersionString()), "1.0") << "earlier objects keep their snapshot";

  // Rewritten in place with the same size and its old modification time put back.
  ageFile(info);
  struct stat before;
  ASSERT_EQ(stat(info.c_str(), &before), 0);
  EXPECT_EQ(versionOf(bundle), "1.1");
  qrtest::writeText(info, infoPlist("com.example.c", "1.2"));
  struct timespec times[2] = {before.st_atim, before.st_mtim};
  ASSERT_EQ(utimensat(AT_FDCWD, info.c_str(), times, 0), 0);
  EXPECT_EQ(versionOf(bundle), "1.2");

  // Replaced by rename, and removed.
  ASSERT_EQ(
      std::rename(dir.write("new.plist", infoPlist("com.example.c", "2.0")).c_str(), info.c_str()),
      0);
  EXPECT_EQ(versionOf(bundle), "2.0");
  std::filesystem::remove(info);
  ASSERT_TRUE(Bundle::open(bundle));
  EXPECT_EQ(versionOf(bundle), "(none)");
}

TEST(BundleCache, ConcurrentOpensWhileTheInfoChanges) {
  TempDir dir;
  std::string info = dir.write("P.plugin/Contents/Info.plist", infoPlist("com.example.p", "0"));
  std::atomic<bool> stop{false};
  std::atomic<int> bad{0};
  std::vector<std::thread> readers;
  for (int t = 0; t < 4; ++t)
    readers.emplace_back([&] {
      while (!stop) {
        auto bundle = Bundle::open(dir / "P.plugin");
        // Replaced by rename, the file is always whole.
        if (!bundle || !bundle->shortVersionString() || !bundle->identifier()) ++bad;
      }
    });
  for (int i = 1; i <= 200; ++i)
    ASSERT_EQ(
        std::rename(dir.write("next.plist", infoPlist("com.example.p", std::to_string(i))).c_str(),
                    info.c_str()),
        0);
  stop = true;
  for (auto& t : readers) t.join();
  EXPECT_EQ(bad, 0);
  EXPECT_EQ(versionOf(dir / "P.plugin"), "200");
}

TEST(BundleCache, ABundleStillHeldIsFoundAfterManyOthersWereOpened) {
  // A run keeps every module's bundle open and asks each for its version
  // again after opening thousands of others: those lookups must not parse.
  TempDir dir;
  std::string info = dir.write("Held.plugin/Contents/Info.plist", infoPlist("com.example.h", "1"));
  ageFile(info);
  auto held = Bundle::open(dir / "Held.plugin");
  ASSERT_TRUE(held && held->infoDictionary());
  for (int i = 0; i < 1500; ++i) {
    std::string name = "M" + std::to_string(i) + ".plugin";
    ageFile(dir.write(name + "/Contents/Info.plist", infoPlist("com.example.m", "1")));
    ASSERT_TRUE(Bundle::open(dir / name));
  }
  auto again = Bundle::open(dir / "Held.plugin");
  EXPECT_EQ(again->infoDictionary(), held->infoDictionary()) << "parsed again";

  // Still checked at every open: a change is seen all the same.
  ASSERT_TRUE(qr::writeFile(info, infoPlist("com.example.h", "2")));
  EXPECT_EQ(Bundle::open(dir / "Held.plugin")->shortVersionString()->utf8(), "2");
  EXPECT_EQ(held->shortVersionString()->utf8(), "1");
}
