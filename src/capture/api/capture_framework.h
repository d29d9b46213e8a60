// What the recording engine needs of a capture framework. capture/ implements it; tests script it.
#pragma once
#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "capture/api/capture_settings.h"
#include "support/dictionary.h"

namespace lmx {

/// An error of the capture framework.
struct CaptureError {
  static constexpr const char* kDomain = "com.zandor.lmxcapture";
  std::string domain = kDomain;
  int code = 0;         ///< one of CaptureErrorCode
  std::string message;  ///< in words, with the device's name
};

/// Codes of the framework's domain. Those up to 1302 mean that a device is lost or can't be had.
enum CaptureErrorCode : int {
  kDeviceNotFound = 1002,      ///< no such device, or no longer there
  kDeviceRemoved = 1003,       ///< unplugged while in use
  kDeviceBusy = 1100,          ///< another program has it
  kDeviceFailed = 1200,        ///< the device reported an error
  kDeviceNotPermitted = 1201,  ///< no permission to open it
  kStreamEnded = 1203,         ///< the device ended its stream
  kDeviceSilent = 1300,        ///< no picture for two seconds
  kAudioSilent = 1302,         ///< no sound samples for two seconds
  kEncoderFailed = 2000,
  kNoSpace = 2001,
  kWriteFailed = 2002,
  kNoMedia = 2003,  ///< nothing was captured for the request
};

/// Reports of a capture controller, on a thread of the framework.
class CaptureControllerDelegate {
 public:
  virtual ~CaptureControllerDelegate() = default;
  virtual void lmrCaptureDidComplete(const std::optional<CaptureError>& error) = 0;
  virtual void lmrCaptureDidCancel(const std::optional<CaptureError>& error) = 0;
};

/// An open camera and microphone that previews and recordings share. Opaque to the engine.
class CaptureSession {
 public:
  virtual ~CaptureSession() = default;
  [[nodiscard]] virtual bool isRunning() const = 0;
};

/// A movie that was not submitted in the ordinary way and has been put into the repository.
struct RecoveredRecording {
  std::string path;             ///< of the movie, whole and in place
  SharedDictionary parameters;  ///< of the START that asked for it; never null
  int recordingType = 0;        ///< code of the type that was recorded
  double startTime = 0;         ///< seconds since 2001-01-01 UTC of its first frame
  double stopTime = 0;
  double duration = 0;           ///< seconds of media
  std::function<void()> forget;  ///< call it once the document is written: what is left of the capture goes
};

/// Records one capture. All operations are thread-safe unless said otherwise and return quickly, but for
/// prepareRecording (opens devices) and processRequest (as long as the disk needs).
/// Times are seconds since 2001-01-01 UTC. A request is what one START asked for: half-open spans between
/// marks.
class LMRCaptureController {
 public:
  virtual ~LMRCaptureController() = default;

  /// The delegate must live until it has had its one report or the controller is destroyed.
  virtual void setDelegate(std::weak_ptr<CaptureControllerDelegate> delegate) = 0;
  /// Opens what the settings name, or joins `session`, and sets up the writing. Main thread.
  /// @return false when it can't: the reason is in lastError().
  virtual bool prepareRecording(const LMRRecordingContext& settings,
                                std::shared_ptr<CaptureSession> session) = 0;
  /// @return false when the recording can't run; true when it runs, or has already been ended in order.
  virtual bool startRecording() = 0;
  /// End with lmrCaptureDidComplete, once the file is closed. A second stop or cancel does nothing.
  virtual void stopRecording() = 0;
  /// Ends with lmrCaptureDidCancel. What cancelled requests recorded is deleted; a request that was started
  /// by mark and that nobody cancelled is kept for recoverAbandonedRequests.
  virtual void cancelRecording() = 0;
  virtual void pauseRecording() = 0;
  virtual void resumeRecording() = 0;

