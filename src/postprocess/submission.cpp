// Builds the submission tool's arguments and runs the tool.
#include "postprocess/submission.h"

#include <chrono>
#include <cstring>

#include "platform/log.h"
#include "platform/paths.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

ChildOptions waitingForTool() {
  ChildOptions options;
  options.reportEvery = 10min;
  options.stillRunning = [](std::chrono::milliseconds elapsed) {
    LMPLogMessage(nullptr, kLogWarning, "Still waiting for /usr/bin/lumex after %lld minutes",
                  static_cast<long long>(std::chrono::duration_cast<std::chrono::minutes>(elapsed).count()));
  };
  return options;
}

void logCall(const std::vector<std::string>& arguments) {
  std::string line = "/usr/bin/lumex ";
  for (const std::string& argument : arguments) line += argument + " ";
  LMPLogMessage(nullptr, kLogDebug, "%s", line.c_str());
}

}  // namespace

int failedBeforeTheTool() {
  LMPLogMessage(nullptr, kLogCritical, "Error: unable to submit job");
  return 1;
}

std::vector<std::string> submissionArguments(const SubmissionRequest& s) {
  if (s.workflow) {
    return {"--server",  s.server, "--submit", "--file", s.file,     "--workflow_uuid",
            *s.workflow, "--user", s.user,     "-p",     s.password, "--delete"};
  }
  return {"--server", s.server, "--submit", "--recording", s.recordingUUID, "--delete"};
}

int submitWithTool(ChildRunner& children, const std::vector<std::string>& arguments) {
  logCall(arguments);
  std::vector<std::string> argv{systemPath(kLumexTool)};
  argv.insert(argv.end(), arguments.begin(), arguments.end());
  const ChildResult result = children.run(argv, waitingForTool());
  if (result.succeeded()) return 0;
  if (result.end == ChildResult::End::notStarted) {
    LMPLogMessage(nullptr, kLogError, "%s could not be started: %s", argv[0].c_str(),
                  std::strerror(result.status));
    return failedBeforeTheTool();
  }
  // For a tool ended by a signal, use a shell's convention for the exit code.
  const int code = result.end == ChildResult::End::exited ? result.status : 128 + result.status;
  LMPLogMessage(nullptr, kLogCritical, "Error: unable to submit job, /usr/bin/lumex exit code: %i", code);
  return 1;
}

}  // namespace lmx
