// Movies out of a closed capture.
#include "capture/store/finished_capture.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstring>

#include "platform/directories.h"
#include "platform/log.h"
#include "platform/paths.h"

namespace lmx {
namespace {

bool exists(const std::string& path) { return access(path.c_str(), F_OK) == 0; }

CaptureError diskError(int error, const std::string& what) {
  return {CaptureError::kDomain, error == ENOSPC ? kNoSpace : kWriteFailed,
          what + ": " + std::strerror(error)};
}

/// `name` cut to leave room for an ending: file systems take 255 bytes. A character is not cut in two.
std::string fitting(std::string name) {
  std::size_t length = std::min<std::size_t>(name.size(), 200);
  while (length > 0 && length < name.size() && (static_cast<unsigned char>(name[length]) & 0xC0) == 0x80)
    --length;
  name.resize(length);
  return name;
}

/// `stem` + first free of "", "-1", "-2" … such that neither a movie nor its document has the name.
std::string freeStem(const std::string& stem) {
  std::string free = stem;
  for (int i = 1; exists(free + ".mov") || exists(free + ".xml"); ++i) free = stem + "-" + std::to_string(i);
  return free;
}

/// An earlier movie of the same name may still wait for its submission: it gets another name, and its
/// document with it. @return 0, or the errno when it stays in the way
int setAside(const std::string& path) {
  if (!exists(path)) return 0;
  const std::string stem = path.ends_with(".mov") ? path.substr(0, path.size() - 4) : path;
  const std::string directory = directoryOf(path);
  const std::string aside =
      freeStem(directory + "/" + fitting(stem.substr(stem.rfind('/') + 1)) + "-replaced");
  if (rename(path.c_str(), (aside + ".mov").c_str()) != 0) return errno;
  LMPLogMessage(nullptr, kLogWarning, "%s was there already, it is now %s.mov", path.c_str(), aside.c_str());
  if (exists(stem + ".xml") && rename((stem + ".xml").c_str(), (aside + ".xml").c_str()) != 0) return errno;
  return 0;
}

int moveFile(const std::string& from, const std::string& to) {
  if (rename(from.c_str(), to.c_str()) != 0) return errno;
  return syncDirectory(directoryOf(to));
}

std::string fileNameFor(const Request& request) {
  std::string name = lookUp(request.parameters, "RecordingMetadata_RECORDING_UUID").value_or("test");
  std::replace(name.begin(), name.end(), '/', '_');
  name = fitting(std::move(name));
  return name.empty() ? "test" : name;
}

}  // namespace

std::string captureFolderOf(const std::string& repository) { return repository + "/.lmxagentd"; }

FinishedCapture::FinishedCapture(std::string folder, std::shared_ptr<Journal> journal, CaptureRecord record,
                                 std::uint32_t totalFrames)
    : folder_(std::move(folder)),
      journal_(std::move(journal)),
      record_(std::move(record)),
      total_frames_(totalFrames) {}

std::optional<CaptureError> FinishedCapture::makeMovie(const std::string& uuid, const std::string& path) {
  const std::lock_guard lock(mutex_);
  const Request* request = record_.marks.find(uuid);
  if (request == nullptr)
    return CaptureError{CaptureError::kDomain, kNoMedia, "no recording of request " + uuid};
  return makeMovieLocked(*request, path);
}

std::optional<CaptureError> FinishedCapture::makeMovieLocked(const Request& request,
                                                             const std::string& path) {
  const auto ranges = framesOf(request, record_.runs, record_.frameSeconds, total_frames_);
  if (ranges.empty())
    return CaptureError{CaptureError::kDomain, kNoMedia, "nothing was captured for " + path};
  journal_->movie(request.uuid, path);
  journal_->sync();
  if (const int error = setAside(path)) {
    return diskError(error, "an earlier movie is in the way of " + path);
  }
  if (!keep_media_ && coversAll(ranges, total_frames_) && !record_.marks.othersPending(request.uuid)) {
    const int error = moveFile(media(), path);
    if (error == 0) return std::nullopt;
    if (error != EXDEV) return diskError(error, "could not move the movie to " + path);
  }
  return copyFrames(ranges, path);
}

std::optional<CaptureError> FinishedCapture::copyFrames(const std::vector<FrameRange>& ranges,
                                                        const std::string& path) {
  const auto index = readMovieIndex(media());
  if (!index) return CaptureError{CaptureError::kDomain, kWriteFailed, media() + " can't be read"};
  // In the capture's own folder: no other capture writes there, and what a crash leaves goes with it.
  int error = copyOver(*index, ranges, folder_ + "/" + kPartName, path);
  if (error == EXDEV)
    error = copyOver(*index, ranges, path + "." + folder_.substr(folder_.rfind('/') + 1) + ".part", path);
  if (error == 0) return std::nullopt;
  return diskError(error, "could not write " + path);
}

int FinishedCapture::copyOver(const MovieIndex& index, const std::vector<FrameRange>& ranges,
                              const std::string& temporary, const std::string& path) {
  int error = copyMovieRanges(media(), index, ranges, record_.frameSeconds, temporary);
  if (error == 0) error = moveFile(temporary, path);
  if (error != 0) unlink(temporary.c_str());
  return error;
}

RecoveredRecording FinishedCapture::describe(const Request& request, const std::string& path) {
  RecoveredRecording recording;
  recording.path = path;
  recording.parameters = request.parameters;
  recording.recordingType = record_.recordingType;
  recording.forget = [self = shared_from_this(), uuid = request.uuid] { self->handedOver(uuid); };
  std::uint32_t frames = 0;
  for (const FrameRange& range : framesOf(request, record_.runs, record_.frameSeconds, total_frames_)) {
    frames += range.end - range.first;
    for (const MovieRun& run : record_.runs) {
      if (run.firstFrame > range.first) break;
      const double at = run.sessionTime + record_.wallOffset;
      if (recording.startTime == 0)
        recording.startTime = at + (range.first - run.firstFrame) * record_.frameSeconds;
      recording.stopTime = at + (range.end - run.firstFrame) * record_.frameSeconds;
    }
  }
  recording.duration = frames * record_.frameSeconds;
  return recording;
}

std::vector<RecoveredRecording> FinishedCapture::recoverPending(const std::string& repository) {
  const std::lock_guard lock(mutex_);
  std::vector<RecoveredRecording> recovered;
  const std::vector<Request> requests = record_.marks.requests();
  for (const Request& request : requests) {
    if (!request.pending()) continue;
    const auto made = record_.movies.find(request.uuid);
    if (made != record_.movies.end() && exists(made->second) && !exists(media())) {
      recovered.push_back(
          describe(request, made->second));  // it had its movie, only the document was missing
      continue;
    }
    const std::string stem = repository + "/" + fileNameFor(request);
    const std::string path = (exists(stem + ".mov") ? freeStem(stem + "-recovered") : stem) + ".mov";
    if (const auto error = makeMovieLocked(request, path)) {
      const bool nothing = error->code == kNoMedia;
      LMPLogMessage(nullptr, nothing ? kLogWarning : kLogError, "Unfinished recording in %s: %s%s",
                    folder_.c_str(), error->message.c_str(),
                    nothing ? "" : "; its media stay there for another try at the next start");
      if (!nothing) continue;
      record_.marks.markDone(request.uuid);
      journal_->done(request.uuid);
      continue;
    }
    recovered.push_back(describe(request, path));
  }
  removeIfResolvedLocked();
  return recovered;
}

void FinishedCapture::handedOver(const std::string& uuid) {
  const std::lock_guard lock(mutex_);
  record_.marks.markDone(uuid);
  journal_->done(uuid);
  removeIfResolvedLocked();
}

void FinishedCapture::removeIfResolved() {
  const std::lock_guard lock(mutex_);
  removeIfResolvedLocked();
}

void FinishedCapture::removeIfResolvedLocked() {
  if (keep_media_ || record_.marks.othersPending({})) return;
  unlink(media().c_str());
  unlink((folder_ + "/" + kPartName).c_str());
  unlink((folder_ + "/" + kJournalName).c_str());
  rmdir(folder_.c_str());
  rmdir(directoryOf(folder_).c_str());  // only succeeds for the last capture
}

}  // namespace lmx
