// Jobs enter the list in the order in which their recordings were stopped.
#include "agent/hand_off_order.h"

#include <gtest/gtest.h>

#include <string>
#include <thread>

#include "postprocess/agent_submit.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;

class HandOff : public ::testing::Test {
 protected:
  static std::shared_ptr<AgentSubmit> job(const std::string& name) {
    auto made = std::make_shared<AgentSubmit>();
    made->recording_file_path = name;
    return made;
  }
  /// The jobs in the list, in order; empties it.
  std::string listed() {
    std::string names;
    while (const auto next = list_.postProcessListNext()) names += *next->recording_file_path;
    return names;
  }
  PostProcessList list_;
  HandOffOrder order_{list_};
};

TEST_F(HandOff, AShortRecordingWaitsForTheLongOneBeforeIt) {
  const auto first = order_.enter();
  const auto second = order_.enter();
  HandOffOrder::deliver(*second, {job("2")});
  EXPECT_EQ(listed(), "");
  HandOffOrder::deliver(*first, {job("1a"), job("1b")});
  EXPECT_EQ(listed(), "1a1b2");
  EXPECT_FALSE(order_.underWay());
}

TEST_F(HandOff, ARecordingWithoutAJobLetsTheNextPass) {
  auto first = order_.enter();
  const auto second = order_.enter();
  HandOffOrder::deliver(*second, {job("2")});
  first = nullptr;
  EXPECT_EQ(listed(), "2");
}

TEST_F(HandOff, ItIsUnderWayUntilAllJobsAreInTheList) {
  EXPECT_FALSE(order_.underWay());
  auto first = order_.enter();
  auto second = order_.enter();
  HandOffOrder::deliver(*second, {job("2")});
  second = nullptr;
  EXPECT_TRUE(order_.underWay());
  first = nullptr;
  EXPECT_FALSE(order_.underWay());
}

TEST_F(HandOff, ARecordingThatHangsHoldsTheOthersForAMinuteOnly) {
  const auto now = HandOffOrder::Clock::now();
  const auto hangs = order_.enter();
  const auto second = order_.enter();
  const auto third = order_.enter();
  HandOffOrder::deliver(*third, {job("3")}, now);
  HandOffOrder::deliver(*second, {job("2")}, now + 1s);
  order_.letOverduePass(now + 59s);
  EXPECT_EQ(listed(), "");
  order_.letOverduePass(now + 60s);
  EXPECT_EQ(listed(), "3");
  order_.letOverduePass(now + 61s);
  EXPECT_EQ(listed(), "2");
  HandOffOrder::deliver(*hangs, {job("1")}, now + 100s);
  EXPECT_EQ(listed(), "1");
}

TEST_F(HandOff, ManyThreadsDeliverInOrder) {
  std::vector<std::shared_ptr<HandOffOrder::Ticket>> tickets;
  for (int i = 0; i < 20; ++i) tickets.push_back(order_.enter());
  std::vector<std::thread> threads;
  std::string expected;
  for (int i = 19; i >= 0; --i) {
    threads.emplace_back([&, i] {
      HandOffOrder::deliver(*tickets[static_cast<std::size_t>(i)],
                            {job(std::string(1, static_cast<char>('a' + i)))});
    });
    expected.insert(0, 1, static_cast<char>('a' + i));
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(listed(), expected);
}

}  // namespace
}  // namespace lmx
