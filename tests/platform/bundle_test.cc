#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <thread>

#include "platform/bundle.h"
#include "platform/string.h"
#include "test_files.h"

using namespace qr;
using qr::testing::EnvGuard;
using qr::testing::TempDir;

namespace {

std::string infoPlist(const std::string& identifier, const std::string& version,
                      const std::string& extra = "") {
  return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n<dict>\n"
         "\t<key>CFBundleIdentifier</key>\n\t<string>" +
         identifier +
         "</string>\n"
         "\t<key>CFBundleShortVersionString</key>\n\t<string>" +
         version + "</string>\n" + extra + "</dict>\n</plist>\n";
}

// Clears every locale variable, then sets the ones given.
void setLocale(EnvGuard& env, std::optional<std::string> lang,
               std::optional<std::string> language = std::nullopt) {
  env.set("LANGUAGE", language);
  env.set("LC_ALL", std::nullopt);
  env.set("LC_MESSAGES", std::nullopt);
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

}  // namespace

TEST(Bundle, ReadsInfoFromContentsOrFromResourcesOfAFlatBundle) {
  TempDir dir;
  dir.write("Full.plugin/Contents/Info.plist",
            infoPlist("com.example.full", "2.1",
                      "\t<key>CFBundleExecutable</key>\n\t<string>full.so</string>\n"));
  dir.write("Flat.bundle/Resources/Info.plist", infoPlist("com.example.flat", "1.0"));

  auto full = Bundle::open(dir / "Full.plugin/");
  ASSERT_TRUE(full);
  EXPECT_EQ(full->path(), dir / "Full.plugin") << "trailing slashes are dropped";
  ASSERT_TRUE(full->identifier());
  EXPECT_EQ(full->identifier()->utf8(), "com.example.full");
  ASSERT_TRUE(full->shortVersionString());
  EXPECT_EQ(full->shortVersionString()->utf8(), "2.1");
  EXPECT_EQ(full->executablePath(), dir / "Full.plugin/Contents/Linux/full.so");

  auto flat = Bundle::open(*URL::fileURL(dir / "Flat.bundle", true));
  ASSERT_TRUE(flat);
  ASSERT_TRUE(flat->identifier());
  EXPECT_EQ(flat->identifier()->utf8(), "com.example.flat");
  EXPECT_FALSE(flat->executablePath()) << "no CFBundleExecutable";
}

TEST(Bundle, NoDirectoryNoBundleAndBrokenInfoNoValues) {
  TempDir dir;
  EXPECT_FALSE(Bundle::open(dir / "Missing.plugin"));
  EXPECT_FALSE(Bundle::open(dir.write("File.plugin", "not a directory")));
  EXPECT_FALSE(Bundle::open(""));

  // A directory is a bundle even when its Info dictionary is missing or broken.
  std::filesystem::create_directories(dir / "Empty.plugin/Contents");
  auto empty = Bundle::open(dir / "Empty.plugin");
  ASSERT_TRUE(empty);
  EXPECT_FALSE(empty->infoDictionary());
  EXPECT_FALSE(empty->identifier());

  dir.write("Broken.plugin/Contents/Info.plist", "<plist><dict><key>x</key>");
  dir.write("Array.plugin/Contents/Info.plist", "<plist version=\"1.0\"><array/></plist>");
  for (const char* name : {"Broken.plugin", "Array.plugin"}) {
    auto bundle = Bundle::open(dir / name);
    ASSERT_TRUE(bundle) << name;
    EXPECT_FALSE(bundle->infoDictionary()) << name;
  }

  // A bundle that goes away is gone for the next open, cached or not.
  dir.write("Gone.plugin/Contents/Info.plist", infoPlist("com.example.gone", "1"));
  ASSERT_TRUE(Bundle::open(dir / "Gone.plugin"));
  std::filesystem::remove_all(dir / "Gone.plugin");
  EXPECT_FALSE(Bundle::open(dir / "Gone.plugin"));
}

TEST(Bundle, ExecutableNameCannotLeaveTheBundle) {
  TempDir dir;
  dir.write("Evil.plugin/Contents/Info.plist",
            infoPlist("com.example.evil", "1",
                      "\t<key>CFBundleExecutable</key>\n\t<string>../../lib.so</string>\n"));
  auto bundle = Bundle::open(dir / "Evil.plugin");
  ASSERT_TRUE(bundle);
  EXPECT_FALSE(bundle->executablePath());
}

TEST(Localization, OrderFollowsTheFirstLocaleVariableThenRegionThenFallbacks) {
  EnvGuard env;
  using V = std::vector<std::string>;
  setLocale(env, "de_DE.UTF-8");
  EXPECT_EQ(localizationOrder("fr"),
            (V{"de_DE.lproj", "de.lproj", "fr.lproj", "en.lproj", "English.lproj", "Base.lproj"}));
  setLocale(env, "C");
  EXPECT_EQ(localizationOrder("fr"), (V{"fr.lproj", "en.lproj", "English.lproj", "Base.lproj"}));
  setLocale(env, std::nullopt);
  EXPECT_EQ(localizationOrder(""), (V{"en.lproj", "English.lproj", "Base.lproj"}));

  // LANGUAGE lists several; modifiers and code sets go; repeats are dropped.
  setLocale(env, "it_IT", "sr_RS@latin:pt_BR.UTF-8:en");
  EXPECT_EQ(localizationOrder("English"), (V{"sr_RS.lproj", "sr.lproj", "pt_BR.lproj", "pt.lproj",
                                             "en.lproj", "English.lproj", "Base.lproj"}));

  // LC_ALL outranks LANG, and "POSIX" in it means no language at all.
  setLocale(env, "de_DE");
  env.set("LC_ALL", "POSIX");
  EXPECT_EQ(localizationOrder(""), (V{"en.lproj", "English.lproj", "Base.lproj"}));
  env.set("LC_ALL", "");  // set but empty counts as unset
  env.set("LC_MESSAGES", "nl_BE");
  EXPECT_EQ(localizationOrder("")[0], "nl_BE.lproj");

  // Names that would leave the resources folder are not used.
  setLocale(env, "../../etc");
  EXPECT_EQ(localizationOrder("..")[0], "en.lproj");
}

TEST(Bundle, ResourcesAreFoundInLocalizationOrderThenAtTheTop) {
  TempDir dir;
  dir.write("R.plugin/Contents/Info.plist",
            infoPlist("com.example.r", "1",
                      "\t<key>CFBundleDevelopmentRegion</key>\n\t<string>fr</string>\n"));
  const std::vector<std::string> folders = {"de_DE.lproj", "de.lproj",      "fr.lproj",
                                            "en.lproj",    "English.lproj", "Base.lproj"};
  dir.write("R.plugin/Contents/Resources/x.txt", "");
  dir.write("R.plugin/Contents/Resources/only-top.txt", "");
  auto bundle = Bundle::open(dir / "R.plugin");
  ASSERT_TRUE(bundle);

  EnvGuard env;
  for (const char* lang : {"de_DE.UTF-8", "C", "(unset)"}) {
    SCOPED_TRACE(lang);
    std::string resources = "R.plugin/Contents/Resources/";
    for (const auto& folder : folders) dir.write(resources + folder + "/x.txt", "");
    setLocale(env,
              std::string(lang) == "(unset)" ? std::nullopt : std::optional<std::string>(lang));
    // Remove the best match each time: the next in order must be found.
    size_t first = std::string(lang) == "de_DE.UTF-8" ? 0 : 2;
    for (size_t i = first; i < folders.size(); ++i) {
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
  dir.write("S.plugin/Contents/Info.plist", infoPlist("com.example.s", "1"));
  // German table in UTF-16 little-endian with a byte-order mark.
  std::u16string german =
      u"\uFEFF/* titles */\n\"com.example.s\" = \"Dr\u00FCcker \u00FCber USB\";\n";
  std::string germanBytes;
  for (char16_t c : german) germanBytes += char(c & 0xFF), germanBytes += char(c >> 8);
  dir.write("S.plugin/Contents/Resources/de.lproj/Localizable.strings", germanBytes);
  // French in big-endian UTF-16, English in UTF-8.
  std::u16string french = u"\uFEFF\"com.example.s\" = \"Imprimantes \u00E0 USB\";";
  std::string frenchBytes;
  for (char16_t c : french) frenchBytes += char(c >> 8), frenchBytes += char(c & 0xFF);
  dir.write("S.plugin/Contents/Resources/fr.lproj/Localizable.strings", frenchBytes);
  dir.write("S.plugin/Contents/Resources/en.lproj/Localizable.strings",
            "\"com.example.s\" = \"Printers over USB\";\n\"USB\" = \"USB printers\";\n");
  auto bundle = Bundle::open(dir / "S.plugin");
  ASSERT_TRUE(bundle);
  auto key = String::make("com.example.s");
  auto absent = String::make("!identifier");

  EnvGuard env;
  setLocale(env, "de_DE.UTF-8");
  EXPECT_EQ(bundle->localizedString(*key, absent)->utf8(),
            "Dr\xC3\xBC"
            "cker \xC3\xBC"
            "ber USB");
  // The first table found decides, even when it lacks the key.
  EXPECT_EQ(bundle->localizedString(*String::make("USB"), absent), absent);

  setLocale(env, "fr_FR.UTF-8");
  EXPECT_EQ(bundle->localizedString(*key, absent)->utf8(), "Imprimantes \xC3\xA0 USB");
  setLocale(env, "C");
  EXPECT_EQ(bundle->localizedString(*key, absent)->utf8(), "Printers over USB");
  setLocale(env, std::nullopt);
  EXPECT_EQ(bundle->localizedString(*String::make("USB"), absent)->utf8(), "USB printers");
  EXPECT_EQ(bundle->localizedString(*String::make("missing"), absent), absent);
  EXPECT_EQ(bundle->localizedString(*String::make("missing"), nullptr), nullptr);

  // A bundle with no table gives the value for an absent key.
  dir.write("T.plugin/Contents/Info.plist", infoPlist("com.example.t", "1"));
  EXPECT_EQ(Bundle::open(dir / "T.plugin")->localizedString(*key, absent), absent);
}

TEST(BundleCache, UnchangedInfoIsSharedAndAnyChangeIsSeen) {
  TempDir dir;
  std::string info = dir.write("C.plugin/Contents/Info.plist", infoPlist("com.example.c", "1.0"));
  ageFile(info);
  auto first = Bundle::open(dir / "C.plugin");
  auto second = Bundle::open(dir / "C.plugin");
  ASSERT_TRUE(first && second);
  EXPECT_EQ(first->infoDictionary(), second->infoDictionary()) << "not read again";

  // Rewritten in place at once, same size: seen, though within one clock tick.
  ASSERT_TRUE(qr::writeFile(info, infoPlist("com.example.c", "1.1")));
  auto third = Bundle::open(dir / "C.plugin");
  EXPECT_EQ(third->shortVersionString()->utf8(), "1.1");
  EXPECT_EQ(first->shortVersionString()->utf8(), "1.0") << "earlier objects keep their snapshot";

  // Rewritten in place with the same size and its old modification time put back.
  ageFile(info);
  struct stat before;
  ASSERT_EQ(stat(info.c_str(), &before), 0);
  auto fourth = Bundle::open(dir / "C.plugin");
  EXPECT_EQ(fourth->shortVersionString()->utf8(), "1.1");
  ASSERT_TRUE(qr::writeFile(info, infoPlist("com.example.c", "1.2")));
  struct timespec times[2] = {before.st_atim, before.st_mtim};
  ASSERT_EQ(utimensat(AT_FDCWD, info.c_str(), times, 0), 0);
  EXPECT_EQ(Bundle::open(dir / "C.plugin")->shortVersionString()->utf8(), "1.2");

  // Replaced by rename, and removed.
  dir.write("new.plist", infoPlist("com.example.c", "2.0"));
  ASSERT_EQ(std::rename((dir / "new.plist").c_str(), info.c_str()), 0);
  EXPECT_EQ(Bundle::open(dir / "C.plugin")->shortVersionString()->utf8(), "2.0");
  std::filesystem::remove(info);
  auto bare = Bundle::open(dir / "C.plugin");
  ASSERT_TRUE(bare);
  EXPECT_FALSE(bare->shortVersionString());
}

TEST(BundleCache, ConcurrentOpensWhileTheInfoChanges) {
  TempDir dir;
  std::string info = dir.write("P.plugin/Contents/Info.plist", infoPlist("com.example.p", "0"));
  std::atomic<bool> stop{false};
  std::vector<std::thread> readers;
  std::atomic<int> bad{0};
  for (int t = 0; t < 4; ++t)
    readers.emplace_back([&] {
      while (!stop) {
        auto bundle = Bundle::open(dir / "P.plugin");
        String* version = bundle ? bundle->shortVersionString() : nullptr;
        // Replaced by rename, the file is always whole.
        if (!version || !bundle->identifier()) ++bad;
      }
    });
  for (int i = 1; i <= 200; ++i) {
    dir.write("next.plist", infoPlist("com.example.p", std::to_string(i)));
    ASSERT_EQ(std::rename((dir / "next.plist").c_str(), info.c_str()), 0);
  }
  stop = true;
  for (auto& t : readers) t.join();
  EXPECT_EQ(bad, 0);
  EXPECT_EQ(Bundle::open(dir / "P.plugin")->shortVersionString()->utf8(), "200");
}
