// The life of an open device.
#include "capture/source/source.h"

#include <algorithm>
#include <system_error>
#include <thread>

#include "capture/gst/picture_format.h"
#include "capture/source/device_list.h"
#include "capture/source/overdue.h"
#include "platform/log.h"
#include "support/format.h"
#include "support/redacted.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

constexpr auto kFirstSampleLimit = 10s;
constexpr auto kSilenceLimit = 2s;
constexpr auto kWatchInterval = 500ms;
constexpr std::chrono::milliseconds kClosingPatience = 5s;
constexpr auto kOpeningPatience = 5s;

std::int64_t steadyMilliseconds() {
  const auto time = std::chrono::steady_clock::now().time_since_epoch();
  return std::chrono::duration_cast<std::chrono::milliseconds>(time).count();
}

std::chrono::milliseconds since(std::int64_t steadyMs) {
  return std::chrono::milliseconds(steadyMilliseconds() - steadyMs);
}

std::shared_ptr<const HardwareDevice> lookUpHardware(const std::string& uniqueID) {
  auto found = findHardware(uniqueID);
  return found ? std::make_shared<const HardwareDevice>(std::move(*found)) : nullptr;
}

/// Whether the sound's times are made by counting samples, or by a network: they follow another clock then.
bool hasOwnClock(const DeviceID& device) {
  return device.kind == DeviceKind::hardware || device.kind == DeviceKind::network;
}

CameraFormat syntheticFormat(const DeviceID& device, const CameraDemand& demand) {
  return {pictureSize(device), syntheticRate(device).value_or(frameRateFrom(demand.maximumRate))};
}

}  // namespace

Source::Source(SourceWish wish)
    : wish_(std::move(wish)),
      device_(parseDeviceID(wish_.device)),
      clock_(!device_.asFastAsPossible()),
      retries_(device_.kind, wish_.picture) {}

bool Source::open(const std::shared_ptr<Source>& source) {
  try {
    // Detached: a driver that never returns must not hold up whoever gives the source back.
    std::thread([source] { source->live(); }).detach();
    return true;
  } catch (const std::system_error&) {
    return false;
  }
}

// ---- its users

std::string Source::name() const {
  return wish_.device == kAnyMicrophone ? "any microphone" : redacted(wish_.device);
}

void Source::close() {
  const std::lock_guard lock(mutex_);
  closing_ = true;
  if (pipeline_ != nullptr) pipeline_->wake();
  changed_.notify_all();
}

bool Source::finished(std::chrono::milliseconds limit) {
  std::unique_lock lock(mutex_);
  return changed_.wait_for(lock, limit, [this] { return finished_; });
}

bool Source::closing() const {
  const std::lock_guard lock(mutex_);
  return closing_;
}

bool Source::startWanted() const {
  const std::lock_guard lock(mutex_);
  return start_wanted_;
}

bool Source::isRunning() const {
  const std::lock_guard lock(mutex_);
  return phase_ == Phase::running || phase_ == Phase::away;  // it is being opened again
}

bool Source::isOpening() const {
  const std::lock_guard lock(mutex_);
  return phase_ == Phase::opening;
}

std::optional<CaptureError> Source::waitUntilRunning(std::chrono::milliseconds limit) {
  std::unique_lock lock(mutex_);
  changed_.wait_for(lock, limit, [this] { return phase_ != Phase::opening; });
  if (phase_ == Phase::running) return std::nullopt;
  if (problem_) return problem_;
  return CaptureError{CaptureError::kDomain, wish_.picture ? kDeviceSilent : kAudioSilent,
                      name() + (wish_.picture ? ": gave no picture in time" : ": gave no sound in time")};
}

void Source::start() {
  const std::lock_guard lock(mutex_);
  start_wanted_ = true;
  if (pipeline_ != nullptr) pipeline_->wake();
}

CameraFormat Source::format() const {
  const std::lock_guard lock(mutex_);
  return format_.value_or(CameraFormat{});
}

std::shared_ptr<const HardwareDevice> Source::hardware() const {
  const std::lock_guard lock(mutex_);
  return hardware_;
}

