// From media to warnings, journal lines and the notice at the end.
#include "capture/recording_account.h"

#include <gst/video/video.h>

#include <cmath>

#include "capture/source/device_pipeline.h"
#include "platform/log.h"

namespace lmx {
namespace {

constexpr double kSmallestStep = 0.5;  // seconds; less is how the clock is kept in time

}  // namespace

RecordingAccount::RecordingAccount(const SignalThresholds& thresholds, Journal& journal, double begin)
    : journal_(journal), watch_(thresholds), ledger_(begin) {}

void RecordingAccount::tell(const SignalEvents& events) {
  for (const SignalEvent& event : events)
    LMPLogMessage(nullptr, event.begins ? kLogWarning : kLogNotice, "%s", signalText(event).c_str());
}

void RecordingAccount::picture(GstBuffer* frame, PictureSize size, double t) {
  if (!watch_.wantsPicture(t)) return;
  GstVideoInfo info;
  gst_video_info_set_format(&info, GST_VIDEO_FORMAT_I420, static_cast<guint>(size.width),
                            static_cast<guint>(size.height));
  GstVideoFrame mapped;
  if (gst_video_frame_map(&mapped, &info, frame, GST_MAP_READ) == FALSE) return;
  tell(watch_.picture({.data = static_cast<const std::uint8_t*>(GST_VIDEO_FRAME_PLANE_DATA(&mapped, 0)),
                       .stride = static_cast<std::size_t>(GST_VIDEO_FRAME_PLANE_STRIDE(&mapped, 0)),
                       .width = static_cast<std::size_t>(size.width),
                       .height = static_cast<std::size_t>(size.height)},
                      t));
  gst_video_frame_unmap(&mapped);
}

void RecordingAccount::sound(const RawMedium& chunk) {
  GstMapInfo map;
  if (gst_buffer_map(chunk.buffer.get(), &map, GST_MAP_READ) == FALSE) return;
  tell(watch_.sound({reinterpret_cast<const float*>(map.data), map.size / sizeof(float)}, kSoundChannels,
                    kSoundRate, chunk.time));
  gst_buffer_unmap(chunk.buffer.get(), &map);
}

void RecordingAccount::silence(double t, double seconds) {
  const std::lock_guard lock(mutex_);
  ledger_.silencePutIn(t, seconds);
}

void RecordingAccount::note(void (GapLedger::*news)(double), double t) {
  const std::lock_guard lock(mutex_);
  (ledger_.*news)(t);
}

void RecordingAccount::sizeChanged(double t, PictureSize size) {
  const std::lock_guard lock(mutex_);
  ledger_.pictureSizeChanged(t, size.width, size.height);
}

void RecordingAccount::pictureLost(double t) {
  const std::lock_guard lock(mutex_);
  ledger_.framesDropped(t, 1);
}

void RecordingAccount::picturesDropped(double t, std::uint32_t count) {
  if (count == 0) return;
  dropped_ += count;
  const std::lock_guard lock(mutex_);
  ledger_.framesDropped(t, count);
}

void RecordingAccount::tick(double t, double wallOffset) {
  const double step = wall_known_ ? wallOffset - wall_offset_ : 0;
  wall_known_ = true;
  wall_offset_ = wallOffset;
  if (std::abs(step) > kSmallestStep) {
    const std::lock_guard lock(mutex_);
    ledger_.clockStepped(t, step);
  }
  journalDue(t);
}

void RecordingAccount::journalDue(double t) {
  std::vector<GapLedger::Words> lines;
  {
    const std::lock_guard lock(mutex_);
    lines = ledger_.journalWords(t);
  }
  for (const auto& words : lines) journal_.gap(words);
}

void RecordingAccount::finish(double t, double soundCorrection) {
  if (dropped_ > 0) {
    LMPLogMessage(nullptr, kLogWarning,
                  "%llu pictures of the recording were lost: the machine could not keep up",
                  static_cast<unsigned long long>(dropped_));
  }
  std::vector<GapLedger::Words> lines;
  std::string summary;
  {
    const std::lock_guard lock(mutex_);
    ledger_.soundCorrected(soundCorrection);
    lines = ledger_.finish(t);
    summary = ledger_.summary();
  }
  for (const auto& words : lines) journal_.gap(words);
  if (!summary.empty()) LMPLogMessage(nullptr, kLogNotice, "%s", summary.c_str());
}

}  // namespace lmx
