// A helper that answers garbage, a cut frame, an outsized frame, a value that
// is no message, or nothing: each is one failed call, never a crash or a hang.
#include <gtest/gtest.h>

#include "fixtures/fixture_support.h"
#include "plist/property_list.h"
#include "scanner/scanner_client.h"
#include "support/temp_dir.h"
#include "values/exception.h"
#include "values/string.h"

using namespace qr;

namespace {

PluginHandle loadIOModule(ScannerClient& client, PlugIn& plugin) {
  return client
      .loadInterface(plugin, *UUID::fromString(FIXTURE_FACTORY_A),
                     *QuarrinModuleFactory::iomTypeID(), *QuarrinModuleFactory::iomIntfID(),
                     nullptr)
      .interface;
}

TEST(ScannerClient, ABrokenHelperIsALostCall) {
  qrtest::TempDir dir;
  auto frame = [](const Object& value) {
    std::string bytes = *writeBinaryPropertyList(value);
    return std::string("\0\0\0", 3) + char(bytes.size()) + bytes;
  };
  dir.write("not-a-message", frame(*String::make("done")));
  // A log line with a line break in it, then a crash.
  auto forged = make<MutableDictionary>();
  forged->set("log", String::make("plug-in\ncachewright[1]: forged"));
  dir.write("forged-log", frame(*forged));
  const struct {
    const char* script;  // what the helper does on fd 3
    const char* lost;    // how the call is reported
  } kHelpers[] = {
      {"printf '\\000\\000\\000\\005hello' >&3; sleep 5", "unreadable answer"},
      {"printf '\\000\\000\\000\\020abc' >&3; exit 4", "exit status 4"},
      {"printf '\\177\\377\\377\\377' >&3; sleep 5", "unreadable answer"},
      {"cat not-a-message >&3; sleep 5", "unreadable answer"},
      {"sleep 5", "timed out after 1 s"},
      {"kill -KILL $$", "SIGKILL"},
      {"cat forged-log >&3; kill -SEGV $$", "SIGSEGV"},
  };
  auto plugin = PlugIn::create(*qr::test::fixtureURL("c_iom"));
  qr::test::CapturedLog log;
  for (const auto& helper : kHelpers) {
    std::string program = dir.write(
        "helper", std::string("#!/bin/sh\ncd ") + dir.path() + "\n" + helper.script + "\n");
    chmod(program.c_str(), 0755);
    ScannerClient client(program, 1);
    try {
      loadIOModule(client, *plugin);
      ADD_FAILURE() << helper.script << " answered";
    } catch (const PluginCallLost& lost) {
      EXPECT_EQ(lost.what, helper.lost) << helper.script;
      EXPECT_EQ(lost.entry, "load");
      EXPECT_EQ(client.helperPid(), 0);
    }
  }
  EXPECT_EQ(log.lines(), std::vector<std::string>{"plug-in cachewright[1]: forged"});
}

TEST(ScannerClient, AMissingHelperIsSaidOnceAndNoModuleIsBlamed) {
  qr::test::CapturedLog log;
  ScannerClient client("/nonexistent/cachewright-scanner", 1);
  auto plugin = PlugIn::create(*qr::test::fixtureURL("c_iom"));
  for (int i = 0; i < 2; ++i) EXPECT_THROW(loadIOModule(client, *plugin), Exception);
  EXPECT_EQ(log.count("Cannot start the plug-in helper /nonexistent/cachewright-scanner"), 1u);
}

// The next helper takes over new loads while the earlier one keeps serving
// what it made: no plug-in sees its factory twice.
TEST(ScannerClient, HelpersTakeTurnsAndEarlierOnesKeepTheirInterfaces) {
  qr::test::FixtureCalls calls;
  ScannerClient client(QUARRIN_BINARY_DIR "/src/cachewright-scanner", 5, 2);
  auto plugin = PlugIn::create(*qr::test::fixtureURL("c_iom"));
  std::vector<PluginHandle> handles;
  std::vector<pid_t> pids;
  for (int i = 0; i < 3; ++i) {
    handles.push_back(loadIOModule(client, *plugin));
    pids.push_back(client.helperPid());
  }
  EXPECT_EQ(pids[0], pids[1]);
  EXPECT_NE(pids[1], pids[2]);
  for (PluginHandle handle : handles) {
    Ref<String> type, path;
    EXPECT_EQ(client.getConnectionInfo(handle, &type, &path), 0);
    EXPECT_TRUE(type);
  }
  EXPECT_EQ(calls.count("c_iom create"), 3u);
  EXPECT_EQ(calls.count("c_iom GetConnectionInfo"), 3u);
}

}  // namespace
