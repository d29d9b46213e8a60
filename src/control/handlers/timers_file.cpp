// The file that keeps the timed commands over a restart.
#include "control/handlers/timers_file.h"

#include <sys/stat.h>

#include <cerrno>

namespace lmx {
namespace {

/// Our own file, however long the list has grown: only what no schedule can be is refused.
constexpr PlistLimits kTimersLimits{.bytes = 64U << 20, .values = 1'000'000};

}  // namespace

TimerEntries TimersFile::read() const {
  const PlistResult file = readPropertyList(path_, kTimersLimits);
  if (file) return timerEntriesFrom(*file);
  return {{}, file.error().systemError == ENOENT ? "" : file.error().message};
}

bool TimersFile::write(const std::vector<TimedCommandList::Entry>& entries) const {
  ::chmod(path_.c_str(), 0600);  // the new file takes over the mode of the old one
  return writePropertyList(path_, plistFrom(entries), 0600) == 0;
}

}  // namespace lmx
