// Submits a recording with the server's tool.
#pragma once
#include <optional>
#include <string>
#include <vector>

#include "platform/child_process.h"

namespace lmx {

struct SubmissionRequest {
  std::string server;
  std::string recordingUUID;
  /// For an ad-hoc submission of `file`; absent for a recording from the repository.
  std::optional<std::string> workflow = {};
  // Used only with a workflow.
  std::string file = {};
  std::string user = {};
  std::string password = {};
};

/// The tool's arguments without its name. Pure.
std::vector<std::string> submissionArguments(const SubmissionRequest& request);

/// Runs the tool and blocks until it ends, however long that takes.
/// @return 0 when it exited with 0, else 1 (logged)
int submitWithTool(ChildRunner& children, const std::vector<std::string>& arguments);

/// Logs that the tool could not be run. @return 1
int failedBeforeTheTool();

}  // namespace lmx
