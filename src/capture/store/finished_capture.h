// A closed capture on the disk, and the movies made from it.
#pragma once
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "capture/api/capture_framework.h"
#include "capture/movie/movie_copy.h"
#include "capture/movie/movie_index.h"
#include "capture/store/capture_record.h"
#include "capture/store/journal.h"
#include "support/result.h"

namespace lmx {

/// What becomes of the media once every request has its movie. They are kept if part of them can't be read:
/// somebody may still be able to rescue it.
enum class MediaAfterUse { remove, keep };

/// A closed capture: its folder with the journal and the media. Thread-safe; its operations may take as long
/// as the disk needs.
class FinishedCapture : public std::enable_shared_from_this<FinishedCapture> {
 public:
  /// @param totalFrames  frames of the movie's clock that were recorded
  FinishedCapture(std::string folder, std::shared_ptr<Journal> journal, CaptureRecord record,
                  std::uint32_t totalFrames, MediaAfterUse media = MediaAfterUse::remove);

  /// Makes the movie of a request at `path`. If it is all of the media and no other request needs them, the
  /// file just moves; else its frames are copied. A file that has the name is set aside, never overwritten.
  /// @return nothing on success
  std::optional<CaptureError> makeMovie(const std::string& uuid, const std::string& path);
  /// The same, but what exists stays where it is: the movie gets `path`, or beside it a name with a number
  /// (logged).
  /// @return the path that the movie has got
  Result<std::string, CaptureError> makeMovieBeside(const std::string& uuid, const std::string& path);
  /// Makes movies of all requests that are neither cancelled nor handed over. Those that can't be made for
  /// now (logged) stay pending.
  /// @param known  whether a job of that request has been stored, so that only this mark is missing; null:
  /// none
  std::vector<RecoveredRecording> recoverPending(
      const std::string& repository, const std::function<bool(const std::string& request)>& known = nullptr);
  /// `uuid` is to be submitted.
  void submit(const std::string& uuid);
  /// The submission of `uuid` is kept elsewhere from now on.
  /// @return false when that could not be written (logged)
  [[nodiscard]] bool queued(const std::string& uuid);
  /// The movie of `uuid` and its document are in place. The folder goes when nothing in it is needed any
  /// more.
  void handedOver(const std::string& uuid);
  /// Removes the folder if no request is pending.
  void removeIfResolved();

 private:
  // All of these: with mutex_ held.
  std::optional<CaptureError> makeMovieLocked(const Request& request, const std::string& path);
  Result<std::string, CaptureError> makeMovieBesideLocked(const Request& request, const std::string& path);
  /// Gives the movie the free name `path`. @return 0 or the errno; EEXIST when it is not free
  int placeMovie(const Request& request, const std::vector<FrameRange>& ranges, const std::string& path);
  [[nodiscard]] bool needsAllMedia(const Request& request, const std::vector<FrameRange>& ranges) const;
  int copyFrames(const std::vector<FrameRange>& ranges, const std::string& path);
  int copyOver(const MovieIndex& index, const std::vector<FrameRange>& ranges, const std::string& temporary,
               const std::string& path);
  std::optional<RecoveredRecording> recover(const Request& request, const std::string& repository);
  void giveUp(const Request& request, const CaptureError& error);
  RecoveredRecording describe(const Request& request, const std::string& path);
  [[nodiscard]] double wallTimeOf(std::uint32_t frame) const;
  [[nodiscard]] std::vector<FrameRange> framesFor(const Request& request) const;
  void markDoneLocked(const std::string& uuid);
  void removeIfResolvedLocked();
  void syncJournal() const;

  const std::string folder_;
  const std::string media_;  ///< path
  const std::shared_ptr<Journal> journal_;
  const std::uint32_t total_frames_;
  const MediaAfterUse media_after_use_;
  std::mutex mutex_;
  CaptureRecord record_;  // guarded by mutex_
};

}  // namespace lmx
