// Makes the movies of a closed capture and removes it.
#include "capture/store/finished_capture.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <iterator>

#include "capture/movie/movie_reader.h"
#include "capture/store/capture_files.h"
#include "capture/store/movie_names.h"
#include "capture/store/request_frames.h"
#include "platform/directories.h"
#include "platform/file_copy.h"
#include "platform/log.h"
#include "platform/paths.h"

namespace lmx {
namespace {

/// How often a name is tried that somebody else takes at the same time.
constexpr int kAttempts = 100;

bool exists(const std::string& path) { return access(path.c_str(), F_OK) == 0; }

CaptureError diskError(int error, const std::string& what) {
  return {CaptureError::kDomain, error == ENOSPC ? kNoSpace : kWriteFailed,
          what + ": " + std::strerror(error)};
}

int moveFile(const std::string& from, const std::string& to) {
  if (const int error = renameToFreeName(from, to)) return error;
  return syncDirectory(directoryOf(to));
}

CaptureError unknownRequest(const std::string& uuid) {
  return {CaptureError::kDomain, kNoMedia, "no recording of request " + uuid};
}

CaptureError nothingCaptured(const std::string& path) {
  return {CaptureError::kDomain, kNoMedia, "nothing was captured for " + path};
}

std::string fileNameFor(const Request& request) {
  std::string name = lookUp(request.parameters, kRecordingUuidKey).value_or("test");
  std::replace(name.begin(), name.end(), '/', '_');
  name = fittingName(std::move(name));
  return name.empty() ? "test" : name;
}

/// The tool knows a recording by its name, so one that is to be submitted gets that.
std::string recoveredPath(const Request& request, const std::string& repository) {
  const std::string stem = repository + "/" + fileNameFor(request);
  const bool taken = !request.submit && exists(stem + ".mov");
  return (taken ? freeStem(stem + "-recovered") : stem) + ".mov";
}

}  // namespace

FinishedCapture::FinishedCapture(std::string folder, std::shared_ptr<Journal> journal, CaptureRecord record,
                                 std::uint32_t totalFrames, MediaAfterUse media)
    : folder_(std::move(folder)),
      media_(folder_ + "/" + kMediaName),
      journal_(std::move(journal)),
      total_frames_(totalFrames),
      media_after_use_(media),
      record_(std::move(record)) {}

// ---- one movie

std::optional<CaptureError> FinishedCapture::makeMovie(const std::string& uuid, const std::string& path) {
  const std::lock_guard lock(mutex_);
  const Request* request = record_.marks.find(uuid);
  return request == nullptr ? unknownRequest(uuid) : makeMovieLocked(*request, path);
}

std::optional<CaptureError> FinishedCapture::makeMovieLocked(const Request& request,
                                                             const std::string& path) {
  const auto ranges = framesFor(request);
  if (ranges.empty()) return nothingCaptured(path);
  int error = EEXIST;
  for (int attempt = 0; error == EEXIST && attempt < kAttempts; ++attempt) {
    if (const int inTheWay = setAside(path))
      return diskError(inTheWay, "an earlier movie is in the way of " + path);
    error = placeMovie(request, ranges, path);
  }
  if (error == 0) return std::nullopt;
  return diskError(error, "could not write " + path);
}

Result<std::string, CaptureError> FinishedCapture::makeMovieBeside(const std::string& uuid,
                                                                   const std::string& path) {
  const std::lock_guard lock(mutex_);
  const Request* request = record_.marks.find(uuid);
  if (request == nullptr) return unknownRequest(uuid);
  return makeMovieBesideLocked(*request, path);
}

Result<std::string, CaptureError> FinishedCapture::makeMovieBesideLocked(const Request& request,
                                                                         const std::string& path) {
  const auto ranges = framesFor(request);
  if (ranges.empty()) return nothingCaptured(path);
  std::string free;
  int error = EEXIST;
  for (int attempt = 0; error == EEXIST && attempt < kAttempts; ++attempt) {
    free = freePath(path);
    error = placeMovie(request, ranges, free);
  }
  if (error != 0) return diskError(error, "could not write " + free);
  if (free != path) {
    LMPLogMessage(nullptr, kLogWarning, "\"%s\" is there already and stays as it is: the movie is \"%s\"",
                  path.c_str(), free.c_str());
  }
  return free;
}

int FinishedCapture::placeMovie(const Request& request, const std::vector<FrameRange>& ranges,
                                const std::string& path) {
  journal_->movie(request.uuid, path);
  syncJournal();  // when it fails the movie is worth making all the same
  if (needsAllMedia(request, ranges)) {
    const int error = moveFile(media_, path);
    if (error != EXDEV) return error;
  }
  return copyFrames(ranges, path);
}

bool FinishedCapture::needsAllMedia(const Request& request, const std::vector<FrameRange>& ranges) const {
  return media_after_use_ == MediaAfterUse::remove && coversAll(ranges, total_frames_) &&
         !record_.marks.othersPending(request.uuid);
}

int FinishedCapture::copyFrames(const std::vector<FrameRange>& ranges, const std::string& path) {
  const auto index = readMovieIndex(media_);
  if (!index) return EBADMSG;
  // Written in the capture's own folder: no other capture writes there, and a crash's leftovers go with it.
  const int error = copyOver(*index, ranges, folder_ + "/" + kPartName, path);
  if (error != EXDEV) return error;
  return copyOver(*index, ranges, path + "." + folder_.substr(folder_.rfind('/') + 1) + ".part", path);
}

/// Copies into `temporary` and renames it to `path`. @return 0 or the errno; nothing is left then
int FinishedCapture::copyOver(const MovieIndex& index, const std::vector<FrameRange>& ranges,
                              const std::string& temporary, const std::string& path) {
  int error = copyMovieRanges(media_, index, ranges, record_.frameSeconds, temporary);
  if (error == 0) error = moveFile(temporary, path);
  if (error != 0) unlink(temporary.c_str());
  return error;
}

// ---- all that is pending

std::vector<RecoveredRecording> FinishedCapture::recoverPending(
    const std::string& repository, const std::function<bool(const std::string& request)>& known) {
  const std::lock_guard lock(mutex_);
  std::vector<RecoveredRecording> recovered;
  const std::vector<Request> requests = record_.marks.requests();
  for (const Request& request : requests) {
    if (!request.pending()) continue;
    // The process was killed between the two. One that is queued lacks its document.
    if (known && !request.queued && known(request.uuid)) {
      markDoneLocked(request.uuid);
      continue;
    }
    if (auto recording = recover(request, repository)) recovered.push_back(std::move(*recording));
  }
  removeIfResolvedLocked();
  return recovered;
}

std::optional<RecoveredRecording> FinishedCapture::recover(const Request& request,
                                                           const std::string& repository) {
  const auto made = record_.movies.find(request.uuid);
  const bool onlyLacksItsDocument = made != record_.movies.end() && exists(made->second) && !exists(media_);
  if (onlyLacksItsDocument) return describe(request, made->second);
  if (const auto wanted = lookUp(request.parameters, kAdHocFilePathKey); wanted && request.submit) {
    if (const auto path = makeMovieBesideLocked(request, *wanted)) return describe(request, *path);
  }
  const std::string path = recoveredPath(request, repository);
  if (const auto error = makeMovieLocked(request, path)) {
    giveUp(request, *error);
    return std::nullopt;
  }
  return describe(request, path);
}

/// For good if there are no media for the request; for now if the disk is to blame.
void FinishedCapture::giveUp(const Request& request, const CaptureError& error) {
  const bool nothing = error.code == kNoMedia;
  LMPLogMessage(nullptr, nothing ? kLogWarning : kLogError, "Unfinished recording in %s: %s%s",
                folder_.c_str(), error.message.c_str(),
                nothing ? "" : "; its media stay there for another try at the next start");
  if (!nothing) return;
  record_.marks.markDone(request.uuid);
  journal_->done(request.uuid);
}

RecoveredRecording FinishedCapture::describe(const Request& request, const std::string& path) {
  RecoveredRecording recording;
  recording.request = request.uuid;
  recording.submit = request.submit && !request.queued;
  recording.path = path;
  recording.parameters = request.parameters;
  recording.recordingType = record_.recordingType;
  recording.queued = [self = shared_from_this(), uuid = request.uuid] { return self->queued(uuid); };
  recording.forget = [self = shared_from_this(), uuid = request.uuid] { self->handedOver(uuid); };
  const std::vector<FrameRange> ranges = framesFor(request);
  if (ranges.empty()) return recording;
  recording.startTime = wallTimeOf(ranges.front().first);
  recording.stopTime = wallTimeOf(ranges.back().end - 1) + record_.frameSeconds;
  std::uint32_t frames = 0;
  for (const FrameRange& range : ranges) frames += range.end - range.first;
  recording.duration = frames * record_.frameSeconds;
  return recording;
}

/// When `frame` was captured, seconds since 2001-01-01 UTC.
double FinishedCapture::wallTimeOf(std::uint32_t frame) const {
  const auto& runs = record_.runs;
  const auto after =
      std::find_if(runs.begin(), runs.end(), [frame](const MovieRun& run) { return run.firstFrame > frame; });
  if (after == runs.begin()) return record_.wallOffset;
  const MovieRun& run = *std::prev(after);
  return record_.wallOffset + run.sessionTime + (frame - run.firstFrame) * record_.frameSeconds;
}

std::vector<FrameRange> FinishedCapture::framesFor(const Request& request) const {
  return framesOf(request, record_.runs, record_.frameSeconds, total_frames_);
}

// ---- the end

void FinishedCapture::submit(const std::string& uuid) {
  const std::lock_guard lock(mutex_);
  const Request* request = record_.marks.find(uuid);
  if (request == nullptr || !request->pending() || request->submit) return;
  record_.marks.submit(uuid);
  journal_->submit(uuid);
}

bool FinishedCapture::queued(const std::string& uuid) {
  const std::lock_guard lock(mutex_);
  record_.marks.markQueued(uuid);
  if (!journal_->queued(uuid)) return false;
  syncJournal();
  return true;
}

void FinishedCapture::handedOver(const std::string& uuid) {
  const std::lock_guard lock(mutex_);
  markDoneLocked(uuid);
  removeIfResolvedLocked();
}

void FinishedCapture::markDoneLocked(const std::string& uuid) {
  record_.marks.markDone(uuid);
  journal_->done(uuid);
  syncJournal();  // the removal may not survive a power cut, and nothing is to be submitted twice
}

void FinishedCapture::syncJournal() const {
  if (const int error = journal_->sync())
    LMPLogMessage(nullptr, kLogError, "The journal of %s could not be synced: %s", folder_.c_str(),
                  std::strerror(error));
}

void FinishedCapture::removeIfResolved() {
  const std::lock_guard lock(mutex_);
  removeIfResolvedLocked();
}

void FinishedCapture::removeIfResolvedLocked() {
  if (media_after_use_ == MediaAfterUse::keep || record_.marks.othersPending({})) return;
  removeCaptureFiles(folder_);
}

}  // namespace lmx
