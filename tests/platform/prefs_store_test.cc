#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <random>

#include "platform/dictionary.h"
#include "platform/log.h"
#include "platform/number.h"
#include "platform/prefs_store.h"
#include "platform/property_list.h"
#include "platform/string.h"
#include "platform/url.h"
#include "test_files.h"

using namespace qr;
using qr::testing::EnvGuard;
using qr::testing::TempDir;

namespace {

class PrefsStore : public ::testing::Test {
 protected:
  void SetUp() override {
    env_.set("CACHEWRIGHT_PREFS", store_);
    previousSink_ = setLogSink([this](std::string_view line) { logged_.emplace_back(line); });
  }
  void TearDown() override { setLogSink(previousSink_); }

  Ref<Dictionary> storedDictionary() const {
    return cast<Dictionary>(readPropertyListFile(store_));
  }
  size_t loggedLinesContaining(std::string_view text) const {
    size_t n = 0;
    for (const auto& line : logged_) n += line.find(text) != std::string::npos;
    return n;
  }

  TempDir dir_{qr::testing::memoryBackedTempBase()};
  std::string store_ = dir_ / "var/lib/quarrin/printing-prefs.plist";
  EnvGuard env_;
  LogSink previousSink_;
  std::vector<std::string> logged_;
};

// Runs f in a child process; the child's exit status is f's result.
template <class F>
pid_t spawn(F&& f) {
  pid_t pid = fork();
  if (pid == 0) {
    setLogSink(nullptr);
    _exit(f() ? 0 : 1);
  }
  return pid;
}

int exitStatusOf(pid_t pid) {
  int status = 0;
  if (waitpid(pid, &status, 0) != pid) return -1;
  return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

std::vector<std::string> filesIn(const std::string& dir) {
  std::vector<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(dir))
    names.push_back(entry.path().filename().string());
  std::sort(names.begin(), names.end());
  return names;
}

}  // namespace

TEST_F(PrefsStore, PathComesFromTheEnvironment) { EXPECT_EQ(prefsStorePath(), store_); }

TEST_F(PrefsStore, MissingStoreHoldsNothingAndTheFirstWriteCreatesIt) {
  auto key = String::make("support_quarrin");
  EXPECT_FALSE(copyStringPrintingPref(*key, 5));
  EXPECT_FALSE(copyDictionaryPrintingPref(*key, 8));
  EXPECT_TRUE(logged_.empty()) << "a missing store is no failure";

  setPrintingPref(*key, *String::make("YES"), 5);
  auto value = copyStringPrintingPref(*key, 5);
  ASSERT_TRUE(value);
  EXPECT_EQ(value->utf8(), "YES");

  struct stat st;
  ASSERT_EQ(stat((dir_ / "var/lib/quarrin").c_str(), &st), 0);
  EXPECT_EQ(st.st_mode & 0777, 0755u) << "missing directories are created";
  ASSERT_EQ(stat(store_.c_str(), &st), 0);
  EXPECT_EQ(st.st_mode & 0777, 0644u);
  auto bytes = readFile(store_);
  ASSERT_TRUE(bytes);
  EXPECT_TRUE(bytes->starts_with("<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist"));
  EXPECT_EQ(filesIn(dir_ / "var/lib/quarrin"),
            (std::vector<std::string>{"printing-prefs.plist", "printing-prefs.plist.lock"}));
}

