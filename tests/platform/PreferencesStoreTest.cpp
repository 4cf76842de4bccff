#include "platform/prefs/FilePreferencesStore.h"
#include "support/PlatformTest.h"

#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <random>

namespace kyn::platform {
namespace {

class PreferencesStoreTest : public test::PlatformTest {
 protected:
  std::filesystem::path dir() const { return configDir->path() / "prefs"; }
  std::vector<std::string> namesInDir() const {
    std::vector<std::string> names;
    for (const auto& e : std::filesystem::directory_iterator(dir())) names.push_back(e.path().filename().string());
    std::sort(names.begin(), names.end());
    return names;
  }
};

TEST_F(PreferencesStoreTest, OtherStoresSeeAValueOnceItIsSynchronisedAndRemovalDeletesTheKey) {
  FilePreferencesStore writer(dir());
  FilePreferencesStore reader(dir());
  writer.setValue("d", "host", Value("a.example"));
  EXPECT_EQ(writer.value("d", "host"), Value("a.example"));  // at once in this store
  EXPECT_FALSE(reader.value("d", "host"));
  ASSERT_TRUE(writer.synchronize("d"));
  EXPECT_EQ(reader.value("d", "host"), Value("a.example"));
  writer.setValue("d", "host", Value("b.example"));
  ASSERT_TRUE(writer.synchronize("d"));
  EXPECT_EQ(reader.value("d", "host"), Value("b.example"));  // re-read when the file changed
  reader.setValue("d", "host", Value("c.example"));
  ASSERT_TRUE(reader.synchronize("d"));
  EXPECT_EQ(writer.value("d", "host"), Value("c.example"));  // its own synchronised value no longer shadows it
  writer.setValue("d", "host", std::nullopt);
  ASSERT_TRUE(writer.synchronize("d"));
  EXPECT_FALSE(FilePreferencesStore(dir()).value("d", "host"));
}

TEST_F(PreferencesStoreTest, EveryDescriptorIsClosedEvenNumberZero) {  // a host may run with its input closed
  const int input = ::dup(0);
  ::close(0);
  FilePreferencesStore store(dir());
  store.setValue("d", "k", Value(1));
  EXPECT_TRUE(store.synchronize("d") && FilePreferencesStore(dir()).value("d", "k") && ::fcntl(0, F_GETFD) == -1);
  ::dup2(input, 0);
  ::close(input);
}

TEST_F(PreferencesStoreTest, ConcurrentWritersInTwoProcessesLoseNoUpdate) {
  constexpr int kWrites = 25;
  auto writeAll = [&](const std::string& prefix) {
    FilePreferencesStore store(dir());
    for (int i = 0; i < kWrites; ++i) {
      store.setValue("d", prefix + std::to_string(i), Value(i));
      if (!store.synchronize("d")) return false;
    }
    return true;
  };
  const pid_t child = fork();
  ASSERT_GE(child, 0);
  if (child == 0) _exit(writeAll("child") ? 0 : 1);
  EXPECT_TRUE(writeAll("parent"));
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
  for (const char* corrupt : {"{\"k\": ", "[1,2]", "\xFF\xFE garbage", ""}) {
    configDir->write("prefs/d.json", corrupt);
    FilePreferencesStore store(dir());
    EXPECT_FALSE(store.value("d", "k")) << corrupt;
    EXPECT_FALSE(log->messages(LogLevel::Error).empty()) << corrupt;  // the user learns the file was lost
    store.setValue("d", "k", Value(1));
    ASSERT_TRUE(store.synchronize("d"));
    EXPECT_EQ(FilePreferencesStore(dir()).value("d", "k"), Value(1));
  }
}

TEST_F(PreferencesStoreTest, WritesLeaveNoTemporaryFilesAndKeepTheFilePrivate) {
  // Owner-only files of the temporaries' name length; only letters and digits make one a temporary.
  for (const char* name : {"d.json.Ab12Cd", "d.json.ab-cD1"}) {
    configDir->write(std::string("prefs/") + name, "{}");
    std::filesystem::permissions(dir() / name, std::filesystem::perms::owner_read | std::filesystem::perms::owner_write);
  }
  configDir->write("prefs/d.json.notes", "{}");
  configDir->write("prefs/d.json.backup", "{}");
  FilePreferencesStore store(dir());
  store.setValue("d", "k", Value("v"));
  ASSERT_TRUE(store.synchronize("d"));
  // A temporary file that an earlier version left behind goes; the user's own files stay.
  EXPECT_EQ(namesInDir(), (std::vector<std::string>{"d.json", "d.json.ab-cD1", "d.json.backup", "d.json.notes"}));
  EXPECT_EQ(std::filesystem::status(dir() / "d.json").permissions() &
                (std::filesystem::perms::group_all | std::filesystem::perms::others_all),
            std::filesystem::perms::none);
}

// A writer in a loop (a separate program) is ended abruptly at random moments, mostly in the middle
// of a write. Each time the file holds the old or the new content, and the folder nothing but the
// domain's file and its lock file.
TEST_F(PreferencesStoreTest, AWriterEndedAtAnyMomentLeavesAWholeFileAndNothingElse) {
  std::mt19937 random(std::random_device{}());
  for (int run = 0; run < 60; ++run) {
    const auto ended = host::runProgram({KYN_PREFS_WRITER, dir().string(), "d", std::to_string(random())});
    ASSERT_EQ(ended.status, 128 + SIGALRM) << "the writer failed on its own";
    for (const std::string& name : namesInDir()) {
      ASSERT_TRUE(name == "d.json" || name == "d.json.lock") << name << " left after run " << run;
    }
    FilePreferencesStore reader(dir());
    const auto stored = reader.value("d", "value");
    const auto value = stringValue(stored ? &*stored : nullptr);
    ASSERT_TRUE(value && value->size() > 8 && value->starts_with("written-") &&
                value->find_first_not_of("0123456789", 8) == std::string::npos)
        << value.value_or("nothing");
    ASSERT_EQ(reader.value("d", "padding"), Value(std::string(16384, 'p')));
  }
}

TEST_F(PreferencesStoreTest, DomainsThatAreNoFileNamesAreRefused) {
  FilePreferencesStore store(dir());
  const std::string tooLong(201, 'd');
  for (const char* bad : {"", "../escape", "a/b", ".hidden", "with space", tooLong.c_str()}) {
    store.setValue(bad, "k", Value(1));
    EXPECT_FALSE(store.value(bad, "k")) << bad;
    EXPECT_FALSE(store.synchronize(bad)) << bad;
  }
  EXPECT_EQ(log->messages(LogLevel::Error).size(), 6u);  // each refused value is reported
  EXPECT_FALSE(std::filesystem::exists(configDir->path() / "escape.json"));
  const std::string longest(200, 'd');
  store.setValue(longest, "k", Value(1));
  EXPECT_TRUE(store.synchronize(longest));
}

TEST_F(PreferencesStoreTest, AFailedWriteIsLoggedAndKeepsThePendingValueForTheNextTry) {
  configDir->write("prefs", "a file where the directory should be");
  FilePreferencesStore store(dir());
  store.setValue("d", "k", Value(1));
  EXPECT_FALSE(store.synchronize("d"));
  EXPECT_EQ(store.value("d", "k"), Value(1));
  EXPECT_EQ(log->messages(LogLevel::Error).size(), 1u);
  std::filesystem::remove(dir());
  EXPECT_TRUE(store.synchronize("d"));
  EXPECT_EQ(FilePreferencesStore(dir()).value("d", "k"), Value(1));
}

}  // namespace
}  // namespace kyn::platform
