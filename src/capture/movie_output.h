// The movie of a capture: raw frames and samples in, encoded and written to the disk.
#pragma once
#include <cstdint>
#include <functional>
#include <memory>

#include "capture/api/capture_framework.h"
#include "capture/gst/encoder.h"
#include "capture/movie/growing_movie.h"
#include "capture/store/movie_writer.h"

namespace lmx {

/// The encoder with the writer behind it. Both start with the first frame or sample. Recorder's thread only.
class MovieOutput {
 public:
  /// Why nothing more can be written. Called on any thread, more than once perhaps; it must not wait for the
  /// recorder's thread.
  using OnError = std::function<void(const CaptureError& error)>;

  /// @param movie  created, not begun
  /// @param journal  must outlive the output
  MovieOutput(const MovieEncoding& encoding, GrowingMovie movie, Journal& journal, OnError onError);

  /// Starts the encoder if it does not run yet. @param size  of the frames
  /// @return false when it could not be started
  bool start(PictureSize size);

  // Once started. These wait while the encoder is behind.
  /// Encodes `buffer` as frame number `place` of the movie.
  void pushFrame(GstBuffer* buffer, std::uint32_t place, bool forceKey);
  /// Encodes `count` samples of each channel, interleaved, from `samples` on; null for silence.
  void pushSound(const float* samples, std::uint32_t count);

  /// Ends the streams and makes the movie whole. Damage is logged or reported as an error.
  /// @param totalSamples  of each channel; what the encoder adds is dropped
  void close(std::int64_t totalSamples);
  /// How many of `frames` of the movie's clock the closed movie holds.
  [[nodiscard]] std::uint32_t framesWritten(std::uint32_t frames) const;
  [[nodiscard]] bool started() const { return encoder_ != nullptr; }

 private:
  [[nodiscard]] EncoderOutput encoderOutput();
  void reportWriteError(int error);
  void finishWriting();

  MovieEncoding encoding_;
  GrowingMovie movie_;  ///< until the writer has it
  Journal& journal_;
  const OnError on_error_;
  std::unique_ptr<MovieWriter> writer_;
  std::unique_ptr<Encoder> encoder_;  // behind the writer: its threads call that
};

}  // namespace lmx
