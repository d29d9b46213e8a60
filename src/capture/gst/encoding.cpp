// Chooses bit rates and time scales, and writes the encoder's launch line.
#include "capture/gst/encoding.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <thread>

#include "support/format.h"

namespace lmx {
namespace {

constexpr double kSoundGrainSeconds = 0.01;

/// The ceiling is an average over this time.
constexpr int kCeilingMilliseconds = 2000;
constexpr double kKeyFrameSeconds = 2.0;

std::string softwareElements(const VideoEncoding& video) {
  return string_with_format(
      "x264enc tune=zerolatency speed-preset=%s pass=qual quantizer=%d bitrate=%d vbv-buf-capacity=%d "
      "key-int-max=%d byte-stream=false aud=false option-string=scenecut=0",
      speedPreset(video, std::thread::hardware_concurrency()), videoRateFactor(video), videoBitRate(video),
      kCeilingMilliseconds, keyInterval(video.frameRate));
}

std::string videoDescription(const VideoEncoding& video) {
  return string_with_format(
             "appsrc name=vsrc format=time max-buffers=0 max-bytes=0 max-time=0 stream-type=stream "
             "caps=video/x-raw,format=I420,width=%d,height=%d,framerate=%d/%d,pixel-aspect-ratio=1/1,"
             "colorimetry=bt709 ! ",
             video.size.width, video.size.height, video.frameRate.numerator, video.frameRate.denominator) +
         video.kind.elements(video) +
         " ! video/x-h264,stream-format=avc,alignment=au ! "
         "appsink name=vout sync=false async=false max-buffers=0 enable-last-sample=false ";
}

/// Left and right are coded apart: of a microphone on one of them this encoder's sum and difference give a
/// half on either side, and all of it on the right one whenever something happens on the other.
std::string audioDescription(const AudioEncoding& audio) {
  return string_with_format(
      "appsrc name=asrc format=time max-buffers=0 max-bytes=0 max-time=0 stream-type=stream "
      "caps=audio/x-raw,format=F32LE,layout=interleaved,rate=%d,channels=%d%s ! "
      "avenc_aac bitrate=%d aac-ms=false ! appsink name=aout sync=false async=false max-buffers=0 "
      "enable-last-sample=false ",
      audio.sampleRate, audio.channels, audio.channels == 2 ? ",channel-mask=(bitmask)0x3" : "",
      audio.bitRate);
}

}  // namespace

VideoEncoderKind softwareEncoder() { return {"x264enc", &softwareElements}; }

double MovieEncoding::frameSeconds() const {
  return video ? video->frameRate.frameSeconds() : kSoundGrainSeconds;
}

int videoBitRate(const VideoEncoding& video) {
  static constexpr double kFactor[] = {0.75, 1.0, 1.6};
  const double megapixels = video.size.width * video.size.height / video.frameRate.frameSeconds() / 1e6;
  // About 2.5 Mbit/s at 720p30 and 4.5 at 1080p30: slides and a speaker, sharp text.
  const double kilobits = 205.0 * std::pow(megapixels, 0.75);
  return std::max(150, static_cast<int>(kilobits * kFactor[static_cast<int>(video.quality)]));
}

int videoRateFactor(const VideoEncoding& video) {
  static constexpr std::array kFactor{24, 22, 19};
  return kFactor[static_cast<std::size_t>(video.quality)];
}

const char* speedPreset(const VideoEncoding& video, unsigned cores) {
  static constexpr std::array kEfforts{"veryfast", "superfast", "ultrafast"};
  constexpr unsigned kCoresForLargePictures = 4;  // "veryfast" takes most of one at 1080p
  const bool upTo720p = video.size.width * video.size.height <= 1280 * 720;
  const bool strong = video.quality == RecordingQuality::best && cores >= kCoresForLargePictures;
  const int wanted = video.quality == RecordingQuality::good || !(upTo720p || strong) ? 1 : 0;
  return kEfforts[std::min(kEfforts.size() - 1, static_cast<std::size_t>(wanted + video.effortSaved))];
}

std::string describeEncoder(const VideoEncoding& video) {
  if (video.kind.name != softwareEncoder().name) return video.kind.name;
  return video.kind.name + " " + speedPreset(video, std::thread::hardware_concurrency());
}

int keyInterval(FrameRate rate) {
  return std::max(1, static_cast<int>(std::lround(kKeyFrameSeconds / rate.frameSeconds())));
}

std::uint32_t videoTimescale(FrameRate rate) {
  std::uint32_t scale = static_cast<std::uint32_t>(rate.numerator);
  while (scale < 10000) scale *= 10;
  return scale;
}

std::uint32_t frameDuration(FrameRate rate) {
  return videoTimescale(rate) / static_cast<std::uint32_t>(rate.numerator) *
         static_cast<std::uint32_t>(rate.denominator);
}

std::string encoderDescription(const MovieEncoding& movie) {
  return (movie.video ? videoDescription(*movie.video) : "") +
         (movie.audio ? audioDescription(*movie.audio) : "");
}

}  // namespace lmx
