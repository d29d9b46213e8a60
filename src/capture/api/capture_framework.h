// What the recording engine needs of a capture framework. capture/ implements it; tests replace it with a
// script.
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
#include "support/result.h"

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

/// Reports of a capture controller, on a thread of the framework, which logs what it reports.
class CaptureControllerDelegate {
 public:
  virtual ~CaptureControllerDelegate() = default;
  /// The microphone is not there at the beginning, or has been lost. The capture goes on with silence. Loss
  /// and return alternate, from a capture's preparation to its end.
  virtual void lmrCaptureSoundLost(const CaptureError& error) = 0;
  /// The microphone is heard again.
  virtual void lmrCaptureSoundBack() = 0;
  virtual void lmrCaptureDidComplete(const std::optional<CaptureError>& error) = 0;
  virtual void lmrCaptureDidCancel(const std::optional<CaptureError>& error) = 0;
};

/// An open camera and microphone that previews and recordings share. Opaque to the engine.
class CaptureSession {
 public:
  virtual ~CaptureSession() = default;
  [[nodiscard]] virtual bool isRunning() const = 0;
  /// Whether it is not decided yet if the devices can be had.
  [[nodiscard]] virtual bool isOpening() const = 0;
};

/// A movie that was not submitted in the ordinary way and has been put into the repository.
struct RecoveredRecording {
  std::string request;          ///< its identifier
  bool submit = false;          ///< it was stopped for good, but its job was not queued yet
  std::string path;             ///< of the movie, whole and in place
  SharedDictionary parameters;  ///< of the START that asked for it; never null
  int recordingType = 0;        ///< code of the type that was recorded
  double startTime = 0;         ///< seconds since 2001-01-01 UTC of its first frame
  double stopTime = 0;
  double duration = 0;           ///< seconds of media
  std::function<bool()> queued;  ///< call it once its job is kept elsewhere: a restart must not submit it
  std::function<void()> forget;  ///< call it once the document is written: what is left of the capture goes
};

/// Records one capture. All operations are thread-safe unless said otherwise. They return quickly, but for
/// prepareRecording (opens devices) and those that deal with finished movies: these wait for the disk, and
/// for each other. Times are seconds since 2001-01-01 UTC. A request is what one START asked for: half-open
/// spans between marks.
class LMRCaptureController {
 public:
  virtual ~LMRCaptureController() = default;

  /// Gets one report of the end, when the capture has ended, and before that those of the microphone. Held
  /// weakly: a delegate that has gone by then gets none.
  virtual void setDelegate(std::weak_ptr<CaptureControllerDelegate> delegate) = 0;
  /// Opens the devices that the settings name and sets up the writing; once. Main thread, blocks while a
  /// device opens.
  /// @param session  not needed: devices that a preview has open in the same format are found and shared
  /// @return false when it can't: the reason is in lastError()
  virtual bool prepareRecording(const LMRRecordingContext& settings,
                                std::shared_ptr<CaptureSession> session) = 0;
  /// @return false when the recording could not be prepared; true when it runs, or has ended already
  virtual bool startRecording() = 0;
  /// Ends with lmrCaptureDidComplete, once the file is closed. Only the first stop or cancel counts.
  virtual void stopRecording() = 0;
  /// Ends with lmrCaptureDidCancel. What cancelled requests recorded is deleted; a request that was started
  /// by mark and that nobody cancelled is kept for recoverAbandonedRequests.
  virtual void cancelRecording() = 0;
  /// Between pause and resume nothing is recorded, whatever the marks say.
  virtual void pauseRecording() = 0;
  virtual void resumeRecording() = 0;

  /// Tags the whole capture with `uuid`, from now on. The tag is no client's request: it records nothing and
  /// is never submitted or recovered.
  virtual void setStartWithUUID(const std::string& uuid) = 0;
  virtual void setStopWithUUID(const std::string& uuid) = 0;
  /// Opens a span of a client's request. `parameters` (of its START) are kept with the first mark. Ignored
  /// once the capture is ending.
  virtual void setStartWithUUID(const std::string& uuid, double atTime, SharedDictionary parameters) = 0;
  virtual void setStopWithUUID(const std::string& uuid, double atTime) = 0;
  /// Does nothing once the request is to be submitted.
  virtual void cancelRequestWithUUID(const std::string& uuid) = 0;
  /// The request has been stopped for good and is to be submitted: a restart that finds it unfinished does
  /// so, and it can't be cancelled any more.
  virtual void submitRequestWithUUID(const std::string& uuid) = 0;
  /// Returns once all marks so far survive a power cut. Blocks for as long as the disk needs.
  virtual void syncMarks() = 0;

