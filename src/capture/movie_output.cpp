// Starting and ending encoder and writer.
#include "capture/movie_output.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstring>

#include "capture/gst/video_encoders.h"
#include "platform/log.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

constexpr auto kEncoderPatience = 10s;

CaptureError writeError(int error) {
  if (error == ENODATA) {
    return {CaptureError::kDomain, kEncoderFailed, "the encoder has given nothing for half a minute"};
  }
  const std::string reason = error == ETIMEDOUT ? "the disk is too slow" : std::strerror(error);
  return {CaptureError::kDomain, error == ENOSPC ? kNoSpace : kWriteFailed,
          "the movie can't be written any further: " + reason};
}

}  // namespace

MovieOutput::MovieOutput(const MovieEncoding& encoding, GrowingMovie movie, Journal& journal,
                         Deadline& patience, OnError onError)
    : encoding_(encoding),
      movie_(std::move(movie)),
      journal_(journal),
      patience_(patience),
      on_error_(std::move(onError)) {}

bool MovieOutput::start() {
  if (tried_) return encoder_ != nullptr;
  tried_ = true;  // the movie is handed on: a second try would have none
  if (encoding_.video) hold_.emplace(frameDuration(encoding_.video->frameRate));
  const std::size_t tracks = (encoding_.video ? 1 : 0) + (encoding_.audio ? 1 : 0);
  writer_ = std::make_unique<MovieWriter>(std::move(movie_), tracks, journal_, patience_,
                                          [this](int error) { on_error_(writeError(error)); });
  auto encoder = newEncoder();
  if (encoder) {
    encoder_ = *std::move(encoder);
  } else {
    on_error_({CaptureError::kDomain, kEncoderFailed, encoder.error().message});
  }
  return encoder_ != nullptr;
}

EncoderOutput MovieOutput::encoderOutput() {
  EncoderOutput output;
  output.onFormat = [this](std::uint32_t track, TrackFormat format) { setFormat(track, std::move(format)); };
  output.onFrame = [this](EncodedSample frame, std::uint32_t place) {
    addFrame(hold_->next(std::move(frame), place));
  };
  output.onSound = [this](EncodedSample packet) { writer_->add(std::move(packet)); };
  output.onError = [this](const std::string& problem) {
    if (encoding_.video) VideoEncoderChoice::instance().failed(*encoding_.video);
    on_error_({CaptureError::kDomain, kEncoderFailed, problem});
  };
  return output;
}

void MovieOutput::pushFrame(GstBuffer* buffer, std::uint32_t place, bool forceKey) {
  encoder_->pushVideo(buffer, place, forceKey);
}

void MovieOutput::pushSound(const float* samples, std::uint32_t count) {
  encoder_->pushAudio(samples, count);
}

/// Hardware may be taken, or away.
Result<std::unique_ptr<Encoder>> MovieOutput::newEncoder() {
  if (!encoding_.video) return Encoder::create(encoding_, patience_, encoderOutput());
  VideoEncoding& video = *encoding_.video;
  VideoEncoderChoice::instance().apply(video);
  auto encoder = Encoder::create(encoding_, patience_, encoderOutput());
  const VideoEncoderKind software = softwareEncoder();
  if (encoder || video.kind.name == software.name) return encoder;
  LMPLogMessage(nullptr, kLogWarning, "%s could not be started (%s): this recording is encoded with %s",
                video.kind.name.c_str(), encoder.error().message.c_str(), software.name.c_str());
  video.kind = software;
  return Encoder::create(encoding_, patience_, encoderOutput());
}

void MovieOutput::fellBehind() const {
  const bool diskWasSlow = writer_ && writer_->wasFull();
  if (encoding_.video && !diskWasSlow) VideoEncoderChoice::instance().fellBehind(*encoding_.video);
}

void MovieOutput::setFormat(std::uint32_t track, TrackFormat format) {
  const bool again = has_format_[track].exchange(true);
  const bool used = writer_->setFormat(track, std::move(format));
  if (!again) return;
  LMPLogMessage(
      nullptr, kLogWarning, "The encoder describes its sound otherwise than was foreseen; %s",
      used ? "the movie gets the encoder's description" : "the movie has begun with what was foreseen");
}

void MovieOutput::addFrame(std::optional<EncodedSample> frame) {
  if (frame) writer_->add(*std::move(frame));
}

void MovieOutput::close(std::uint32_t totalFrames, std::int64_t totalSamples) {
  if (encoder_) endStreams(totalFrames, totalSamples);
  if (writer_) finishWriting();
}

void MovieOutput::endStreams(std::uint32_t totalFrames, std::int64_t totalSamples) {
  patience_.set(Deadline::Clock::now() + kEncoderPatience);
  const bool ended = encoder_->finish(totalSamples, kEncoderPatience);
  encoder_.reset();
  if (!ended) {
    LMPLogMessage(nullptr, kLogError, "The encoder did not come to its end; the movie holds what it gave");
  }
  // Frames may be missing behind the last one that a failed encoder gave: it must not stand for all of them.
  if (hold_) addFrame(hold_->last(ended ? std::optional(totalFrames) : std::nullopt));
}

void MovieOutput::finishWriting() {
  const int closeError = writer_->finish();
  if (const int error = writer_->syncError()) {
    on_error_(
        {CaptureError::kDomain, kWriteFailed,
         std::string("the movie may be damaged, the disk has not kept all of it: ") + std::strerror(error)});
  }
  if (closeError == 0) return;
  LMPLogMessage(nullptr, kLogError, "The movie could not be closed in order (%s); it stays readable as it is",
                std::strerror(closeError));
}

std::uint32_t MovieOutput::framesWritten(std::uint32_t frames) const {
  if (!writer_ || writer_->index().mediaEnd == 0) return 0;
  const TrackIndex* video = writer_->index().video();
  // What a full disk or a failing encoder left out is not there to be copied.
  if (video == nullptr) return frames;
  const std::uint64_t written = video->totalDuration / frameDuration(encoding_.video->frameRate);
  return static_cast<std::uint32_t>(std::min<std::uint64_t>(frames, written));
}

}  // namespace lmx
