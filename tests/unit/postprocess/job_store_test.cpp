// Jobs that survive the process.
#include "postprocess/job_store.h"

#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>

#include "model/metadata_keys.h"
#include "tests/unit/postprocess/submit_fixture.h"

namespace {

bool directory_syncs_fail = false;
std::string synced;  ///< what has been synced: "f" for a file, "d" for a directory

}  // namespace

/// Stands for the system's in this program.
extern "C" int fsync(int descriptor) {
  struct stat status {};
  const bool directory = fstat(descriptor, &status) == 0 && S_ISDIR(status.st_mode);
  if (directory && directory_syncs_fail) {
    errno = EIO;
    return -1;
  }
  synced += directory ? 'd' : 'f';
  return static_cast<int>(syscall(SYS_fsync, descriptor));
}

namespace lmx {
namespace {

class Jobs : public testing::SubmitFixture {
 protected:
  std::shared_ptr<AgentSubmit> job(const std::string& name) {
    auto made = std::make_shared<AgentSubmit>();
    made->agentContext = context_;
    made->request = "request of " + name;
    made->properties[metadata_key::kRecordingUUID] = name;
    made->recording_file_path = inRepository(name + ".mov");
    made->properties_file_path = inRepository(name + ".xml");
    return made;
  }
  static std::string folder() { return testing::kTestRoot.path() + "/var/lmx/agent/jobs"; }
  static std::size_t filesLeft() {
    const std::filesystem::directory_iterator all(folder());
    return static_cast<std::size_t>(std::distance(begin(all), end(all)));
  }
  /// What a new process finds. @return the names of the jobs that wait, in order
  std::vector<std::string> takenUp(JobStore& store) {
    std::vector<std::string> names;
    left_ = store.takeUp(context_);
    for (const auto& waiting : left_.waiting)
      names.push_back(waiting->properties[metadata_key::kRecordingUUID]);
    return names;
  }
  JobStore::Left left_;
};

using Names = std::vector<std::string>;

TEST_F(Jobs, AreTakenUpInTheOrderOfTheirPlaces) {
  {
    JobStore store(folder());
    store.keep(*job("C"), 3);
    store.keep(*job("A"), 1);
    store.keep(*job("B1"), 2);
    store.keep(*job("B2"), 2);
  }
  JobStore next(folder());
  EXPECT_EQ(takenUp(next), (Names{"A", "B1", "B2", "C"}));
  EXPECT_TRUE(next.tookUp("request of B1"));
  EXPECT_FALSE(next.tookUp("request of D"));
  EXPECT_TRUE(log_.entries().empty());
}

TEST_F(Jobs, OfANewProcessComeBehindThoseItTookUp) {
  JobStore(folder()).keep(*job("old"), 40);
  {
    JobStore second(folder());
    takenUp(second);
    second.keep(*job("new"), 1);
  }
  JobStore third(folder());
  EXPECT_EQ(takenUp(third), (Names{"old", "new"}));
}

TEST_F(Jobs, KeepAllThatTheToolNeeds) {
  auto kept = job("R1");
  kept->adhoc_workflow_uuid = "W";
  kept->user = "bob";
  kept->password = "open, sesame = <&>";
  kept->recorded = std::make_shared<AgentRecord>();
  kept->recorded->setRecordedType(kRecordingTypeVideo);
  JobStore(folder()).keep(*kept, 1);
  JobStore next(folder());
  takenUp(next);
  ASSERT_EQ(left_.waiting.size(), 1U);
  AgentSubmit& found = *left_.waiting[0];
  EXPECT_EQ(found.recording_file_path, inRepository("R1.mov"));
  EXPECT_EQ(found.properties_file_path, inRepository("R1.xml"));
  EXPECT_EQ(found.recorded->recordedType(), kRecordingTypeVideo);
  EXPECT_EQ(found.addRecordingWithCommentary(children_), 0);
  EXPECT_EQ(children_.runs().at(0), (Names{systemPath(kLumexTool), "--server", "https://lumex.example",
                                           "--submit", "--file", inRepository("R1.mov"), "--workflow_uuid",
                                           "W", "--user", "bob", "-p", "open, sesame = <&>", "--delete"}));
}

TEST_F(Jobs, AreForTheirOwnerAlone) {
  const auto kept = job("R1");
  JobStore(folder()).keep(*kept, 1);
  for (const auto& entry : std::filesystem::directory_iterator(folder())) {
    EXPECT_EQ(entry.status().permissions(),
              std::filesystem::perms::owner_read | std::filesystem::perms::owner_write);
  }
  EXPECT_EQ(std::filesystem::status(folder()).permissions(), std::filesystem::perms::owner_all);
}

TEST_F(Jobs, AreGoneWithAllTracesOnceTheToolHasEnded) {
  for (const int status : {0, 3}) {
    const auto kept = job("R1");
    JobStore(folder()).keep(*kept, 1);
    children_.results = {{ChildResult::End::exited, status, {}}};
    kept->addRecordingWithCommentary(children_);
    EXPECT_EQ(filesLeft(), 0U) << status;
  }
}

TEST_F(Jobs, WhoseToolHadBeenStartedAreOnlyNamed) {
  const auto kept = job("R1");
  JobStore(folder()).keep(*kept, 1);
  JobStore(folder()).keep(*job("R2"), 2);
  bool checked = false;
  children_.on_run = [&](const ChildOptions&) {  // the process is killed here
    JobStore next(folder());
    EXPECT_EQ(takenUp(next), Names{"R2"});
    EXPECT_EQ(left_.begun, Names{inRepository("R1.mov")});
    checked = true;
  };
  kept->addRecordingWithCommentary(children_);
  EXPECT_TRUE(checked);
}

/// A start that is itself cut short must neither name it again nor forget it.
TEST_F(Jobs, ThatHadBegunAreNamedOnceAndKnownUntilTheCapturesHaveBeenSeen) {
  const auto kept = job("R1");
  JobStore(folder()).keep(*kept, 1);
  kept->stored->begin();
  for (const bool first : {true, false}) {
    JobStore next(folder());
    EXPECT_EQ(takenUp(next), Names{});
    EXPECT_EQ(left_.begun, first ? Names{inRepository("R1.mov")} : Names{});
    EXPECT_TRUE(next.tookUp("request of R1"));
    if (!first) next.forgetBegun();
  }
  EXPECT_EQ(filesLeft(), 0U);
  JobStore last(folder());
  takenUp(last);
  EXPECT_FALSE(last.tookUp("request of R1"));
}

TEST_F(Jobs, SurviveAPowerCutInEachState) {
  const auto kept = job("R1");
  JobStore store(folder());
  takenUp(store);  // makes the folder
  synced.clear();
  store.keep(*kept, 1);
  EXPECT_EQ(synced, "fd") << "the file, then its name";
  synced.clear();
  kept->stored->begin();
  EXPECT_EQ(synced, "d") << "its new name";
}

/// The file is there: a job that did not know it would be submitted again by the next start.
TEST_F(Jobs, WhoseFileMayNotSurviveAPowerCutAreRemovedAllTheSame) {
  const auto kept = job("R1");
  JobStore(folder()).keep(*job("other"), 1);  // makes the folder
  directory_syncs_fail = true;
  JobStore(folder()).keep(*kept, 2);
  directory_syncs_fail = false;
  EXPECT_TRUE(log_.mentions("could not be stored"));
  EXPECT_EQ(filesLeft(), 2U);
  kept->addRecordingWithCommentary(children_);
  EXPECT_EQ(filesLeft(), 1U);
}

TEST_F(Jobs, ThatFailBeforeTheToolAreGoneToo) {
  const auto kept = job("R1");
  kept->adhoc_workflow_uuid = "W";  // and nobody to submit it
  JobStore(folder()).keep(*kept, 1);
  EXPECT_EQ(kept->addRecordingWithCommentary(children_), -1);
  EXPECT_EQ(filesLeft(), 0U);
}

TEST_F(Jobs, OfAnotherProcessThatRunsAreLeftToIt) {
  JobStore first(folder());
  takenUp(first);
  first.keep(*job("R1"), 1);
  JobStore second(folder());
  EXPECT_EQ(takenUp(second), Names{});
  EXPECT_TRUE(log_.mentions("The jobs in " + folder() + " can't be taken up: another process uses them"));
}

TEST_F(Jobs, ThatWereBeingWrittenLeaveNothing) {
  JobStore(folder()).keep(*job("R1"), 1);
  write(folder() + "/.lmx-0000000002-0000.job.aBcDeF", "half a fi");
  JobStore next(folder());
  EXPECT_EQ(takenUp(next), Names{"R1"});
  EXPECT_EQ(filesLeft(), 1U);
}

TEST_F(Jobs, ThatCanNotBeReadAreLeftAloneAndNamed) {
  JobStore(folder()).keep(*job("R1"), 2);
  write(folder() + "/0000000001-0000.job", "half a fi");
  JobStore next(folder());
  EXPECT_EQ(takenUp(next), Names{"R1"});
  EXPECT_TRUE(log_.mentions("0000000001-0000.job"));
  EXPECT_TRUE(contentOf(folder() + "/0000000001-0000.job"));
}

TEST_F(Jobs, ThatCanNotBeStoredStayInMemory) {
  const auto kept = job("R1");
  write(inRepository("file"), "a file in the way");
  JobStore(inRepository("file/jobs")).keep(*kept, 1);
  EXPECT_EQ(kept->stored, nullptr);
  EXPECT_TRUE(log_.mentions("The submission of \"" + inRepository("R1.mov") + "\" could not be stored"));
  EXPECT_EQ(kept->addRecordingWithCommentary(children_), 0);
}

}  // namespace
}  // namespace lmx
