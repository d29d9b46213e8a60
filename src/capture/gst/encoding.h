// How a movie's picture and sound are encoded. Pure.
#pragma once
#include <cstdint>
#include <optional>
#include <string>

#include "capture/api/capture_settings.h"
#include "capture/api/picture.h"

namespace lmx {

struct VideoEncoding {
  PictureSize size;
  FrameRate frameRate;
  RecordingQuality quality = RecordingQuality::better;
};
struct AudioEncoding {
  int sampleRate = 48000;  ///< Hz
  int channels = 2;
  int bitRate = 128000;  ///< bits a second
};
/// The tracks of a movie; at least one of them.
struct MovieEncoding {
  std::optional<VideoEncoding> video;
  std::optional<AudioEncoding> audio;
  /// The grain of the movie's clock: a frame of the picture, 10 ms where there is only sound.
  [[nodiscard]] double frameSeconds() const;
};

/// Kilobits a second for a picture. Grows with its pixels, less than in proportion.
int videoBitRate(const VideoEncoding& video);
/// The encoder's effort: what a small machine sustains live.
const char* speedPreset(const VideoEncoding& video);
/// Timescale units a second of a video track; at least 10,000, and a multiple of the rate's numerator.
std::uint32_t videoTimescale(FrameRate rate);
/// Length of a frame in those units, without a remainder.
std::uint32_t frameDuration(FrameRate rate);

/// The encoder's pipeline in GStreamer's launch notation: raw frames go into "vsrc" and come out encoded at
/// "vout", samples go into "asrc" and come out at "aout".
std::string encoderDescription(const MovieEncoding& movie);

}  // namespace lmx
