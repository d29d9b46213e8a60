// The journal of a capture: what a restart must know to finish it.
#pragma once
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "capture/media/request_marks.h"
#include "capture/media/span_cutter.h"
#include "capture/movie/movie_file.h"
#include "support/unique_fd.h"

namespace lmx {

/// The number that stands for the kind of a recording in journals and documents.
constexpr int recordingTypeCode(bool video, bool audio) { return video ? (audio ? 2 : 3) : 1; }

/// What a journal says, read back. Pure data.
struct CaptureRecord {
  bool intact = false;  ///< it names the capture and a request, and every whole line was understood
  int recordingType = 0;
  double frameSeconds = 0;
  double wallOffset = 0;  ///< add it to running time to get seconds since 2001-01-01 UTC
  std::vector<MovieRun> runs;
  RequestMarks marks;
  std::map<std::string, std::string> movies;  ///< request → path it was, or was about to be, given
};

/// Reads what it understands and skips the rest: a torn last line is no damage, any other is.
CaptureRecord parseJournal(const std::string& text);

/// The frames of `request` among those of `runs`. Ranges ascend; ranges that touch are joined.
std::vector<FrameRange> framesOf(const Request& request, const std::vector<MovieRun>& runs,
                                 double frameSeconds, std::uint32_t totalFrames);
/// Whether `ranges` are all of the frames.
bool coversAll(const std::vector<FrameRange>& ranges, std::uint32_t totalFrames);

/// Appends to a journal. Each line is one write, so a killed process loses at most the line it was writing;
/// sync() makes them survive a power cut. Holding it open locks it: another process then leaves the capture
/// alone. Thread-safe.
class Journal {
 public:
  /// Creates (or, with `existing`, opens) the journal and locks it. @return null with errno set on failure
  /// (EWOULDBLOCK: locked).
  static std::unique_ptr<Journal> open(const std::string& path, bool existing);

  void capture(int recordingType, double frameSeconds, double wallOffset);
  void run(const MovieRun& run);
  void start(const std::string& uuid, double t, const SharedDictionary& parameters);
  void stop(const std::string& uuid, double t);
  void cancel(const std::string& uuid);
  void pause(double t);
  void resume(double t);
  void movie(const std::string& uuid, const std::string& path);
  void done(const std::string& uuid);
  /// @return 0 or the errno
  int sync();

 private:
  explicit Journal(UniqueFd file) : file_(std::move(file)) {}
  void append(const std::vector<std::string>& words);
  UniqueFd file_;
};

}  // namespace lmx
