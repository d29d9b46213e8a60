// Joins losses, counts them and puts them in words.
#include "capture/media/gap_ledger.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <iterator>

#include "support/format.h"

namespace lmx {
namespace {

/// Losses of one kind with fewer seconds between them are one entry.
constexpr double kJoinSeconds = 10;
/// An hour of trouble must not fill the disk: so many lines a kind, the sums go on.
constexpr std::uint32_t kMostLines = 200;
/// So many entries of a kind are named in the summary.
constexpr std::size_t kMostNamed = 3;
/// Less is how recordings begin and end: devices open and close one after the other.
constexpr double kLeastSilence = 0.1;

std::string number(double value) { return string_with_format("%.3f", value); }

}  // namespace

void GapLedger::pictureSizeChanged(double t, int width, int height) {
  add(Kind::size, t, t, 0, string_with_format("%dx%d", width, height));
}

void GapLedger::back(Kind kind, std::optional<double>& lost, double t) {
  if (!lost) return;
  add(kind, *lost, std::max(*lost, t), std::max(0.0, t - *lost));
  lost.reset();
}

void GapLedger::add(Kind kind, double from, double to, double amount, std::string text) {
  const bool joins = kind == Kind::frames || kind == Kind::silence;
  const auto open = open_.find(kind);
  if (joins && open != open_.end() && from - open->second.to < kJoinSeconds) {
    open->second.to = std::max(open->second.to, to);
    open->second.amount += amount;
    return;
  }
  if (open != open_.end()) {
    close(open->second);
    open_.erase(open);
  }
  Entry entry{.kind = kind, .from = from, .to = to, .amount = amount, .text = std::move(text)};
  joins ? void(open_.emplace(kind, std::move(entry))) : close(entry);
}

void GapLedger::close(const Entry& entry) {
  if (entry.kind == Kind::silence && entry.amount < kLeastSilence) return;
  Sum& sum = sums_[static_cast<std::size_t>(entry.kind)];
  sum.amount += entry.amount;
  if (sum.first.size() < kMostNamed) sum.first.push_back(entry);
  if (++sum.entries <= kMostLines) due_.push_back(wordsOf(entry));
}

std::vector<GapLedger::Words> GapLedger::journalWords(double now) {
  for (auto open = open_.begin(); open != open_.end();) {
    const bool over = now - open->second.to >= kJoinSeconds;
    if (over) close(open->second);
    open = over ? open_.erase(open) : std::next(open);
  }
  return std::exchange(due_, {});
}

std::vector<GapLedger::Words> GapLedger::finish(double now) {
  microphoneBack(now);
  cameraBack(now);
  for (const auto& [kind, entry] : open_) close(entry);
  open_.clear();
  if (std::lround(parts_per_million_) != 0) due_.push_back({"gap", "speed", number(parts_per_million_)});
  return std::exchange(due_, {});
}

GapLedger::Words GapLedger::wordsOf(const Entry& entry) {
  switch (entry.kind) {
    case Kind::frames:
      return {"gap", "frames", number(entry.from), number(entry.to),
              string_with_format("%.0f", entry.amount)};
    case Kind::silence:
      return {"gap", "silence", number(entry.from), number(entry.to), number(entry.amount)};
    case Kind::microphone:
      return {"gap", "microphone", number(entry.from), number(entry.to)};
    case Kind::camera:
      return {"gap", "camera", number(entry.from), number(entry.to)};
    case Kind::clock:
      return {"gap", "clock", number(entry.from), number(entry.amount)};
    case Kind::size:
      return {"gap", "size", number(entry.from), entry.text};
  }
  return {};
}

std::string GapLedger::summary() const {
  std::vector<std::string> parts;
  if (const Sum& frames = sum(Kind::frames); frames.entries > 0) {
    parts.push_back(string_with_format("%.0f frames lost, from %s on", frames.amount,
                                       clockText(frames.first.front().from).c_str()));
  }
  if (const Sum& silence = sum(Kind::silence); silence.entries > 0) {
    parts.push_back(string_with_format("%.2f s of silence put in, from %s on", silence.amount,
                                       clockText(silence.first.front().from).c_str()));
  }
  for (const Kind kind : {Kind::microphone, Kind::camera, Kind::clock, Kind::size}) {
    for (const Entry& entry : sum(kind).first) parts.push_back(told(entry));
    const std::size_t more = sum(kind).entries - sum(kind).first.size();
    if (more > 0) parts.back() += string_with_format(" and %zu times more", more);
  }
  if (const long ppm = std::lround(parts_per_million_); ppm != 0) {
    parts.push_back(
        string_with_format("sound made %s by %ld ppm", ppm > 0 ? "slower" : "faster", std::labs(ppm)));
  }
  std::string line;
  for (const std::string& part : parts) line += (line.empty() ? "Not real in this recording: " : "; ") + part;
  return line;
}

std::string GapLedger::told(const Entry& entry) const {
  const std::string from = clockText(entry.from);
  switch (entry.kind) {
    case Kind::microphone:
      return "microphone away from " + from + " to " + clockText(entry.to);
    case Kind::camera:
      return "camera away from " + from + " to " + clockText(entry.to);
    case Kind::clock:
      return string_with_format("clock set by %+.3f s at %s", entry.amount, from.c_str());
    default:
      return "picture scaled from " + entry.text + " at " + from;
  }
}

/// H:MM:SS since the beginning.
std::string GapLedger::clockText(double t) const {
  const long seconds = std::max(0L, std::lround(t - begin_));
  return string_with_format("%ld:%02ld:%02ld", seconds / 3600, seconds / 60 % 60, seconds % 60);
}

}  // namespace lmx
