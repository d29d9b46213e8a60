// What an earlier process left of a capture, read back with as much distrust as a power cut deserves.
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstring>
#include <fstream>
#include <sstream>

#include "capture/store/finished_capture.h"
#include "platform/log.h"
#include "support/time_value.h"

namespace lmx {
namespace {

/// What a writer that died may have left behind its last whole fragment: one fragment is half a second.
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

/// All of the media as one recording, for a journal that can't be trusted: who of several requests wanted
/// what, and whether one was cancelled, is not known any more, and too much can be cut away later.
CaptureRecord wholeOf(const CaptureRecord& damaged, const MovieIndex& index, const std::string& folder) {
  const TrackIndex& lead = index.tracks.front();
  CaptureRecord record;
  record.recordingType = recordingTypeCode(index.video() != nullptr, index.audio() != nullptr);
  record.frameSeconds = lead.seconds() / static_cast<double>(lead.sizes.size());
  record.wallOffset = writtenAt(folder + "/" + FinishedCapture::kMediaName) - lead.seconds();
  record.runs.push_back({.sessionTime = 0, .firstFrame = 0});
  SharedDictionary parameters;
  if (!damaged.marks.requests().empty()) parameters = damaged.marks.requests().front().parameters;
  if (!lookUp(parameters, "RecordingMetadata_RECORDING_UUID")) {
    parameters = std::make_shared<const Dictionary>(
        Dictionary{{"RecordingMetadata_RECORDING_UUID", folder.substr(folder.rfind('/') + 1)}});
  }
  record.marks.start("recovered", 0, parameters);
  return record;
}

/// Whether `index` can be of a movie whose writer has died, rather than of a file that a disk has damaged.
bool makesSense(const MovieIndex& index, std::uint64_t fileSize) {
  const TrackIndex& lead = index.tracks.front();
  return lead.sizes.empty() ? fileSize <= index.mediaEnd + kTornStartLimit : lead.totalDuration > 0;
}

std::uint32_t framesIn(const MovieIndex& index, double frameSeconds) {
  return static_cast<std::uint32_t>(std::floor(index.tracks.front().seconds() / frameSeconds + 1e-3));
}

/// Frames of the movie that all of the media have become, for its document; 0 when there is no such movie.
std::uint32_t framesOfTheMovie(const CaptureRecord& record) {
  for (const auto& [uuid, path] : record.movies) {
    const Request* request = record.marks.find(uuid);
    if (request == nullptr || !request->pending()) continue;
    const auto index = readMovieIndex(path);
    if (index && record.frameSeconds > 0) return framesIn(*index, record.frameSeconds);
  }
  return 0;
}

std::shared_ptr<FinishedCapture> leftAlone(const std::string& path, const char* why) {
  LMPLogMessage(
      nullptr, kLogError,
      "Unfinished recording: %s can't be read (%s); it stays there for another try at the next start",
      path.c_str(), why);
  return nullptr;
}

}  // namespace

std::shared_ptr<FinishedCapture> FinishedCapture::openAbandoned(const std::string& folder) {
  const std::string journalPath = folder + "/" + kJournalName;
  const std::string media = folder + "/" + kMediaName;
  const std::uint64_t mediaSize = sizeOf(media);
  std::shared_ptr<Journal> journal = Journal::open(journalPath, true);
  // Media without a journal are nobody's: a capture makes its journal first and removes it last.
  if (!journal && errno == ENOENT && mediaSize > 0) journal = Journal::open(journalPath, false);
  if (!journal) {
    if (errno == EWOULDBLOCK || errno == ENOENT) return nullptr;
    return leftAlone(journalPath, std::strerror(errno));
  }
  const auto text = readAll(journalPath);
  if (!text) return leftAlone(journalPath, "input/output error");
  const auto index = readMovieIndex(media);
  if (mediaSize > 0 && !index) return leftAlone(media, "it holds no movie header, or could not be opened");
  if (index && !makesSense(*index, mediaSize)) return leftAlone(media, "its fragments are damaged");

  CaptureRecord record = parseJournal(*text);
  if (!index || index->tracks.front().sizes.empty()) {
    const std::uint32_t frames = mediaSize == 0 ? framesOfTheMovie(record) : 0;
    return std::make_shared<FinishedCapture>(folder, std::move(journal), std::move(record), frames);
  }
  if (!record.intact || record.runs.empty()) {
    LMPLogMessage(nullptr, kLogError,
                  "The journal of %s is damaged: all that was captured is kept as one recording",
                  folder.c_str());
    record = wholeOf(record, *index, folder);
  }
  const std::uint32_t frames = framesIn(*index, record.frameSeconds);
  const bool torn = mediaSize > index->mediaEnd + kTornTailLimit;
  if (torn) {
    LMPLogMessage(nullptr, kLogError,
                  "%s can be read up to %.0f s only; the movie ends there, and the file stays as it is",
                  media.c_str(), index->seconds());
  } else if (const int error = finishMovieInPlace(media, *index)) {
    LMPLogMessage(nullptr, kLogWarning, "%s stays fragmented: %s", media.c_str(), std::strerror(error));
  }
  auto capture = std::make_shared<FinishedCapture>(folder, std::move(journal), std::move(record), frames);
  capture->keep_media_ = torn;
  return capture;
}

}  // namespace lmx
