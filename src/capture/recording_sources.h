// The camera and the microphone of one recording.
#pragma once
#include <memory>

#include "capture/recording_plan.h"
#include "capture/source/sources.h"

namespace lmx {

/// Holds the leases of a recording's devices. They are one and the same where a file or a network camera
/// gives both.
class RecordingSources {
 public:
  /// Opens the devices and waits for the camera's first picture. A microphone that is not there is no reason
  /// to fail.
  /// @return why there is no picture
  static Result<RecordingSources, CaptureError> open(const RecordingPlan& plan);

  void add(const std::shared_ptr<CaptureConsumer>& consumer) const;
  void remove(const CaptureConsumer* consumer) const;
  /// Starts devices of "speed=max".
  void start() const;
  /// Gives the devices back.
  void release();

  [[nodiscard]] const CaptureClock& clock() const { return clock_; }
  /// What the camera gives; meaningless without a camera.
  [[nodiscard]] const CameraFormat& format() const { return format_; }
  /// The open devices, for the engine; null once they are given back.
  [[nodiscard]] std::shared_ptr<CaptureSession> session() const;
  /// False when there is none, or it could not be opened because it is still being closed.
  [[nodiscard]] bool hasMicrophone() const { return microphone_ != nullptr; }
  /// See Source::soundCorrection.
  [[nodiscard]] double soundCorrection() const;

 private:
  RecordingSources(SourceLease camera, SourceLease microphone);
  [[nodiscard]] bool oneDevice() const { return camera_ == microphone_; }
  SourceLease camera_;
  SourceLease microphone_;
  CaptureClock clock_;
  CameraFormat format_;
};

}  // namespace lmx
