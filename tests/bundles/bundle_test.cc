#include "bundles/bundle.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <quarrin/plugin.h>

#include <sstream>

#include "bundles/plugin_model.h"
#include "fixtures/fixture_support.h"
#include "support/temp_dir.h"

using namespace qr;
using qrtest::infoPlist;
namespace fs = std::filesystem;

// Its stamp is no longer "racy": an unchanged file is trusted without a read.
static void age(const std::string& path) {
  fs::last_write_time(path, fs::file_time_type::clock::now() - std::chrono::hours(1));
}

TEST(Bundle, AnyDirectoryIsABundleWithItsInfoInContentsOrResources) {
  qrtest::TempDir dir;
  const std::string exe = "<key>CFBundleExecutable</key><string>";
  // A file written, its first folder the bundle; the bundle's identifier and
  // executable within it, or "none" for no bundle.
  const std::tuple<const char*, std::string, std::string> cases[] = {
      {"Full.plugin/Contents/Info.plist", infoPlist("full", "2", exe + "f.so</string>"),
       "full /Contents/Linux/f.so"},
      {"Flat.bundle/Resources/Info.plist", infoPlist("flat", "1"), "flat "},
      // The shared object must lie inside the bundle.
      {"Up.plugin/Contents/Info.plist", infoPlist("up", "1", exe + "../a.so</string>"), "up "},
      {"Broken.plugin/Contents/Info.plist", "<plist><dict><key>x</key>", "(null) "},
      {"File.plugin", "not a directory", "none"},
  };
  for (const auto& [file, text, expected] : cases) {
    std::string name = dir / fs::path(file).begin()->string();
    dir.write(file, text);
    auto bundle = Bundle::open(name + "/");  // its path drops the slash
    EXPECT_EQ(bool(PlugIn::create(*URL::fileURL(name, true))), bundle && bundle->infoDictionary());
    EXPECT_EQ(!bundle ? "none"
                      : describe(bundle->identifier()) + " " +
                            bundle->executablePath().value_or(name).substr(name.size()),
              expected);
  }
  EXPECT_FALSE(Bundle::open(dir / "Missing.plugin") || Bundle::open(""));
}

TEST(Localization, OrderFollowsTheFirstLocaleVariableThenRegionThenFallbacks) {
  // The locale variables set, the development region, and the folders
  // without ".lproj".
  const std::tuple<std::string, const char*, std::string> cases[] = {
      {"LANG=de_DE.UTF-8", "fr", "de_DE de fr en English Base"},
      {"LANG=C", "", "en English Base"},
      // LANGUAGE lists several; modifiers and code sets go; repeats are dropped.
      {"LANG=it_IT LANGUAGE=sr_RS@latin:pt_BR.UTF-8:en", "English",
       "sr_RS sr pt_BR pt en English Base"},
      // LC_ALL outranks LC_MESSAGES and LANG, and "POSIX" in it means no language at all.
      {"LANG=de_DE LC_ALL=POSIX LC_MESSAGES=nl_BE", "", "en English Base"},
      // Set but empty counts as unset.
      {"LANG=de_DE LC_ALL= LC_MESSAGES=nl_BE", "", "nl_BE nl en English Base"},
      // Names that would leave the resources folder are not used.
      {"LANG=de/../../etc", "a/b", "en English Base"},
  };
  for (const auto& [variables, region, expected] : cases) {
    qrtest::EnvGuard env;
    for (const char* name : {"LANGUAGE", "LC_ALL", "LC_MESSAGES", "LANG"}) env.set(name, {});
    std::istringstream in(variables);
    for (std::string v; in >> v;) env.set(v.substr(0, v.find('=')), v.substr(v.find('=') + 1));
    std::string order;
    for (const auto& folder : localizationOrder(region))
      order += (order.empty() ? "" : " ") + folder.substr(0, folder.size() - 6);
    EXPECT_EQ(order, expected) << variables;
  }
}

TEST(Bundle, StringsComeFromTheFirstLocalizationWithATableThenTheTop) {
  qrtest::TempDir dir;
  dir.write("R.plugin/Contents/Info.plist",
            infoPlist("r", "1", "<key>CFBundleDevelopmentRegion</key><string>fr</string>"));
  std::string fr = dir.write("R.plugin/Contents/Resources/fr.lproj/Localizable.strings", "k = fr;");
  std::string top = dir.write("R.plugin/Contents/Resources/Localizable.strings", "k = top; t = x;");
  auto bundle = Bundle::open(dir / "R.plugin");
  auto lookUp = [&](const char* key) {
    return describe(bundle->localizedString(*String::make(key), String::make("-")).get());
  };
  qrtest::EnvGuard env;
  env.set("LANGUAGE", "de");  // no table there: the development region's comes next
  EXPECT_EQ(lookUp("k") + lookUp("t"), "fr-") << "the first table found decides";
  fs::remove(fr);
  EXPECT_EQ(lookUp("k") + lookUp("t"), "topx");
  qrtest::writeText(top, "k = new;");
  EXPECT_EQ(lookUp("k"), "new") << "a changed table is read again";
  EXPECT_FALSE(bundle->resourcePath("../Info", "plist")) << "names stay inside";
}

