// TIMEDCMD: replies, list, file and deferred execution; time is what the entries say.
#include "control/handlers/timed_commands.h"

#include <gmock/gmock.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <random>
#include <regex>
#include <thread>

#include "control/handlers/command_handlers.h"
#include "control/protocol/command_parser.h"
#include "platform/paths.h"
#include "platform/plist/property_list.h"
#include "record/agent_record.h"
#include "support/date_text.h"
#include "tests/unit/control/handlers/collected_replies.h"
#include "tests/unit/doubles/log_capture.h"
#include "tests/unit/doubles/scripted_actions.h"
#include "tests/unit/doubles/scripted_capture.h"
#include "tests/unit/doubles/test_root.h"

namespace lmx {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using Lines = std::vector<std::string>;

class TimedCommandsTest : public ::testing::Test {
 protected:
  TimedCommandsTest() {
    ::unlink(file().c_str());
    session_->captureController.set(capture_);
  }
  ~TimedCommandsTest() override { ::unlink(file().c_str()); }

  static std::string file() { return systemPath(kTimersFile); }
  /// The file as it is on the disk.
  static PlistArray stored() {
    const PlistResult read = readPropertyList(file());
    return read ? std::get<PlistArray>(read->value) : PlistArray();
  }
  std::string in(std::time_t seconds) const { return *dateText(now_ + seconds); }
  /// Runs one line. @return its reply
  std::string run(const std::string& line) {
    const std::size_t before = replies_.all().size();
    const Command command = parseCommand(line);
    timed_.handleTIMEDCMD(command.parameters ? &*command.parameters : nullptr);
    const Lines replies = replies_.all();
    EXPECT_EQ(replies.size(), before + 1) << line;
    return replies.size() > before ? replies.back() : "";
  }
  void schedule(TimedCommands& timed, const std::string& id) const {
    const Dictionary parameters{{"command", "STOP"}, {"time", in(600)}, {"TimerID", id}};
    timed.handleTIMEDCMD(&parameters);
  }
  static void revoke(TimedCommands& timed, const std::string& id) {
    const Dictionary parameters{{"command", "TIMERREVOKE"}, {"TimerID", id}};
    timed.handleTIMEDCMD(&parameters);
  }
  std::vector<SharedDictionary> listed() { return context_->timedCmdList.entries(); }
  /// What the main loop does when the time of the n-th scheduled command has come.
  std::string fire(std::size_t n) {
    const std::size_t before = replies_.all().size();
    timed_.completeTimedCommand(actions_.scheduled.at(n).entry);
    const Lines replies = replies_.all();
    return replies.size() > before ? replies.back() : "";
  }

