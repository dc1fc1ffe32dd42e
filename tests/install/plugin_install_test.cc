// Installs the project into a scratch prefix and builds a plug-in against it
// the way an outside author would, with pkg-config and with the CMake package;
// then loads each build.
#include <gtest/gtest.h>
#include <quarrin/plugin.h>

#include "bundles/c_bridge.h"
#include "support/installed_sdk.h"
#include "support/plugin_bundle.h"
#include "support/plugin_instance.h"
#include "support/run_program.h"
#include "values/string.h"

namespace {

const char kFactoryID[] = "6A0E3C55-1F2B-4D8E-9C31-70A4B2E5D901";

// sh -ec kBuild sh CMAKE PREFIX DIR, with PKG_CONFIG_PATH set: builds
// DIR/External.so with pkg-config and DIR/build/External.so with the CMake
// package, and lists the installed headers.
const char kBuild[] = R"sh(cmake=$1 prefix=$2 dir=$3
exec 3>&1 1>&2
cc -std=c99 -pedantic-errors -Wall -Wextra -Werror -fPIC -shared -fexceptions \
  "$dir/project/external_plugin.c" -o "$dir/External.so" $(pkg-config --cflags --libs quarrin-plugin)
"$cmake" -S "$dir/project" -B "$dir/build" -DCMAKE_PREFIX_PATH="$prefix"
"$cmake" --build "$dir/build"
find "$prefix/include" -type f >&3
)sh";

TEST(Installation, PkgConfigAndTheCMakePackageEachBuildAPlugInThatLoads) {
  qrtest::TempDir dir;
  // The source is copied out so nothing of the source tree is in reach.
  dir.write("project/external_plugin.c",
            qrtest::readText(QUARRIN_SOURCE_DIR "/tests/install/external_plugin.c"));
  dir.write("project/CMakeLists.txt",
            "cmake_minimum_required(VERSION 3.25)\nproject(External C)\n"
            "find_package(Quarrin 0.1 REQUIRED)\n"
            "add_library(External MODULE external_plugin.c)\n"
            "set_target_properties(External PROPERTIES PREFIX \"\")\n"
            "target_compile_options(External PRIVATE -fexceptions)\n"
            "target_link_libraries(External PRIVATE Quarrin::quarrin)\n");
  const qrtest::InstalledSDK& sdk = qrtest::installedSDK();
  ASSERT_FALSE(sdk.pkgConfigPath.empty()) << sdk.log;
  qrtest::ProgramOptions o;
  o.args = {"-ec", kBuild, "sh", QUARRIN_CMAKE_COMMAND, sdk.prefix, dir.path()};
  o.env["PKG_CONFIG_PATH"] = sdk.pkgConfigPath;
  auto r = qrtest::runProgram("/bin/sh", o);
  ASSERT_EQ(r.status, 0) << r.out << r.err;
  EXPECT_EQ(r.out, sdk.prefix + "/include/quarrin/plugin.h\n") << "no internal header";

  for (const std::string& library : {dir / "External.so", dir / "build/External.so"}) {
    // A bundle around the shared object, declaring one I/O module factory.
    std::string bundle = library + ".plugin";
    qrtest::writePluginBundle(bundle, {{QR_IOM_TYPE_ID, {kFactoryID}}}, "", "External.so");
    qrtest::writeText(bundle + "/Contents/Linux/External.so", qrtest::readText(library));
    void* iom = qrtest::interfaceOf(bundle, kFactoryID, QR_IOM_TYPE_ID, QR_IOM_INTERFACE_ID);
    ASSERT_TRUE(iom) << library;
    QrStringRef type = nullptr;
    (*static_cast<const QrIOModuleVTbl**>(iom))->GetConnectionInfo(&type, nullptr);
    EXPECT_EQ(qr::describe(qr::fromCAs<qr::String>(type)), "Installed");
  }
}

}  // namespace
