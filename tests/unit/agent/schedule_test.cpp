// The schedule with a clock set by the test, and the main loop that runs due commands.
#include "agent/schedule.h"

#include <gmock/gmock.h>

#include "support/date_text.h"
#include "tests/unit/agent/agent_fixture.h"

namespace lmx {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

std::vector<std::string> due(Schedule& schedule, std::time_t now) {
  std::vector<std::string> names;
  while (const auto command = schedule.takeDue(now))
    names.push_back(lookUp(command->entry, "command").value());
  return names;
}
Schedule::Command at(std::time_t date, const char* name) {
  return {std::make_shared<const Dictionary>(Dictionary{{"command", name}}), date, ChannelKind::tunnel};
}

TEST(Schedule, CommandsComeOnceInTheOrderOfTheirDates) {
  Schedule schedule;
  schedule.add(at(200, "late"));
  schedule.add(at(100, "first"));
  schedule.add(at(100, "second"));
  EXPECT_EQ(schedule.next(), 100);
  EXPECT_THAT(due(schedule, 99), IsEmpty());
  EXPECT_THAT(due(schedule, 100), ElementsAre("first", "second"));
  EXPECT_THAT(due(schedule, 150), IsEmpty());
  EXPECT_EQ(schedule.next(), 200);
  EXPECT_THAT(due(schedule, 1000), ElementsAre("late"));
  EXPECT_EQ(schedule.next(), std::nullopt);
}

TEST(Schedule, WhatEndsARecordingComesFirstInItsSecond) {
  Schedule schedule;
  for (const char* name : {"START", "PAUSE", "STOP", "CANCEL", "STATUS"}) schedule.add(at(100, name));
  schedule.add(at(99, "START"));
  EXPECT_THAT(due(schedule, 100), ElementsAre("START", "STOP", "CANCEL", "START", "PAUSE", "STATUS"));
}

TEST(Schedule, FollowsAWallClockThatIsSet) {
  constexpr std::time_t kHour = 3600;
  Schedule schedule;
  schedule.add(at(10 * kHour, "lecture"));
  EXPECT_THAT(due(schedule, 9 * kHour), IsEmpty());
  EXPECT_THAT(due(schedule, 8 * kHour), IsEmpty()) << "set back by an hour";
  EXPECT_THAT(due(schedule, 10 * kHour), ElementsAre("lecture")) << "set forward by two";
}

class TimedCommands : public AgentTest {
 protected:
  TimedCommands() { ::unlink(file().c_str()); }
  ~TimedCommands() override { ::unlink(file().c_str()); }
  static std::string file() { return systemPath(kTimersFile); }
  static void writeTimers(const PlistValue& value) { ASSERT_EQ(writePropertyList(file(), value), 0); }
  static PlistDictionary entry(const char* command, std::time_t date, const char* id) {
    return {{"command", command}, {"time", *dateText(date)}, {"TimerID", id}};
  }
  std::vector<std::string> waiting() {
    std::vector<std::string> ids;
    for (const auto& item : context_->timedCmdList.entries())
      ids.push_back(lookUp(item, "TimerID").value_or("?"));
    return ids;
  }
  const std::time_t now_ = std::time(nullptr);
};

TEST_F(TimedCommands, AreLoadedFromTheFileExceptExpiredOnes) {
  writeTimers(PlistArray{entry("START", now_ + 1000, "A"), entry("STOP", now_ - 5, "B"),
                         entry("FOO", now_ + 9, "C"), entry("STOP", now_ + 2000, "D")});
  agent_.timedCommands().loadSchedule();
  EXPECT_THAT(waiting(), ElementsAre("A", "D"));
  EXPECT_TRUE(
      log_.contains(kLogInfo, "Not scheduling STOP command. The timer has expired: " + *dateText(now_ - 5)));
  EXPECT_TRUE(log_.contains(kLogInfo, "Not scheduling unknown command: FOO"));
}

TEST_F(TimedCommands, LoadingTwiceSchedulesOnce) {
  writeTimers(PlistArray{entry("START", now_ + 1000, "A")});
  agent_.timedCommands().loadSchedule();
  agent_.timedCommands().loadSchedule();
  EXPECT_THAT(waiting(), ElementsAre("A"));
}

TEST_F(TimedCommands, AFileOfExpiredOnesIsKept) {
  writeTimers(PlistArray{entry("START", now_ - 1000, "A")});
  const std::string before = testing::readFile(file());
  agent_.timedCommands().loadSchedule();
  EXPECT_EQ(testing::readFile(file()), before);
}

TEST_F(TimedCommands, WithoutAFileThereIsNothingToDo) {
  agent_.timedCommands().loadSchedule();
  EXPECT_THAT(waiting(), IsEmpty());
  EXPECT_FALSE(log_.mentions("timers file"));
}

TEST_F(TimedCommands, AnUnreadableFileIsKeptUnderAnotherName) {
  for (const char* content : {"half a fi", "<plist version=\"1.0\"><dict/></plist>"}) {
    testing::writeFile(file(), content);
    agent_.timedCommands().loadSchedule();
    EXPECT_TRUE(log_.mentions("The timers file " + file() + " can't be used"));
    EXPECT_EQ(testing::readFile(file() + ".unreadable-1"), content);
    ::unlink((file() + ".unreadable-1").c_str());
  }
}

TEST_F(TimedCommands, GoodElementsOfABadFileAreLoaded) {
  writeTimers(PlistArray{PlistValue("text"), entry("START", now_ + 1000, "A")});
  agent_.timedCommands().loadSchedule();
  EXPECT_THAT(waiting(), ElementsAre("A"));
  EXPECT_TRUE(std::filesystem::exists(file() + ".unreadable-1"));
  ::unlink((file() + ".unreadable-1").c_str());
}

TEST_F(TimedCommands, AThousandEntriesAreLoaded) {
  PlistArray many;
  for (int i = 0; i < 1000; ++i) {
    PlistDictionary one = entry("START", now_ + 1000 + i, std::to_string(i).c_str());
    for (int k = 0; k < 20; ++k) one.emplace("Key" + std::to_string(k), std::string(20, 'v'));
    many.emplace_back(std::move(one));
  }
  writeTimers(many);
  agent_.timedCommands().loadSchedule();
  EXPECT_EQ(waiting().size(), 1000U);
}

class DueTogether : public AgentTest {
 protected:
  DueTogether() { agent_.mainRunLoop().adoptThread(); }
  void schedule(const char* command, const std::string& uuid, std::time_t date = 1000) {
    const auto entry = std::make_shared<const Dictionary>(
        Dictionary{{"command", command},
                   {"TimerID", command + uuid},
                   {"RecordingMetadata_RECORDING_UUID", uuid},
                   {"RecordingMetadata_MAX_RECORDING_MINUTES", "60"},
                   {"RecordingMetadata_UNATTENDED_RECORDING_MINUTES", "60"}});
    context_->timedCmdList.append(entry);
    agent_.scheduleTimedCommand(entry, date, ChannelKind::detached);
  }
  /// As the main loop: one command, then one source, until nothing is left.
  void runAll() {
    RunLoop::Turn turn = RunLoop::Turn::handledSource;
    while (turn == RunLoop::Turn::handledSource) {
      agent_.timedCommands().postDueCommand(2000);
      turn = agent_.mainRunLoop().run(std::chrono::milliseconds(0));
    }
  }
  /// The recordings that have begun, by their files.
  Entries begun() {
    Entries files;
    for (const auto& entry : log_.entries()) {
      if (entry.text.ends_with(" recording started")) files.push_back(entry.text);
    }
    return files;
  }
};

TEST_F(DueTogether, AStopAndTheNextStartAreTwoWholeRecordings) {
  const auto first = start("R1");
  schedule("START", "R2");
  schedule("STOP", "R1");
  runAll();
  EXPECT_EQ(begun().size(), 2U);
  EXPECT_EQ(journalCount("controller stopRecording"), 1);
  EXPECT_FALSE(log_.mentions("capture not idle"));
  EXPECT_EQ(lookUp(session_->request.get().properties, "RecordingMetadata_RECORDING_UUID"), "R2");
}

TEST_F(DueTogether, AStopThatWaitsInTheLoopComesBeforeTheStart) {
  start("R1");
  schedule("START", "R2");
  agent_.mainRunLoop().post([] {}, Wait::no);
  agent_.perform(&AgentActions::stopRecording, Wait::no);
  runAll();
  EXPECT_EQ(begun().size(), 2U);
}

TEST_F(DueTogether, TwentyLecturesAfterAStall) {
  start("L0");
  for (int i = 1; i <= 20; ++i) {
    schedule("START", "L" + std::to_string(i), 1000 + i);
    schedule("STOP", "L" + std::to_string(i - 1), 1000 + i);
  }
  runAll();
  EXPECT_EQ(begun().size(), 21U);
  EXPECT_EQ(journalCount("controller stopRecording"), 20);
}

TEST_F(DueTogether, AnAgentThatEndsLeavesThemInTheFile) {
  schedule("START", "R1");
  agent_.timedCommands().postDueCommand(1000);
  context_->state.running.set(false);
  turnTheLoop();
  EXPECT_EQ(begun().size(), 0U);
  EXPECT_EQ(context_->timedCmdList.entries().size(), 1U);
}

TEST_F(TimedCommands, ADueCommandRunsInTheMainLoop) {
  setParameters({});
  writeTimers(PlistArray{entry("PAUSE", now_ + 1, "A")});
  agent_.timedCommands().loadSchedule();
  std::thread ending([&] {
    log_.waitFor(kLogInfo, "Running deferred command: PAUSE");
    context_->state.running.set(false);
  });
  EXPECT_EQ(agent_.mainLoop().appLoop(), 0);
  ending.join();
  EXPECT_GE(std::time(nullptr), now_ + 1);
  EXPECT_LE(std::time(nullptr), now_ + 3);
  EXPECT_THAT(waiting(), IsEmpty());
  EXPECT_TRUE(log_.contains(kLogDebug, "Nobody to send the reply to: cmdStatus=0"));
}

}  // namespace
}  // namespace lmx
