// The submission tool's arguments. Pure.
#pragma once
#include <optional>
#include <string>
#include <vector>

namespace lmx {

struct Submission {
  std::string server;
  std::string recordingUUID;
  /// Of an ad-hoc submission of `file`; absent for a recording of the repository.
  std::optional<std::string> workflow = {};
  // Read with a workflow only.
  std::string file = {};
  std::string user = {};
  std::string password = {};
};

/// Everything behind the tool's name.
std::vector<std::string> submissionArguments(const Submission& submission);

}  // namespace lmx
