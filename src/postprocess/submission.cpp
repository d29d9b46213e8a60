// Handing a recording to the server's tool.
#include "postprocess/submission.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>

#include "platform/directories.h"
#include "platform/log.h"
#include "platform/paths.h"
#include "postprocess/agent_submit.h"
#include "support/unique_fd.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

constexpr const char* kUuidKey = "RecordingMetadata_RECORDING_UUID";

int copyContents(int from, int to) {
  char buffer[1 << 16];
  for (;;) {
    const ssize_t n = read(from, buffer, sizeof buffer);
    if (n < 0 && errno == EINTR) continue;
    if (n < 0) return errno;
    if (n == 0) return fsync(to) == 0 ? 0 : errno;
    for (ssize_t done = 0; done < n;) {
      const ssize_t w = write(to, buffer + done, static_cast<std::size_t>(n - done));
      if (w < 0 && errno == EINTR) continue;
      if (w < 0) return errno;
      done += w;
    }
  }
}

bool nameTaken(const std::string& path) {
  struct stat status {};
  return lstat(path.c_str(), &status) == 0;  // also a link that leads nowhere
}

/// @return 0 or the errno; EEXIST when the name is taken.
int renameToFreeName(const std::string& from, const std::string& to) {
  if (renameat2(AT_FDCWD, from.c_str(), AT_FDCWD, to.c_str(), RENAME_NOREPLACE) == 0) return 0;
  // Some file systems can't refuse to replace; there nothing but a look beforehand protects what is there.
  if (errno != EINVAL && errno != ENOSYS) return errno;
  if (nameTaken(to)) return EEXIST;
  return rename(from.c_str(), to.c_str()) == 0 ? 0 : errno;
}

/// Copies a file so that no half copy ever bears the name. @return 0 or the errno; EEXIST when the name is
/// taken.
int copyFile(const std::string& from, const std::string& to) {
  if (nameTaken(to)) return EEXIST;
  const UniqueFd source(open(from.c_str(), O_RDONLY | O_CLOEXEC));
  if (!source.valid()) return errno;
  std::string temporary = directoryOf(to) + "/.lmx-copy.XXXXXX";
  const UniqueFd target(mkostemp(temporary.data(), O_CLOEXEC));
  if (!target.valid()) return errno;
  int error = copyContents(source.get(), target.get());
  if (error == 0 && fchmod(target.get(), 0644) != 0) error = errno;
  if (error == 0) error = renameToFreeName(temporary, to);
  if (error != 0) {
    unlink(temporary.c_str());
    return error;
  }
  return syncDirectory(directoryOf(to));
}

void copyIntoRepository(const std::string& from, const std::string& to) {
  if (const int error = copyFile(from, to)) {
    LMPLogMessage(nullptr, kLogDebug, "\"%s\" was not copied to \"%s\": %s", from.c_str(), to.c_str(),
                  std::strerror(error));
  }
}

void removeFile(LMPLogContext log, const std::string& path) {
  if (unlink(path.c_str()) == 0) {
    LMPLogMessage(log, kLogInfo, "File \"%s\" was removed", path.c_str());
  } else {
    LMPLogMessage(log, kLogError, "An error occurred removing file \"%s\"", path.c_str());
  }
}

ChildOptions waitingForTool() {
  ChildOptions options;
  options.reportEvery = 10min;
  options.stillRunning = [](std::chrono::milliseconds elapsed) {
    LMPLogMessage(nullptr, kLogWarning, "Still waiting for /usr/bin/lumex after %lld minutes",
                  static_cast<long long>(std::chrono::duration_cast<std::chrono::minutes>(elapsed).count()));
  };
  return options;
}

int failedBeforeTheTool() {
  LMPLogMessage(nullptr, kLogCritical, "Error: unable to submit job");
  return 1;
}

}  // namespace

