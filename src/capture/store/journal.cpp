// Creates, locks and writes a journal.
#include "capture/store/journal.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>

#include "platform/log.h"
#include "support/format.h"

namespace lmx {
namespace {

std::string number(double v) { return string_with_format("%.7f", v); }

}  // namespace

Result<std::shared_ptr<Journal>> Journal::open(const std::string& path) {
  UniqueFd file(::open(path.c_str(), O_RDWR | O_APPEND | O_CLOEXEC));
  if (!file.valid() || flock(file.get(), LOCK_EX | LOCK_NB) != 0) return Error::fromSystem(path);
  return std::shared_ptr<Journal>(new Journal(std::move(file)));
}

Result<std::shared_ptr<Journal>> Journal::create(const std::string& path) {
  // It gets its name only once it is locked: otherwise a recovery might take it for an abandoned one.
  const std::string name = path + ".new";
  UniqueFd file(::open(name.c_str(), O_RDWR | O_APPEND | O_CLOEXEC | O_CREAT | O_EXCL, 0600));
  if (!file.valid() || flock(file.get(), LOCK_EX | LOCK_NB) != 0) return Error::fromSystem(name);
  if (rename(name.c_str(), path.c_str()) != 0) {
    Error error = Error::fromSystem(path);
    unlink(name.c_str());
    return error;
  }
  return std::shared_ptr<Journal>(new Journal(std::move(file)));
}

bool Journal::append(const JournalWords& words) {
  const std::string line = journalLine(words);
  const std::lock_guard lock(mutex_);
  const ssize_t written = write(file_.get(), line.data(), line.size());
  if (written == static_cast<ssize_t>(line.size())) return true;
  const int error = written < 0 ? errno : ENOSPC;
  // Half a line must not run into the next one. Truncating the file needs no space.
  struct stat status {};
  const bool whole =
      written <= 0 || (fstat(file_.get(), &status) == 0 &&
                       ftruncate(file_.get(), status.st_size - static_cast<off_t>(written)) == 0);
  LMPLogMessage(nullptr, kLogError,
                "The capture journal could not be written%s: %s; a crash now would lose marks",
                whole ? "" : " and is damaged", std::strerror(error));
  return false;
}

void Journal::capture(int recordingType, double frameSeconds, double wallOffset) {
  append({"capture", std::to_string(recordingType), string_with_format("%.12f", frameSeconds),
          number(wallOffset)});
}

void Journal::run(const MovieRun& begun) {
  append({"run", number(begun.sessionTime), std::to_string(begun.firstFrame)});
}

void Journal::start(const std::string& uuid, double t, const SharedDictionary& parameters) {
  JournalWords words{"start", uuid, number(t)};
  if (parameters) {
    for (const auto& [key, value] : *parameters) {
      words.push_back(key);
      words.push_back(value);
    }
  }
  append(words);
}

void Journal::stop(const std::string& uuid, double t) { append({"stop", uuid, number(t)}); }
void Journal::cancel(const std::string& uuid) { append({"cancel", uuid}); }
void Journal::submit(const std::string& uuid) { append({"submit", uuid}); }
bool Journal::queued(const std::string& uuid) { return append({"queued", uuid}); }
void Journal::pause(double t) { append({"pause", number(t)}); }
void Journal::resume(double t) { append({"resume", number(t)}); }
void Journal::movie(const std::string& uuid, const std::string& path) { append({"movie", uuid, path}); }
void Journal::done(const std::string& uuid) { append({"done", uuid}); }
int Journal::sync() const { return fdatasync(file_.get()) == 0 ? 0 : errno; }

}  // namespace lmx
