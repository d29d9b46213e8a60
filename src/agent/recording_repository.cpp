// Creates the recording repository.
#include "agent/recording_repository.h"

#include <sys/stat.h>

#include <cerrno>

#include "platform/directories.h"

namespace lmx {

bool setupRecordingRepository(const AgentLog& log, const std::string& path) {
  struct stat info {};
  if (stat(path.c_str(), &info) != 0 && errno == ENOENT) {
    LMPLogMessage(log.log_context(), kLogInfo, "Recording Repository does not exist, creating %s.",
                  path.c_str());
    if (mkdir_p(path.c_str(), 0755) != 0) {
      LMPLogMessage(log.log_context(), kLogCritical, "Unable to create recording directory");
      return false;
    }
  }
  if (stat(path.c_str(), &info) == 0) return true;
  LMPLogMessage(log.log_context(), kLogCritical, "Recording repository path \"%s\" does not exist",
                path.c_str());
  return false;
}

}  // namespace lmx
