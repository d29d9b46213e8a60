// Marks and the end of a capture.
#include "capture/store/capture_marks.h"

#include <algorithm>

namespace lmx {

// ---- marks

void CaptureMarks::start(const std::string& uuid, double t, const SharedDictionary& parameters) {
  const std::lock_guard lock(mutex_);
  if (closed_ || ending_ != Ending::no) return;
  marks_.start(uuid, t, parameters);
  journal_->start(uuid, t, parameters);
}

void CaptureMarks::stop(const std::string& uuid, double t) {
  const std::lock_guard lock(mutex_);
  if (closed_ || marks_.find(uuid) == nullptr) return;
  marks_.stop(uuid, t);
  journal_->stop(uuid, t);
}

void CaptureMarks::cancel(const std::string& uuid) {
  const std::lock_guard lock(mutex_);
  const Request* request = marks_.find(uuid);
  if (closed_ || request == nullptr || request->submit) return;
  marks_.cancel(uuid);
  journal_->cancel(uuid);
}

bool CaptureMarks::submit(const std::string& uuid) {
  const std::lock_guard lock(mutex_);
  if (closed_) return false;
  const Request* request = marks_.find(uuid);
  if (request == nullptr || request->submit || request->cancelled) return true;
  marks_.submit(uuid);
  journal_->submit(uuid);
  return true;
}

void CaptureMarks::pause(double t) {
  const std::lock_guard lock(mutex_);
  if (closed_ || marks_.paused()) return;
  marks_.pause(t);
  journal_->pause(t);
}

void CaptureMarks::resume(double t) {
  const std::lock_guard lock(mutex_);
  if (closed_ || !marks_.paused()) return;
  marks_.resume(t);
  journal_->resume(t);
}

void CaptureMarks::tag(const std::string& uuid, double t) {
  const std::lock_guard lock(mutex_);
  if (closed_) return;
  tag_ = uuid;
  tag_span_ = {.start = t};
}

void CaptureMarks::untag(const std::string& uuid, double t) {
  const std::lock_guard lock(mutex_);
  if (uuid == tag_ && tag_span_.open()) tag_span_.stop = t;
}

// ---- status

bool CaptureMarks::paused() const {
  const std::lock_guard lock(mutex_);
  return marks_.paused();
}

double CaptureMarks::elapsed(const std::string& uuid, double now) const {
  const std::lock_guard lock(mutex_);
  if (!uuid.empty() && uuid == tag_) return std::max(0.0, std::min(tag_span_.stop, now) - tag_span_.start);
  return marks_.elapsed(uuid, now);
}

// ---- the end

bool CaptureMarks::end(Ending how, std::optional<double> t) {
  const std::lock_guard lock(mutex_);
  if (closed_ || ending_ != Ending::no) return false;
  ending_ = how;
  if (t) {
    end_time_ = *t;
    return true;
  }
  for (const Request& request : marks_.requests()) {
    if (!request.spans.empty()) end_time_ = std::max(end_time_, request.spans.back().stop);
  }
  return true;
}

std::optional<double> CaptureMarks::endTime() const {
  const std::lock_guard lock(mutex_);
  return ending_ == Ending::no ? std::nullopt : std::optional(end_time_);
}

bool CaptureMarks::cancelled() const {
  const std::lock_guard lock(mutex_);
  return ending_ == Ending::cancel;
}

bool CaptureMarks::worthless() const {
  const std::lock_guard lock(mutex_);
  return ending_ == Ending::cancel && !marks_.othersPending({});
}

RequestMarks CaptureMarks::close() {
  const std::lock_guard lock(mutex_);
  closed_ = true;
  return marks_;
}

// ---- wishes

CaptureMarks::Wish CaptureMarks::wishAt(double previous, double t, bool firstFrame) const {
  const std::lock_guard lock(mutex_);
  const bool wanted = marks_.wanted(t) && (ending_ == Ending::no || t < end_time_);
  return {.wanted = wanted || (firstFrame && marks_.starving(t)),
          .keyFrame = marks_.startsBetween(previous, t)};
}

std::optional<double> CaptureMarks::wantedUntil(double t) const {
  const std::lock_guard lock(mutex_);
  return marks_.wantedUntil(ending_ == Ending::no ? t : std::min(t, end_time_));
}

}  // namespace lmx