  /// Recorded seconds of the request (for the tag: seconds since it was set) up to now; 0 for an unknown one.
  virtual double elapsedTimeForRequestWithUUID(const std::string& uuid) = 0;
  /// Media recorded so far by the whole capture.
  virtual std::int64_t elapsedTimeInMilliseconds() = 0;
  /// kCaptureRecording, kCapturePaused; anything else: neither.
  virtual int recordingState() = 0;
  /// Whether the file is closed and the devices are given back, or nothing could be prepared at all.
  virtual bool hasShutDown() = 0;
  [[nodiscard]] virtual std::optional<CaptureError> lastError() = 0;
  /// The open devices; null before and after the capture.
  [[nodiscard]] virtual std::shared_ptr<CaptureSession> session() = 0;
  /// Newest level of each channel in decibels; empty where levels are not measured.
  virtual std::vector<double> audioAveragePowerLevels() = 0;

  /// Writes the request's movie to `outputPath`: there under its name only when whole. Blocks; waits for the
  /// capture to shut down first. @return nothing on success.
  virtual std::optional<CaptureError> processRequestWithUUID(const std::string& uuid,
                                                             const std::string& outputPath) = 0;
  /// The same, but nothing that exists is moved or replaced: where `outputPath` is taken the movie gets a
  /// name with a number beside it.
  /// @return the movie's path
  virtual Result<std::string, CaptureError> processRequestBeside(const std::string& uuid,
                                                                 const std::string& outputPath) = 0;
  /// The request's job is kept elsewhere: a restart must not submit it any more. Blocks until that survives a
  /// power cut.
  /// @return false when that could not be written (logged)
  [[nodiscard]] virtual bool requestQueued(const std::string& uuid) = 0;
  /// The request's movie and document are in place: a restart need not care for it any more. Blocks likewise.
  virtual void requestHandedOver(const std::string& uuid) = 0;
  /// Makes movies of the requests that nobody stopped or cancelled, after the capture has shut down and the
  /// one that was submitted has been processed. Blocks.
  virtual std::vector<RecoveredRecording> recoverAbandonedRequests() = 0;

  /// Frees space during a continuous recording. @return path of the deleted segment; nothing when there is
  /// none
  virtual std::optional<std::string> deleteEarliestSegment() = 0;
};

/// Takes the pictures of a preview, on a thread of the framework.
class LMRPreviewControllerDelegate {
 public:
  virtual ~LMRPreviewControllerDelegate() = default;
  virtual void setFrameGrabInterval(int milliseconds) = 0;
  virtual void handleJPEGData(std::vector<std::uint8_t> jpeg) = 0;
};

/// A look at one camera (and one microphone) without recording.
class LMRPreviewController {
 public:
  virtual ~LMRPreviewController() = default;
  /// Chooses the camera and opens it for a moment, to prove that it can be had. Main thread, blocks
  /// meanwhile.
  /// @return false, with `*error` set, when it can't be had
  virtual bool attachIOWithDevice(const std::string& device, CaptureError* error) = 0;
  virtual void addAudioDeviceWithID(const std::optional<std::string>& device) = 0;
  [[nodiscard]] virtual std::string videoDeviceLocalizedDisplayName() const = 0;
  /// May never be called: a framework need not take pictures of a preview.
  virtual void setDelegate(std::shared_ptr<LMRPreviewControllerDelegate> delegate) = 0;
  /// That of the running preview, else the one it was made with; may be null.
  [[nodiscard]] virtual std::shared_ptr<CaptureSession> session() const = 0;
  /// Opens the devices until stopPreview. A failure is logged: isPreviewRunning() tells.
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
  /// Begins to open a camera, which may take seconds, and holds it open. Any thread, does not block.
  /// @return null where nothing can be opened ahead
  virtual std::shared_ptr<CaptureSession> openAhead(const std::string& /*camera*/) { return nullptr; }
  /// Loads what the first recording would otherwise wait for. Any thread, blocks.
  virtual void warmUp() = 0;
  /// Waits until the devices are closed that nobody uses any more, at most `limit`: a network camera keeps a
  /// viewer that does not say goodbye for a minute. Any thread.
  virtual void waitUntilClosed(std::chrono::milliseconds /*limit*/) {}
  /// The capture devices in words, for the command line.
  /// @param limits  what cameras would be asked for
  virtual std::string deviceInformation(const PictureLimits& limits) = 0;
  /// Makes movies of the recordings that an earlier process left unfinished in `repository`. Blocks.
  /// @param known  whether a job of that request has been stored: it is only marked as done
  virtual std::vector<RecoveredRecording> recoverUnfinished(
      const std::string& repository, const std::function<bool(const std::string& request)>& known) = 0;
};

}  // namespace lmx