TEST_F(PrefsStore, ValuesOfTheWrongKindReadAsNoneAndCopiesBelongToTheCaller) {
  auto cacheKey = String::make("pmcache 5");
  auto entry = make<MutableDictionary>();
  entry->set("Bundle Version", String::make("1.0"));
  auto cache = make<MutableDictionary>();
  cache->set("file:///a.plugin/", entry);
  setPrintingPref(*cacheKey, *cache, 8);
  setPrintingPref(*String::make("support_quarrin"), *String::make("YES"), 5);

  auto copy = copyDictionaryPrintingPref(*cacheKey, 8);
  ASSERT_TRUE(copy);
  EXPECT_TRUE(copy->isEqual(*cache));
  auto inner = cast<MutableDictionary>(Ref<Object>(copy->get("file:///a.plugin/")));
  ASSERT_TRUE(inner) << "containers are mutable all the way down";
  inner->set("Bundle Version", String::make("2.0"));
  copy->set("extra", String::make("x"));
  EXPECT_TRUE(copyDictionaryPrintingPref(*cacheKey, 8)->isEqual(*cache))
      << "the store is untouched";

  EXPECT_FALSE(copyStringPrintingPref(*cacheKey, 5));
  EXPECT_FALSE(copyDictionaryPrintingPref(*String::make("support_quarrin"), 8));

  // A value that is no property list is refused with a log line; the store stays.
  setPrintingPref(*String::make("url"), *URL::fileURL("/tmp", true), 5);
  EXPECT_EQ(loggedLinesContaining("not a property list"), 1u);
  EXPECT_EQ(storedDictionary()->count(), 2u);
}

TEST_F(PrefsStore, CorruptStoreReadsEmptyLogsOnceAndIsKeptBeforeReplacement) {
  const std::string garbage = "<?xml version=\"1.0\"?><plist><dict><key>half";
  std::filesystem::create_directories(dir_ / "var/lib/quarrin");
  ASSERT_TRUE(writeFile(store_, garbage));
  auto key = String::make("support_quarrin");
  EXPECT_FALSE(copyStringPrintingPref(*key, 5));
  EXPECT_FALSE(copyDictionaryPrintingPref(*key, 5));
  EXPECT_EQ(loggedLinesContaining(store_), 1u) << "logged once, naming the store";

  setPrintingPref(*key, *String::make("YES"), 5);
  EXPECT_EQ(readFile(store_ + ".corrupt"), garbage);
  auto stored = storedDictionary();
  ASSERT_TRUE(stored);
  EXPECT_EQ(stored->count(), 1u);
  EXPECT_EQ(copyStringPrintingPref(*key, 5)->utf8(), "YES");
  EXPECT_EQ(loggedLinesContaining(".corrupt"), 1u);
}

TEST_F(PrefsStore, StoreWhoseTopLevelIsNoDictionaryCountsAsCorrupt) {
  const std::string array =
      "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n"
      "<array>\n\t<string>support_quarrin</string>\n</array>\n</plist>\n";
  std::filesystem::create_directories(dir_ / "var/lib/quarrin");
  ASSERT_TRUE(writeFile(store_, array));
  auto key = String::make("support_quarrin");
  EXPECT_FALSE(copyStringPrintingPref(*key, 5));
  EXPECT_EQ(loggedLinesContaining(store_), 1u);
  setPrintingPref(*String::make("other"), *String::make("x"), 5);
  EXPECT_EQ(readFile(store_ + ".corrupt"), array);
  EXPECT_EQ(storedDictionary()->count(), 1u);
}

TEST_F(PrefsStore, UnreadableStoreIsNotReplaced) {
  // A directory where the store should be: reading fails, so writing must not
  // guess at what the store held.
  std::filesystem::create_directories(store_);
  setPrintingPref(*String::make("k"), *String::make("v"), 5);
  EXPECT_TRUE(std::filesystem::is_directory(store_));
  EXPECT_GE(loggedLinesContaining(store_), 1u);
}

