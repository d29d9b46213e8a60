// Writes the journal of a capture: what a restart must know to finish it. parseJournal reads it back.
#pragma once
#include <memory>
#include <mutex>
#include <string>

#include "capture/media/frame_cutter.h"
#include "capture/store/journal_line.h"
#include "support/dictionary.h"
#include "support/result.h"
#include "support/unique_fd.h"

namespace lmx {

/// An open journal. Each line is one write, so a killed process loses at most the line it was writing; sync()
/// makes the lines survive a power cut. A line that can't be written is logged and left out. While it is open
/// it is locked: another process then leaves the capture alone. Thread-safe. All times are running time in
/// seconds.
class Journal {
 public:
  /// A new journal at `path`; replaces one that nobody has open.
  static Result<std::shared_ptr<Journal>> create(const std::string& path);
  /// The journal that an earlier process left at `path`. EWOULDBLOCK when its writer still lives.
  static Result<std::shared_ptr<Journal>> open(const std::string& path);

  /// @param recordingType  a RecordingTypeCode
  /// @param frameSeconds  of the movie's clock
  /// @param wallOffset  add it to running time to get seconds since 2001-01-01 UTC
  void capture(int recordingType, double frameSeconds, double wallOffset);
  /// A run has begun; its length is found in the movie.
  void run(const MovieRun& begun);
  /// Passwords among `parameters` are kept, like in the document: a restart may have to submit the recording.
  void start(const std::string& uuid, double t, const SharedDictionary& parameters);
  void stop(const std::string& uuid, double t);
  void cancel(const std::string& uuid);
  /// The request has been stopped for good and is to be submitted.
  void submit(const std::string& uuid);
  /// The submission of the request is kept elsewhere from now on.
  /// @return false when it could not be written
  [[nodiscard]] bool queued(const std::string& uuid);
  void pause(double t);
  void resume(double t);
  /// The request is about to get its movie at `path`.
  void movie(const std::string& uuid, const std::string& path);
  /// Movie and document of the request are in place.
  void done(const std::string& uuid);
  /// What is not real in the movie; `words` come from GapLedger. Nothing reads them back.
  void gap(const JournalWords& words) { append(words); }
  /// @return 0 or the errno
  [[nodiscard]] int sync() const;

 private:
  explicit Journal(UniqueFd file) : file_(std::move(file)) {}
  bool append(const JournalWords& words);
  std::mutex mutex_;  ///< one line at a time, with the repair of one that could be written in part only
  const UniqueFd file_;
};

}  // namespace lmx
