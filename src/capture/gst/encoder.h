// Encodes the raw frames and samples of one movie to H.264 and AAC.
#pragma once
#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

#include "capture/gst/encoding.h"
#include "capture/gst/gst_handles.h"
#include "capture/media/deadline.h"
#include "capture/movie/growing_movie.h"
#include "support/result.h"

namespace lmx {

/// Takes what is encoded. Called on the encoder's threads, one per track.
struct EncoderOutput {
  /// Before the track's samples: sound's as soon as the encoder runs, the picture's with its first frame.
  /// Again if the sound's encoder describes itself otherwise than was foreseen.
  std::function<void(std::uint32_t track, TrackFormat format)> onFormat;
  /// A frame with the place it was pushed with. It has no duration yet: that depends on the next one.
  std::function<void(EncodedSample frame, std::uint32_t place)> onFrame;
  std::function<void(EncodedSample packet)> onSound;
  /// Once at most: nothing more is encoded then. On any thread.
  std::function<void(std::string problem)> onError;
};

/// Fed by one thread. Track 0 is the picture, if there is one; the sound follows.
class Encoder {
 public:
  /// Starts an encoder. The error says in words why there is none; the output has heard nothing then.
  /// @param patience  when its feeder is no longer made to wait; must outlive the encoder
  static Result<std::unique_ptr<Encoder>> create(const MovieEncoding& movie, const Deadline& patience,
                                                 EncoderOutput output);
  /// Stops it. The output is not called any more afterwards.
  ~Encoder();
  Encoder(const Encoder&) = delete;
  Encoder& operator=(const Encoder&) = delete;

  /// Encodes `buffer` as frame number `place`; places ascend, possibly with holes. Blocks while the encoder
  /// is more than a few frames behind, until the patience is at its end. Does nothing once it has failed.
  void pushVideo(GstBuffer* buffer, std::uint32_t place, bool forceKey);
  /// Encodes `count` samples of each channel, interleaved, from `samples` on; null for silence. Blocks and
  /// fails like pushVideo.
  void pushAudio(const float* samples, std::uint32_t count);
  /// Ends the streams and waits until all is out. Sound behind `totalSamples` is dropped.
  /// @return false when it has failed, or did not come to its end within `limit`
  bool finish(std::int64_t totalSamples, std::chrono::milliseconds limit);

 private:
  using NewSample = GstFlowReturn(GstElement*, gpointer) noexcept;
  Encoder(const MovieEncoding& movie, const Deadline& patience, EncoderOutput output);
  void attach(GstHandle<GstElement> pipeline);
  void takeFrom(const char* sink, NewSample* onSample);
  [[nodiscard]] std::optional<Error> start();
  static GstFlowReturn onVideoSample(GstElement* sink, gpointer self) noexcept;
  static GstFlowReturn onAudioSample(GstElement* sink, gpointer self) noexcept;
  static void onEos(GstElement* sink, gpointer self) noexcept;
  static GstBusSyncReply onMessage(GstBus* bus, GstMessage* message, gpointer self) noexcept;
  void fail(const std::string& problem);
  template <class HasRoom>
  [[nodiscard]] bool waitForRoom(HasRoom hasRoom);
  void pushSound(const float* samples, std::uint32_t count);
  [[nodiscard]] TrackFormat soundFormat(const Bytes& config) const;
  [[nodiscard]] std::uint32_t soundTrack() const { return video_ ? 1 : 0; }
  void takeVideo(GstSample* sample);
  void takeAudio(GstSample* sample);
  [[nodiscard]] bool keyFrameIsDue(std::uint32_t place) const;
  [[nodiscard]] std::uint32_t placeOf(GstSample* sample) const;

  const std::optional<VideoEncoding> video_;
  const std::optional<AudioEncoding> audio_;
  const Deadline& patience_;
  const EncoderOutput output_;
  Bytes sound_config_;  ///< as foreseen
  GstHandle<GstElement> pipeline_;
  GstHandle<GstElement> video_source_;
  GstHandle<GstElement> audio_source_;
  std::uint32_t last_key_ = 0;       // feeding thread: place of the newest key frame that was asked for
  std::int64_t audio_pushed_ = 0;    // feeding thread
  bool video_format_known_ = false;  // video thread
  std::int64_t audio_packets_ = 0;   // audio thread
  std::atomic<std::int64_t> total_samples_{INT64_MAX};
  std::mutex mutex_;
  std::condition_variable changed_;
  int open_streams_ = 0;                     // guarded by mutex_
  bool started_ = false;                     // guarded by mutex_: failures are told to the output from now on
  bool failed_ = false;                      // guarded by mutex_
  std::string problem_;                      // guarded by mutex_: why it has failed
  std::deque<std::uint32_t> places_inside_;  // guarded by mutex_: of the frames that are not out yet
  std::int64_t audio_out_ = 0;               // guarded by mutex_: samples
};

}  // namespace lmx
