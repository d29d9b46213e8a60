// Feeds arbitrary text to the reader of capture journals; what it makes of it must be usable.
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>

#include "capture/store/capture_record.h"
#include "capture/store/journal_line.h"
#include "capture/store/request_frames.h"

namespace {

constexpr std::uint32_t kTotalFrames = 1000;

void require(bool holds) {
  if (!holds) std::abort();
}

/// Ranges ascend without touching and lie among the frames that are there.
void checkFrames(const lmx::CaptureRecord& record, const lmx::Request& request) {
  std::uint32_t end = 0;
  for (const auto& range : lmx::framesOf(request, record.runs, record.frameSeconds, kTotalFrames)) {
    require(range.first < range.end && range.end <= kTotalFrames);
    end = range.end;
  }
  require(end <= kTotalFrames);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string text(reinterpret_cast<const char*>(data), size);
  const lmx::CaptureRecord record = lmx::parseJournal(text);
  require(std::isfinite(record.frameSeconds) && std::isfinite(record.wallOffset));
  require(!record.intact || (record.frameSeconds > 0 && !record.marks.requests().empty()));
  for (const lmx::Request& request : record.marks.requests()) {
    require(request.parameters != nullptr);
    for (const lmx::Span& span : request.spans) require(span.stop >= span.start);
    checkFrames(record, request);
  }
  const lmx::JournalWords words = lmx::journalWords(text);
  if (!words.empty()) require(lmx::journalWords(lmx::journalLine(words)) == words);
  return 0;
}
