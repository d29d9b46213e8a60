// Handing a recording to the server's tool.
#pragma once
#include <optional>
#include <string>
#include <vector>

#include "platform/child_process.h"

namespace lmx {

struct SubmissionRequest {
  std::string server;
  std::string recordingUUID;
  /// Of an ad-hoc submission of `file`; absent for a recording of the repository.
  std::optional<std::string> workflow = {};
  // Read with a workflow only.
  std::string file = {};
  std::string user = {};
  std::string password = {};
};

/// Everything behind the tool's name. Pure.
std::vector<std::string> submissionArguments(const SubmissionRequest& request);

/// Runs the tool; blocks until it has ended, however long that takes. @return 0 when it exited with 0, else 1
/// (logged)
int submitWithTool(ChildRunner& children, const std::vector<std::string>& arguments);

/// Logs that nothing could be submitted. @return 1
int failedBeforeTheTool();

}  // namespace lmx
