// The settings of a capture, and the catalogue of devices and compressions they are chosen from.
#pragma once
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "capture/api/picture.h"
#include "capture/api/signal_thresholds.h"
#include "model/continuous_recording.h"
#include "support/dictionary.h"

namespace lmx {

/// The capture framework's numbering of what is recorded; not that of the recording types.
enum class CaptureType { audioAndVideo = 0, audio = 1, video = 2, file = 3 };
enum class MediaType { audio = 0, video = 1 };
enum class RecordingQuality { good = 0, better = 1, best = 2 };

/// How one medium is encoded.
struct LMRCompressionOptions {
  MediaType media = MediaType::video;
  RecordingQuality quality = RecordingQuality::better;  ///< video; sound has one bit rate
  int sampleRate = 48000;                               ///< Hz, audio
  int channels = 2;                                     ///< audio
  bool operator==(const LMRCompressionOptions&) const = default;
};

/// The settings of one capture. Filled by AgentPreferences, completed by the engine, read by the framework.
struct LMRRecordingContext {
  std::string uuid;
  CaptureType captureType = CaptureType::audioAndVideo;
  bool audioEnabled = false;
  bool videoEnabled = false;
  bool previewEnabled = false;
  std::optional<std::string> videoDeviceID;
  /// Absent: the first microphone there is when the capture begins. With a microphone that isn't there, or
  /// none at all, the recording is silent until one is.
  std::optional<std::string> audioDeviceID;
  PictureSize maximumSize = kFullHD;  ///< of the picture; a camera is asked for no more
  std::optional<LMRCompressionOptions> videoCompressionOptions;
  std::optional<LMRCompressionOptions> audioCompressionOptions;
  std::string captureTempDir;  ///< the recording repository
  std::int64_t diskSpaceCutoffInMB = 0;
  std::int64_t previewIntervalInMilliseconds = 0;
  std::string previewImagePath;
  LMRContinuousRecordingInfo continuous;
  SignalThresholds signal;
  // Set by the engine:
  std::string outputPath;                ///< final name of the movie
  std::uint32_t maxDurationMinutes = 0;  ///< 0: no limit
  double maximumFrameRate = 30.0;        ///< frames per second
};

/// One line in words, for the log and the -i option.
std::string describe(const LMRRecordingContext& context);

/// The capture framework's device information and compression settings. Thread-safe.
class CaptureCatalog {
 public:
  virtual ~CaptureCatalog() = default;
  /// Unique identifier of the machine's default camera, real hardware only; nothing when there is none.
  virtual std::optional<std::string> defaultVideoDevice() = 0;
  /// The same for devices that carry picture and sound in one stream.
  virtual std::optional<std::string> defaultMuxedDevice() = 0;
  virtual bool hasDevice(const std::string& uniqueID) = 0;
  struct PreferredAudio {
    std::optional<std::string> uniqueID;
    bool isMuxedAudioOfVideoDevice = false;
  };
  /// The microphone that belongs to `videoDevice`.
  virtual PreferredAudio preferredAudioDevice(const std::string& videoDevice) = 0;
  /// Whether `audioDevice` can be a microphone's identifier, whether or not that microphone is there. Pure.
  virtual bool canBeMicrophone(const std::string& audioDevice) = 0;
  /// Whether that microphone is there; absent asks for any. May block for some milliseconds.
  virtual bool hasMicrophone(const std::optional<std::string>& audioDevice) = 0;
  virtual std::optional<LMRCompressionOptions> compressionOptions(MediaType media,
                                                                  RecordingQuality quality) = 0;
};

}  // namespace lmx
