// The thread that brings encoded samples to the disk, half a second at a time.
#pragma once
#include <atomic>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <optional>
#include <thread>
#include <vector>

#include "capture/movie/growing_movie.h"
#include "capture/store/journal.h"

namespace lmx {

/// Samples come from the encoder's threads; a bounded queue keeps them until the disk has them.
class MovieWriter {
 public:
  /// @param trackCount  how many formats will come before anything can be written
  /// @param onError  called once, on the writer's thread, with the errno of a failed write
  MovieWriter(GrowingMovie movie, std::size_t trackCount, Journal& journal, std::function<void(int)> onError);
  ~MovieWriter();
  MovieWriter(const MovieWriter&) = delete;
  MovieWriter& operator=(const MovieWriter&) = delete;

  void setFormat(std::uint32_t track, TrackFormat format);
  /// Waits while more than kQueueLimit bytes are queued: a disk that is too slow for the movie slows the
  /// encoder down and then costs frames, never memory.
  void add(EncodedSample sample);
  /// Writes what is left, makes the movie whole and ends the thread. @return 0 or the errno.
  int finish();
  /// The errno of the first sync that failed, 0 when none has. The disk has then lost something of what it
  /// was given, and says so only once: later syncs succeed. Thread-safe.
  [[nodiscard]] int syncError() const { return sync_error_; }
  /// After finish().
  [[nodiscard]] const MovieIndex& index() const { return movie_.index(); }

 private:
  static constexpr std::size_t kQueueLimit = 64U << 20;
  void run();
  void writeFragment(std::vector<EncodedSample> samples);
  void syncToDisk();
  [[nodiscard]] bool fragmentDue() const;

  GrowingMovie movie_;  // writer thread, then finish()'s caller
  Journal& journal_;
  const std::function<void(int)> on_error_;
  std::mutex mutex_;
  std::condition_variable changed_;
  std::vector<std::optional<TrackFormat>> formats_;  // guarded by mutex_
  std::vector<EncodedSample> queue_;                 // guarded by mutex_
  std::size_t queued_bytes_ = 0;                     // guarded by mutex_
  std::uint64_t lead_duration_ = 0;                  // guarded by mutex_: of track 0 in the queue
  bool ending_ = false;                              // guarded by mutex_
  std::atomic<int> error_{0};
  std::atomic<int> sync_error_{0};
  std::thread thread_;
};

}  // namespace lmx