// ---- its thread

void Source::live() {
  begun_at_ = Clock::now();
  while (!closing()) {
    const CaptureError error = guardedOpenAndWatch();
    if (closing()) break;
    const RetryPolicy::Next next = retries_.after(failure(error));
    if (next.step != RetryPolicy::Next::Step::lost) {
      if (next.step == RetryPolicy::Next::Step::away) tellAbsence(error, "it is tried again every 3 s");
      std::unique_lock lock(mutex_);
      changed_.wait_for(lock, next.pause, [this] { return closing_; });
      continue;
    }
    LMPLogMessage(nullptr, kLogError, "Capture device lost: %s (code %d)", error.message.c_str(), error.code);
    {
      const std::lock_guard lock(mutex_);
      problem_ = error;
    }
    set(Phase::lost);
    consumers_.lost(error);
    std::unique_lock lock(mutex_);
    changed_.wait(lock, [this] { return closing_; });
  }
  const std::lock_guard lock(mutex_);
  phase_ = Phase::closed;
  finished_ = true;
  changed_.notify_all();
}

void Source::set(Phase phase) {
  const std::lock_guard lock(mutex_);
  phase_ = phase;
  changed_.notify_all();
}

// No memory, no thread: the device is lost, not the daemon.

CaptureError Source::guardedOpenAndWatch() {
  try {
    return openAndWatch();
  } catch (const std::exception& problem) {
    return {CaptureError::kDomain, kDeviceFailed, name() + ": " + problem.what()};
  }
}

std::optional<CaptureError> Source::guardedWatch(DevicePipeline& pipeline) {
  try {
    return watch(pipeline);
  } catch (const std::exception& problem) {
    return CaptureError{CaptureError::kDomain, kDeviceFailed, name() + ": " + problem.what()};
  }
}

/// @return why the device delivers no more; meaningless when the source is being closed
CaptureError Source::openAndWatch() {
  if (!predecessorHasGone()) return {CaptureError::kDomain, kDeviceBusy, name() + ": is still being closed"};
  for (;;) {
    opened_at_ = Clock::now();
    delivering_ = false;
    auto opened = openPipeline();
    if (!opened) return opened.error();
    std::unique_ptr<DevicePipeline> pipeline = *std::move(opened);
    {
      const std::lock_guard lock(mutex_);
      pipeline_ = pipeline.get();
      hardware_ = found_;
    }
    std::optional<CaptureError> problem;
    bool started = clock_.realTime();
    while (!problem && !closing()) {
      if (!started && startWanted()) {
        pipeline->start();  // without the lock: its first samples take it before this returns
        started = true;
      }
      problem = guardedWatch(*pipeline);
    }
    {
      const std::lock_guard lock(mutex_);
      pipeline_ = nullptr;
    }
    pipeline.reset();  // while the driver closes lists leave the device out
    {
      const std::lock_guard lock(mutex_);
      hardware_ = nullptr;
    }
    const bool again =
        problem && problem->code == kStreamEnded && device_.kind == DeviceKind::file && pacer_.played();
    if (!again) return problem.value_or(CaptureError{});
    pacer_.nextRound();
  }
}

/// A device is never opened while it is still being closed.
bool Source::predecessorHasGone() {
  for (auto waited = 0ms; predecessor_ && waited < kClosingPatience && !closing(); waited += kWatchInterval) {
    if (predecessor_->finished(kWatchInterval)) predecessor_ = nullptr;
  }
  return predecessor_ == nullptr;
}

