#include "store/prefs_store.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>

#include <map>
#include <random>
#include <thread>

#include "fixtures/fixture_support.h"
#include "platform/file_io.h"
#include "plist/property_list.h"
#include "support/temp_dir.h"

using namespace qr;
namespace fs = std::filesystem;

class PrefsStore : public ::testing::Test {
 protected:
  void SetUp() override { env_.set("CACHEWRIGHT_PREFS", store_); }
  Ref<Dictionary> stored() const { return cast<Dictionary>(readPropertyListFile(store_)); }
  static void set(std::string_view key, const std::string& text) {
    setPrintingPref(*String::make(key), *readPropertyList(text), 5);
  }
  static bool has(std::string_view k) { return bool(copyStringPrintingPref(*String::make(k), 5)); }

  qrtest::TempDir dir_{qrtest::memoryBackedTempBase()};
  std::string store_ = dir_ / "var/lib/quarrin/printing-prefs.plist";
  qrtest::EnvGuard env_;
  qr::test::CapturedLog log_;
};

TEST_F(PrefsStore, WhatIsWrittenIsReadBackAndEachCopyIsTheCallers) {
  std::mt19937 random(7);
  auto pick = [&](int n) { return std::to_string(random() % unsigned(n)); };
  std::map<std::string, Ref<Object>> model;
  for (int i = 0; i < 60; ++i) {
    // A few keys, each a short string or a nested dictionary: values repeat,
    // get replaced and change kind.
    std::string key = "k" + pick(4),
                text = pick(2) == "0" ? "\"" + pick(3) + "\"" : "{inner = {n = " + pick(3) + ";};}";
    set(key, text);
    model[key] = readPropertyList(text);
    for (const auto& [k, expected] : model) {
      EXPECT_TRUE(equal(copyStringPrintingPref(*String::make(k), 5), cast<String>(expected)));
      auto copy = copyDictionaryPrintingPref(*String::make(k), 5);
      ASSERT_TRUE(equal(copy, cast<Dictionary>(expected))) << k;
      // Each copy is the caller's own, mutable all the way down.
      EXPECT_TRUE(!copy || copy->getAs<MutableDictionary>("inner")) << "mutable all the way down";
    }
  }
  EXPECT_TRUE(log_.lines().empty());
}

// A store read once is taken from memory while its stamp holds; a rewrite
// in place at the same size with the times set back is still seen.
TEST_F(PrefsStore, AStoreChangedBehindTheReadersBackIsReadAgain) {
  const timespec old[2] = {{1'600'000'000, 0}, {1'600'000'000, 0}};
  auto write = [&](const char* value) {
    qrtest::writeText(store_, std::string("<plist><dict><key>k</key><string>") + value +
                                  "</string></dict></plist>");
    ASSERT_EQ(utimensat(AT_FDCWD, store_.c_str(), old, 0), 0);
  };
  fs::create_directories(fs::path(store_).parent_path());
  for (const char* value : {"one", "two", "six"}) {
    write(value);
    EXPECT_TRUE(copyStringPrintingPref(*String::make("k"), 5)->equals(value));
    EXPECT_TRUE(copyStringPrintingPref(*String::make("k"), 5)->equals(value)) << "from memory";
  }
}

