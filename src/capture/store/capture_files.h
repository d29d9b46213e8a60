// The files of a capture in progress, in a folder of its own.
#pragma once
#include <memory>
#include <string>

#include "capture/api/capture_framework.h"
#include "capture/movie/growing_movie.h"
#include "capture/store/journal.h"
#include "support/result.h"

namespace lmx {

inline constexpr const char* kJournalName = "journal";
inline constexpr const char* kMediaName = "media.mov";
inline constexpr const char* kPartName = "movie.part";  ///< a movie that is being copied out of the media

/// Directory of all captures in progress inside a repository.
std::string captureFolderOf(const std::string& repository);

/// Removes a capture's files and its folder; with the last capture their common folder goes too.
void removeCaptureFiles(const std::string& folder);

/// A new capture's folder with its journal, locked, and its movie, still empty.
struct CaptureFiles {
  std::string folder;
  std::shared_ptr<Journal> journal;
  GrowingMovie movie;

  /// Makes them in `repository`. On failure nothing is left behind.
  static Result<CaptureFiles, CaptureError> create(const std::string& repository, const std::string& uuid);
};

}  // namespace lmx