  const std::time_t now_ = std::time(nullptr);
  testing::LogCapture log_;
  testing::Journal journal_;
  testing::ScriptedActions actions_{journal_};
  std::shared_ptr<testing::ScriptedCaptureController> capture_ =
      std::make_shared<testing::ScriptedCaptureController>(journal_);
  std::shared_ptr<AgentContext> context_ = newAgentContext();
  std::shared_ptr<AgentRecord> session_ = context_->record_context();
  ChannelContext held_{context_};
  testing::CollectedReplies replies_;
  CommandHandlers handlers_{held_, &actions_, replies_, ChannelKind::tunnel};
  TimedCommands& timed_ = handlers_.timed();
};

TEST_F(TimedCommandsTest, StartIsScheduledWithItsParametersAndAnIdentity) {
  const std::string start = "command=START,time=" + in(600) +
                            ",RecordingMetadata_RECORDING_UUID=R1,RecordingMetadata_MAX_RECORDING_MINUTES=50,"
                            "RecordingMetadata_UNATTENDED_RECORDING_MINUTES=20";
  EXPECT_EQ(run("TIMEDCMD " + start), "cmdStatus=0");
  ASSERT_EQ(listed().size(), 1U);
  const SharedDictionary entry = listed()[0];
  const std::string id = lookUp(entry, "TimerID").value_or("");
  EXPECT_TRUE(std::regex_match(id, std::regex("[0-9A-F]{8}(-[0-9A-F]{4}){3}-[0-9A-F]{12}"))) << id;
  EXPECT_EQ(entry->size(), 6U);
  ASSERT_EQ(stored().size(), 1U);
  EXPECT_EQ(stored()[0].dictionary()->at("TimerID"), PlistValue(id));
  EXPECT_EQ(stored()[0].dictionary()->at("time"), PlistValue(in(600)));
  ASSERT_EQ(actions_.scheduled.size(), 1U);
  EXPECT_EQ(actions_.scheduled[0].date, now_ + 600);
  EXPECT_TRUE(log_.contains(kLogInfo, "Scheduling START command to run at: " + in(600)));

  EXPECT_EQ(fire(0), "cmdStatus=0");
  EXPECT_TRUE(log_.contains(kLogInfo, "Running deferred command: START"));
  EXPECT_THAT(listed(), IsEmpty());
  EXPECT_THAT(stored(), IsEmpty());
  ASSERT_EQ(actions_.started.size(), 1U);
  EXPECT_EQ(actions_.started[0]->at("TimerID"), id) << "the handler gets the whole entry";
  EXPECT_THAT(journal_.entries(), ::testing::Contains("performStart"));
}

TEST_F(TimedCommandsTest, AServersOwnIdentityIsKept) {
  EXPECT_EQ(run("TIMEDCMD command=STOP,time=" + in(60) + ",TimerID=mine"), "cmdStatus=0");
  EXPECT_EQ(lookUp(listed()[0], "TimerID"), "mine");
}

TEST_F(TimedCommandsTest, InThePastIs31AndNotStored) {
  EXPECT_EQ(run("TIMEDCMD command=STOP,time=" + in(-1)), "cmdStatus=31");
  EXPECT_THAT(listed(), IsEmpty());
  EXPECT_FALSE(std::filesystem::exists(file()));
  EXPECT_TRUE(log_.contains(kLogInfo, "Not scheduling STOP command. The timer has expired: " + in(-1)));
}

TEST_F(TimedCommandsTest, AnUnknownCommandIs31) {
  for (const char* command : {"FOO", "start", "", "X-PREVIEW", "TIMEDCMD"}) {
    EXPECT_EQ(run("TIMEDCMD command=" + std::string(command) + ",time=" + in(60)), "cmdStatus=31") << command;
    EXPECT_TRUE(log_.contains(kLogInfo, "Not scheduling unknown command: " + std::string(command)));
  }
  EXPECT_EQ(run("TIMEDCMD"), "cmdStatus=31");
  EXPECT_THAT(listed(), IsEmpty());
}

TEST_F(TimedCommandsTest, WithoutAUsableTimeRunsAtOnce) {
  EXPECT_EQ(run("TIMEDCMD command=STOP"), "cmdStatus=0");
  EXPECT_EQ(run("TIMEDCMD command=STOP,time=tomorrow"), "cmdStatus=0");
  ASSERT_EQ(actions_.scheduled.size(), 2U);
  for (const auto& one : actions_.scheduled) EXPECT_LE(one.date, std::time(nullptr));
}

TEST_F(TimedCommandsTest, ASecondAheadIsTheFuture) {
  EXPECT_EQ(run("TIMEDCMD command=STOP,time=" + *dateText(std::time(nullptr) + 1)), "cmdStatus=0");
}

TEST_F(TimedCommandsTest, OffsetsAndLeapDaysAreUnderstood) {
  for (const char* time :
       {"2096-02-29 10:00:00 +0000", "2030-01-01 10:00:00 +0530", "2030-01-01 10:00:00 -0800"}) {
    EXPECT_EQ(run("TIMEDCMD command=STOP,time=" + std::string(time)), "cmdStatus=0");
  }
  ASSERT_EQ(actions_.scheduled.size(), 3U);
  EXPECT_EQ(actions_.scheduled[2].date - actions_.scheduled[1].date, (5 * 60 + 30 + 8 * 60) * 60);
}

TEST_F(TimedCommandsTest, AnEmptyListIsAnEmptyArray) {
  const std::string reply = run("TIMEDCMD command=TIMERLIST");
  ASSERT_TRUE(reply.starts_with("cmdStatus=0,timerlist=<?xml")) << reply;
  EXPECT_EQ(parsePropertyList(reply.substr(22)).value(), PlistValue(PlistArray()));
}

TEST_F(TimedCommandsTest, TheListIsAPropertyListOfTheEntries) {
  run("TIMEDCMD command=STOP,time=" + in(60) + ",TimerID=A,RecordingMetadata_TITLE=Fish & Chips <1>");
  run("TIMEDCMD command=PAUSE,time=" + in(30) + ",TimerID=B");
  const std::string reply = run("TIMEDCMD command=TIMERLIST");
  const PlistValue list = parsePropertyList(reply.substr(22)).value().value();
  EXPECT_EQ(list, PlistValue(
                      PlistArray{PlistDictionary{{"command", "STOP"},
                                                 {"time", in(60)},
                                                 {"TimerID", "A"},
                                                 {"RecordingMetadata_TITLE", "Fish & Chips <1>"}},
                                 PlistDictionary{{"command", "PAUSE"}, {"time", in(30)}, {"TimerID", "B"}}}));
  EXPECT_EQ(PlistValue(stored()), list);
}

TEST_F(TimedCommandsTest, ARevokedOneDoesNotRun) {
  run("TIMEDCMD command=STOP,time=" + in(60) + ",TimerID=A");
  EXPECT_EQ(run("TIMEDCMD command=TIMERREVOKE,TimerID=A"), "cmdStatus=0");
  EXPECT_THAT(stored(), IsEmpty());
  EXPECT_EQ(fire(0), "cmdStatus=38");
  EXPECT_TRUE(log_.contains(kLogInfo, "Not running deferred command"));
  EXPECT_EQ(journal_.entries(), Lines{"scheduleTimedCommand STOP"});
}

TEST_F(TimedCommandsTest, RevokingWhatIsNotThereIs37) {
  EXPECT_EQ(run("TIMEDCMD command=TIMERREVOKE,TimerID=A"), "cmdStatus=37");
  EXPECT_EQ(run("TIMEDCMD command=TIMERREVOKE"), "cmdStatus=37");
  run("TIMEDCMD command=STOP,time=" + in(60) + ",TimerID=A");
  EXPECT_EQ(run("TIMEDCMD command=TIMERREVOKE,TimerID=a"), "cmdStatus=37");
  EXPECT_EQ(listed().size(), 1U);
}

TEST_F(TimedCommandsTest, OtherManagementIsDoneByDoingNothing) {
  EXPECT_EQ(run("TIMEDCMD command=TIMERX,time=" + in(60)), "cmdStatus=0");
  EXPECT_EQ(run("TIMEDCMD command=TIMER"), "cmdStatus=0");
  EXPECT_THAT(listed(), IsEmpty());
}

TEST_F(TimedCommandsTest, EqualEntriesEachRun) {
  const std::string same = "TIMEDCMD command=STOP,time=" + in(60) + ",TimerID=A";
  run(same);
  run(same);
  EXPECT_EQ(listed().size(), 2U);
  EXPECT_EQ(run("TIMEDCMD command=TIMERREVOKE,TimerID=A"), "cmdStatus=0");
  EXPECT_EQ(listed().size(), 1U) << "the first one only";
  EXPECT_EQ(fire(0), "cmdStatus=0") << "one equal to it is still listed";
  EXPECT_EQ(fire(1), "cmdStatus=0");
  EXPECT_THAT(listed(), IsEmpty());
}

TEST_F(TimedCommandsTest, AFileThatCannotBeWrittenIsAWarning) {
  const std::string state = directoryOf(file());
  std::filesystem::rename(state, state + ".away");
  EXPECT_EQ(run("TIMEDCMD command=STOP,time=" + in(60)), "cmdStatus=0");
  std::filesystem::rename(state + ".away", state);
  EXPECT_TRUE(log_.contains(kLogWarning, "Unable to write timer file."));
  EXPECT_EQ(listed().size(), 1U);
}

TEST_F(TimedCommandsTest, TheFileIsForItsOwnerAlone) {
  run("TIMEDCMD command=STOP,time=" + in(60) + ",RecordingMetadata_AGENT_PASSWORD=geheim");
  EXPECT_EQ(std::filesystem::status(file()).permissions(),
            std::filesystem::perms::owner_read | std::filesystem::perms::owner_write);
}

TEST_F(TimedCommandsTest, ManyThreadsKeepListAndFileInStep) {
  std::vector<std::thread> threads;
  for (int thread = 0; thread < 4; ++thread) {
    threads.emplace_back([&, thread] {
      CommandHandlers handlers(held_, nullptr, replies_, ChannelKind::tunnel);
      for (int i = 0; i < 10; ++i) {
        const std::string id = std::to_string(thread) + "-" + std::to_string(i);
        schedule(handlers.timed(), id);
        if (i % 2 == 0) revoke(handlers.timed(), id);
      }
    });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(listed().size(), 20U);
  EXPECT_EQ(stored().size(), 20U);
}

TEST_F(TimedCommandsTest, AKillLeavesTheOldOrTheNewList) {
  std::mt19937 random(5);  // NOLINT: the same numbers every time
  for (int round = 0; round < 20; ++round) {
    ::unlink(file().c_str());
    run("TIMEDCMD command=STOP,time=" + in(600) + ",TimerID=" + std::string(20000, 'x'));
    const pid_t child = fork();
    if (child == 0) {
      for (;;) {
        schedule(timed_, "A");
        revoke(timed_, "A");
      }
    }
    std::this_thread::sleep_for(std::chrono::microseconds(500 + random() % 20000));
    kill(child, SIGKILL);
    waitpid(child, nullptr, 0);
    const std::size_t entries = stored().size();
    EXPECT_TRUE(entries == 1 || entries == 2) << entries;
    context_->timedCmdList.removeTimer(std::string(20000, 'x'));
  }
}

}  // namespace
}  // namespace lmx
