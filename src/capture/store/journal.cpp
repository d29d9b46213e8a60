// Journal lines: words separated by blanks, each percent-escaped.
#include "capture/store/journal.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <sstream>

#include "platform/log.h"
#include "support/format.h"

namespace lmx {
namespace {

std::string escaped(const std::string& word) {
  std::string out;
  for (const char c : word) {
    const auto u = static_cast<unsigned char>(c);
    if (u <= ' ' || c == '%' || u == 0x7F) {
      out += string_with_format("%%%02X", u);
    } else {
      out += c;
    }
  }
  return out.empty() ? "%" : out;  // an empty word must still be a word
}

std::string unescaped(const std::string& word) {
  if (word == "%") return {};
  std::string out;
  for (std::size_t i = 0; i < word.size(); ++i) {
    if (word[i] == '%' && i + 2 < word.size() &&
        std::isxdigit(static_cast<unsigned char>(word[i + 1])) != 0) {
      out += static_cast<char>(std::strtol(word.substr(i + 1, 2).c_str(), nullptr, 16));
      i += 2;
    } else {
      out += word[i];
    }
  }
  return out;
}

std::vector<std::string> wordsOf(const std::string& line) {
  std::vector<std::string> words;
  std::istringstream in(line);
  for (std::string word; in >> word;) words.push_back(unescaped(word));
  return words;
}

std::string number(double v) { return string_with_format("%.7f", v); }
double real(const std::string& text) { return std::strtod(text.c_str(), nullptr); }
std::uint32_t count(const std::string& text) {
  return static_cast<std::uint32_t>(std::strtoul(text.c_str(), nullptr, 10));
}

using Words = std::vector<std::string>;

/// @return whether the line was understood
bool applyRequestLine(CaptureRecord& record, const Words& w) {
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
bool applyLine(CaptureRecord& record, const Words& w) {
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
    understood = applyLine(record, wordsOf(text.substr(at, end - at))) && understood;
  }
  record.intact = understood && record.frameSeconds > 0 && !record.marks.requests().empty();
  return record;
}

std::vector<FrameRange> framesOf(const Request& request, const std::vector<MovieRun>& runs,
                                 double frameSeconds, std::uint32_t totalFrames) {
  std::vector<FrameRange> ranges;
  if (frameSeconds <= 0) return ranges;
  const auto add = [&](std::uint32_t first, std::uint32_t end) {
    if (first >= end) return;
    if (!ranges.empty() && ranges.back().end >= first) {
      ranges.back().end = std::max(ranges.back().end, end);
    } else {
      ranges.push_back({first, end});
    }
  };
  for (std::size_t i = 0; i < runs.size(); ++i) {
    const std::uint32_t runEnd = i + 1 < runs.size() ? runs[i + 1].firstFrame : totalFrames;
    const double frames = runEnd > runs[i].firstFrame ? runEnd - runs[i].firstFrame : 0;
    for (const Span& span : request.spans) {
      // The number of the first frame at or after a mark; 1/1000 of a frame absorbs the rounding of the
      // marks.
      const auto frameAt = [&](double t) {
        return std::clamp(std::ceil((t - runs[i].sessionTime) / frameSeconds - 1e-3), 0.0, frames);
      };
      add(runs[i].firstFrame + static_cast<std::uint32_t>(frameAt(span.start)),
          runs[i].firstFrame + static_cast<std::uint32_t>(frameAt(span.stop)));
    }
  }
  // A request that ended before the first frame came still has that one.
  if (ranges.empty() && totalFrames > 0 && !request.spans.empty() && !runs.empty() &&
      request.spans.front().start <= runs.front().sessionTime) {
    ranges.push_back({0, 1});
  }
  return ranges;
}

bool coversAll(const std::vector<FrameRange>& ranges, std::uint32_t totalFrames) {
  return ranges.size() == 1 && ranges.front().first == 0 && ranges.front().end >= totalFrames;
}

std::unique_ptr<Journal> Journal::open(const std::string& path, bool existing) {
  // A new one bears its name only once it is locked: the recovery at the start must not take it for a dead
  // one.
  const std::string name = existing ? path : path + ".new";
  const int flags = O_RDWR | O_APPEND | O_CLOEXEC | (existing ? 0 : O_CREAT | O_EXCL);
  UniqueFd file(::open(name.c_str(), flags, 0600));
  if (!file.valid() || flock(file.get(), LOCK_EX | LOCK_NB) != 0) return nullptr;
  if (!existing && rename(name.c_str(), path.c_str()) != 0) {
    const int error = errno;
    unlink(name.c_str());
    errno = error;
    return nullptr;
  }
  return std::unique_ptr<Journal>(new Journal(std::move(file)));
}

void Journal::append(const std::vector<std::string>& words) {
  std::string line;
  for (const std::string& word : words) line += (line.empty() ? "" : " ") + escaped(word);
  line += '\n';
  const ssize_t written = write(file_.get(), line.data(), line.size());
  if (written == static_cast<ssize_t>(line.size())) return;
  const int error = written < 0 ? errno : ENOSPC;
  // Half a line must not become one with the next; cutting a file short needs no space.
  struct stat status {};
  const bool whole =
      written <= 0 || (fstat(file_.get(), &status) == 0 &&
                       ftruncate(file_.get(), status.st_size - static_cast<off_t>(written)) == 0);
  LMPLogMessage(nullptr, kLogError,
                "The capture journal could not be written%s: %s; a crash now would lose marks",
                whole ? "" : " and is damaged", std::strerror(error));
}

void Journal::capture(int recordingType, double frameSeconds, double wallOffset) {
  append({"capture", std::to_string(recordingType), string_with_format("%.12f", frameSeconds),
          number(wallOffset)});
}
void Journal::run(const MovieRun& r) { append({"run", number(r.sessionTime), std::to_string(r.firstFrame)}); }
void Journal::start(const std::string& uuid, double t, const SharedDictionary& parameters) {
  Words words{"start", uuid, number(t)};
  if (parameters) {
    for (const auto& [key, value] : *parameters) {
      if (key == "RecordingMetadata_AGENT_PASSWORD")
        continue;  // no secret on the disk: nothing here needs it
      words.push_back(key);
      words.push_back(value);
    }
  }
  append(words);
}
void Journal::stop(const std::string& uuid, double t) { append({"stop", uuid, number(t)}); }
void Journal::cancel(const std::string& uuid) { append({"cancel", uuid}); }
void Journal::pause(double t) { append({"pause", number(t)}); }
void Journal::resume(double t) { append({"resume", number(t)}); }
void Journal::movie(const std::string& uuid, const std::string& path) { append({"movie", uuid, path}); }
void Journal::done(const std::string& uuid) { append({"done", uuid}); }
int Journal::sync() { return fdatasync(file_.get()) == 0 ? 0 : errno; }

}  // namespace lmx
