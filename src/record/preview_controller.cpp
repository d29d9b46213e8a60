// Stores preview frames and hands them out.
#include "record/preview_controller.h"

#include <ctime>
#include <mutex>

#include "support/base64.h"

namespace lmx {

void MyLMRPreviewControllerDelegate::handleJPEGData(std::vector<std::uint8_t> jpeg) {
  auto frame = std::make_shared<const std::vector<std::uint8_t>>(std::move(jpeg));
  const std::lock_guard lock(mLock_);
  mLastJPEGData_.swap(frame);
}

std::optional<std::string> MyLMRPreviewControllerDelegate::base64PreviewFrameCopy() {
  std::shared_ptr<const std::vector<std::uint8_t>> frame;
  {
    const std::lock_guard lock(mLock_);
    frame = mLastJPEGData_;
  }
  if (!frame) return std::nullopt;
  return lmp_encode_base64({reinterpret_cast<const char*>(frame->data()), frame->size()});
}

MyLMRPreviewController::MyLMRPreviewController(std::unique_ptr<LMRPreviewController> controller)
    : controller_(std::move(controller)) {}

void MyLMRPreviewController::setDelegate(std::shared_ptr<MyLMRPreviewControllerDelegate> delegate) {
  delegate_ = std::move(delegate);
  controller_->setDelegate(delegate_);
}

std::optional<std::string> MyLMRPreviewController::base64PreviewFrameCopy() {
  mLastPreviewRequestTime.set(std::time(nullptr));
  return delegate_ ? delegate_->base64PreviewFrameCopy() : std::nullopt;
}

}  // namespace lmx