Result<std::unique_ptr<DevicePipeline>, CaptureError> Source::openPipeline() {
  DevicePipeline::Wish wish{.device = device_,
                            .picture = wish_.picture,
                            .overUdp = retries_.overUdp(),
                            .demand = wish_.demand,
                            .hardware = nullptr};
  if (!findHardwareFor(wish)) {
    return CaptureError{
        CaptureError::kDomain, kDeviceNotFound,
        name() + (wish_.picture ? ": the camera is not there" : ": the microphone is not there")};
  }
  const auto steady =
      hasOwnClock(wish.device) ? std::make_shared<SteadySound>(kSoundRate, kSoundChannels) : nullptr;
  DeviceOutput output;
  output.onPicture = [this](GstSample* picture, double time) { takePicture(picture, time); };
  output.onSound = [this, steady](GstBuffer* sound, double time, double arrival) {
    takeSound(steady.get(), sound, time, arrival);
  };
  auto pipeline = openInTime(wish, std::move(output));
  if (!pipeline) return pipeline;
  if (!(*pipeline)->mode().empty() && !ever_ran_)
    LMPLogMessage(nullptr, kLogInfo, "%s: %s", name().c_str(), (*pipeline)->mode().c_str());
  if (clock_.realTime()) return pipeline;
  {
    const std::lock_guard lock(mutex_);
    format_ = syntheticFormat(device_, wish_.demand);
  }
  set(Phase::running);
  return pipeline;
}

/// A camera's users wait for it themselves. Those of a microphone don't, so another thread tells them when a
/// driver does not return: this one can't.
Result<std::unique_ptr<DevicePipeline>, CaptureError> Source::openInTime(const DevicePipeline::Wish& wish,
                                                                         DeviceOutput output) {
  if (wish_.picture) return DevicePipeline::open(wish, pacer_, std::move(output));
  auto pipeline = [&] {
    const Overdue overdue(kOpeningPatience, [this] {
      if (!closing())
        tellAbsence({CaptureError::kDomain, kAudioSilent, name() + ": has not been opened within 5 s"},
                    "its driver is waited for");
    });
    return DevicePipeline::open(wish, pacer_, std::move(output));
  }();
  if (delivering_) tellReturn();  // its first sound may have come before the absence was told
  return pipeline;
}

/// @return false for hardware that is not there
bool Source::findHardwareFor(DevicePipeline::Wish& wish) {
  found_ = nullptr;
  if (wish_.device == kAnyMicrophone) {
    const auto devices = listHardware();
    const HardwareDevice* first = firstDevice(devices, false);
    if (first == nullptr) return false;
    wish.device = parseDeviceID(first->uniqueID);
    found_ = std::make_shared<const HardwareDevice>(copyOf(*first));
  } else if (device_.kind == DeviceKind::hardware && !device_.alsaName()) {
    found_ = lookUpHardware(device_.text);
  } else {
    return true;
  }
  if (!found_) return false;
  wish.hardware = found_;
  return true;
}

std::optional<CaptureError> Source::watch(DevicePipeline& pipeline) {
  if (auto problem = pipeline.watch(kWatchInterval)) return problem;
  checkForSound(pipeline);
  return clock_.realTime() ? silence() : std::nullopt;
}

/// The sound of a device that gives both may be missing while the picture goes on.
void Source::checkForSound(const DevicePipeline& pipeline) {
  if (mute_since_ms_ != 0) return;
  const bool none = !pipeline.mayHaveSound();
  // Where the picture has stopped as well the device is about to be away, with both.
  const bool pictureGoesOn = delivering_ && since(last_sample_ms_) < kSilenceLimit / 2;
  const bool stopped = device_.kind == DeviceKind::network && pictureGoesOn && last_sound_ms_ != 0 &&
                       since(last_sound_ms_) > kSilenceLimit;
  if (!none && !stopped) return;
  mute_since_ms_ = steadyMilliseconds();
  const char* problem = none ? ": has no sound" : ": no sound for 2 s";
  LMPLogMessage(nullptr, kLogNotice, "%s%s, the picture goes on", name().c_str(), problem);
  consumers_.noSound({CaptureError::kDomain, kAudioSilent, name() + problem});
}

