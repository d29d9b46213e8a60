// The scheduler's loop with a scripted sleep, and its thread.
#include "postprocess/scheduler.h"

#include <gmock/gmock.h>

#include <latch>
#include <thread>

#include "tests/unit/postprocess/submit_fixture.h"

namespace lmx {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using namespace std::chrono_literals;

constexpr const char* kStarts = "Post-Process Scheduler starts";
constexpr const char* kStopped = "Post-Process Scheduler stopped";

class Scheduler : public testing::SubmitFixture {
 protected:
  void add(const std::string& uuid) {
    auto job = std::make_shared<AgentSubmit>();
    job->agentContext = context_;
    job->properties = {{"RecordingMetadata_RECORDING_UUID", uuid}};
    context_->post_process_list.postProcessListAddJob(std::move(job));
  }
  /// Runs the loop on this thread and calls `onSleep` instead of sleeping.
  void runLoop(std::function<void()> onSleep) {
    EXPECT_EQ(agentPostProcessSchedulerRunLoop(*context_, children_,
                                               {.sleep =
                                                    [this, &onSleep](std::chrono::milliseconds time) {
                                                      sleeps_.push_back(time);
                                                      onSleep();
                                                    },
                                                .cancelled = [this] { return cancelled_; },
                                                .setBusy = [this](bool busy) { busy_ = busy; }}),
              0);
  }
  [[nodiscard]] std::vector<std::string> submitted() const {
    std::vector<std::string> uuids;
    for (const auto& argv : children_.runs()) uuids.push_back(argv.at(5));
    return uuids;
  }

  std::vector<std::chrono::milliseconds> sleeps_;
  bool cancelled_ = false;
  bool busy_ = false;
};

TEST_F(Scheduler, WithoutJobsLooksEveryFiveSecondsAndDoesNothingElse) {
  runLoop([this] { context_->state.running.set(sleeps_.size() < 3); });
  EXPECT_THAT(sleeps_, ElementsAre(5s, 5s, 5s));
  EXPECT_THAT(children_.runs(), IsEmpty());
  using Entry = testing::LogCapture::Entry;
  EXPECT_THAT(log_.entries(), ElementsAre(Entry{kLogInfo, kStarts}, Entry{kLogInfo, kStopped}));
}

TEST_F(Scheduler, RunsTheJobsInTheOrderOfTheirArrivalWithoutSleepingBetweenThem) {
  for (const char* uuid : {"A", "B", "C"}) add(uuid);
  runLoop([this] { context_->state.running.set(false); });
  EXPECT_THAT(submitted(), ElementsAre("A", "B", "C"));
  EXPECT_EQ(sleeps_.size(), 1U);
}

TEST_F(Scheduler, TakesAJobThatCameWhileItSlept) {
  runLoop([this] {
    if (sleeps_.size() == 1) add("A");
    if (sleeps_.size() == 2) context_->state.running.set(false);
  });
  EXPECT_THAT(submitted(), ElementsAre("A"));
}

TEST_F(Scheduler, ContinuesAfterAFailedJob) {
  children_.results = {{ChildResult::End::exited, 1, {}}};
  add("A");
  add("B");
  runLoop([this] { context_->state.running.set(false); });
  EXPECT_THAT(submitted(), ElementsAre("A", "B"));
}

TEST_F(Scheduler, EndsAfterTheCurrentJobWhenTheAgentStops) {
  add("A");
  add("B");
  children_.on_run = [this](const ChildOptions&) { context_->state.running.set(false); };
  runLoop([] {});
  EXPECT_THAT(submitted(), ElementsAre("A"));
  EXPECT_EQ(context_->post_process_list.postProcessListCount(), 1U);
  EXPECT_THAT(sleeps_, IsEmpty());
}

TEST_F(Scheduler, EndsAfterTheCurrentJobWhenCancelled) {
  add("A");
  add("B");
  children_.on_run = [this](const ChildOptions&) { cancelled_ = true; };
  runLoop([] {});
  EXPECT_THAT(submitted(), ElementsAre("A"));
  EXPECT_EQ(context_->post_process_list.postProcessListCount(), 1U);
}

TEST_F(Scheduler, IsBusyWhileAJobRunsAndIdleWhileItSleeps) {
  add("A");
  bool busyInJob = false;
  children_.on_run = [this, &busyInJob](const ChildOptions&) { busyInJob = busy_; };
  bool busyInSleep = true;
  runLoop([this, &busyInSleep] {
    busyInSleep = busy_;
    context_->state.running.set(false);
  });
  EXPECT_TRUE(busyInJob);
  EXPECT_FALSE(busyInSleep);
  EXPECT_FALSE(busy_);
}

TEST_F(Scheduler, ReleasesAJobOnceItHasRun) {
  auto job = std::make_shared<AgentSubmit>();
  job->agentContext = context_;
  const std::weak_ptr<AgentSubmit> watched = job;
  context_->post_process_list.postProcessListAddJob(std::move(job));
  runLoop([this, &watched] {
    EXPECT_TRUE(watched.expired());
    context_->state.running.set(false);
  });
}

TEST_F(Scheduler, DoesNotHoldTheListWhileAJobRuns) {
  add("A");
  children_.on_run = [this](const ChildOptions&) {
    if (submitted().size() > 1) return;
    std::jthread([this] { add("B"); }).join();  // would deadlock if the list were locked
  };
  runLoop([this] { context_->state.running.set(false); });
  EXPECT_THAT(submitted(), ElementsAre("A", "B"));
}

// The thread.

/// A tool that ends when the test allows it.
class GatedChildren : public ChildRunner {
 public:
  ChildResult run(const std::vector<std::string>&, const ChildOptions&) override {
    entered.count_down();
    released.wait();
    return {ChildResult::End::exited, 0, {}};
  }
  std::latch entered{1};
  std::latch released{1};
};

TEST_F(Scheduler, ThreadRunsAJobAndSaysThatItIsBusy) {
  GatedChildren gated;
  add("A");
  PostProcessScheduler scheduler;
  EXPECT_FALSE(scheduler.busy());
  ASSERT_TRUE(scheduler.start(context_, gated));
  gated.entered.wait();
  EXPECT_TRUE(scheduler.busy());
  scheduler.cancel();
  gated.released.count_down();
  EXPECT_TRUE(log_.waitFor(kLogInfo, kStopped));
  EXPECT_TRUE(log_.contains(kLogInfo, "Recording completed with success"));
  EXPECT_FALSE(scheduler.busy());
}

TEST_F(Scheduler, AnIdleThreadEndsAtOnceWhenItIsCancelled) {
  PostProcessScheduler scheduler;
  ASSERT_TRUE(scheduler.start(context_, children_));
  ASSERT_TRUE(log_.waitFor(kLogInfo, kStarts));
  const auto asked = std::chrono::steady_clock::now();
  scheduler.cancel();
  EXPECT_TRUE(log_.waitFor(kLogInfo, kStopped));
  EXPECT_LT(std::chrono::steady_clock::now() - asked, 4s);  // an uninterrupted sleep takes five seconds
}

TEST_F(Scheduler, ThreadOutlivesTheScheduler) {
  GatedChildren gated;
  add("A");
  {
    PostProcessScheduler scheduler;
    ASSERT_TRUE(scheduler.start(context_, gated));
    gated.entered.wait();
  }
  gated.released.count_down();
  EXPECT_TRUE(log_.waitFor(kLogInfo, kStopped));
}

}  // namespace
}  // namespace lmx
