// Writes and removes the PID file.
#include "agent/pid_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "platform/paths.h"
#include "support/format.h"
#include "support/unique_fd.h"

namespace lmx {

int createPIDFile(const AgentLog& log) {
  const std::string path = systemPath(kPidFile);
  const UniqueFd file(open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644));
  if (!file.valid()) {
    if (errno != EACCES) return 1;
    LMPLogMessage(log.log_context(), kLogError, "unable to write pid file (EACCES)");
    return 0;
  }
  const std::string text = string_with_format("%d\n", static_cast<int>(getpid()));
  const bool written = write(file.get(), text.data(), text.size()) == static_cast<ssize_t>(text.size());
  return written && fchmod(file.get(), 0644) == 0 ? 0 : 1;
}

void removePIDFile() { unlink(systemPath(kPidFile).c_str()); }

}  // namespace lmx
