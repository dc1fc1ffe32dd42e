#include "store/prefs_store.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <random>

#include "fixtures/fixture_support.h"
#include "platform/file_io.h"
#include "plist/property_list.h"
#include "support/temp_dir.h"
#include "values/dictionary.h"
#include "values/number.h"
#include "values/string.h"
#include "values/url.h"

using namespace qr;

namespace {

class PrefsStore : public ::testing::Test {
 protected:
  void SetUp() override { env_.set("CACHEWRIGHT_PREFS", store_); }

  Ref<Dictionary> storedDictionary() const {
    return cast<Dictionary>(readPropertyListFile(store_));
  }
  // What the store's directory holds, sorted.
  std::vector<std::string> storeFolder() const {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(dir_ / "var/lib/quarrin"))
      names.push_back(entry.path().filename().string());
    std::sort(names.begin(), names.end());
    return names;
  }
  static void set(std::string_view key, const Object& value) {
    setPrintingPref(*String::make(key), value, 5);
  }

  qrtest::TempDir dir_{qrtest::memoryBackedTempBase()};
  std::string store_ = dir_ / "var/lib/quarrin/printing-prefs.plist";
  const std::vector<std::string> kStoreAndLock = {"printing-prefs.plist",
                                                  "printing-prefs.plist.lock"};
  qrtest::EnvGuard env_;
  qr::test::CapturedLog log_;
};

size_t linesContaining(const qr::test::CapturedLog& log, std::string_view text) {
  return std::ranges::count_if(
      log.lines(), [&](const std::string& line) { return line.find(text) != std::string::npos; });
}

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

}  // namespace

TEST_F(PrefsStore, MissingStoreHoldsNothingAndTheFirstWriteCreatesIt) {
  auto key = String::make("support_quarrin");
  EXPECT_FALSE(copyStringPrintingPref(*key, 5));
  EXPECT_FALSE(copyDictionaryPrintingPref(*key, 8));
  EXPECT_TRUE(log_.lines().empty()) << "a missing store is no failure";

  set("support_quarrin", *String::make("YES"));
  auto value = copyStringPrintingPref(*key, 5);
  ASSERT_TRUE(value);
  EXPECT_EQ(value->utf8(), "YES");

  struct stat st;
  ASSERT_EQ(stat((dir_ / "var/lib/quarrin").c_str(), &st), 0);
  EXPECT_EQ(st.st_mode & 0777, 0755u) << "missing directories are created";
  ASSERT_EQ(stat(store_.c_str(), &st), 0);
  EXPECT_EQ(st.st_mode & 0777, 0644u);
  EXPECT_TRUE(
      qrtest::readText(store_).starts_with("<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist"));
  EXPECT_EQ(storeFolder(), kStoreAndLock);
}

TEST_F(PrefsStore, ValuesOfTheWrongKindReadAsNoneAndCopiesBelongToTheCaller) {
  auto cacheKey = String::make("pmcache 5");
  auto entry = make<MutableDictionary>();
  entry->set("Bundle Version", String::make("1.0"));
  auto cache = make<MutableDictionary>();
  cache->set("file:///a.plugin/", entry);
  set("pmcache 5", *cache);
  set("support_quarrin", *String::make("YES"));

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
  set("url", *URL::fileURL("/tmp", true));
  EXPECT_EQ(linesContaining(log_, "not a property list"), 1u);
  EXPECT_EQ(storedDictionary()->count(), 2u);
}

TEST_F(PrefsStore, EveryReadSeesTheFileAsItIsAndAnUnchangedValueLeavesItAlone) {
  auto key = String::make("support_quarrin");
  setPrintingPref(*key, *String::make("YES"), 5);
  EXPECT_EQ(copyStringPrintingPref(*key, 5)->utf8(), "YES");

  // Rewritten in place by someone else, same size, its times put back: seen.
  struct stat before;
  ASSERT_EQ(stat(store_.c_str(), &before), 0);
  std::string bytes = *readFile(store_);
  bytes.replace(bytes.find("YES"), 3, "NOP");
  ASSERT_TRUE(writeFile(store_, bytes));
  struct timespec times[2] = {before.st_atim, before.st_mtim};
  ASSERT_EQ(utimensat(AT_FDCWD, store_.c_str(), times, 0), 0);
  EXPECT_EQ(copyStringPrintingPref(*key, 5)->utf8(), "NOP");

  // Storing the value the store already holds writes nothing.
  struct stat rewritten, after;
  ASSERT_EQ(stat(store_.c_str(), &rewritten), 0);
  setPrintingPref(*key, *String::make("NOP"), 5);
  ASSERT_EQ(stat(store_.c_str(), &after), 0);
  EXPECT_EQ(after.st_ino, rewritten.st_ino) << "not replaced";
  EXPECT_EQ(after.st_mtim.tv_nsec, rewritten.st_mtim.tv_nsec);
  EXPECT_EQ(after.st_mtim.tv_sec, rewritten.st_mtim.tv_sec);

  // Any other value replaces it.
  setPrintingPref(*key, *String::make("YES"), 5);
  ASSERT_EQ(stat(store_.c_str(), &after), 0);
  EXPECT_NE(after.st_ino, rewritten.st_ino);
  EXPECT_EQ(copyStringPrintingPref(*key, 5)->utf8(), "YES");
  EXPECT_TRUE(log_.lines().empty());
}

