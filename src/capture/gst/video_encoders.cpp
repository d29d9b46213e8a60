// Trying encoders out, once.
#include "capture/gst/video_encoders.h"

#include <atomic>
#include <chrono>
#include <mutex>

#include "capture/gst/encoder.h"
#include "platform/log.h"
#include "support/format.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;

constexpr auto kTrialPatience = 5s;
constexpr PictureSize kTrialSize{640,
                                 368};  // some hardware refuses small pictures, and heights off its blocks

/// What hardware puts out has its parameter sets in the stream.
constexpr const char* kParser =
    " ! h264parse ! video/x-h264,profile={constrained-baseline,baseline,main,high}";

std::string vaEncoder(const VideoEncoding& video) {
  return string_with_format("videoconvert ! vah264enc b-frames=0 bitrate=%d key-int-max=%d",
                            videoBitRate(video), keyInterval(video.frameRate)) +
         kParser;
}

std::string vaapiEncoder(const VideoEncoding& video) {
  return string_with_format("vaapih264enc max-bframes=0 rate-control=vbr bitrate=%d keyframe-period=%d",
                            videoBitRate(video), keyInterval(video.frameRate)) +
         kParser;
}

std::string nvEncoder(const VideoEncoding& video) {
  return string_with_format("nvh264enc zerolatency=true bframes=0 rc-mode=vbr max-bitrate=%d gop-size=%d",
                            videoBitRate(video), keyInterval(video.frameRate)) +
         kParser;
}

std::string v4l2Encoder(const VideoEncoding& video) {
  return string_with_format(
             "videoconvert ! v4l2h264enc extra-controls=\"controls,video_bitrate=%d,h264_i_frame_period=%d\" "
             "! "
             "video/x-h264,level=(string)4",
             videoBitRate(video) * 1000, keyInterval(video.frameRate)) +
         kParser;
}

/// What comes out of an encoder that is tried out.
struct Trial {
  std::mutex mutex;
  std::vector<std::uint32_t> places;  // guarded by mutex
  std::vector<std::uint32_t> keys;    // guarded by mutex
  std::string problem;                // guarded by mutex

  EncoderOutput output() {
    EncoderOutput output;
    output.onFormat = [](std::uint32_t, const TrackFormat&) {};
    output.onFrame = [this](const EncodedSample& frame, std::uint32_t place) {
      const std::lock_guard lock(mutex);
      if (!frame.data.empty()) places.push_back(place);
      if (frame.sync) keys.push_back(place);
    };
    output.onError = [this](const std::string& what) {
      const std::lock_guard lock(mutex);
      problem = what;
    };
    return output;
  }
};

BufferHandle grey() {
  const gsize luma = gsize{kTrialSize.width} * gsize{kTrialSize.height};
  BufferHandle buffer(gst_buffer_new_allocate(nullptr, luma * 3 / 2, nullptr));
  gst_buffer_memset(buffer.get(), 0, 128, luma * 3 / 2);
  return buffer;
}

}  // namespace

const std::vector<VideoEncoderKind>& knownVideoEncoders() {
  static const std::vector<VideoEncoderKind> kKinds{{"vah264enc", &vaEncoder},
                                                    {"vaapih264enc", &vaapiEncoder},
                                                    {"nvh264enc", &nvEncoder},
                                                    {"v4l2h264enc", &v4l2Encoder},
                                                    softwareEncoder()};
  return kKinds;
}

std::optional<std::string> tryVideoEncoder(const VideoEncoderKind& kind) {
  VideoEncoding video{.size = kTrialSize, .frameRate = {30, 1}};
  video.kind = kind;
  Deadline patience;
  patience.set(Deadline::Clock::now() + kTrialPatience);
  Trial trial;
  auto encoder = Encoder::create({video, std::nullopt}, patience, trial.output());
  if (!encoder) return encoder.error().message;
  const std::vector<std::uint32_t> places{0, 1, 2, 5, 6, 9, 10, 11};
  const BufferHandle picture = grey();
  for (const std::uint32_t place : places)
    (*encoder)->pushVideo(picture.get(), place, place == 0 || place == 6);
  const bool ended = (*encoder)->finish(0, kTrialPatience);
  *encoder = nullptr;
  const std::lock_guard lock(trial.mutex);
  if (!trial.problem.empty()) return trial.problem;
  if (!ended) return "it does not come to its end";
  if (trial.places != places) return "frames are missing, or come out of order";
  if (trial.keys != std::vector<std::uint32_t>{0, 6}) return "it makes no key frame when it is asked for one";
  return std::nullopt;
}

VideoEncoderChoice& VideoEncoderChoice::instance() {
  static VideoEncoderChoice choice;
  return choice;
}

void VideoEncoderChoice::tryOut(const std::vector<VideoEncoderKind>& kinds) {
  for (const VideoEncoderKind& kind : kinds) {
    if (const auto problem = tryVideoEncoder(kind)) {
      LMPLogMessage(nullptr, kLogDebug, "Pictures are not encoded with %s: %s", kind.name.c_str(),
                    problem->c_str());
      continue;
    }
    LMPLogMessage(nullptr, kLogInfo, "Pictures are encoded with %s", kind.name.c_str());
    const std::lock_guard lock(mutex_);
    kind_ = kind;
    return;
  }
  LMPLogMessage(nullptr, kLogError, "No encoder for pictures works: recordings will fail");
}

void VideoEncoderChoice::apply(VideoEncoding& video) const {
  const std::lock_guard lock(mutex_);
  video.kind = kind_.value_or(softwareEncoder());
  video.effortSaved = effort_saved_;
}

void VideoEncoderChoice::failed(const VideoEncoding& video) {
  const VideoEncoderKind software = softwareEncoder();
  if (video.kind.name == software.name) return;
  {
    const std::lock_guard lock(mutex_);
    kind_ = software;
  }
  LMPLogMessage(nullptr, kLogWarning, "%s has failed: the next recordings are encoded with %s",
                video.kind.name.c_str(), software.name.c_str());
}

void VideoEncoderChoice::fellBehind(const VideoEncoding& video) {
  VideoEncoding cheaper = video;
  if (video.kind.name == softwareEncoder().name) {
    ++cheaper.effortSaved;
  } else {
    cheaper.kind = softwareEncoder();
  }
  const std::string now = describeEncoder(video);
  const std::string next = describeEncoder(cheaper);
  if (now == next) return;
  {
    const std::lock_guard lock(mutex_);
    kind_ = cheaper.kind;
    effort_saved_ = cheaper.effortSaved;
  }
  LMPLogMessage(nullptr, kLogNotice,
                "The encoder could not keep up with %s: the next recording is encoded with %s", now.c_str(),
                next.c_str());
}

}  // namespace lmx
