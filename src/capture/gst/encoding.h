// How a movie's picture and sound are encoded. Pure.
#pragma once
#include <cstdint>
#include <functional>
#include <optional>
#include <string>

#include "capture/api/capture_settings.h"
#include "capture/api/picture.h"

namespace lmx {

struct VideoEncoding;

/// An encoder of pictures.
struct VideoEncoderKind {
  std::string name;
  /// Its elements in GStreamer's launch notation: I420 goes in, H.264 without reordered frames comes out.
  std::function<std::string(const VideoEncoding&)> elements;
};
/// x264.
VideoEncoderKind softwareEncoder();

struct VideoEncoding {
  PictureSize size;
  FrameRate frameRate;
  RecordingQuality quality = RecordingQuality::better;
  VideoEncoderKind kind = softwareEncoder();
  int effortSaved = 0;  ///< steps below the effort that the quality asks for
};
struct AudioEncoding {
  int sampleRate = 48000;  ///< Hz
  int channels = 2;
  int bitRate = 192000;  ///< bits a second; with 128,000 a steady tone wavers
};
/// The tracks of a movie; at least one of them.
struct MovieEncoding {
  std::optional<VideoEncoding> video;
  std::optional<AudioEncoding> audio;
  /// The grain of the movie's clock: a frame of the picture, 10 ms where there is only sound.
  [[nodiscard]] double frameSeconds() const;
};

/// Kilobits a second that a picture takes at most, averaged over two seconds. Grows with its pixels, less
/// than in proportion.
int videoBitRate(const VideoEncoding& video);
/// The constant quality that is aimed at below that rate: x264's rate factor, lower is better.
int videoRateFactor(const VideoEncoding& video);
/// The encoder's effort: what the machine sustains live.
/// @param cores  of the machine
const char* speedPreset(const VideoEncoding& video, unsigned cores);
/// The encoder and its effort in words, for the log.
std::string describeEncoder(const VideoEncoding& video);
/// Frames from one key frame to the next at most.
int keyInterval(FrameRate rate);
/// Timescale units a second of a video track; at least 10,000, and a multiple of the rate's numerator.
std::uint32_t videoTimescale(FrameRate rate);
/// Length of a frame in those units, without a remainder.
std::uint32_t frameDuration(FrameRate rate);

/// The encoder's pipeline in GStreamer's launch notation: raw frames go into "vsrc" and come out encoded at
/// "vout", samples go into "asrc" and come out at "aout".
std::string encoderDescription(const MovieEncoding& movie);

}  // namespace lmx
