// Installs the project into a scratch prefix and builds a plug-in against it
// the way an outside author would, then loads that plug-in.
#include <gtest/gtest.h>
#include <quarrin/plugin.h>

#include <filesystem>

#include "bundles/c_bridge.h"
#include "support/plugin_bundle.h"
#include "support/plugin_instance.h"
#include "support/run_program.h"
#include "support/temp_dir.h"
#include "values/string.h"

namespace fs = std::filesystem;

namespace {

constexpr const char* kFactoryID = "6A0E3C55-1F2B-4D8E-9C31-70A4B2E5D901";

class Installation : public ::testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(run(QUARRIN_CMAKE_COMMAND, {"--install", QUARRIN_BINARY_DIR, "--prefix", prefix_}));
    // The plug-in source is copied out so nothing of the source tree is in reach.
    dir_.write("project/external_plugin.c",
               qrtest::readText(QUARRIN_SOURCE_DIR "/tests/install/external_plugin.c"));
  }

  // Runs a program and shows its output when it fails.
  static bool run(const std::string& program, std::vector<std::string> args,
                  std::map<std::string, std::string> env = {}) {
    qrtest::ProgramOptions o;
    o.args = std::move(args);
    o.env = std::move(env);
    auto r = qrtest::runProgram(program, o);
    EXPECT_EQ(r.status, 0) << program << "\n" << r.out << r.err;
    return r.status == 0;
  }

  // Lays a bundle around the shared object, declaring one I/O module factory,
  // and asks an instance of it for its connection type.
  std::string connectionTypeOf(const std::string& library) const {
    std::string bundle = dir_ / "External.plugin";
    qrtest::writePluginBundle(bundle, {{QR_IOM_TYPE_ID, {kFactoryID}}}, "", "External.so");
    fs::create_directories(bundle + "/Contents/Linux");
    fs::copy_file(library, bundle + "/Contents/Linux/External.so");
    void* iom = qrtest::interfaceOf(bundle, kFactoryID, QR_IOM_TYPE_ID, QR_IOM_INTERFACE_ID);
    if (!iom) return "(no interface)";
    QrStringRef type = nullptr;
    (*static_cast<const QrIOModuleVTbl**>(iom))->GetConnectionInfo(&type, nullptr);
    return qr::describe(qr::fromCAs<qr::String>(type));
  }

  qrtest::TempDir dir_;
  const std::string prefix_ = dir_ / "prefix";
};

}  // namespace

TEST_F(Installation, PkgConfigAloneBuildsAPlugInThatLoads) {
  std::vector<std::string> headers;
  std::string pkgConfigDir;
  for (const auto& entry : fs::recursive_directory_iterator(prefix_)) {
    if (entry.path().filename() == "quarrin-plugin.pc") pkgConfigDir = entry.path().parent_path();
    if (entry.is_regular_file() && entry.path().string().starts_with(prefix_ + "/include/"))
      headers.push_back(fs::relative(entry.path(), prefix_).string());
  }
  EXPECT_EQ(headers, std::vector<std::string>{"include/quarrin/plugin.h"}) << "no internal header";
  ASSERT_FALSE(pkgConfigDir.empty());
  ASSERT_TRUE(run("/bin/sh",
                  {"-c",
                   "cc -std=c99 -pedantic-errors -Wall -Wextra -Werror -fPIC -shared -fexceptions"
                   " \"$1\" -o \"$2\" $(pkg-config --cflags --libs quarrin-plugin)",
                   "sh", dir_ / "project/external_plugin.c", dir_ / "External.so"},
                  {{"PKG_CONFIG_PATH", pkgConfigDir}}));
  EXPECT_EQ(connectionTypeOf(dir_ / "External.so"), "Installed");
}

TEST_F(Installation, CMakePackageBuildsAPlugInThatLoads) {
  dir_.write("project/CMakeLists.txt",
             "cmake_minimum_required(VERSION 3.25)\n"
             "project(External C)\n"
             "find_package(Quarrin 0.1 REQUIRED)\n"
             "add_library(External MODULE external_plugin.c)\n"
             "set_target_properties(External PROPERTIES PREFIX \"\")\n"
             "target_compile_options(External PRIVATE -fexceptions)\n"
             "target_link_libraries(External PRIVATE Quarrin::quarrin)\n");
  ASSERT_TRUE(run(QUARRIN_CMAKE_COMMAND, {"-S", dir_ / "project", "-B", dir_ / "build",
                                          "-DCMAKE_PREFIX_PATH=" + prefix_}));
  ASSERT_TRUE(run(QUARRIN_CMAKE_COMMAND, {"--build", dir_ / "build"}));
  EXPECT_EQ(connectionTypeOf(dir_ / "build/External.so"), "Installed");
}
