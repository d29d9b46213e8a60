// The submission tool's arguments. Pure.
#pragma once
#include <string>
#include <vector>

namespace lmx {

struct Submission {
  std::string server;
  std::string recordingUUID;
  // Of an ad-hoc submission to a workflow; otherwise empty.
  std::string workflow;
  std::string file;
  std::string user;
  std::string password;
};

/// Everything behind the tool's name.
std::vector<std::string> submissionArguments(const Submission& submission);

}  // namespace lmx
