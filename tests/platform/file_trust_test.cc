// What a run as root refuses to load: code that anyone but root could have
// put in place, anywhere from the bundle down to the shared object.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "fixtures/fixture_support.h"
#include "modules/io_module.h"
#include "platform/file_trust.h"
#include "support/temp_dir.h"

using namespace qr;

namespace {

TEST(RootTrust, EveryPathFromTheBundleDownMustBeRootsAlone) {
  if (geteuid() != 0) GTEST_SKIP() << "needs root to make files owned by root";
  qrtest::TempDir dir;
  const std::string bundle = dir / "A.plugin", linux = bundle + "/Contents/Linux",
                    object = linux + "/a.so";
  const struct {
    const char* change;
    std::function<void()> apply;
    std::string path;
    std::string reason;
  } kCases[] = {
      {"none", [] {}, "", ""},
      {"object chowned", [&] { chown(object.c_str(), 65534, 0); }, object, "owned by user 65534"},
      {"folder group-writable", [&] { chmod(linux.c_str(), 0775); }, linux, "writable by group"},
      {"bundle world-writable", [&] { chmod(bundle.c_str(), 0757); }, bundle, "writable by others"},
      {"link to a writable object",
       [&] {
         dir.write("elsewhere.so", "");
         chmod((dir / "elsewhere.so").c_str(), 0646);
         std::filesystem::remove(object);
         std::filesystem::create_symlink(dir / "elsewhere.so", object);
       },
       dir / "elsewhere.so", "writable by others"},
  };
  for (const auto& c : kCases) {
    std::filesystem::remove_all(bundle);
    dir.write("A.plugin/Contents/Linux/a.so", "");
    for (const auto& p : {bundle, bundle + "/Contents", linux}) chmod(p.c_str(), 0755);
    chmod(object.c_str(), 0644);
    c.apply();
    auto problem = rootTrustProblem(bundle, object);
    EXPECT_EQ(problem ? problem->path : "", c.path) << c.change;
    EXPECT_EQ(problem ? problem->reason : "", c.reason) << c.change;
  }
}

TEST(RootTrust, ARefusedPlugInIsOneThatCouldNotBeLoaded) {
  if (geteuid() != 0) GTEST_SKIP() << "needs root to make files owned by root";
  qrtest::TempDir dir;
  const std::string bundle = dir / "c_iom.plugin";
  std::filesystem::copy(qr::test::fixtureBundle("c_iom"), bundle,
                        std::filesystem::copy_options::recursive);
  std::string object;
  for (const auto& f : std::filesystem::directory_iterator(bundle + "/Contents/Linux"))
    object = f.path();
  chown(object.c_str(), 65534, 65534);
  qr::test::CapturedLog log;
  auto module = QuarrinModuleFactory::IOMModuleForURL(URL::fileURL(bundle, true).get());
  ASSERT_TRUE(module);
  EXPECT_FALSE(module->loadPluginInterface());
  EXPECT_EQ(log.count("Refusing to load '" + object + "': owned by user 65534"), 1u);
}

}  // namespace
