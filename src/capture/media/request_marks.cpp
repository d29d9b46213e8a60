// From marks to spans.
#include "capture/media/request_marks.h"

#include <algorithm>

namespace lmx {
namespace {

auto named(const std::string& uuid) {
  return [&uuid](const Request& request) { return request.uuid == uuid; };
}

}  // namespace

double commonSeconds(const std::vector<Span>& a, const std::vector<Span>& b, double now) {
  double total = 0;
  for (const Span& x : a) {
    for (const Span& y : b) {
      const double from = std::max(x.start, y.start);
      const double to = std::min({x.stop, y.stop, now});
      total += std::max(0.0, to - from);
    }
  }
  return total;
}

bool Request::wanted(double t) const {
  return std::any_of(spans.begin(), spans.end(), [t](const Span& span) { return span.contains(t); });
}

void RequestMarks::start(const std::string& uuid, double t, SharedDictionary parameters) {
  Request* request = editable(uuid);
  if (request == nullptr) {
    if (!parameters) parameters = std::make_shared<const Dictionary>();
    request =
        &requests_.emplace_back(Request{.uuid = uuid, .parameters = std::move(parameters), .spans = {}});
  }
  if (request->submit) return;
  if (!request->spans.empty()) {
    if (request->spans.back().open()) return;
    t = std::max(t, request->spans.back().stop);
  }
  request->spans.push_back({.start = t});
}

void RequestMarks::stop(const std::string& uuid, double t) {
  Request* request = editable(uuid);
  if (request == nullptr || request->spans.empty()) return;
  Span& last = request->spans.back();
  last.stop = std::max(last.start, std::min(last.stop, t));
}

void RequestMarks::cancel(const std::string& uuid) {
  if (Request* request = editable(uuid)) request->cancelled = !request->submit;
}

void RequestMarks::submit(const std::string& uuid) {
  if (Request* request = editable(uuid)) request->submit = !request->cancelled;
}

void RequestMarks::markQueued(const std::string& uuid) {
  if (Request* request = editable(uuid)) request->queued = true;
}

void RequestMarks::markDone(const std::string& uuid) {
  if (Request* request = editable(uuid)) request->done = true;
}

void RequestMarks::pause(double t) {
  if (!paused()) pauses_.push_back({.start = t});
}

void RequestMarks::resume(double t) {
  if (paused()) pauses_.back().stop = std::max(pauses_.back().start, t);
}

bool RequestMarks::wanted(double t) const {
  const auto holds = [t](const Span& span) { return span.contains(t); };
  if (std::any_of(pauses_.begin(), pauses_.end(), holds)) return false;
  return std::any_of(requests_.begin(), requests_.end(),
                     [t](const Request& request) { return !request.cancelled && request.wanted(t); });
}

std::optional<double> RequestMarks::wantedUntil(double t) const {
  std::optional<double> latest;
  for (const Request& request : requests_) {
    if (request.cancelled) continue;
    for (const Span& span : request.spans) {
      double end = std::min(span.stop, t);
      for (auto pause = pauses_.rbegin(); pause != pauses_.rend(); ++pause) {
        if (pause->start < end && end <= pause->stop) end = pause->start;
      }
      if (end > span.start) latest = std::max(latest.value_or(end), end);
    }
  }
  return latest;
}

bool RequestMarks::startsBetween(double previous, double t) const {
  for (const Request& request : requests_) {
    for (const Span& span : request.spans) {
      if (span.start > previous && span.start <= t) return true;
    }
  }
  return false;
}

bool RequestMarks::starving(double t) const {
  return std::any_of(requests_.begin(), requests_.end(), [t](const Request& request) {
    return !request.cancelled && !request.spans.empty() && request.spans.front().start <= t &&
           !request.spans.back().open() && request.spans.back().stop <= t;
  });
}

double RequestMarks::elapsed(const std::string& uuid, double now) const {
  const Request* request = find(uuid);
  if (request == nullptr) return 0;
  double total = 0;
  for (const Span& span : request->spans) total += std::max(0.0, std::min(span.stop, now) - span.start);
  return total - commonSeconds(request->spans, pauses_, now);
}

const Request* RequestMarks::find(const std::string& uuid) const {
  const auto found = std::find_if(requests_.begin(), requests_.end(), named(uuid));
  return found == requests_.end() ? nullptr : &*found;
}

Request* RequestMarks::editable(const std::string& uuid) {
  const auto found = std::find_if(requests_.begin(), requests_.end(), named(uuid));
  return found == requests_.end() ? nullptr : &*found;
}

bool RequestMarks::othersPending(const std::string& uuid) const {
  return std::any_of(requests_.begin(), requests_.end(),
                     [&](const Request& request) { return request.uuid != uuid && request.pending(); });
}

}  // namespace lmx
