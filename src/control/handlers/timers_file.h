// The file that keeps the timed commands over a restart.
#pragma once
#include <string>
#include <vector>

#include "control/handlers/timer_entries.h"

namespace lmx {

class TimersFile {
 public:
  explicit TimersFile(std::string path) : path_(std::move(path)) {}

  /// A file that does not exist holds no entries, which is no problem.
  [[nodiscard]] TimerEntries read() const;
  /// Replaces the file, whole; for its owner alone, since commands carry passwords.
  /// @return false when it can't be written
  [[nodiscard]] bool write(const std::vector<TimedCommandList::Entry>& entries) const;
  [[nodiscard]] const std::string& path() const { return path_; }

 private:
  std::string path_;
};

}  // namespace lmx
