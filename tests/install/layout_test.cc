// A build configured for a scratch prefix and installed there: its own
// cachewright, with nothing but the store named, finds the framework bundle
// and the plug-in folder that the installation laid down.
#include <gtest/gtest.h>

#include <cstring>
#include <filesystem>

#include "plist/property_list.h"
#include "support/run_program.h"
#include "values/array.h"
#include "values/dictionary.h"

namespace {

// sh -ec kLayDown sh CMAKE SOURCE DIR: builds in DIR/build for the prefix
// DIR/prefix, installs there afresh and prints the search settings' path.
// The programs' paths are compiled in, so no other prefix would do.
const char kLayDown[] = R"sh(cmake=$1 source=$2 dir=$3
exec 3>&1 1>&2
"$cmake" -S "$source" -B "$dir/build" -DCMAKE_INSTALL_PREFIX="$dir/prefix" \
  -DCMAKE_BUILD_TYPE=None -DBUILD_TESTING=OFF -DQUARRIN_BENCH=OFF
"$cmake" --build "$dir/build" --parallel 2
rm -rf "$dir/prefix"
"$cmake" --install "$dir/build"
find "$dir/prefix" -path '*/Zephrin.framework/Contents/Resources/com.varnex.pm.xml' >&3
)sh";

TEST(Installation, TheInstalledCachewrightCachesPlugInsDroppedIntoTheInstalledFolder) {
#ifdef __SANITIZE_ADDRESS__
  GTEST_SKIP() << "the tree it installs is a plain build, which the plain suite checks";
#endif
  const std::string dir = QUARRIN_BINARY_DIR "/install-check";
  qrtest::ProgramOptions o;
  o.args = {"-ec", kLayDown, "sh", QUARRIN_CMAKE_COMMAND, QUARRIN_SOURCE_DIR, dir};
  auto r = qrtest::runProgram("/bin/sh", o);
  ASSERT_EQ(r.status, 0) << r.err;
  const std::filesystem::path path = r.out.substr(0, r.out.find('\n'));
  EXPECT_TRUE(std::filesystem::exists(path.parent_path().parent_path() / "Info.plist")) << path;
  auto settings = qr::cast<qr::Dictionary>(qr::readPropertyListFile(path));
  auto* folders = settings ? settings->getAs<qr::Array>("PM Search Directories") : nullptr;
  ASSERT_TRUE(folders && folders->count() == 1) << r.out;
  const std::string folder = qr::describe(folders->at(0));
  ASSERT_TRUE(std::filesystem::is_empty(folder)) << folder;
  for (const char* bundle : {"IOModules/USB.plugin", "PrinterModules/AurelLaser.plugin"})
    std::filesystem::copy(dir + "/build/examples/demo/Printers/" + bundle,
                          folder + std::strrchr(bundle, '/'),
                          std::filesystem::copy_options::recursive);

  qrtest::TempDir scratch;
  o = {};
  o.env["LD_LIBRARY_PATH"] = "";  // installed programs find the library by their RUNPATH
  o.env["CACHEWRIGHT_PREFS"] = scratch.write(
      "prefs.plist", "<plist><dict><key>support_quarrin</key><string>YES</string></dict></plist>");
  r = qrtest::runProgram(dir + "/prefix/bin/cachewright", o);
  EXPECT_EQ(r.status, 1) << r.err;
  EXPECT_EQ(r.err, "") << "a run over working plug-ins logs nothing";
  auto prefs = qr::cast<qr::Dictionary>(qr::readPropertyListFile(o.env["CACHEWRIGHT_PREFS"]));
  auto* cache = prefs ? prefs->getAs<qr::Dictionary>("pmcache 5") : nullptr;
  ASSERT_TRUE(cache) << r.err;
  // Asked for USB because the I/O module beside it reported that connection type.
  auto* laser = cache->getAs<qr::Dictionary>("file://" + folder + "/AurelLaser.plugin/");
  auto* entries = laser ? laser->getAs<qr::Array>("USB") : nullptr;
  EXPECT_TRUE(entries && entries->count() > 0) << qr::describe(cache);
}

}  // namespace
