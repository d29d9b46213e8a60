// The PID file, the recording repository and the time-shift file.
#include <sys/stat.h>
#include <unistd.h>

#include "agent/pid_file.h"
#include "agent/recording_repository.h"
#include "tests/unit/agent/agent_fixture.h"

namespace lmx {
namespace {

namespace fs = std::filesystem;
using testing::readFile;
using testing::writeFile;

class DaemonFiles : public AgentTest {
 protected:
  ~DaemonFiles() override {
    fs::remove_all(systemPath(kPidFile));
    fs::remove_all(systemPath(kTimeShiftFile));
  }
  /// Runs one turn of the main loop, which reads the time shift.
  void turn() {
    agent_.mainRunLoop().post([this] { context_->state.running.set(false); }, Wait::no);
    EXPECT_EQ(agent_.mainLoop().appLoop(), 0);
    context_->state.running.set(true);
  }
};

TEST_F(DaemonFiles, PidFileHoldsTheProcessIdInDecimal) {
  EXPECT_EQ(createPIDFile(*context_), 0);
  EXPECT_EQ(readFile(systemPath(kPidFile)), std::to_string(getpid()) + "\n");
  EXPECT_EQ(fs::status(systemPath(kPidFile)).permissions(), fs::perms{0644});
  removePIDFile();
  EXPECT_FALSE(fs::exists(systemPath(kPidFile)));
  removePIDFile();
}

TEST_F(DaemonFiles, PidFileReplacesALongerOne) {
  writeFile(systemPath(kPidFile), "999999999999\nleft over");
  EXPECT_EQ(createPIDFile(*context_), 0);
  EXPECT_EQ(readFile(systemPath(kPidFile)), std::to_string(getpid()) + "\n");
}

TEST_F(DaemonFiles, PidFileThatCannotBeCreatedFailsSilently) {
  fs::create_directory(systemPath(kPidFile));
  EXPECT_EQ(createPIDFile(*context_), 1);
  EXPECT_TRUE(log_.entries().empty());
}

TEST_F(DaemonFiles, DeniedAccessToThePidFileIsOnlyLogged) {
  // Changes the effective user of this thread only: root is never denied access.
  if (geteuid() != 0) GTEST_SKIP() << "needs root to become somebody else";
  fs::permissions(systemPath("/var/run"), fs::perms{0700});
  fs::permissions(systemPath(""), fs::perms{0755});
  ASSERT_EQ(seteuid(65534), 0);
  const int result = createPIDFile(*context_);
  ASSERT_EQ(seteuid(0), 0);
  EXPECT_EQ(result, 0);
  EXPECT_TRUE(log_.contains(kLogError, "unable to write pid file (EACCES)"));
}

TEST_F(DaemonFiles, ExistingRepositoryIsUsed) {
  EXPECT_TRUE(
      setupRecordingRepository(*context_, context_->recording.recording_repository_path.get().value()));
  EXPECT_TRUE(log_.entries().empty());
}

TEST_F(DaemonFiles, MissingRepositoryIsMadeWithItsParents) {
  const std::string path = repository_.file("a/b/c");
  context_->recording.recording_repository_path.set(path);
  EXPECT_TRUE(
      setupRecordingRepository(*context_, context_->recording.recording_repository_path.get().value()));
  EXPECT_TRUE(fs::is_directory(path));
  EXPECT_EQ(fs::status(path).permissions(), fs::perms{0755});
  EXPECT_TRUE(log_.contains(kLogInfo, "Recording Repository does not exist, creating " + path + "."));
}

TEST_F(DaemonFiles, RepositoryThatCannotBeMadeIsAFailure) {
  fs::create_symlink("/no/such/place", repository_.file("link"));
  context_->recording.recording_repository_path.set(repository_.file("link"));
  EXPECT_FALSE(
      setupRecordingRepository(*context_, context_->recording.recording_repository_path.get().value()));
  EXPECT_TRUE(log_.contains(kLogCritical, "Unable to create recording directory"));
}

TEST_F(DaemonFiles, RepositoryBelowAFileDoesNotExist) {
  writeFile(repository_.file("plain"), "");
  const std::string path = repository_.file("plain/sub");
  context_->recording.recording_repository_path.set(path);
  EXPECT_FALSE(
      setupRecordingRepository(*context_, context_->recording.recording_repository_path.get().value()));
  EXPECT_TRUE(log_.contains(kLogCritical, "Recording repository path \"" + path + "\" does not exist"));
}

TEST_F(DaemonFiles, TimeShiftIsReadOnEveryTurn) {
  const std::string path = systemPath(kTimeShiftFile);
  ASSERT_EQ(writePropertyList(path, PlistDictionary{{"TimeShiftSeconds", std::int64_t{20}}}), 0);
  turn();
  EXPECT_EQ(context_->state.timeshift_seconds.get(), 20);
  ASSERT_EQ(writePropertyList(path, PlistDictionary{{"Other", std::int64_t{30}}}), 0);
  turn();
  EXPECT_EQ(context_->state.timeshift_seconds.get(), 0);
}

TEST_F(DaemonFiles, WithoutAUsableTimeShiftFileThereIsNone) {
  for (const char* content : {"", "not a property list"}) {
    context_->state.timeshift_seconds.set(20);
    writeFile(systemPath(kTimeShiftFile), content);
    turn();
    EXPECT_EQ(context_->state.timeshift_seconds.get(), 0);
  }
  fs::remove(systemPath(kTimeShiftFile));
  context_->state.timeshift_seconds.set(20);
  turn();
  EXPECT_EQ(context_->state.timeshift_seconds.get(), 0);
}

}  // namespace
}  // namespace lmx
