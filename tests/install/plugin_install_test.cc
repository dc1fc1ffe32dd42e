// Installs the project into a scratch prefix and builds plug-ins against it
// the way an outside author would: one with plain cc and pkg-config that
// raises through QrRaise, one with the CMake package and quarrin_add_plugin,
// installed by its own install rule. The installed cachewright then runs over
// both from that prefix, without LD_LIBRARY_PATH.
#include <gtest/gtest.h>
#include <quarrin/plugin.h>

#include "plist/property_list.h"
#include "support/installed_sdk.h"
#include "support/plugin_bundle.h"
#include "support/run_program.h"
#include "values/dictionary.h"

namespace {

const char kFactoryID[] = "6A0E3C55-1F2B-4D8E-9C31-70A4B2E5D901";

// sh -ec kBuild sh CMAKE PREFIX DIR, with PKG_CONFIG_PATH set: builds
// DIR/Raising.so with pkg-config, builds and installs the CMake project's
// plug-in into DIR/plugins/lib/quarrin/Printers, and lists the installed headers.
const char kBuild[] = R"sh(cmake=$1 prefix=$2 dir=$3
exec 3>&1 1>&2
cc -std=c99 -pedantic-errors -Wall -Wextra -Werror -fPIC -shared -DEXTERNAL_RAISES \
  "$dir/project/external_plugin.c" -o "$dir/Raising.so" $(pkg-config --cflags --libs quarrin-plugin)
"$cmake" -S "$dir/project" -B "$dir/build" -DCMAKE_PREFIX_PATH="$prefix"
"$cmake" --build "$dir/build"
"$cmake" --install "$dir/build" --prefix "$dir/plugins"
find "$prefix/include" -type f >&3
)sh";

TEST(Installation, PlugInsBuiltAgainstAnInstalledSDKRunUnderTheInstalledCachewright) {
  qrtest::TempDir dir;
  // The source is copied out so nothing of the source tree is in reach.
  dir.write("project/external_plugin.c",
            qrtest::readText(QUARRIN_SOURCE_DIR "/tests/install/external_plugin.c"));
  dir.write("project/CMakeLists.txt",
            "cmake_minimum_required(VERSION 3.25)\nproject(External C)\n"
            "find_package(Quarrin 0.1 REQUIRED)\n"
            "quarrin_add_plugin(External KIND iom SOURCES external_plugin.c\n"
            "  IDENTIFIER org.example.External VERSION 1.0 FACTORY CreateInstance\n"
            "  INSTALL_DESTINATION lib/quarrin/Printers)\n");
  const qrtest::InstalledSDK& sdk = qrtest::installedSDK();
  ASSERT_FALSE(sdk.pkgConfigPath.empty()) << sdk.log;
  qrtest::ProgramOptions o;
  o.args = {"-ec", kBuild, "sh", QUARRIN_CMAKE_COMMAND, sdk.prefix, dir.path()};
  o.env["PKG_CONFIG_PATH"] = sdk.pkgConfigPath;
  auto r = qrtest::runProgram("/bin/sh", o);
  ASSERT_EQ(r.status, 0) << r.out << r.err;
  EXPECT_EQ(r.out, sdk.prefix + "/include/quarrin/plugin.h\n") << "no internal header";

  const std::string printers = dir / "plugins/lib/quarrin/Printers";
  qrtest::writePluginBundle(printers + "/Raising.plugin", {{QR_IOM_TYPE_ID, {kFactoryID}}}, "1.0",
                            "Raising.so");
  qrtest::writeText(printers + "/Raising.plugin/Contents/Linux/Raising.so",
                    qrtest::readText(dir / "Raising.so"));
  dir.write("Z.framework/Resources/com.varnex.pm.xml",
            "<plist version=\"1.0\"><dict><key>PM Search Directories</key><array><string>" +
                printers + "</string></array></dict></plist>");
  dir.write("prefs.plist",
            "<plist version=\"1.0\"><dict><key>support_quarrin</key><string>YES</string>"
            "</dict></plist>");
  qrtest::ProgramOptions run;
  run.env = {{"CACHEWRIGHT_FRAMEWORK", dir / "Z.framework"},
             {"CACHEWRIGHT_PREFS", dir / "prefs.plist"},
             {"LD_LIBRARY_PATH", ""}};
  auto ran = qrtest::runProgram(sdk.prefix + "/bin/cachewright", run);
  EXPECT_EQ(ran.status, 1) << ran.err;
  EXPECT_NE(ran.err.find("[ExternalError] on call to 'GetConnectionInfo' for 'file://" + printers +
                         "/Raising.plugin/'"),
            std::string::npos)
      << ran.err;
  auto prefs = qr::cast<qr::Dictionary>(qr::readPropertyListFile(dir / "prefs.plist"));
  auto* cache = prefs ? prefs->getAs<qr::Dictionary>("pmcache 5") : nullptr;
  auto* entry =
      cache ? cache->getAs<qr::Dictionary>("file://" + printers + "/External.plugin/") : nullptr;
  ASSERT_TRUE(entry) << ran.err;
  EXPECT_EQ(qr::describe(entry->get("kIOMConnectionType")), "Installed");
}

}  // namespace
