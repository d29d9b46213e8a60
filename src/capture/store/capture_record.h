// What a capture's journal says, read back.
#pragma once
#include <map>
#include <string>
#include <vector>

#include "capture/media/frame_cutter.h"
#include "capture/media/request_marks.h"

namespace lmx {

/// The parameter of a START that names the recording and its movie.
inline constexpr const char* kRecordingUuidKey = "RecordingMetadata_RECORDING_UUID";

/// The one that says where it goes instead of into the repository.
inline constexpr const char* kAdHocFilePathKey = "RecordingMetadata_ADHOC_FILE_PATH";

/// A capture's runs, marks and movies. Pure data.
struct CaptureRecord {
  bool intact = false;      ///< it names the capture and a request, and every whole line was understood
  int recordingType = 0;    ///< a RecordingTypeCode
  double frameSeconds = 0;  ///< of the movie's clock
  double wallOffset = 0;    ///< add it to running time to get seconds since 2001-01-01 UTC
  std::vector<MovieRun> runs;
  RequestMarks marks;
  std::map<std::string, std::string> movies;  ///< request → path it was, or was about to be, given
};

/// Reads what it understands and skips the rest. A torn last line is no damage; any other line that is not
/// understood is.
CaptureRecord parseJournal(const std::string& text);

}  // namespace lmx
