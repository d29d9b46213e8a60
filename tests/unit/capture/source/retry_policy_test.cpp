// Which device is tried again, and when.
#include "capture/source/retry_policy.h"

#include <gtest/gtest.h>

#include "capture/api/capture_framework.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;
using Step = RetryPolicy::Next::Step;
using Failure = RetryPolicy::Failure;

TEST(RetryPolicy, TableOfFirstFailures) {
  struct Row {
    const char* what;
    DeviceKind kind;
    bool picture;
    Failure failure;
    Step step;
    RetryPolicy::Milliseconds pause;
    bool overUdp = false;
  };
  const Failure ran{
      .code = kDeviceFailed, .everRan = true, .delivered = true, .wantedFor = 1h, .triedFor = 1h};
  const Failure refused{.code = kDeviceFailed, .triedFor = 20ms};
  const Failure busy{.code = kDeviceBusy, .wantedFor = 1900ms};
  for (const Row& row : {
           Row{"camera unplugged", DeviceKind::hardware, true, ran, Step::lost, 0ms},
           Row{"camera refused", DeviceKind::hardware, true, refused, Step::lost, 0ms},
           Row{"camera busy", DeviceKind::hardware, true, busy, Step::lost, 0ms},
           Row{"file at an end that it can't begin again", DeviceKind::file, true, ran, Step::lost, 0ms},
           Row{"network camera breaks off", DeviceKind::network, true, ran, Step::away, 500ms},
           Row{"network camera refuses TCP", DeviceKind::network, true, refused, Step::again, 0ms, true},
           Row{"network camera takes its time and fails",
               DeviceKind::network,
               true,
               {.code = kDeviceFailed, .triedFor = 5s},
               Step::lost,
               0ms},
           Row{"network camera wants a password",
               DeviceKind::network,
               true,
               {.code = kDeviceNotPermitted, .triedFor = 20ms},
               Step::lost,
               0ms},
           Row{"microphone unplugged", DeviceKind::hardware, false, ran, Step::away, 3s},
           Row{"microphone never there", DeviceKind::hardware, false, refused, Step::away, 3s},
           Row{"microphone busy for a moment", DeviceKind::hardware, false, busy, Step::again, 100ms},
           Row{"microphone busy for longer",
               DeviceKind::hardware,
               false,
               {.code = kDeviceBusy, .wantedFor = 2001ms},
               Step::away,
               3s},
           Row{"sound of a network camera, TCP refused", DeviceKind::network, false, refused, Step::again,
               0ms, true},
           Row{"sound of a file", DeviceKind::file, false, ran, Step::away, 3s},
       }) {
    RetryPolicy policy(row.kind, row.picture);
    const auto next = policy.after(row.failure);
    EXPECT_EQ(next.step, row.step) << row.what;
    EXPECT_EQ(next.pause, row.pause) << row.what;
    EXPECT_EQ(policy.overUdp(), row.overUdp) << row.what;
  }
}

TEST(RetryPolicy, ANetworkCameraGetsTenSeconds) {
  RetryPolicy policy(DeviceKind::network, true);
  Failure failure{.code = kDeviceFailed, .everRan = true};
  struct Row {
    RetryPolicy::Milliseconds away;
    Step step;
    RetryPolicy::Milliseconds pause;
  };
  for (const Row& row : {Row{999ms, Step::away, 500ms}, Row{1s, Step::away, 3s}, Row{6s, Step::away, 3s},
                         Row{7s, Step::away, 2s}, Row{8950ms, Step::away, 100ms}, Row{9s, Step::lost, 0ms}}) {
    failure.awayFor = row.away;
    const auto next = policy.after(failure);
    EXPECT_EQ(next.step, row.step) << row.away.count();
    EXPECT_EQ(next.pause, row.pause) << row.away.count();
  }
}

TEST(RetryPolicy, UdpIsTriedOnceAndForgottenWhereItDidNotHelp) {
  RetryPolicy policy(DeviceKind::network, false);
  Failure failure{.code = kDeviceFailed, .triedFor = 20ms};
  EXPECT_EQ(policy.after(failure).step, Step::again);
  EXPECT_EQ(policy.after(failure).step, Step::away);
  EXPECT_FALSE(policy.overUdp());
  failure.awayFor = 3s;
  EXPECT_EQ(policy.after(failure).step, Step::again);
  EXPECT_TRUE(policy.overUdp());
  failure.everRan = true;
  EXPECT_EQ(policy.after(failure).step, Step::away);
  EXPECT_TRUE(policy.overUdp()) << "it has worked that way";
}

TEST(RetryPolicy, AMicrophoneThatStaysAwayIsTriedMoreSeldom) {
  RetryPolicy policy(DeviceKind::hardware, false);
  Failure failure{.code = kDeviceNotFound};
  EXPECT_EQ(policy.after(failure).pause, 3s);
  failure.awayFor = 3s;
  for (int i = 0; i < 20; ++i) EXPECT_EQ(policy.after(failure).pause, 3s);
  EXPECT_EQ(policy.after(failure).pause, 10s);
  failure.awayFor = std::nullopt;  // it came back, and went away again
  EXPECT_EQ(policy.after(failure).pause, 3s);
}

}  // namespace
}  // namespace lmx
