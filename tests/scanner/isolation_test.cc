// A plug-in that crashes, exits, hangs or chatters among good ones: whole runs
// over an installation, judged by the log, the cache, the failure record and
// the processes left behind.
#include <dirent.h>
#include <signal.h>
#include <sys/wait.h>

#include <chrono>
#include <thread>

#include "support/installation.h"

using namespace qr;

namespace {

const std::vector<std::string> kGood = {"c_iom", "io_dnssd", "c_pm", "pm_dnssd", "pm_usb_only"};

// Live processes whose environment carries the mark: helpers left behind.
std::vector<pid_t> processesMarked(const std::string& mark) {
  std::vector<pid_t> found;
  DIR* proc = opendir("/proc");
  while (dirent* entry = proc ? readdir(proc) : nullptr) {
    pid_t pid = atoi(entry->d_name);
    std::string environ = qrtest::readText("/proc/" + std::string(entry->d_name) + "/environ");
    if (pid > 0 && environ.find("QUARRIN_TEST_MARK=" + mark) != std::string::npos)
      found.push_back(pid);
  }
  if (proc) closedir(proc);
  return found;
}

size_t occurrences(const std::string& text, const std::string& needle) {
  size_t n = 0;
  for (size_t at = text.find(needle); at != std::string::npos; at = text.find(needle, at + 1)) ++n;
  return n;
}

struct Fault {
  std::string kind;    // what the fixture does
  std::string module;  // the fixture that does it
  std::string entry;   // where
  std::string logged;  // what the run says, "" for nothing
};

void PrintTo(const Fault& f, std::ostream* os) {
  *os << f.module << ":" << f.kind << "@" << f.entry;
}

class Isolation : public ::testing::TestWithParam<Fault> {
 protected:
  std::map<std::string, std::string> env(bool faulty) const {
    const Fault& f = GetParam();
    std::map<std::string, std::string> e{{"CACHEWRIGHT_PLUGIN_TIMEOUT", "1"},
                                         {"QUARRIN_TEST_MARK", install_.dir().path()}};
    if (faulty) e["QUARRIN_FIXTURE_FAULT"] = f.module + ":" + f.kind + "@" + f.entry;
    return e;
  }
  std::string failureLine() const {
    return "[" + GetParam().logged + "] on call to '" + GetParam().entry + "' for '" +
           install_.key(GetParam().module) + "'";
  }
  // Every good module's entry is what a run without the bad one makes.
  void expectGoodEntries(const Dictionary& cache) const {
    for (const auto& name : kGood)
      EXPECT_TRUE(equal(cache.get(install_.key(name)), baseline_->get(install_.key(name)))) << name;
  }

  void SetUp() override {
    auto clean = install_.run({"-s"}, env(false));
    baseline_ = cast<Dictionary>(readPropertyList(clean.out));
    ASSERT_TRUE(baseline_) << clean.err;
    install_.add(GetParam().module);
  }