  /// Tags the whole capture with `uuid`, from now on; not a client's request and never submitted or
  /// recovered.
  virtual void setStartWithUUID(const std::string& uuid) = 0;
  virtual void setStopWithUUID(const std::string& uuid) = 0;
  /// Opens a span of a client's request. `parameters` (of its START) are kept with the first mark.
  virtual void setStartWithUUID(const std::string& uuid, double atTime, SharedDictionary parameters) = 0;
  virtual void setStopWithUUID(const std::string& uuid, double atTime) = 0;
  virtual void cancelRequestWithUUID(const std::string& uuid) = 0;

  /// Recorded seconds of the request up to now; 0 for an unknown one.
  virtual double elapsedTimeForRequestWithUUID(const std::string& uuid) = 0;
  /// Media written so far by the whole capture.
  virtual std::int64_t elapsedTimeInMilliseconds() = 0;
  /// kCaptureRecording, kCapturePaused; anything else: neither.
  virtual int recordingState() = 0;
  virtual bool hasShutDown() = 0;
  [[nodiscard]] virtual std::optional<CaptureError> lastError() = 0;
  [[nodiscard]] virtual std::shared_ptr<CaptureSession> session() = 0;
  /// Per-channel levels in decibels, newest.
  virtual std::vector<double> audioAveragePowerLevels() = 0;

  /// Writes the request's movie to `outputPath`: there under its name only when whole. Blocks; waits for the
  /// capture to shut down first. @return nothing on success.
  virtual std::optional<CaptureError> processRequestWithUUID(const std::string& uuid,
                                                             const std::string& outputPath) = 0;
  /// The request's movie and document are in place: a restart need not care for it any more.
  virtual void requestHandedOver(const std::string& uuid) = 0;
  /// Makes movies of the requests that nobody stopped or cancelled, after the capture has shut down and the
  /// one that was submitted has been processed. Blocks.
  virtual std::vector<RecoveredRecording> recoverAbandonedRequests() = 0;

  // Continuous recording.
  virtual std::optional<std::string> deleteEarliestSegment() = 0;
};

/// Preview frames of a preview controller, on a thread of the framework.
class LMRPreviewControllerDelegate {
 public:
  virtual ~LMRPreviewControllerDelegate() = default;
  virtual void setFrameGrabInterval(int milliseconds) = 0;
  virtual void handleJPEGData(std::vector<std::uint8_t> jpeg) = 0;
};

/// A capture session on one camera (and one microphone).
class LMRPreviewController {
 public:
  virtual ~LMRPreviewController() = default;
  /// Opens the camera. @return false, with `*error` set, when it can't be had. Main thread.
  virtual bool attachIOWithDevice(const std::string& device, CaptureError* error) = 0;
  virtual void addAudioDeviceWithID(const std::optional<std::string>& device) = 0;
  [[nodiscard]] virtual std::string videoDeviceLocalizedDisplayName() const = 0;
  virtual void setDelegate(std::shared_ptr<LMRPreviewControllerDelegate> delegate) = 0;
  [[nodiscard]] virtual std::shared_ptr<CaptureSession> session() const = 0;
  virtual void startPreview() = 0;
  virtual void stopPreview() = 0;
  [[nodiscard]] virtual bool isPreviewRunning() const = 0;
};

/// The framework's factory. Thread-safe.
class CaptureFramework : public CaptureCatalog {
 public:
  virtual std::shared_ptr<LMRCaptureController> newCaptureController() = 0;
  virtual std::unique_ptr<LMRPreviewController> newPreviewController(
      std::shared_ptr<CaptureSession> session) = 0;
  /// Loads what the first recording would otherwise wait for. Any thread, blocks.
  virtual void warmUp() = 0;
  /// The capture devices in words, for the command line.
  virtual std::string deviceInformation() = 0;
  /// Makes movies of the recordings that an earlier process left unfinished in `repository`. Blocks.
  virtual std::vector<RecoveredRecording> recoverUnfinished(const std::string& repository) = 0;
};

}  // namespace lmx
