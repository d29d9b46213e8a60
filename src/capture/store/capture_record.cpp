// Journal lines to a record.
#include "capture/store/capture_record.h"

#include <cstdint>
#include <cstdlib>
#include <memory>

#include "capture/store/journal_line.h"

namespace lmx {
namespace {

double real(const std::string& text) { return std::strtod(text.c_str(), nullptr); }
std::uint32_t count(const std::string& text) {
  return static_cast<std::uint32_t>(std::strtoul(text.c_str(), nullptr, 10));
}

/// @return whether the line was understood
bool applyRequestLine(CaptureRecord& record, const JournalWords& w) {
  if (w[0] == "start" && w.size() >= 3 && w.size() % 2 == 1) {
    auto parameters = std::make_shared<Dictionary>();
    for (std::size_t i = 3; i + 1 < w.size(); i += 2) (*parameters)[w[i]] = w[i + 1];
    record.marks.start(w[1], real(w[2]), parameters);
  } else if (w[0] == "stop" && w.size() == 3) {
    record.marks.stop(w[1], real(w[2]));
  } else if (w[0] == "cancel" && w.size() == 2) {
    record.marks.cancel(w[1]);
  } else if (w[0] == "done" && w.size() == 2) {
    record.marks.markDone(w[1]);
  } else if (w[0] == "movie" && w.size() == 3) {
    record.movies[w[1]] = w[2];
  } else {
    return false;
  }
  return true;
}

/// @return whether the line was understood
bool applyLine(CaptureRecord& record, const JournalWords& w) {
  if (w.empty()) return true;
  if (w[0] == "capture" && w.size() == 4) {
    record.recordingType = std::atoi(w[1].c_str());
    record.frameSeconds = real(w[2]);
    record.wallOffset = real(w[3]);
  } else if (w[0] == "run" && w.size() == 3) {
    record.runs.push_back({.sessionTime = real(w[1]), .firstFrame = count(w[2])});
  } else if (w[0] == "pause" && w.size() == 2) {
    record.marks.pause(real(w[1]));
  } else if (w[0] == "resume" && w.size() == 2) {
    record.marks.resume(real(w[1]));
  } else {
    return applyRequestLine(record, w);
  }
  return true;
}

}  // namespace

CaptureRecord parseJournal(const std::string& text) {
  CaptureRecord record;
  bool understood = true;
  std::size_t at = 0;
  // Only lines that end are whole: the last one of a killed writer may be torn.
  for (std::size_t end; (end = text.find('\n', at)) != std::string::npos; at = end + 1) {
    understood = applyLine(record, journalWords(text.substr(at, end - at))) && understood;
  }
  record.intact = understood && record.frameSeconds > 0 && !record.marks.requests().empty();
  return record;
}

}  // namespace lmx