  qrtest::Installation install_{kGood};
  Ref<Dictionary> baseline_;
  qr::test::FixtureCalls calls_;
};

TEST_P(Isolation, CostsOnlyTheBadModuleAndIsNotLoadedAgainWhileUnchanged) {
  const Fault& f = GetParam();
  const bool fails = !f.logged.empty();
  auto first = install_.run({"-s"}, env(true));
  EXPECT_EQ(first.status, 0);
  auto streamed = cast<Dictionary>(readPropertyList(first.out));
  ASSERT_TRUE(streamed) << "standard output is the cache alone:\n" << first.out;
  expectGoodEntries(*streamed);
  EXPECT_EQ(streamed->get(install_.key(f.module)) == nullptr, fails);
  EXPECT_EQ(occurrences(first.err, failureLine()), fails ? 1u : 0u) << first.err;
  if (f.kind == "stdout") {
    EXPECT_NE(first.err.find(f.module + " chatters in " + f.entry), std::string::npos);
  }
  EXPECT_TRUE(processesMarked(install_.dir().path()).empty());
  if (!fails) return;

  // The next run skips it, says so once, and remembers it still.
  size_t seen = calls_.lines().size();
  auto second = install_.run({}, env(true));
  EXPECT_EQ(second.status, 1) << second.err;
  EXPECT_EQ(occurrences(second.err, "Skipping '" + install_.key(f.module) + "'"), 1u) << second.err;
  EXPECT_TRUE(calls_.of(f.module, seen).empty());
  EXPECT_TRUE(install_.stored("cachewright failures")->get(install_.key(f.module)));
  expectGoodEntries(*install_.stored("pmcache 5"));
}

const Fault kFaults[] = {
    {"segv", "io_no_path", "load", "SIGSEGV"},
    {"abort", "pm_serial", "load", "SIGABRT"},
    {"exit", "io_no_path", "load", "exit status 3"},
    {"hang", "pm_serial", "load", "timed out after 1 s"},
    {"stdout", "io_no_path", "load", ""},
    {"segv", "pm_serial", "factory", "SIGSEGV"},
    {"abort", "io_no_path", "factory", "SIGABRT"},
    {"exit", "pm_serial", "factory", "exit status 3"},
    {"hang", "io_no_path", "factory", "timed out after 1 s"},
    {"stdout", "pm_serial", "factory", ""},
    {"segv", "io_no_path", "QueryInterface", "SIGSEGV"},
    {"abort", "pm_serial", "QueryInterface", "SIGABRT"},
    {"exit", "io_no_path", "QueryInterface", "exit status 3"},
    {"hang", "pm_serial", "QueryInterface", "timed out after 1 s"},
    {"stdout", "io_no_path", "QueryInterface", ""},
    {"segv", "pm_serial", "Release", "SIGSEGV"},
    {"segv", "io_no_path", "GetConnectionInfo", "SIGSEGV"},
    {"abort", "io_no_path", "GetConnectionInfo", "SIGABRT"},
    {"exit", "io_no_path", "GetConnectionInfo", "exit status 3"},
    {"hang", "io_no_path", "GetConnectionInfo", "timed out after 1 s"},
    {"stdout", "io_no_path", "GetConnectionInfo", ""},
    {"segv", "pm_serial", "CreateBrowserInfo", "SIGSEGV"},
    {"abort", "pm_serial", "CreateBrowserInfo", "SIGABRT"},
    {"exit", "pm_serial", "CreateBrowserInfo", "exit status 3"},
    {"hang", "pm_serial", "CreateBrowserInfo", "timed out after 1 s"},
    {"stdout", "pm_serial", "CreateBrowserInfo", ""},
};
INSTANTIATE_TEST_SUITE_P(Faults, Isolation, ::testing::ValuesIn(kFaults), [](const auto& info) {
  return info.param.kind + "_" + info.param.module + "_" + info.param.entry;
});

// The record follows the plug-in: a new version or path mode asks it again,
// and an answer or its removal takes it off.
TEST(FailureMemory, ANewVersionOrPathModeAsksAgainAndAnAnswerOrRemovalForgets) {
  qrtest::Installation install({"c_iom", "c_pm", "pm_serial"});
  const std::string bad = install.key("pm_serial");
  const std::map<std::string, std::string> faulty{
      {"QUARRIN_FIXTURE_FAULT", "pm_serial:segv@CreateBrowserInfo"}};
  qr::test::FixtureCalls calls;
  auto asked = [&](std::vector<std::string> args, const std::map<std::string, std::string>& env) {
    size_t seen = calls.lines().size();
    install.run(std::move(args), env);
    return !calls.of("pm_serial", seen).empty();
  };
  auto remembered = [&] {
    auto failures = install.stored("cachewright failures");
    return failures && failures->get(bad);
  };
  EXPECT_TRUE(asked({}, faulty));
  EXPECT_TRUE(remembered());
  EXPECT_FALSE(asked({}, faulty));
  install.setVersion("pm_serial", "9.0");
  EXPECT_TRUE(asked({}, faulty));
  EXPECT_FALSE(asked({}, faulty));
  EXPECT_TRUE(asked({install.dir() / "cache.plist"}, faulty)) << "path mode asks every module";
  EXPECT_TRUE(remembered());
  EXPECT_TRUE(asked({install.dir() / "cache.plist"}, {}));
  EXPECT_FALSE(remembered()) << "it answered";

  EXPECT_TRUE(asked({install.dir() / "cache.plist"}, faulty));
  std::filesystem::remove_all(install.bundle("pm_serial"));
  install.run({}, {});
  EXPECT_FALSE(remembered()) << "it is gone";
}

// A killed run takes its helper along; a run waiting on a hanging plug-in
// holds no lock, so another run can store meanwhile.
TEST(Helper, DiesWithItsRunAndHoldsNoStoreLock) {
  qrtest::Installation install({"c_iom", "c_pm"});
  const std::string mark = install.dir().path();
  pid_t run = fork();
  if (run == 0) {
    setenv("CACHEWRIGHT_FRAMEWORK", (install.dir() / "Z.framework").c_str(), 1);
    setenv("CACHEWRIGHT_PREFS", install.store().c_str(), 1);
    setenv("QUARRIN_FIXTURE_FAULT", "c_pm:hang@CreateBrowserInfo", 1);
    setenv("QUARRIN_TEST_MARK", mark.c_str(), 1);
    execl(QUARRIN_BINARY_DIR "/src/cachewright", "cachewright", nullptr);
    _exit(127);
  }
  std::vector<pid_t> helpers;
  for (int i = 0; i < 500 && helpers.size() < 2; ++i) {
    std::this_thread::sleep_for(std::chrono::milliseconds(10));
    helpers = processesMarked(mark);
  }
  ASSERT_EQ(helpers.size(), 2u) << "the run and its helper";

  auto other = install.run({});  // no fault here: it stores while the first waits
  EXPECT_EQ(other.status, 1) << other.err;
  EXPECT_TRUE(install.stored("pmcache 5")->get(install.key("c_pm")));

  kill(run, SIGKILL);
  waitpid(run, nullptr, 0);
  for (int i = 0; i < 200 && !processesMarked(mark).empty(); ++i)
    std::this_thread::sleep_for(std::chrono::milliseconds(10));
  EXPECT_TRUE(processesMarked(mark).empty());
}

}  // namespace
