// The options of the command line.
#pragma once
#include "capture/api/capture_framework.h"
#include "model/codes.h"
#include "model/run_options.h"
#include "platform/child_process.h"

namespace lmx {

/// Parses one command line. Messages go to standard error.
class CommandLine {
 public:
  /// All arguments outlive the object. @param options  receives the values of the options
  CommandLine(RunOptions& options, CaptureFramework& framework, ChildRunner& children)
      : options_(options), framework_(framework), children_(children) {}

  /// Reads the options and runs the tools they ask for. Call once.
  /// @return YES when start-up should continue; NO when the program should exit with `*exitCode`
  bool parseArgs(char* const* argv, int count, int* exitCode);

 private:
  bool readOptions(char* const* argv, int count, int& exitCode);
  /// Handles an option that ends the parsing.
  ProcessEnd stopAtOption(int option, const char* program);
  /// @return whether it was one of these options and its value was accepted
  bool takeToolOption(int option);
  bool takeAdHocOption(int option);
  void ask(AdHocRequest request);
  [[nodiscard]] bool combinationAllowed() const;
  int runTools();

  RunOptions& options_;
  CaptureFramework& framework_;
  ChildRunner& children_;
  // Arguments of the tools that change the preferences file. The strings belong to argv.
  bool duration_given_ = false;
  int number_ = 0;  ///< value of the last valid -d or -Z; a later invalid one repeats it
  const char* server_ = nullptr;
  const char* preview_path_ = nullptr;
  const char* test_path_ = nullptr;
};

}  // namespace lmx
