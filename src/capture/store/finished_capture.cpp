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
#include "platform/log.h"
#include "platform/paths.h"

namespace lmx {
namespace {

bool exists(const std::string& path) { return access(path.c_str(), F_OK) == 0; }

CaptureError diskError(int error, const std::string& what) {
  return {CaptureError::kDomain, error == ENOSPC ? kNoSpace : kWriteFailed,
          what + ": " + std::strerror(error)};
}

int moveFile(const std::string& from, const std::string& to) {
  if (rename(from.c_str(), to.c_str()) != 0) return errno;
  return syncDirectory(directoryOf(to));
}

std::string fileNameFor(const Request& request) {
  std::string name = lookUp(request.parameters, kRecordingUuidKey).value_or("test");
  std::replace(name.begin(), name.end(), '/', '_');
  name = fittingName(std::move(name));
  return name.empty() ? "test" : name;
}

std::string recoveredPath(const Request& request, const std::string& repository) {
  const std::string stem = repository + "/" + fileNameFor(request);
  return (exists(stem + ".mov") ? freeStem(stem + "-recovered") : stem) + ".mov";
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
  if (request == nullptr)
    return CaptureError{CaptureError::kDomain, kNoMedia, "no recording of request " + uuid};
  return makeMovieLocked(*request, path);
}

std::optional<CaptureError> FinishedCapture::makeMovieLocked(const Request& request,
                                                             const std::string& path) {
  const auto ranges = framesFor(request);
  if (ranges.empty())
    return CaptureError{CaptureError::kDomain, kNoMedia, "nothing was captured for " + path};
  journal_->movie(request.uuid, path);
  (void)journal_->sync();  // when it fails the movie is worth making all the same
  if (const int error = setAside(path)) {
    return diskError(error, "an earlier movie is in the way of " + path);
  }
  if (needsAllMedia(request, ranges)) {
    const int error = moveFile(media_, path);
    if (error == 0) return std::nullopt;
    if (error != EXDEV) return diskError(error, "could not move the movie to " + path);
  }
  return copyFrames(ranges, path);
}

bool FinishedCapture::needsAllMedia(const Request& request, const std::vector<FrameRange>& ranges) const {
  return media_after_use_ == MediaAfterUse::remove && coversAll(ranges, total_frames_) &&
         !record_.marks.othersPending(request.uuid);
}

std::optional<CaptureError> FinishedCapture::copyFrames(const std::vector<FrameRange>& ranges,
                                                        const std::string& path) {
  const auto index = readMovieIndex(media_);
  if (!index) return CaptureError{CaptureError::kDomain, kWriteFailed, media_ + " can't be read"};
  // Written in the capture's own folder: no other capture writes there, and a crash's leftovers go with it.
  int error = copyOver(*index, ranges, folder_ + "/" + kPartName, path);
  if (error == EXDEV)
    error = copyOver(*index, ranges, path + "." + folder_.substr(folder_.rfind('/') + 1) + ".part", path);
  if (error == 0) return std::nullopt;
  return diskError(error, "could not write " + path);
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

std::vector<RecoveredRecording> FinishedCapture::recoverPending(const std::string& repository) {
  const std::lock_guard lock(mutex_);
  std::vector<RecoveredRecording> recovered;
  const std::vector<Request> requests = record_.marks.requests();
  for (const Request& request : requests) {
    if (!request.pending()) continue;
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
  recording.path = path;
  recording.parameters = request.parameters;
  recording.recordingType = record_.recordingType;
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
  if (media_after_use_ == MediaAfterUse::keep || record_.marks.othersPending({})) return;
  removeCaptureFiles(folder_);
}

}  // namespace lmx
