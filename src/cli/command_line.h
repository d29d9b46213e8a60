// The options of the command line.
#pragma once
#include "capture/api/capture_framework.h"
#include "model/codes.h"
#include "model/run_options.h"
#include "platform/child_process.h"

namespace lmx {

/// Reads one command line. Its messages go to standard error.
class CommandLine {
 public:
  /// All of them outlive the object. @param options  gets what the options ask for
  CommandLine(RunOptions& options, CaptureFramework& framework, ChildRunner& children)
      : options_(options), framework_(framework), children_(children) {}

  /// Reads the options and runs the tools among them. Call it once.
  /// @return YES when the program is to go on to its start-up; NO when it is to exit with `*exitCode`
  bool parseArgs(char* const* argv, int count, int* exitCode);

 private:
  bool readOptions(char* const* argv, int count, int& exitCode);
  /// An option that ends the reading.
  ProcessEnd stopAtOption(int option, const char* program);
  /// @return whether it was one of these (and could be taken)
  bool takeToolOption(int option);
  bool takeAdHocOption(int option);
  void ask(AdHocRequest request);
  [[nodiscard]] bool combinationAllowed() const;
  int runTools();

  RunOptions& options_;
  CaptureFramework& framework_;
  ChildRunner& children_;
  // What is asked of the tools that change the preferences file. The texts are argv's.
  bool duration_given_ = false;
  int number_ = 0;  ///< of the last -d or -Z that could be read: a later one that can't repeats it
  const char* server_ = nullptr;
  const char* preview_path_ = nullptr;
  const char* test_path_ = nullptr;
};

}  // namespace lmx
