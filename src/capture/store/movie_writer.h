// Writes encoded samples to the disk on a thread of its own, half a second at a time.
#pragma once
#include <atomic>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <optional>
#include <thread>
#include <vector>

#include "capture/media/deadline.h"
#include "capture/movie/growing_movie.h"
#include "capture/store/journal.h"

namespace lmx {

/// Samples come from the encoder's threads and wait in a bounded queue until they are written. Every second
/// the movie and the journal are synced.
class MovieWriter {
 public:
  /// Starts the thread.
  /// @param trackCount  how many formats must be known before anything can be written
  /// @param journal  must outlive the writer
  /// @param patience  when a full queue is no longer waited for; must outlive the writer
  /// @param onError  called once, on any thread, with the errno of a failed write, ETIMEDOUT when the queue
  /// was still full at the end of the patience, or ENODATA when the format of a track does not come
  MovieWriter(GrowingMovie movie, std::size_t trackCount, Journal& journal, const Deadline& patience,
              std::function<void(int)> onError);
  ~MovieWriter();
  MovieWriter(const MovieWriter&) = delete;
  MovieWriter& operator=(const MovieWriter&) = delete;

  // Encoder threads.
  /// @return false when the movie has begun already: what it began with stays
  bool setFormat(std::uint32_t track, TrackFormat format);
  /// Queues a sample. Waits while the queue holds more than kQueueLimit bytes: a disk that is too slow makes
  /// the encoder wait and then costs frames, never memory. After an error samples are dropped.
  void add(EncodedSample sample);
  /// Writes what is queued, makes the movie whole and ends the thread. @return 0 or the errno
  int finish();
  /// The errno of the first sync that failed; 0 when none has. Part of the data is lost then, although later
  /// syncs succeed: the kernel reports such a loss only once. Thread-safe.
  [[nodiscard]] int syncError() const { return sync_error_; }
  /// Whether the disk was so slow that samples had to wait. Thread-safe.
  [[nodiscard]] bool wasFull() const { return was_full_; }
  /// Valid after finish().
  [[nodiscard]] const MovieIndex& index() const { return movie_.index(); }

  static constexpr std::size_t kQueueLimit = 64U << 20;

 private:
  struct Fragment {
    std::vector<EncodedSample> samples;
    bool last = false;
  };
  void run();
  Fragment takeFragment();
  void writeFragment(const std::vector<EncodedSample>& samples);
  [[nodiscard]] std::vector<TrackFormat> knownFormats();
  void syncToDisk();
  [[nodiscard]] bool fragmentDue() const;
  [[nodiscard]] bool formatsKnown() const;
  [[nodiscard]] bool formatIsOverdue() const;
  void queue(EncodedSample sample);
  void fail(int error);

  GrowingMovie movie_;  // writer thread, then finish()'s caller
  Journal& journal_;
  const Deadline& patience_;
  const std::function<void(int)> on_error_;
  std::mutex mutex_;
  std::condition_variable changed_;
  std::vector<std::optional<TrackFormat>> formats_;  // guarded by mutex_
  std::vector<EncodedSample> queue_;                 // guarded by mutex_
  std::size_t queued_bytes_ = 0;                     // guarded by mutex_
  std::vector<std::uint64_t> queued_duration_;       // guarded by mutex_: timescale units of each track
  bool ending_ = false;                              // guarded by mutex_
  bool formats_used_ = false;                        // guarded by mutex_
  bool overflowed_ = false;                          // guarded by mutex_: takes no more, writes what it has
  std::atomic<int> error_{0};
  std::atomic<int> sync_error_{0};
  std::atomic<bool> was_full_{false};
  std::thread thread_;
};

}  // namespace lmx
