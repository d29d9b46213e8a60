// The options of the command line.
#include <getopt.h>

#include <cstdio>
#include <cstring>
#include <ctime>
#include <exception>

#include "agent/agent_main.h"
#include "capture/api/capture_framework.h"
#include "cli/adhoc_command.h"
#include "cli/preference_tools.h"
#include "model/codes.h"
#include "platform/log.h"
#include "prefs/preference_dump.h"
#include "prefs/recording_context.h"
#include "support/date_text.h"
#include "support/scan.h"
#include "support/utf8.h"

namespace lmx {

/// What the options ask of the tools that change the preferences file. The texts are argv's.
struct AgentMain::ToolRequest {
  bool durationGiven = false;
  int number = 0;  ///< of the last -d or -Z that could be read: a later one that can't repeats it
  const char* server = nullptr;
  const char* previewPath = nullptr;
  const char* testPath = nullptr;
};

namespace {

constexpr int kExitUsage = 64;
constexpr int kExitSoftware = 70;
constexpr int kExitOperatingSystem = 71;

constexpr const char* kShortOptions = "c:d:f:hHi:p:st:u:vZ:";
constexpr option kLongOptions[] = {{"unattended_minutes", required_argument, nullptr, 'Z'},
                                   {"max_duration", required_argument, nullptr, 'd'},
                                   {"file", required_argument, nullptr, 'f'},
                                   {"password", required_argument, nullptr, 'P'},
                                   {"status", no_argument, nullptr, 'S'},
                                   {"timerstart", required_argument, nullptr, 'T'},
                                   {"timerdelay", required_argument, nullptr, 'U'},
                                   {"timerlist", no_argument, nullptr, 'L'},
                                   {"timerrevoke", required_argument, nullptr, 'R'},
                                   {nullptr, 0, nullptr, 0}};

/// The date that lies `delay` (seconds, positive) ahead, as timers write it.
std::optional<std::string> dateAfter(const char* delay) {
  const auto seconds = scanReal(delay);
  const auto now = lmp_gettimeofday();
  // Beyond ten thousand years no calendar can tell the date.
  if (!now || !seconds || !(*seconds > 0) || *seconds > 1e11) return std::nullopt;
  const double begin = static_cast<double>(now->tv_sec) + static_cast<double>(now->tv_usec) * 1e-6;
  return dateText(static_cast<std::time_t>(begin + *seconds));
}

void printContext(const char* kind, const std::shared_ptr<LMRRecordingContext>& context) {
  std::fputs("\n", stdout);
  const std::string text = context ? describe(*context) : "(null)";
  LMPLogMessage(nullptr, kLogNotice, "Got recording context (with %s): %s", kind, text.c_str());
  std::fprintf(stderr, "Got recording context (with %s): %s\n", kind, text.c_str());
  std::fputs("\n", stdout);
}

/// @return the exit code.
int printInformation(const std::string& kind, const std::shared_ptr<CaptureFramework>& framework) {
  try {
    if (kind == "ad-hoc-prefs") {
      printContext("ad-hoc-prefs", newRecordingContextForAdHoc(*framework));
      dumpAdHoc();
    } else if (kind == "daemon-prefs") {
      printContext("daemon-prefs", newRecordingContextForDaemon(*framework));
      dumpDaemon();
    } else if (kind == "zq-device-list") {
      std::fputs(framework->deviceInformation().c_str(), stdout);
    }
  } catch (const std::exception& error) {
    LMPLogMessage(nullptr, kLogCritical, "Exception caught: %s", error.what());
    std::fprintf(stderr, "Exception caught: %s\n", error.what());
    return kExitSoftware;
  }
  return 0;
}

}  // namespace

std::string AgentMain::toolNameFromPathArg(const char* argument) {
  const char* slash = argument == nullptr ? nullptr : std::strrchr(argument, '/');
  return slash != nullptr ? slash + 1 : argument != nullptr ? argument : "";
}

void AgentMain::usageForTool(const std::string& tool) {
  const char* name = tool.c_str();
  std::fprintf(stderr, "\n%s (version %.0f)\n\n", name, kVersion);
  std::fprintf(
      stderr,
      "usage: %s [-dhsv] [-i [ad-hoc-prefs | daemon-prefs | zq-device-list]] [-f file_output_path]\n\n",
      name);
  std::fputs(
      "\t    -h (help usage)\n"
      "\t    -v (print version and application validity)\n"
      "\t    -d (duration in seconds of an ad-hoc recording)\n"
      "\t    -i (print the requested type of information)\n"
      "\t    -s (disables submission post-process step, enabled by default)\n"
      "\t    -f file_output_path (runs an ad-hoc capture on this machine)\n",
      stderr);
  std::fprintf(stderr, "\nexample: %s -s\n\n", name);
}

bool AgentMain::parseArgs(char* const* argv, int count, int* exitCode) {
  int code = 0;
  const bool goOn = readOptions(argv, count, code);
  if (exitCode != nullptr) *exitCode = code;
  return goOn;
}

bool AgentMain::readOptions(char* const* argv, int count, int& exitCode) {
  const std::string tool = toolNameFromPathArg(count > 0 ? argv[0] : nullptr);
  ToolRequest request;
  optind = 0;  // GNU's way to begin anew
  opterr = 1;
  for (int option = 0; (option = getopt_long(count, argv, kShortOptions, kLongOptions, nullptr)) != -1;) {
    if (takeToolOption(option, request) || takeAdHocOption(option)) continue;
    exitCode = stopAtOption(option, tool);
    return false;
  }
  if (!combinationAllowed(request)) {
    exitCode = kExitUsage;
    return false;
  }
  if (request.testPath == nullptr && request.previewPath == nullptr) return true;
  exitCode = runTools(request);
  return false;
}

int AgentMain::stopAtOption(int option, const std::string& tool) {
  switch (option) {
    case 'f':
      std::fputs("The -f option requires a path in UTF-8\n", stderr);
      return kExitOperatingSystem;
    case 'i':
      return printInformation(optarg, environment_.framework);
    case 'v':
      std::fprintf(stderr, "\nLumex lmxagentd (version %.0f)\n\n", kVersion);
      return 0;
    default:
      usageForTool(tool);
      return option == 'h' || option == 'H' ? 0 : kExitUsage;
  }
}

bool AgentMain::takeToolOption(int option, ToolRequest& request) {
  switch (option) {
    case 'c':
      request.server = optarg;
      return true;
    case 'd':
      request.durationGiven = true;
      request.number = scanInteger(optarg).value_or(request.number);
      context_->options.duration.set(request.number);
      return true;
    case 'p':
      request.previewPath = optarg;
      return true;
    case 's':
      context_->options.submit_disabled.set(true);
      return true;
    case 't':
      request.testPath = optarg;
      return true;
    case 'Z':
      request.number = scanInteger(optarg).value_or(request.number);
      context_->options.unattended.set(request.number);
      return true;
    default:
      return false;
  }
}

bool AgentMain::takeAdHocOption(int option) {
  const auto ask = [this](AdHocRequest type) {
    context_->options.adhoc.set(true);
    context_->options.adhoc_request_type.set(type);
  };
  switch (option) {
    case 'f':
      if (!isUtf8(optarg)) return false;
      context_->options.adhoc.set(true);
      context_->options.adhoc_output_file.set(optarg);
      return true;
    case 'u':
      context_->options.user.set(optarg);
      return true;
    case 'P':
      context_->options.password.set(optarg);
      return true;
    case 'S':
      ask(kAdHocStatus);
      return true;
    case 'L':
      ask(kAdHocTimerList);
      return true;
    case 'R':
      ask(kAdHocTimerRevoke);
      context_->options.timer_id.set(optarg);
      return true;
    case 'T':
      context_->options.start_timer.set(optarg);
      return true;
    case 'U':
      if (const auto start = dateAfter(optarg)) context_->options.start_timer.set(start);
      return true;
    default:
      return false;
  }
}

bool AgentMain::combinationAllowed(const ToolRequest& request) const {
  if (request.durationGiven && !context_->options.adhoc.get()) {
    std::fputs("The -d option only applies to ad-hoc mode (requires a file path)\n", stderr);
    return false;
  }
  if (!context_->options.user.get() && context_->options.adhoc.get() &&
      !context_->options.submit_disabled.get() &&
      context_->options.adhoc_request_type.get() == kAdHocRecording) {
    std::fputs("A user name is required for ad-hoc file submission.\n", stderr);
    return false;
  }
  return true;
}

int AgentMain::runTools(const ToolRequest& request) {
  if (request.testPath != nullptr) {
    const auto user = context_->options.user.get();
    const int status = bindTestCamera(request.testPath, user ? user->c_str() : nullptr, request.server,
                                      *environment_.children);
    if (status != 0) return status;
  }
  return request.previewPath == nullptr ? 0 : setPreviewPath(request.previewPath);
}

}  // namespace lmx
