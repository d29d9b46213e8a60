// Parses journal lines into a record.
#include "capture/store/capture_record.h"

#include <charconv>
#include <cmath>
#include <cstdint>
#include <memory>

#include "capture/store/journal_line.h"

namespace lmx {
namespace {

/// Lengths of a frame that a recording can have, seconds.
constexpr double kShortestFrame = 1e-4;
constexpr double kLongestFrame = 1e4;

/// Reads the words of a line. After a word that should be a number but is none, ok() is false.
class LineReader {
 public:
  explicit LineReader(const JournalWords& words) : words_(words) {}
  /// Whether the line is of that kind and has that many words.
  [[nodiscard]] bool is(const char* kind, std::size_t words) const {
    return words_.size() == words && words_[0] == kind;
  }
  double real(std::size_t i) {
    const double value = number<double>(i);
    ok_ = ok_ && std::isfinite(value);
    return value;
  }
  std::uint32_t count(std::size_t i) { return number<std::uint32_t>(i); }
  [[nodiscard]] bool ok() const { return ok_; }

 private:
  template <class T>
  T number(std::size_t i) {
    T value{};
    const std::string& word = words_[i];
    const auto [end, error] = std::from_chars(word.data(), word.data() + word.size(), value);
    ok_ = ok_ && error == std::errc() && end == word.data() + word.size();
    return value;
  }
  const JournalWords& words_;
  bool ok_ = true;
};

// Each of these handles some kinds of lines. It returns whether the line was understood; other lines change
// nothing.

bool applyStart(CaptureRecord& record, const JournalWords& words) {
  LineReader line(words);
  const double t = line.real(2);
  if (!line.ok()) return false;
  auto parameters = std::make_shared<Dictionary>();
  for (std::size_t i = 3; i + 1 < words.size(); i += 2) (*parameters)[words[i]] = words[i + 1];
  record.marks.start(words[1], t, parameters);
  return true;
}

bool applyRequestLine(CaptureRecord& record, const JournalWords& words) {
  LineReader line(words);
  if (words[0] == "start" && words.size() >= 3 && words.size() % 2 == 1) return applyStart(record, words);
  if (line.is("stop", 3)) {
    const double t = line.real(2);
    if (line.ok()) record.marks.stop(words[1], t);
  } else if (line.is("cancel", 2)) {
    record.marks.cancel(words[1]);
  } else if (line.is("submit", 2)) {
    record.marks.submit(words[1]);
  } else if (line.is("queued", 2)) {
    record.marks.markQueued(words[1]);
  } else if (line.is("done", 2)) {
    record.marks.markDone(words[1]);
  } else if (line.is("movie", 3)) {
    record.movies[words[1]] = words[2];
  } else {
    return false;
  }
  return line.ok();
}

bool applyCapture(CaptureRecord& record, LineReader line) {
  const std::uint32_t type = line.count(1);
  const double frame = line.real(2);
  const double offset = line.real(3);
  if (!line.ok() || frame < kShortestFrame || frame > kLongestFrame) return false;
  record.recordingType = static_cast<int>(type);
  record.frameSeconds = frame;
  record.wallOffset = offset;
  return true;
}

bool applyRun(CaptureRecord& record, LineReader line) {
  const MovieRun run{.sessionTime = line.real(1), .firstFrame = line.count(2)};
  if (line.ok()) record.runs.push_back(run);
  return line.ok();
}

bool applyPause(CaptureRecord& record, LineReader line) {
  const double t = line.real(1);
  if (!line.ok()) return false;
  line.is("pause", 2) ? record.marks.pause(t) : record.marks.resume(t);
  return true;
}

bool applyLine(CaptureRecord& record, const JournalWords& words) {
  if (words.empty() || words[0] == "gap") return true;  // gaps are for people
  const LineReader line(words);
  if (line.is("capture", 4)) return applyCapture(record, line);
  if (line.is("run", 3)) return applyRun(record, line);
  if (line.is("pause", 2) || line.is("resume", 2)) return applyPause(record, line);
  return applyRequestLine(record, words);
}

}  // namespace

CaptureRecord parseJournal(const std::string& text) {
  CaptureRecord record;
  bool understood = true;
  std::size_t at = 0;
  // A line without its end is torn: its writer was killed.
  for (std::size_t end; (end = text.find('\n', at)) != std::string::npos; at = end + 1) {
    understood = applyLine(record, journalWords(text.substr(at, end - at))) && understood;
  }
  record.intact = understood && record.frameSeconds > 0 && !record.marks.requests().empty();
  return record;
}

}  // namespace lmx
