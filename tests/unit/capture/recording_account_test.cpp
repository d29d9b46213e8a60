// What is told of a recording that is not all real.
#include "capture/recording_account.h"

#include <gtest/gtest.h>

#include "tests/unit/capture/capture_harness.h"
#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

using testing::Folder;
using testing::LogCapture;

TEST(RecordingAccount, TheLossesOfASlowMachineAreToldWithTheirSum) {
  const Folder folder;
  const auto journal = *Journal::create(folder.file("journal"));
  for (const std::uint32_t lost : {0U, 148U}) {
    LogCapture log;
    RecordingAccount account({}, *journal, 0);
    account.tick(60, 1000);
    account.picturesDropped(61, lost / 2);
    account.tick(64, 1000);
    account.picturesDropped(90, lost - lost / 2);
    account.tick(93, 1000);
    account.finish(100, 0);
    const std::string told =
        std::to_string(lost) + " pictures of the recording were lost: the machine could not keep up";
    EXPECT_EQ(log.count(kLogWarning, told), lost > 0 ? 1 : 0);
    EXPECT_EQ(log.mentions("Not real in this recording: 148 frames lost, from 0:01:01 on"), lost > 0);
    EXPECT_EQ(log.entries().empty(), lost == 0);
  }
}

}  // namespace
}  // namespace lmx