std::optional<CaptureError> Source::silence() const {
  const CaptureErrorCode code = wish_.picture ? kDeviceSilent : kAudioSilent;
  const char* what = wish_.picture ? "picture" : "sound";
  if (!delivering_) {
    const std::int64_t away = away_since_ms_;
    const bool late = Clock::now() - opened_at_ > kFirstSampleLimit ||
                      (wish_.picture && away != 0 && since(away) > RetryPolicy::kNetworkLimit);
    if (!late) return std::nullopt;
    return CaptureError{CaptureError::kDomain, code, name() + ": gave no " + what + " within 10 s"};
  }
  if (device_.kind == DeviceKind::file) return std::nullopt;  // the sound may be longer than the picture
  if (since(last_sample_ms_) <= kSilenceLimit) return std::nullopt;
  return CaptureError{CaptureError::kDomain, code, name() + ": no " + what + " for 2 s"};
}

// ---- away and back

RetryPolicy::Failure Source::failure(const CaptureError& error) const {
  const auto now = Clock::now();
  const std::int64_t away = away_since_ms_;
  return {.code = error.code,
          .everRan = ever_ran_,
          .delivered = delivering_,
          .wantedFor = std::chrono::duration_cast<std::chrono::milliseconds>(now - begun_at_),
          .triedFor = std::chrono::duration_cast<std::chrono::milliseconds>(now - opened_at_),
          .awayFor = away == 0 ? std::nullopt : std::optional(since(away))};
}

/// @param next  what is done about it. Only the first one is told until the source is back.
void Source::tellAbsence(const CaptureError& error, const char* next) {
  std::int64_t before = 0;
  const bool first = away_since_ms_.compare_exchange_strong(before, steadyMilliseconds());
  {
    const std::lock_guard lock(mutex_);
    problem_ = error;
  }
  set(Phase::away);
  if (!first) return;
  LMPLogMessage(nullptr, kLogError, "The %s is away: %s (code %d); %s",
                wish_.picture ? "camera" : "microphone", error.message.c_str(), error.code, next);
  consumers_.away(error);
}

// ---- streaming threads

void Source::takePicture(GstSample* picture, double time) {
  // What a decoder makes up before the first key frame is no picture.
  if (!delivering_ && GST_BUFFER_FLAG_IS_SET(gst_sample_get_buffer(picture), GST_BUFFER_FLAG_CORRUPTED))
    return;
  last_sample_ms_ = steadyMilliseconds();
  if (!has_format_.exchange(true)) {
    const GstCaps* caps = gst_sample_get_caps(picture);
    const std::lock_guard lock(mutex_);
    format_ = CameraFormat{recordedSize(caps), nominalRate(caps)};
  }
  firstSample();
  consumers_.deliverPicture(picture, time);
}

void Source::takeSound(SteadySound* steady, GstBuffer* sound, double time, double arrival) {
  last_sound_ms_ = steadyMilliseconds();
  if (const std::int64_t mute = mute_since_ms_.exchange(0); mute != 0) {
    LMPLogMessage(nullptr, kLogNotice, "%s: its sound is back", name().c_str());
    consumers_.soundBack(std::chrono::duration<double>(since(mute)).count());
  }
  if (!wish_.picture) {
    last_sample_ms_ = steadyMilliseconds();
    firstSample();
  }
  if (steady == nullptr) {
    consumers_.deliverSound(sound, time);
    return;
  }
  for (const SteadySound::Chunk& chunk : steady->feed(BufferHandle(gst_buffer_ref(sound)), arrival))
    consumers_.deliverSound(chunk.buffer.get(), chunk.time);
  sound_correction_ = steady->partsPerMillion();
}

/// The first one since the device was opened, of what the source is watched by.
void Source::firstSample() {
  if (delivering_.exchange(true)) return;
  ever_ran_ = true;
  if (last_sound_ms_ != 0)
    last_sound_ms_ = steadyMilliseconds();  // it could not come while the device was away
  tellReturn();
}

void Source::tellReturn() {
  set(Phase::running);
  const std::int64_t away = away_since_ms_.exchange(0);
  if (away == 0) return;
  const double seconds = std::chrono::duration<double>(since(away)).count();
  LMPLogMessage(nullptr, kLogNotice, "The %s is back after %.1f s: %s",
                wish_.picture ? "camera" : "microphone", seconds, name().c_str());
  consumers_.back(seconds);
}

}  // namespace lmx
