// The PID file, the recording repository and what an earlier process left in it.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "agent/agent_main.h"
#include "platform/directories.h"
#include "platform/log.h"
#include "platform/paths.h"
#include "platform/work_queue.h"
#include "support/format.h"
#include "support/unique_fd.h"

namespace lmx {

int AgentMain::createPIDFile() {
  const std::string path = systemPath(kPidFile);
  const UniqueFd file(open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644));
  if (!file.valid()) {
    if (errno != EACCES) return 1;
    LMPLogMessage(context_->log_context(), kLogError, "unable to write pid file (EACCES)");
    return 0;
  }
  const std::string text = string_with_format("%d\n", static_cast<int>(getpid()));
  const bool written = write(file.get(), text.data(), text.size()) == static_cast<ssize_t>(text.size());
  return written && fchmod(file.get(), 0644) == 0 ? 0 : 1;
}

void AgentMain::removePIDFile() { unlink(systemPath(kPidFile).c_str()); }

bool AgentMain::setupRecordingRepository() {
  const std::string path = context_->recording.recording_repository_path.get().value_or("");
  LMPLogContext log = context_->log_context();
  struct stat info {};
  if (stat(path.c_str(), &info) != 0 && errno == ENOENT) {
    LMPLogMessage(log, kLogInfo, "Recording Repository does not exist, creating %s.", path.c_str());
    if (mkdir_p(path.c_str(), 0755) != 0) {
      LMPLogMessage(log, kLogCritical, "Unable to create recording directory");
      return false;
    }
  }
  if (stat(path.c_str(), &info) == 0) return true;
  LMPLogMessage(log, kLogCritical, "Recording repository path \"%s\" does not exist", path.c_str());
  return false;
}

void AgentMain::recoverUnfinishedRecordings() {
  const auto repository = context_->recording.recording_repository_path.get();
  if (!repository) return;
  // On a worker: a long recording may have to be copied, and the agent is to be commanded meanwhile.
  dispatchAsync(WorkPriority::background, [this, repository] {
    keepRecovered(environment_.framework->recoverUnfinished(*repository));
  });
}

}  // namespace lmx