TEST(BundleCache, UnchangedInfoIsSharedAndEveryChangeIsSeen) {
  qrtest::TempDir dir;
  const std::string bundle = dir / "C.plugin";
  std::string info = dir.write("C.plugin/Contents/Info.plist", infoPlist("c", "1.0"));
  auto version = [&] { return describe(Bundle::open(bundle)->shortVersionString()); };
  EXPECT_EQ(version(), "1.0");
  // Rewritten in place at once, same size: seen, though within one clock tick.
  qrtest::writeText(info, infoPlist("c", "1.1"));
  EXPECT_EQ(version(), "1.1");
  age(info);
  auto first = Bundle::open(bundle);
  // A run holds every module's bundle and asks it again after opening
  // thousands of others, more than the cache keeps: still no parse. Here
  // the others are 1100 paths of the one directory.
  for (std::string other = dir.path(); other.size() < dir.path().size() + 2200;)
    ASSERT_TRUE(Bundle::open(other += "/."));
  EXPECT_EQ(first->infoDictionary(), Bundle::open(bundle)->infoDictionary()) << "read again";
  // Rewritten in place, same size, its modification time put back.
  auto modified = fs::last_write_time(info);
  qrtest::writeText(info, infoPlist("c", "1.2"));
  fs::last_write_time(info, modified);
  EXPECT_EQ(version(), "1.2");
  fs::rename(dir.write("new", infoPlist("c", "2.0")), info);
  EXPECT_EQ(version(), "2.0");
  fs::remove(info);
  EXPECT_EQ(version(), "(null)");
  EXPECT_EQ(describe(first->shortVersionString()), "1.1") << "earlier objects keep their snapshot";
  // Gone while the cache kept it: forgotten, and the thousand bundles
  // opened next push nothing out that is no longer there.
  fs::remove_all(bundle);
  EXPECT_FALSE(Bundle::open(bundle));
  for (std::string other = dir.path(); other.size() < dir.path().size() + 2200;)
    ASSERT_TRUE(Bundle::open(other += "/."));
}

TEST(PlugIn, FactoriesOfATypeComeInThePlugInsOrderWithoutMalformedOnes) {
  auto plugin = PlugIn::create(*qr::test::fixtureURL("c_declarations"));
  ASSERT_TRUE(plugin);
  // Type, and its factories in order or "(undeclared)".
  const std::pair<const char*, std::string> cases[] = {
      {QR_PM_TYPE_ID, FIXTURE_FACTORY_B " " FIXTURE_FACTORY_A},
      {QR_IOM_TYPE_ID, FIXTURE_FACTORY_A},  // declared in lower case
      {FIXTURE_TYPE_OTHER, FIXTURE_FACTORY_C " " FIXTURE_FACTORY_UNDECLARED},
      {QR_PBM_TYPE_ID, ""},
      {QR_PBM_VERSION_ID, "(undeclared)"},
  };
  for (const auto& [type, expected] : cases) {
    auto factories = plugin->factoriesForType(*UUID::fromString(type));
    std::string texts = factories ? "" : "(undeclared)";
    for (size_t i = 0; factories && i < factories->count(); ++i)
      texts += (i ? " " : "") + describe(factories->at(i));
    EXPECT_EQ(texts, expected) << type;
  }
}

TEST(PlugIn, EachWayOfFailingGivesNoInstanceAndALogLine) {
  qr::test::FixtureCalls calls;
  // Fixture, factory, type, and what every log line names.
  const std::tuple<const char*, const char*, const char*, const char*> cases[] = {
      {"c_factory_null", FIXTURE_FACTORY_A, QR_IOM_TYPE_ID, "FixtureFactory"},
      // Code that cannot be loaded is reported once, however often it is asked for.
      {"no_executable", FIXTURE_FACTORY_A, QR_IOM_TYPE_ID, "no_executable"},
      {"broken_executable", FIXTURE_FACTORY_A, QR_IOM_TYPE_ID, "broken_executable"},
      {"c_declarations", FIXTURE_FACTORY_C, FIXTURE_TYPE_OTHER, "NoSuchFunction"},
      {"c_declarations", FIXTURE_FACTORY_UNDECLARED, FIXTURE_TYPE_OTHER, "4A0F"},  // its UUID
      // Declared, but not for this type.
      {"c_declarations", FIXTURE_FACTORY_A, FIXTURE_TYPE_OTHER, FIXTURE_TYPE_OTHER},
  };
  for (const auto& [fixture, factory, type, logged] : cases) {
    qr::test::CapturedLog log;
    auto plugin = PlugIn::create(*qr::test::fixtureURL(fixture));
    for (int attempt = 0; attempt < 3; ++attempt)
      EXPECT_FALSE(plugin->createInstance(*UUID::fromString(factory), *UUID::fromString(type)));
    EXPECT_THAT(log.lines(), ::testing::Each(::testing::HasSubstr(logged))) << fixture;
    EXPECT_EQ(log.lines().size(), std::string(fixture).ends_with("executable") ? 1u : 3u);
  }
  EXPECT_EQ(calls.count("c_factory_null create"), 3u);
}
