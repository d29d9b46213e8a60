// Reads a capture that a crash or a power cut ended. Nothing it left can be trusted.
#include "capture/store/abandoned_capture.h"

#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstring>
#include <fstream>
#include <limits>
#include <numeric>
#include <sstream>

#include "capture/movie/movie_finish.h"
#include "capture/movie/movie_reader.h"
#include "capture/store/capture_files.h"
#include "model/codes.h"
#include "platform/log.h"
#include "support/time_value.h"

namespace lmx {
namespace {

/// How much a killed writer may have left behind its last whole fragment. A fragment is half a second.
constexpr std::uint64_t kTornTailLimit = 16U << 20;
/// The same where there is no whole fragment at all.
constexpr std::uint64_t kTornStartLimit = 2U << 20;

std::optional<std::string> readAll(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  std::ostringstream out;
  // An empty file sets the failbit of `out`, an error the badbit of `in`.
  if (!in || (out << in.rdbuf(), in.bad())) return std::nullopt;
  return out.str();
}

/// Bytes; 0 also for a file that is not there.
std::uint64_t sizeOf(const std::string& path) {
  struct stat status {};
  return stat(path.c_str(), &status) == 0 ? static_cast<std::uint64_t>(status.st_size) : 0;
}

/// Seconds since the reference date at which `path` was last written.
double writtenAt(const std::string& path) {
  struct stat status {};
  if (stat(path.c_str(), &status) != 0) return 0;
  return static_cast<double>(status.st_mtim.tv_sec) + static_cast<double>(status.st_mtim.tv_nsec) / 1e9 -
         kReferenceDateOffset;
}

/// Length of a frame of the clock that a track's samples were placed by: all of them are multiples of it.
double grainSeconds(const TrackIndex& track) {
  std::uint32_t units = 0;
  for (const DurationRun& run : track.durations) units = std::gcd(units, run.duration);
  return static_cast<double>(units) / track.format.timescale;
}

/// All of the media as one recording, for a journal that can't be trusted. Which request wanted what is not
/// known any more; too much is better than too little, since it can be cut away later.
/// @param mayGo  false: the folder stays, and is found again by each start, which must not submit it each
/// time
CaptureRecord wholeOf(const CaptureRecord& damaged, const MovieIndex& index, const std::string& folder,
                      bool mayGo) {
  const TrackIndex& lead = index.tracks.front();
  CaptureRecord record;
  record.recordingType = recordingTypeOf(index.video() != nullptr, index.audio() != nullptr);
  record.frameSeconds = grainSeconds(lead);
  record.wallOffset = writtenAt(folder + "/" + kMediaName) - lead.seconds();
  record.runs.push_back({.sessionTime = 0, .firstFrame = 0});
  SharedDictionary parameters;
  if (!damaged.marks.requests().empty()) parameters = damaged.marks.requests().front().parameters;
  if (!lookUp(parameters, kRecordingUuidKey)) {
    parameters = std::make_shared<const Dictionary>(
        Dictionary{{kRecordingUuidKey, folder.substr(folder.rfind('/') + 1)}});
  }
  // Its only request stays known by its name: what had been asked for must not be forgotten, nor done twice.
  const auto& requests = damaged.marks.requests();
  const bool single = requests.size() == 1;
  const std::string uuid = single ? requests.front().uuid : "recovered";
  record.marks.start(uuid, 0, parameters);
  if (single && requests.front().submit && mayGo) record.marks.submit(uuid);
  if (single && requests.front().queued) record.marks.markQueued(uuid);
  return record;
}

/// Whether the file looks like a movie whose writer was killed, rather than like one that the disk damaged.
bool makesSense(const MovieIndex& index, std::uint64_t fileSize) {
  const TrackIndex& lead = index.tracks.front();
  return lead.sizes.empty() ? fileSize <= index.mediaEnd + kTornStartLimit : lead.totalDuration > 0;
}

std::uint32_t framesIn(const MovieIndex& index, double frameSeconds) {
  const double frames = std::floor(index.tracks.front().seconds() / frameSeconds + 1e-3);
  return static_cast<std::uint32_t>(std::min(frames, double{std::numeric_limits<std::uint32_t>::max()}));
}

/// Length of the movie that the media were moved to, in frames, for its document; 0 when there is none.
std::uint32_t framesOfTheMovie(const CaptureRecord& record) {
  for (const auto& [uuid, path] : record.movies) {
    const Request* request = record.marks.find(uuid);
    if (request == nullptr || !request->pending()) continue;
    const auto index = readMovieIndex(path);
    if (index && record.frameSeconds > 0) return framesIn(*index, record.frameSeconds);
  }
  return 0;
}

/// Logs that the capture stays as it is. @return null
std::shared_ptr<FinishedCapture> leftAlone(const std::string& path, const char* why) {
  LMPLogMessage(
      nullptr, kLogError,
      "Unfinished recording: %s can't be read (%s); it stays there for another try at the next start",
      path.c_str(), why);
  return nullptr;
}

/// The folder's journal, locked.
Result<std::shared_ptr<Journal>> openJournal(const std::string& path, bool hasMedia) {
  auto journal = Journal::open(path);
  // No live capture has media but no journal: the journal is made first and removed last.
  if (!journal && journal.error().systemError == ENOENT && hasMedia) return Journal::create(path);
  return journal;
}

/// The record to make movies by: the journal's if it can be trusted.
CaptureRecord trusted(CaptureRecord record, const MovieIndex& index, const std::string& folder, bool mayGo) {
  if (record.intact && !record.runs.empty()) return record;
  LMPLogMessage(nullptr, kLogError,
                "The journal of %s is damaged: all that was captured is kept as one recording",
                folder.c_str());
  return wholeOf(record, index, folder, mayGo);
}

/// Whether more follows what can be read than a killed writer leaves.
bool hidesMedia(std::uint64_t mediaSize, const MovieIndex& index) {
  return mediaSize > index.mediaEnd + kTornTailLimit;
}

/// Makes the media one whole movie. @return whether they may go once they have been used
MediaAfterUse finishMedia(const std::string& media, std::uint64_t mediaSize, const MovieIndex& index) {
  if (hidesMedia(mediaSize, index)) {
    LMPLogMessage(nullptr, kLogError,
                  "%s can be read up to %.0f s only; the movie ends there, and the file stays as it is",
                  media.c_str(), index.seconds());
    return MediaAfterUse::keep;
  }
  if (const int error = finishMovieInPlace(media, index))
    LMPLogMessage(nullptr, kLogWarning, "%s stays fragmented: %s", media.c_str(), std::strerror(error));
  return MediaAfterUse::remove;
}

}  // namespace

std::shared_ptr<FinishedCapture> openAbandonedCapture(const std::string& folder) {
  const std::string journalPath = folder + "/" + kJournalName;
  const std::string media = folder + "/" + kMediaName;
  const std::uint64_t mediaSize = sizeOf(media);
  const auto journal = openJournal(journalPath, mediaSize > 0);
  if (!journal) {
    const int error = journal.error().systemError;
    if (error == EWOULDBLOCK || error == ENOENT) return nullptr;
    return leftAlone(journalPath, std::strerror(error));
  }
  const auto text = readAll(journalPath);
  if (!text) return leftAlone(journalPath, "input/output error");
  const auto index = readMovieIndex(media);
  if (mediaSize > 0 && !index) return leftAlone(media, "it holds no movie header, or could not be opened");
  if (index && !makesSense(*index, mediaSize)) return leftAlone(media, "its fragments are damaged");

  CaptureRecord record = parseJournal(*text);
  if (!index || index->tracks.front().sizes.empty()) {
    const std::uint32_t frames = mediaSize == 0 ? framesOfTheMovie(record) : 0;
    return std::make_shared<FinishedCapture>(folder, *journal, std::move(record), frames);
  }
  record = trusted(std::move(record), *index, folder, !hidesMedia(mediaSize, *index));
  const std::uint32_t frames = framesIn(*index, record.frameSeconds);
  return std::make_shared<FinishedCapture>(folder, *journal, std::move(record), frames,
                                           finishMedia(media, mediaSize, *index));
}

}  // namespace lmx
