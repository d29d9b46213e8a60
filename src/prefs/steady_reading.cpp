// Remembers what each settings file held.
#include "prefs/steady_reading.h"

#include <cerrno>
#include <map>
#include <memory>
#include <mutex>
#include <utility>

#include "platform/log.h"

namespace lmx {
namespace {

class Memory {
 public:
  SteadyReading read(const std::string& path) {
    const std::lock_guard lock(mutex_);
    PlistResult now = reader_ ? reader_(path) : readPropertyList(path);
    Entry& entry = entries_[path];
    if (!now && isPassing(now.error())) {
      if (!std::exchange(entry.failing, true)) logBegin(path, now.error());
      const Error why = now.error();
      return {entry.last ? *entry.last : std::move(now), why};
    }
    if (std::exchange(entry.failing, false) && now) {
      LMPLogMessage(nullptr, kLogNotice, "The settings file \"%s\" can be read again", path.c_str());
    }
    entry.last = now;
    return {std::move(now), std::nullopt};
  }

  void restart(std::function<PlistResult(const std::string&)> reader) {
    const std::lock_guard lock(mutex_);
    reader_ = std::move(reader);
    entries_.clear();
  }

 private:
  struct Entry {
    std::optional<PlistResult> last;
    bool failing = false;  ///< the error line has been written
  };

  static void logBegin(const std::string& path, const Error& error) {
    LMPLogMessage(nullptr, kLogError, "The settings file \"%s\" can't be read at present: %s (errno %d)",
                  path.c_str(), error.message.c_str(), error.systemError);
  }

  std::mutex mutex_;
  std::map<std::string, Entry> entries_;                        // guarded by mutex_
  std::function<PlistResult(const std::string& path)> reader_;  // guarded by mutex_
};

/// Never destroyed: threads that outlive main may read.
Memory& memory() {
  static Memory& memory = *std::make_unique<Memory>().release();
  return memory;
}

}  // namespace

bool isPassing(const Error& error) {
  switch (error.systemError) {
    case 0:  // it was read
    case ENOENT:
    case ENOTDIR:
    case ELOOP:
    case ENAMETOOLONG:
    case EISDIR:
    case EINVAL:  // no regular file
    case ENXIO:
    case ENODEV:
    case EFBIG:
      return false;
    default:
      return true;
  }
}

SteadyReading readSteadily(const std::string& path) { return memory().read(path); }

void setSettingsReaderForTesting(std::function<PlistResult(const std::string& path)> reader) {
  memory().restart(std::move(reader));
}

}  // namespace lmx
