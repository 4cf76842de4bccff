#include "platform/prefs/FilePreferencesStore.h"
#include "support/PlatformTest.h"

#include <sys/wait.h>
#include <unistd.h>

#include <fstream>

namespace kyn::platform {
namespace {

using test::PlatformTest;

class PreferencesStoreTest : public PlatformTest {
 protected:
  std::filesystem::path dir() const { return configDir->path() / "prefs"; }
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
  FilePreferencesStore store(dir());
  store.setValue("d", "k", Value("v"));
  ASSERT_TRUE(store.synchronize("d"));
  std::vector<std::string> names;
  for (const auto& e : std::filesystem::directory_iterator(dir())) names.push_back(e.path().filename().string());
  std::sort(names.begin(), names.end());
  EXPECT_EQ(names, (std::vector<std::string>{"d.json", "d.json.lock"}));
  const auto perms = std::filesystem::status(dir() / "d.json").permissions();
  EXPECT_EQ(perms & (std::filesystem::perms::group_all | std::filesystem::perms::others_all),
            std::filesystem::perms::none);
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
