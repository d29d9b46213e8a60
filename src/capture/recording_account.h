// Watches the media of a running recording, and keeps account of what in its movie is not real.
#pragma once
#include <cstdint>
#include <mutex>

#include "capture/api/picture.h"
#include "capture/media/gap_ledger.h"
#include "capture/media/signal_watch.h"
#include "capture/media_queue.h"
#include "capture/store/journal.h"

namespace lmx {

/// Logs trouble with the signal while it lasts, writes gaps to the journal as they come and tells all of them
/// in one line at the end. Times are running time in seconds. Thread-safe.
class RecordingAccount {
 public:
  /// @param journal  must outlive the account
  /// @param begin  when the recording begins
  RecordingAccount(const SignalThresholds& thresholds, Journal& journal, double begin);

  /// A frame that was recorded, as it was encoded: I420. Recording thread.
  void picture(GstBuffer* frame, PictureSize size, double t);
  /// Samples that were recorded, kSoundRate and kSoundChannels. Recording thread.
  void sound(const RawMedium& chunk);
  /// Silence was put in the place of missing sound.
  void silence(double t, double seconds);
  void microphoneLost(double t) { note(&GapLedger::microphoneLost, t); }
  void microphoneBack(double t) { note(&GapLedger::microphoneBack, t); }
  void cameraLost(double t) { note(&GapLedger::cameraLost, t); }
  void cameraBack(double t) { note(&GapLedger::cameraBack, t); }
  void sizeChanged(double t, PictureSize size);
  /// A picture could not be read: the one before it stays.
  void pictureLost(double t);
  /// The machine could not keep up: so many frames from `t` on are not in the movie. Recording thread.
  void picturesDropped(double t, std::uint32_t count);
  /// @param wallOffset  wall clock at running time 0, as the clock is set now
  void tick(double t, double wallOffset);
  /// The end of the recording: tells what was not real. Recording thread, after the last tick().
  void finish(double t, double soundCorrection);

 private:
  void note(void (GapLedger::*news)(double), double t);
  void journalDue(double t);
  static void tell(const SignalEvents& events);

  Journal& journal_;
  SignalWatch watch_;  // recording thread
  std::mutex mutex_;
  GapLedger ledger_;           // guarded by mutex_
  std::uint64_t dropped_ = 0;  // recording thread
  double wall_offset_ = 0;     // recording thread
  bool wall_known_ = false;    // recording thread
};

}  // namespace lmx