TEST_F(PrefsStore, BrokenStoresReadEmptyLogOnceAndAreKeptOrLeftAlone) {
  const std::string whole = "{old = x;}";
  // Name, what is made there (mode 0600, a directory 0700) and with what bytes, and the mode
  // the store has after a write.
  const std::tuple<std::string, mode_t, std::string, unsigned> cases[] = {
      {"missing", 0, "", 0644},
      {"whole", S_IFREG, whole, 0600},
      {"cut short", S_IFREG, "{old = x;", 0600},
      {"pipe", S_IFIFO, "", 0644},       // reads as empty (see the feeder); no store's mode
      {"directory", S_IFDIR, "", 0700},  // unreadable: replacing it would lose what it holds
  };
  // Opens the pipe for writing whenever someone waits to read it, and closes it at once.
  std::atomic<bool> done = false;
  std::thread feeder([&, pipe = dir_ / "pipe/prefs"] {
    for (; !done; usleep(100)) close(open(pipe.c_str(), O_WRONLY | O_NONBLOCK | O_CLOEXEC));
  });
  for (const auto& [name, type, bytes, mode] : cases) {
    std::string store = dir_ / (name + "/prefs");
    env_.set("CACHEWRIGHT_PREFS", store);
    if (type) {
      fs::create_directories(dir_ / name);
      ASSERT_EQ(type == S_IFDIR ? mkdir(store.c_str(), 0700) : mknod(store.c_str(), type | 0600, 0),
                0);
    }
    if (!bytes.empty()) qrtest::writeText(store, bytes);
    qr::test::CapturedLog log;
    bool broken = type && bytes != whole;
    EXPECT_EQ(has("old"), bytes == whole) << name;
    EXPECT_EQ(log.lines().size(), size_t(broken)) << name;
    set("new", "v");
    EXPECT_EQ(log.lines().size(), 2 * size_t(broken)) << name << ": the store logged once";
    EXPECT_EQ(has("new"), type != S_IFDIR) << name;
    EXPECT_EQ(has("old"), bytes == whole) << name;
    EXPECT_EQ(unsigned(fs::status(store).permissions()), mode) << name << " (modes in decimal)";
    EXPECT_EQ(readFile(store + ".corrupt").value_or("-"), broken && type != S_IFDIR ? bytes : "-");
  }
  done = true;
  feeder.join();
}

TEST_F(PrefsStore, ConcurrentWritersLoseNoKey) {
  // Each writer sets its own keys in turn to the count of its writes and first
  // checks that its keys still hold what it last wrote: a write made from a
  // stale copy of the store would put an older count back or drop a key.
  // Threads lock as processes do: each write opens the lock file afresh.
  constexpr int kWriters = 6, kWrites = 120, kKeys = 3;
  auto key = [](int w, int k) { return std::to_string(w) + "-" + std::to_string(k); };
  std::vector<std::thread> writers;
  for (int w = 0; w < kWriters; ++w)
    writers.emplace_back([&, w] {
      for (int n = 0; n < kWrites; ++n) {
        // Key k last got the largest count below n that is k modulo kKeys.
        for (int k = 0; k < kKeys && n >= kKeys; ++k)
          ASSERT_EQ(describe(stored()->get(key(w, k))),
                    std::to_string(n - 1 - (n - 1 - k) % kKeys));
        set(key(w, n % kKeys), std::to_string(n));
      }
    });
  for (auto& writer : writers) writer.join();
  EXPECT_EQ(stored()->count(), size_t(kWriters * kKeys));
}

TEST_F(PrefsStore, WriterKilledAtAnyMomentLeavesTheOldOrTheNewStore) {
  // The value's size follows the count it starts with: a store written in
  // place and cut short would not parse.
  auto write = [&](long long n) { set("n", std::to_string(n) + std::string(n % 50 * 400, 'x')); };
  auto count = [&] { return stored() ? std::atoll(describe(stored()->get("n")).c_str()) : -1; };
  write(0);
  long long last = 0;
  // The kill times sweep the first milliseconds of each writer, which it
  // spends in one write or another.
  for (int kills = 0; kills < 80 || (last < 80 && kills < 2000); ++kills) {
    pid_t writer = fork();
    while (writer == 0) write(count() + 1);
    usleep(useconds_t(kills * 397 % 4000));
    kill(writer, SIGKILL);
    waitpid(writer, nullptr, 0);
    ASSERT_GE(count(), last) << "a broken or older store after " << kills << " kills";
    last = count();
  }
  EXPECT_GE(last, 80) << "too few writes got through for the kills to mean much";
  // The temporary files of killed writers are cleared by the next writer,
  // which leaves the store and its lock.
  write(last + 1);
  EXPECT_EQ(std::distance(fs::directory_iterator(dir_ / "var/lib/quarrin"), {}), 2);
}