TEST_F(PrefsStore, CorruptStoreReadsEmptyLogsOnceAndIsKeptBeforeReplacement) {
  for (std::string corrupt : {
           "<?xml version=\"1.0\"?><plist><dict><key>half",
           // A whole property list, but no dictionary.
           "<?xml version=\"1.0\"?>\n<plist version=\"1.0\"><array><string>support_quarrin</string>"
           "</array></plist>\n",
       }) {
    SCOPED_TRACE(corrupt);
    qr::test::CapturedLog log;
    store_ += "-" + std::to_string(corrupt.size());  // a store not yet logged about
    env_.set("CACHEWRIGHT_PREFS", store_);
    qrtest::writeText(store_, corrupt);
    auto key = String::make("support_quarrin");
    EXPECT_FALSE(copyStringPrintingPref(*key, 5));
    EXPECT_FALSE(copyDictionaryPrintingPref(*key, 5));
    EXPECT_EQ(linesContaining(log, store_), 1u) << "logged once, naming the store";

    set("support_quarrin", *String::make("YES"));
    EXPECT_EQ(qrtest::readText(store_ + ".corrupt"), corrupt);
    auto stored = storedDictionary();
    ASSERT_TRUE(stored);
    EXPECT_EQ(stored->count(), 1u);
    EXPECT_EQ(copyStringPrintingPref(*key, 5)->utf8(), "YES");
    EXPECT_EQ(linesContaining(log, ".corrupt"), 1u);
  }
}

TEST_F(PrefsStore, UnreadableStoreIsNotReplaced) {
  // A directory where the store should be: reading fails, so writing must not
  // guess at what the store held.
  std::filesystem::create_directories(store_);
  set("k", *String::make("v"));
  EXPECT_TRUE(std::filesystem::is_directory(store_));
  EXPECT_GE(linesContaining(log_, store_), 1u);
}

TEST_F(PrefsStore, ConcurrentWritersLoseNoKeyAndReadersAlwaysSeeAWholeStore) {
  // Each writer sets its own few keys in turn, the value counting its writes,
  // so the store stays small. Before every write it checks that each of its
  // keys still holds the count it last wrote there: an update lost to another
  // writer's stale copy would put an older count back or drop the key.
  constexpr int kWriters = 8, kWritesEach = 200, kKeysEach = 4;
  auto key = [](int w, int k) { return "w" + std::to_string(w) + "-" + std::to_string(k); };
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
    writers.push_back(spawn([&, w] {
      std::vector<int64_t> last(kKeysEach, -1);
      for (int n = 0; n < kWritesEach; ++n) {
        auto stored = storedDictionary();
        for (int k = 0; k < kKeysEach; ++k) {
          auto* value = stored ? stored->getAs<Number>(key(w, k)) : nullptr;
          if (last[k] >= 0 && (!value || value->int64Value() != last[k])) return false;
        }
        set(key(w, n % kKeysEach), *Number::integer(n));
        last[n % kKeysEach] = n;
      }
      return true;
    }));
  for (pid_t pid : writers) EXPECT_EQ(exitStatusOf(pid), 0) << "a writer saw its write lost";
  close(done[1]);
  EXPECT_EQ(exitStatusOf(reader), 0) << "a read saw a broken or shrunken store";
  close(done[0]);

  auto stored = storedDictionary();
  ASSERT_TRUE(stored);
  EXPECT_EQ(stored->count(), size_t(kWriters * kKeysEach));
  for (int w = 0; w < kWriters; ++w)
    for (int k = 0; k < kKeysEach; ++k) {
      auto* n = stored->getAs<Number>(key(w, k));
      ASSERT_TRUE(n) << key(w, k);
      EXPECT_EQ(n->int64Value(), kWritesEach - kKeysEach + k) << key(w, k);
    }
  EXPECT_TRUE(log_.lines().empty());
}

TEST_F(PrefsStore, WriterKilledAtAnyMomentLeavesTheOldOrTheNewStore) {
  // The writer stores a counter with a payload whose size changes with it, so
  // a store written in place and cut short would fail to parse.
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
  set("support_quarrin", *String::make("YES"));
  set("state", *stateFor(0));
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
        set("state", *stateFor(*n + 1));
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
  set("state", *stateFor(lastCounter + 1));
  EXPECT_EQ(storeFolder(), kStoreAndLock);
}
