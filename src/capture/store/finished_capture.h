// What a capture left on the disk, and the movies that are made of it.
#pragma once
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "capture/api/capture_framework.h"
#include "capture/movie/movie_index.h"
#include "capture/store/journal.h"

namespace lmx {

/// Directory of all captures in progress inside a repository.
std::string captureFolderOf(const std::string& repository);

/// A closed capture: its folder with the journal and the media. Thread-safe; its operations may take as long
/// as the disk needs.
class FinishedCapture : public std::enable_shared_from_this<FinishedCapture> {
 public:
  static constexpr const char* kJournalName = "journal";
  static constexpr const char* kMediaName = "media.mov";
  static constexpr const char* kPartName = "movie.part";

  /// @param totalFrames  frames of the movie's clock that were recorded
  FinishedCapture(std::string folder, std::shared_ptr<Journal> journal, CaptureRecord record,
                  std::uint32_t totalFrames);
  /// The capture of an earlier process. Null when another process is still recording it, or when it can't be
  /// read (logged): it is then left as it is. A damaged journal makes all of the media one recording.
  static std::shared_ptr<FinishedCapture> openAbandoned(const std::string& folder);

  /// Makes the movie of a request at `path`. When it is all of the media and nobody else needs that, the file
  /// just moves; else its frames are copied. A file that bears the name already is set aside, never
  /// overwritten.
  std::optional<CaptureError> makeMovie(const std::string& uuid, const std::string& path);
  /// Makes movies of all requests that are neither cancelled nor handed over.
  std::vector<RecoveredRecording> recoverPending(const std::string& repository);
  /// The movie of `uuid` and its document are in place. The folder goes when nothing in it is needed any
  /// more.
  void handedOver(const std::string& uuid);
  /// Removes the folder if no request is pending.
  void removeIfResolved();

 private:
  std::optional<CaptureError> makeMovieLocked(const Request& request, const std::string& path);
  std::optional<CaptureError> copyFrames(const std::vector<FrameRange>& ranges, const std::string& path);
  /// Copies into `temporary` and renames it to `path`. @return 0 or the errno; nothing is left then
  int copyOver(const MovieIndex& index, const std::vector<FrameRange>& ranges, const std::string& temporary,
               const std::string& path);
  RecoveredRecording describe(const Request& request, const std::string& path);
  [[nodiscard]] std::string media() const { return folder_ + "/" + kMediaName; }
  void removeIfResolvedLocked();

  std::mutex mutex_;
  const std::string folder_;
  std::shared_ptr<Journal> journal_;
  CaptureRecord record_;  // guarded by mutex_
  const std::uint32_t total_frames_;
  bool keep_media_ = false;  ///< a part that can't be read may still be of use to somebody; set before use
};

}  // namespace lmx
