#include "platform/prefs/FilePreferencesStore.h"
#include "support/PlatformTest.h"

#include <fcntl.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <fstream>
#include <random>
#include <thread>

namespace kyn::platform {
namespace {

using test::PlatformTest;

class PreferencesStoreTest : public PlatformTest {
 protected:
  std::filesystem::path dir() const { return configDir->path() / "prefs"; }

  std::vector<std::string> namesInDir() const {
    std::vector<std::string> names;
    for (const auto& e : std::filesystem::directory_iterator(dir())) names.push_back(e.path().filename().string());
    std::sort(names.begin(), names.end());
    return names;
  }
};

TEST_F(PreferencesStoreTest, ValuesRoundTripAndRemovalDeletesTheKey) {
  FilePreferencesStore store(dir());
  EXPECT_FALSE(store.value("d", "k"));
  store.setValue("d", "k", Value("v"));
  EXPECT_EQ(store.value("d", "k"), Value("v"));  // visible at once in this process
  ASSERT_TRUE(store.synchronize("d"));
  store.setValue("d", "k", std::nullopt);
  EXPECT_FALSE(store.value("d", "k"));
  ASSERT_TRUE(store.synchronize("d"));
  FilePreferencesStore other(dir());
  EXPECT_FALSE(other.value("d", "k"));
}

TEST_F(PreferencesStoreTest, OtherStoresSeeAValueOnlyOnceItIsSynchronised) {
  FilePreferencesStore writer(dir());
  FilePreferencesStore reader(dir());
  writer.setValue("d", "host", Value("a.example"));
  EXPECT_FALSE(reader.value("d", "host"));
  ASSERT_TRUE(writer.synchronize("d"));
  EXPECT_EQ(reader.value("d", "host"), Value("a.example"));
  writer.setValue("d", "host", Value("b.example"));
  ASSERT_TRUE(writer.synchronize("d"));
  EXPECT_EQ(reader.value("d", "host"), Value("b.example"));  // re-read when the file changed
}

TEST_F(PreferencesStoreTest, ASecondProcessSeesTheStoredValue) {
  {
    FilePreferencesStore store(dir());
    store.setValue("com.example.app", "RedirectedHostKey", Value("r.example:8443"));
    ASSERT_TRUE(store.synchronize("com.example.app"));
  }
  const pid_t child = fork();
  ASSERT_GE(child, 0);
  if (child == 0) {
    FilePreferencesStore store(dir());
    const auto v = store.value("com.example.app", "RedirectedHostKey");
    _exit(v && *v == Value("r.example:8443") ? 0 : 1);
  }
  int status = 0;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
}

TEST_F(PreferencesStoreTest, ConcurrentWritersInTwoProcessesLoseNoUpdate) {
  constexpr int kWrites = 40;
  const pid_t child = fork();
  ASSERT_GE(child, 0);
  if (child == 0) {
    FilePreferencesStore store(dir());
    for (int i = 0; i < kWrites; ++i) {
      store.setValue("d", "child" + std::to_string(i), Value(i));
      if (!store.synchronize("d")) _exit(1);
    }
    _exit(0);
  }
  FilePreferencesStore store(dir());
  for (int i = 0; i < kWrites; ++i) {
    store.setValue("d", "parent" + std::to_string(i), Value(i));
    ASSERT_TRUE(store.synchronize("d"));
  }
  int status = 0;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  ASSERT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
  FilePreferencesStore reader(dir());
  for (int i = 0; i < kWrites; ++i) {
    EXPECT_EQ(reader.value("d", "child" + std::to_string(i)), Value(i));
    EXPECT_EQ(reader.value("d", "parent" + std::to_string(i)), Value(i));
  }
}

TEST_F(PreferencesStoreTest, ACorruptFileReadsAsEmptyAndIsReplacedOnTheNextWrite) {
  std::filesystem::create_directories(dir());
  for (const char* corrupt : {"{\"k\": ", "[1,2]", "\xFF\xFE garbage", ""}) {
    { std::ofstream(dir() / "d.json", std::ios::trunc) << corrupt; }
    FilePreferencesStore store(dir());
    EXPECT_FALSE(store.value("d", "k")) << corrupt;
    store.setValue("d", "k", Value(1));
    ASSERT_TRUE(store.synchronize("d"));
    FilePreferencesStore reader(dir());
    EXPECT_EQ(reader.value("d", "k"), Value(1));
  }
  EXPECT_TRUE(log->contains("is not a JSON object"));
}

TEST_F(PreferencesStoreTest, WritesLeaveNoTemporaryFilesAndKeepTheFilePrivate) {
  std::filesystem::create_directories(dir());
  for (const char* name : {"d.json.Ab12Cd", "d.json.notes"}) std::ofstream(dir() / name) << "{}";
  FilePreferencesStore store(dir());
  store.setValue("d", "k", Value("v"));
  ASSERT_TRUE(store.synchronize("d"));
  // A temporary file that an earlier version left behind goes; other files stay.
  EXPECT_EQ(namesInDir(), (std::vector<std::string>{"d.json", "d.json.notes"}));
  const auto perms = std::filesystem::status(dir() / "d.json").permissions();
  EXPECT_EQ(perms & (std::filesystem::perms::group_all | std::filesystem::perms::others_all),
            std::filesystem::perms::none);
}

// A writer in a loop (a separate program) is killed at random moments, mostly in the middle of a
// write. Each time the file holds the old or the new content, and the folder nothing but the
// domain's file and its lock file.
TEST_F(PreferencesStoreTest, AWriterKilledAtAnyMomentLeavesAWholeFileAndNothingElse) {
  constexpr int kKills = 200;
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(20);
  std::mt19937 random(std::random_device{}());
  std::string directory = dir().string();
  std::string domain = "d";
  char* argv[] = {const_cast<char*>(KYN_PREFS_WRITER), directory.data(), domain.data(), nullptr};
  int kills = 0;
  for (; kills < kKills && std::chrono::steady_clock::now() < deadline; ++kills) {
    int out[2];
    ASSERT_EQ(::pipe2(out, O_CLOEXEC), 0);
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, out[1], STDOUT_FILENO);
    pid_t child = -1;
    const int spawned = ::posix_spawn(&child, KYN_PREFS_WRITER, &actions, nullptr, argv, environ);
    posix_spawn_file_actions_destroy(&actions);
    ::close(out[1]);
    // The writer reports how long its first write took; the kill comes within such a span.
    char line[32] = {};
    const bool writing = spawned == 0 && ::read(out[0], line, sizeof line - 1) > 0;
    ::close(out[0]);
    ASSERT_EQ(spawned, 0);
    std::this_thread::sleep_for(std::chrono::microseconds(random() % (std::atoll(line) + 1)));
    ::kill(child, SIGKILL);
    int status = 0;
    ASSERT_EQ(::waitpid(child, &status, 0), child);
    ASSERT_TRUE(writing && WIFSIGNALED(status)) << "the writer failed on its own, status " << status;

    const auto names = namesInDir();
    for (const std::string& name : names) {
      ASSERT_TRUE(name == "d.json" || name == "d.json.lock") << name << " left after " << kills + 1 << " kills";
    }
    FilePreferencesStore reader(dir());
    const auto stored = reader.value("d", "value");
    const auto value = stringValue(stored ? &*stored : nullptr);
    ASSERT_TRUE(value && value->size() > 8 && value->starts_with("written-") &&
                value->find_first_not_of("0123456789", 8) == std::string::npos)
        << value.value_or("nothing");
    ASSERT_EQ(reader.value("d", "padding"), Value(std::string(16384, 'p')));
  }
  EXPECT_GE(kills, 30);
}

TEST_F(PreferencesStoreTest, DomainsThatAreNoFileNamesAreRefused) {
  FilePreferencesStore store(dir());
  for (const char* bad : {"", "../escape", "a/b", ".hidden", "with space"}) {
    store.setValue(bad, "k", Value(1));
    EXPECT_FALSE(store.value(bad, "k")) << bad;
    EXPECT_FALSE(store.synchronize(bad)) << bad;
  }
  EXPECT_FALSE(std::filesystem::exists(configDir->path() / "escape.json"));
}

TEST_F(PreferencesStoreTest, AFailedWriteKeepsThePendingValueForTheNextTry) {
  { std::ofstream(dir()) << "a file where the directory should be"; }
  FilePreferencesStore store(dir());
  store.setValue("d", "k", Value(1));
  EXPECT_FALSE(store.synchronize("d"));
  EXPECT_EQ(store.value("d", "k"), Value(1));
  EXPECT_TRUE(log->contains("could not be written"));
  std::filesystem::remove(dir());
  EXPECT_TRUE(store.synchronize("d"));
  EXPECT_EQ(FilePreferencesStore(dir()).value("d", "k"), Value(1));
}

}  // namespace
}  // namespace kyn::platform
