// Encodes the raw frames and samples of a capture and writes the movie to the disk.
#pragma once
#include <array>
#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>

#include "capture/api/capture_framework.h"
#include "capture/gst/encoder.h"
#include "capture/movie/frame_hold.h"
#include "capture/movie/growing_movie.h"
#include "capture/store/movie_writer.h"

namespace lmx {

/// The encoder with the writer behind it. Both start with the first frame or sample. Recording thread only.
class MovieOutput {
 public:
  /// Gets the reason when nothing more can be written, possibly several times and on any thread. It must not
  /// wait for the recording thread.
  using OnError = std::function<void(const CaptureError& error)>;

  /// @param movie  created, not begun
  /// @param journal  must outlive the output
  /// @param patience  when nothing waits any more for a disk or an encoder that is too slow: what does not
  /// fit then is dropped, and told as an error. Must outlive the output
  MovieOutput(const MovieEncoding& encoding, GrowingMovie movie, Journal& journal, Deadline& patience,
              OnError onError);

  /// Starts the encoder, once.
  /// @return false when it could not be started, now or before
  bool start();

  // Once started. These wait while the encoder is behind.
  /// Encodes `buffer` as frame number `place` of the movie's clock. Places ascend; before a hole the frame
  /// lasts until the next one.
  void pushFrame(GstBuffer* buffer, std::uint32_t place, bool forceKey);
  /// Encodes `count` samples of each channel, interleaved, from `samples` on; null for silence.
  void pushSound(const float* samples, std::uint32_t count);

  /// Ends the streams and makes the movie whole. What goes wrong is logged or reported to `onError`.
  /// @param totalFrames  length of the movie on its clock: the last frame lasts until then
  /// @param totalSamples  of each channel; what the encoder adds is dropped
  void close(std::uint32_t totalFrames, std::int64_t totalSamples);
  /// Frames had to be dropped because this output was too slow. If that was the encoder's fault, the next
  /// recording's gets less to do.
  void fellBehind() const;
  /// How many of the `frames` of the movie's clock that were recorded the closed movie holds.
  [[nodiscard]] std::uint32_t framesWritten(std::uint32_t frames) const;
  [[nodiscard]] bool started() const { return encoder_ != nullptr; }

 private:
  [[nodiscard]] EncoderOutput encoderOutput();
  [[nodiscard]] Result<std::unique_ptr<Encoder>> newEncoder();
  void setFormat(std::uint32_t track, TrackFormat format);
  void addFrame(std::optional<EncodedSample> frame);
  void endStreams(std::uint32_t totalFrames, std::int64_t totalSamples);
  void finishWriting();

  MovieEncoding encoding_;
  GrowingMovie movie_;  ///< until the writer has it
  Journal& journal_;
  Deadline& patience_;
  const OnError on_error_;
  bool tried_ = false;
  std::array<std::atomic<bool>, 2> has_format_{};  ///< of each track
  std::unique_ptr<MovieWriter> writer_;
  std::optional<FrameHold> hold_;     // the encoder's picture thread while there is an encoder
  std::unique_ptr<Encoder> encoder_;  // declared behind the writer, which its threads call
};

}  // namespace lmx