std::vector<std::string> submissionArguments(const Submission& s) {
  if (s.workflow) {
    return {"--server",  s.server, "--submit", "--file", s.file,     "--workflow_uuid",
            *s.workflow, "--user", s.user,     "-p",     s.password, "--delete"};
  }
  return {"--server", s.server, "--submit", "--recording", s.recordingUUID, "--delete"};
}

int AgentSubmit::addRecordingWithCommentary(ChildRunner& children) {
  const LMPLogContext log = agentContext_ ? agentContext_->log_context() : nullptr;
  const bool disabled = agentContext_ && agentContext_->options.submit_disabled.get();
  LMPLogMessage(log, kLogInfo, "Post-process mechanism is starting...");
  if (!disabled && !canceled_) {
    LMPLogMessage(log, kLogInfo, "Completion in progress...");
    if (addRecording(children) != 0) {
      const Text server = agentContext_ ? agentContext_->server.lumex_url.get() : std::nullopt;
      LMPLogMessage(log, kLogError, "An error occurred completing recording \"%s\"",
                    server.value_or("(null)").c_str());
      LMPLogMessage(log, kLogCritical, "An internal error occurred during agent post-processing");
      return -1;
    }
    LMPLogMessage(log, kLogInfo, "Recording completed with success");
  } else if (canceled_) {
    LMPLogMessage(log, kLogInfo, "Submission not launched because the recording was canceled");
    removeFile(log, recording_file_path_.value_or(""));
    removeFile(log, properties_file_path_.value_or(""));
  }
  LMPLogMessage(log, kLogInfo, "Post-process mechanism completed with success");
  return 0;
}

int AgentSubmit::addRecording(ChildRunner& children) {
  const Text uuid = getProperty(std::string(kUuidKey));
  if (!agentContext_ || !uuid) return failedBeforeTheTool();
  const std::string movie = recording_file_path_.value_or("");
  const auto session = record();
  if (session && session->recordedType() == kRecordingTypeFile) {
    const std::string copy =
        agentContext_->recording.recording_repository_path.get().value_or("") + "/" + *uuid;
    copyIntoRepository(movie, copy + ".mov");
    copyIntoRepository(movie.substr(0, movie.size() - std::min<std::size_t>(3, movie.size())) + "xml",
                       copy + ".xml");
  }
  Submission submission{.server = agentContext_->server.lumex_url.get().value_or(""), .recordingUUID = *uuid};
  if (adhoc_workflow_uuid_) {
    const auto user = agentContext_->options.user.get();
    const auto password = agentContext_->options.password.get();
    if (!user || !password) return failedBeforeTheTool();
    submission.workflow = *adhoc_workflow_uuid_;
    submission.file = movie;
    submission.user = *user;
    submission.password = *password;
  }
  const auto arguments = submissionArguments(submission);
  std::string line = "/usr/bin/lumex ";
  for (const std::string& argument : arguments) line += argument + " ";
  LMPLogMessage(nullptr, kLogDebug, "%s", line.c_str());
  return runTool(children, arguments);
}

int AgentSubmit::runTool(ChildRunner& children, const std::vector<std::string>& arguments) {
  std::vector<std::string> argv{systemPath(kLumexTool)};
  argv.insert(argv.end(), arguments.begin(), arguments.end());
  const ChildResult result = children.run(argv, waitingForTool());
  if (result.succeeded()) return 0;
  if (result.end == ChildResult::End::notStarted) {
    LMPLogMessage(nullptr, kLogError, "%s could not be started: %s", argv[0].c_str(),
                  std::strerror(result.status));
    return failedBeforeTheTool();
  }
  // A tool that a signal ended counts as a shell would have it.
  const int code = result.end == ChildResult::End::exited ? result.status : 128 + result.status;
  LMPLogMessage(nullptr, kLogCritical, "Error: unable to submit job, /usr/bin/lumex exit code: %i", code);
  return 1;
}

}  // namespace lmx