TEST_F(PrefsStore, ConcurrentWritersLoseNoKeyAndReadersAlwaysSeeAWholeStore) {
  constexpr int kWriters = 8, kKeysEach = 200;
  int done[2];
  ASSERT_EQ(pipe2(done, O_CLOEXEC), 0);
  pid_t reader = spawn([&] {
    close(done[1]);
    fcntl(done[0], F_SETFL, O_NONBLOCK);
    size_t lastCount = 0, reads = 0;
    char c;
    while (read(done[0], &c, 1) < 0 && errno == EAGAIN) {
      auto bytes = readFile(store_);
      if (!bytes) continue;  // not created yet
      auto dict = cast<Dictionary>(readPropertyList(*bytes));
      if (!dict || dict->count() < lastCount) return false;
      lastCount = dict->count();
      ++reads;
      usleep(500);  // leave the writers most of the processor
    }
    return reads > 0;
  });
  std::vector<pid_t> writers;
  for (int w = 0; w < kWriters; ++w)
    writers.push_back(spawn([w] {
      for (int k = 0; k < kKeysEach; ++k)
        setPrintingPref(*String::make("w" + std::to_string(w) + "-" + std::to_string(k)),
                        *Number::integer(w * 1000 + k), 5);
      return true;
    }));
  for (pid_t pid : writers) EXPECT_EQ(exitStatusOf(pid), 0);
  close(done[1]);
  EXPECT_EQ(exitStatusOf(reader), 0) << "a read saw a broken or shrunken store";
  close(done[0]);

  auto stored = storedDictionary();
  ASSERT_TRUE(stored);
  EXPECT_EQ(stored->count(), size_t(kWriters * kKeysEach));
  for (int w = 0; w < kWriters; ++w)
    for (int k = 0; k < kKeysEach; ++k) {
      auto* n = stored->getAs<Number>("w" + std::to_string(w) + "-" + std::to_string(k));
      ASSERT_TRUE(n) << w << "-" << k;
      EXPECT_EQ(n->int64Value(), w * 1000 + k);
    }
  EXPECT_TRUE(logged_.empty());
}

TEST_F(PrefsStore, WriterKilledAtAnyMomentLeavesTheOldOrTheNewStore) {
  // The writer stores a counter with a payload whose size changes with it, so
  // a store written in place and cut short would fail to parse.
  auto stateKey = String::make("state");
  auto stateFor = [](int64_t n) {
    auto state = make<MutableDictionary>();
    state->set("n", Number::integer(n));
    state->set("payload", String::make(std::string(size_t(n % 50) * 400, 'x')));
    return state;
  };
  auto counterIn = [&](const Ref<Dictionary>& store) -> std::optional<int64_t> {
    auto* state = store ? store->getAs<Dictionary>("state") : nullptr;
    auto* n = state ? state->getAs<Number>("n") : nullptr;
    if (!n) return std::nullopt;
    return n->int64Value();
  };
  setPrintingPref(*String::make("support_quarrin"), *String::make("YES"), 5);
  setPrintingPref(*stateKey, *stateFor(0), 5);
  std::mt19937 random(12345);
  int64_t lastCounter = 0;
  int kills = 0, advanced = 0;
  // Run for a few seconds, longer on a busy machine until some writes got through.
  auto start = std::chrono::steady_clock::now();
  auto elapsed = [&] { return std::chrono::steady_clock::now() - start; };
  while (elapsed() < std::chrono::seconds(4) ||
         (advanced < 3 && elapsed() < std::chrono::seconds(30))) {
    pid_t writer = spawn([&] {
      for (;;) {
        auto n = counterIn(storedDictionary());
        if (!n) return false;
        setPrintingPref(*stateKey, *stateFor(*n + 1), 5);
      }
    });
    usleep(std::uniform_int_distribution<useconds_t>(0, 50000)(random));
    kill(writer, SIGKILL);
    ASSERT_EQ(exitStatusOf(writer), 128 + SIGKILL) << "the writer failed on its own";
    ++kills;
    auto stored = storedDictionary();
    ASSERT_TRUE(stored) << "a killed writer left a broken store after " << kills << " kills";
    ASSERT_TRUE(stored->getAs<String>("support_quarrin"));
    auto counter = counterIn(stored);
    ASSERT_TRUE(counter);
    ASSERT_GE(*counter, lastCounter) << "a committed write was lost";
    advanced += *counter > lastCounter;
    lastCounter = *counter;
  }
  EXPECT_GT(kills, 10);
  EXPECT_GE(advanced, 3) << "too few writers got a write through for the kills to mean much";

  // Temporary files of killed writers are cleared by the next writer.
  setPrintingPref(*stateKey, *stateFor(lastCounter + 1), 5);
  EXPECT_EQ(filesIn(dir_ / "var/lib/quarrin"),
            (std::vector<std::string>{"printing-prefs.plist", "printing-prefs.plist.lock"}));
}
