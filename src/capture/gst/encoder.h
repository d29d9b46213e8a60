// Raw frames and samples of one movie in, H.264 and AAC samples out.
#pragma once
#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

#include "capture/api/capture_settings.h"
#include "capture/api/picture.h"
#include "capture/gst/gst_handles.h"
#include "capture/movie/movie_file.h"

namespace lmx {

struct VideoEncoding {
  PictureSize size;
  FrameRate frameRate;
  RecordingQuality quality = RecordingQuality::better;
};
struct AudioEncoding {
  int sampleRate = 48000;
  int channels = 2;
  int bitRate = 128000;
};

/// Kilobits a second for a picture: grows with its pixels, less than in proportion.
int videoBitRate(const VideoEncoding& video);
/// The encoder's effort: what a small machine sustains live.
const char* speedPreset(const VideoEncoding& video);
/// Units a second of a video track; a frame then lasts frameRate.denominator * 1000 / … of them, without a
/// remainder.
std::uint32_t videoTimescale(FrameRate rate);
std::uint32_t frameDuration(FrameRate rate);

/// Where encoded samples go; called on the encoder's threads, one thread a track.
struct EncoderOutput {
  std::function<void(std::uint32_t track, TrackFormat format)>
      onFormat;  ///< once a track, before its samples
  std::function<void(EncodedSample sample)> onSample;
  std::function<void(std::string problem)> onError;
};

/// Feeding belongs to one thread. Track 0 is the video where there is one; the sound follows.
class Encoder {
 public:
  /// @return null with the reason in `*problem`.
  static std::unique_ptr<Encoder> create(const std::optional<VideoEncoding>& video,
                                         const std::optional<AudioEncoding>& audio, EncoderOutput output,
                                         std::string* problem);
  ~Encoder();
  Encoder(const Encoder&) = delete;
  Encoder& operator=(const Encoder&) = delete;

  /// Encodes `buffer` as frame number `place`; blocks while the encoder is more than a few frames behind.
  /// Does nothing once it has failed.
  void pushVideo(GstBuffer* buffer, std::uint32_t place, bool forceKey);
  /// Encodes `count` samples of all channels from `samples` on; null for silence.
  void pushAudio(const float* samples, std::uint32_t count);
  /// Ends the streams and waits until all is out. Sound behind `totalSamples` is dropped.
  /// @return false when it did not come to its end within `limit`.
  bool finish(std::int64_t totalSamples, std::chrono::milliseconds limit);

 private:
  Encoder(std::optional<VideoEncoding> video, std::optional<AudioEncoding> audio, EncoderOutput output);
  bool build(std::string* problem);
  static GstFlowReturn onVideoSample(GstElement* sink, gpointer self) noexcept;
  static GstFlowReturn onAudioSample(GstElement* sink, gpointer self) noexcept;
  static void onEos(GstElement* sink, gpointer self) noexcept;
  static GstBusSyncReply onMessage(GstBus* bus, GstMessage* message, gpointer self) noexcept;
  void fail(const std::string& problem);
  [[nodiscard]] bool failed();
  void takeVideo(GstSample* sample);
  void takeAudio(GstSample* sample);

  const std::optional<VideoEncoding> video_;
  const std::optional<AudioEncoding> audio_;
  const EncoderOutput output_;
  GstHandle<GstElement> pipeline_;
  GstHandle<GstElement> video_source_;
  GstHandle<GstElement> audio_source_;
  std::int64_t audio_pushed_ = 0;    // feeding thread
  bool video_format_known_ = false;  // video thread
  bool audio_format_known_ = false;  // audio thread
  std::int64_t audio_packets_ = 0;   // audio thread
  std::atomic<std::int64_t> total_samples_{INT64_MAX};
  std::mutex mutex_;
  std::condition_variable changed_;
  int open_streams_ = 0;  // guarded by mutex_
  bool failed_ = false;   // guarded by mutex_
};

}  // namespace lmx
