// X-PREVIEW: how often the preview's picture is taken.
#include "control/handlers/extension_command.h"

#include <gtest/gtest.h>

#include "record/agent_record.h"
#include "record/preview_controller.h"
#include "tests/unit/doubles/scripted_capture.h"

namespace lmx {
namespace {

class ExtensionCommandTest : public ::testing::Test {
 protected:
  ChannelContext context_{newAgentContext()};
  ExtensionCommand extension_{context_};
  const Dictionary half_second_{{"refresh_milliseconds", "500"}};
};

TEST_F(ExtensionCommandTest, XPreviewChangesTheInterval) {
  auto preview =
      std::make_shared<MyLMRPreviewController>(std::make_unique<testing::ScriptedPreviewController>());
  auto delegate = std::make_shared<MyLMRPreviewControllerDelegate>(400);
  preview->setDelegate(delegate);
  context_.session()->previewController.set(preview);
  extension_.handleXCMD("X-FOO", &half_second_);
  extension_.handleXCMD("X-PREVIEW", nullptr);
  EXPECT_EQ(delegate->frameGrabInterval(), 400);
  extension_.handleXCMD("X-PREVIEW", &half_second_);
  EXPECT_EQ(delegate->frameGrabInterval(), 500);
}

TEST_F(ExtensionCommandTest, WithoutPreviewControllerOrContextNothingHappens) {
  extension_.handleXCMD("X-PREVIEW", &half_second_);
  context_.release();
  extension_.handleXCMD("X-PREVIEW", &half_second_);
  EXPECT_EQ(context_.session(), nullptr);
}

}  // namespace
}  // namespace lmx
