// Handing a recording to the server's tool.
#include "postprocess/submission.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>

#include "platform/log.h"
#include "platform/paths.h"
#include "postprocess/agent_submit.h"
#include "support/directories.h"
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

/// Copies a file so that no half copy ever bears the name. @return 0 or the errno; EEXIST when the name is
/// taken.
int copyFile(const std::string& from, const std::string& to) {
  if (access(to.c_str(), F_OK) == 0) return EEXIST;
  const UniqueFd source(open(from.c_str(), O_RDONLY | O_CLOEXEC));
  if (!source.valid()) return errno;
  std::string temporary = to + ".XXXXXX";
  const UniqueFd target(mkostemp(temporary.data(), O_CLOEXEC));
  if (!target.valid()) return errno;
  int error = copyContents(source.get(), target.get());
  if (error == 0 && fchmod(target.get(), 0644) != 0) error = errno;
  // link, unlike rename, never replaces what has come there meanwhile.
  if (error == 0 && link(temporary.c_str(), to.c_str()) != 0) error = errno;
  unlink(temporary.c_str());
  return error != 0 ? error : syncDirectory(directoryOf(to));
}

void copyIntoRepository(const std::string& from, const std::string& to) {
  if (const int error = copyFile(from, to)) {
    LMPLogMessage(nullptr, kLogDebug, "\"%s\" was not copied to \"%s\": %s", from.c_str(), to.c_str(),
                  std::strerror(error));
  }
}

void removeFile(const AgentContext& context, const std::string& path) {
  if (unlink(path.c_str()) == 0) {
    context.logInfo("File \"" + path + "\" was removed");
  } else {
    LMPLogMessage(context.log_context(), kLogError, "An error occurred removing file \"%s\"", path.c_str());
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
  if (!s.workflow.empty()) {
    return {"--server", s.server, "--submit", "--file", s.file,     "--workflow_uuid",
            s.workflow, "--user", s.user,     "-p",     s.password, "--delete"};
  }
  return {"--server", s.server, "--submit", "--recording", s.recordingUUID, "--delete"};
}

int AgentSubmit::addRecordingWithCommentary(ChildRunner& children) {
  if (!agentContext_) return -1;
  AgentContext& context = *agentContext_;
  context.logInfo("Post-process mechanism is starting...");
  if (!context.submit_disabled() && !canceled_) {
    context.logInfo("Completion in progress...");
    if (addRecording(children) != 0) {
      LMPLogMessage(context.log_context(), kLogError, "An error occurred completing recording \"%s\"",
                    context.lumex_url().value_or("(null)").c_str());
      LMPLogMessage(context.log_context(), kLogCritical,
                    "An internal error occurred during agent post-processing");
      return -1;
    }
    context.logInfo("Recording completed with success");
  } else if (canceled_) {
    context.logInfo("Submission not launched because the recording was canceled");
    removeFile(context, recording_file_path_.value_or(""));
    removeFile(context, properties_file_path_.value_or(""));
  }
  context.logInfo("Post-process mechanism completed with success");
  return 0;
}

int AgentSubmit::addRecording(ChildRunner& children) {
  const Text uuid = getProperty(std::string(kUuidKey));
  if (!agentContext_ || !uuid) return failedBeforeTheTool();
  const std::string movie = recording_file_path_.value_or("");
  const auto session = record();
  if (session && session->recordingType() == kRecordingTypeFile) {
    const std::string copy = agentContext_->recording_repository_path().value_or("") + "/" + *uuid;
    copyIntoRepository(movie, copy + ".mov");
    copyIntoRepository(movie.substr(0, movie.size() - std::min<std::size_t>(3, movie.size())) + "xml",
                       copy + ".xml");
  }
  Submission submission{
      .server = agentContext_->lumex_url().value_or(""), .recordingUUID = *uuid, .workflow = {}};
  if (adhoc_workflow_uuid_) {
    const auto user = agentContext_->user();
    const auto password = agentContext_->password();
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
