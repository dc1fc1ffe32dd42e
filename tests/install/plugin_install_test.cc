// Installs the project into a scratch prefix and builds a plug-in against it
// the way an outside author would, then loads that plug-in.
#include <gtest/gtest.h>
#include <quarrin/plugin.h>
#include <stdlib.h>
#include <unistd.h>

#include <cstring>
#include <filesystem>
#include <string>

#include "platform/c_bridge.h"
#include "platform/file_io.h"
#include "platform/plugin_model.h"
#include "platform/string.h"

namespace fs = std::filesystem;
using namespace qr;

namespace {

constexpr const char* kFactoryID = "6A0E3C55-1F2B-4D8E-9C31-70A4B2E5D901";

std::string shellQuoted(const std::string& s) {
  std::string out = "'";
  for (char c : s) out += c == '\'' ? std::string("'\\''") : std::string(1, c);
  return out + "'";
}

class Installation : public ::testing::Test {
 protected:
  void SetUp() override {
    char pattern[] = "/tmp/quarrin-install-XXXXXX";
    ASSERT_TRUE(mkdtemp(pattern));
    root_ = pattern;
    prefix_ = root_ / "prefix";
    ASSERT_EQ(run(std::string(QUARRIN_CMAKE_COMMAND) + " --install " +
                  shellQuoted(QUARRIN_BINARY_DIR) + " --prefix " + shellQuoted(prefix_.string())),
              0);
    // The plug-in source is copied out so nothing of the source tree is in reach.
    ASSERT_TRUE(fs::copy_file(fs::path(QUARRIN_SOURCE_DIR) / "tests/install/external_plugin.c",
                              root_ / "external_plugin.c"));
  }
  void TearDown() override {
    if (!root_.empty()) fs::remove_all(root_);
  }

  // Runs a shell command with its output kept in the scratch folder; shows it on failure.
  int run(const std::string& command) {
    std::string output = (root_ / "command-output.txt").string();
    int status = std::system(("(" + command + ") >" + shellQuoted(output) + " 2>&1").c_str());
    if (status != 0) ADD_FAILURE() << command << "\n" << readFile(output).value_or("");
    return status;
  }

  fs::path pkgConfigDir() const {
    for (const auto& entry : fs::recursive_directory_iterator(prefix_))
      if (entry.path().filename() == "quarrin-plugin.pc") return entry.path().parent_path();
    return {};
  }

  // A bundle around the shared object at `library`, declaring one I/O module factory.
  fs::path layOutBundle(const fs::path& library) {
    fs::path bundle = root_ / "External.plugin";
    fs::create_directories(bundle / "Contents/Linux");
    fs::copy_file(library, bundle / "Contents/Linux/External.so",
                  fs::copy_options::overwrite_existing);
    std::string info = std::string(R"(<?xml version="1.0" encoding="UTF-8"?>
<plist version="1.0">
<dict>
	<key>CFBundleExecutable</key>
	<string>External.so</string>
	<key>CFBundleIdentifier</key>
	<string>org.example.external</string>
	<key>CFPlugInFactories</key>
	<dict>
		<key>)") +
                       kFactoryID + R"(</key>
		<string>ExternalFactory</string>
	</dict>
	<key>CFPlugInTypes</key>
	<dict>
		<key>)" +
                       QR_IOM_TYPE_ID + R"(</key>
		<array>
			<string>)" +
                       kFactoryID + R"(</string>
		</array>
	</dict>
</dict>
</plist>
)";
    EXPECT_TRUE(writeFile((bundle / "Contents/Info.plist").string(), info));
    return bundle;
  }

  // Creates an instance through the component model and asks the I/O module
  // interface for its connection type.
  static std::string connectionTypeOf(const fs::path& bundle) {
    auto plugin = PlugIn::create(*URL::fileURL(bundle.string(), true));
    if (!plugin) return "(no plug-in)";
    auto iomType = UUID::fromString(QR_IOM_TYPE_ID);
    auto factories = plugin->factoriesForType(*iomType);
    if (!factories || factories->count() != 1) return "(no factory)";
    void* instance = plugin->createInstance(*cast<UUID>(factories->at(0)), *iomType);
    if (!instance) return "(no instance)";
    auto* unknown = *static_cast<const QrIUnknownVTbl**>(instance);
    QrUUIDBytes iid;
    std::memcpy(iid.bytes, UUID::fromString(QR_IOM_INTERFACE_ID)->bytes().data(), 16);
    void* interface = nullptr;
    int32_t result = unknown->QueryInterface(instance, iid, &interface);
    unknown->Release(instance);
    if (result != QR_S_OK || !interface) return "(no interface)";
    QrStringRef type = nullptr;
    (*static_cast<const QrIOModuleVTbl**>(interface))->GetConnectionInfo(&type, nullptr);
    String* s = fromCAs<String>(type);
    return s ? s->utf8() : "(no connection type)";
  }

  fs::path root_;
  fs::path prefix_;
};

}  // namespace

TEST_F(Installation, InstallsThePublicHeaderAndNoInternalOne) {
  std::vector<std::string> headers;
  for (const auto& entry : fs::recursive_directory_iterator(prefix_ / "include"))
    if (entry.is_regular_file()) headers.push_back(fs::relative(entry.path(), prefix_).string());
  EXPECT_EQ(headers, std::vector<std::string>{"include/quarrin/plugin.h"});
  EXPECT_FALSE(pkgConfigDir().empty());
}

TEST_F(Installation, PkgConfigAloneBuildsAPlugInThatLoads) {
  fs::path pcDir = pkgConfigDir();
  ASSERT_FALSE(pcDir.empty());
  fs::path library = root_ / "External.so";
  ASSERT_EQ(run("cd " + shellQuoted(root_.string()) +
                " && export PKG_CONFIG_PATH=" + shellQuoted(pcDir.string()) +
                " && cc -std=c99 -pedantic-errors -Wall -Wextra -Werror -fPIC -shared -fexceptions"
                " external_plugin.c -o " +
                shellQuoted(library.string()) + " $(pkg-config --cflags --libs quarrin-plugin)"),
            0);
  EXPECT_EQ(connectionTypeOf(layOutBundle(library)), "Installed");
}

TEST_F(Installation, CMakePackageBuildsAPlugInThatLoads) {
  fs::path project = root_ / "project";
  fs::create_directories(project);
  fs::rename(root_ / "external_plugin.c", project / "external_plugin.c");
  ASSERT_TRUE(writeFile((project / "CMakeLists.txt").string(),
                        "cmake_minimum_required(VERSION 3.25)\n"
                        "project(External C)\n"
                        "find_package(Quarrin 0.1 REQUIRED)\n"
                        "add_library(External MODULE external_plugin.c)\n"
                        "set_target_properties(External PROPERTIES PREFIX \"\")\n"
                        "target_compile_options(External PRIVATE -fexceptions)\n"
                        "target_link_libraries(External PRIVATE Quarrin::quarrin)\n"));
  fs::path build = root_ / "project-build";
  ASSERT_EQ(
      run(std::string(QUARRIN_CMAKE_COMMAND) + " -S " + shellQuoted(project.string()) + " -B " +
          shellQuoted(build.string()) + " -DCMAKE_PREFIX_PATH=" + shellQuoted(prefix_.string()) +
          " && " + QUARRIN_CMAKE_COMMAND + " --build " + shellQuoted(build.string())),
      0);
  EXPECT_EQ(connectionTypeOf(layOutBundle(build / "External.so")), "Installed");
}
