// The options of the command line.
#include <getopt.h>

#include <cstdio>
#include <cstring>
#include <exception>

#include "agent/agent_main.h"
#include "platform/log.h"

namespace lmx {
namespace {

constexpr int kExitUsage = 64;
constexpr int kExitSoftware = 70;

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
      printContext("ad-hoc-prefs", AgentPreferences::newRecordingContextForAdHoc(framework));
      AgentPreferences::dumpAdHoc();
    } else if (kind == "daemon-prefs") {
      printContext("daemon-prefs", AgentPreferences::newRecordingContextForDaemon(framework));
      AgentPreferences::dumpDaemon();
    } else if (kind == "zq-device-list") {
      std::fputs(framework->deviceInformation().c_str(), stdout);
    }
  } catch (const std::exception& error) {
    LMPLogMessage(nullptr, kLogCritical, "Exception caught: %s", error.what());
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
  const auto stopWith = [exitCode](int code) {
    if (exitCode != nullptr) *exitCode = code;
    return false;
  };
  if (exitCode != nullptr) *exitCode = 0;
  const std::string tool = toolNameFromPathArg(count > 0 ? argv[0] : nullptr);
  optind = 1;
  opterr = 1;
  for (int option = 0; (option = getopt(count, argv, "hHi:sv")) != -1;) {
    switch (option) {
      case 'h':
      case 'H':
        usageForTool(tool);
        return stopWith(0);
      case 'i':
        return stopWith(printInformation(optarg, environment_.framework));
      case 's':
        context_->setSubmit_disabled(true);
        break;
      case 'v':
        std::fprintf(stderr, "\nLumex lmxagentd (version %.0f)\n\n", kVersion);
        return stopWith(0);
      default:
        usageForTool(tool);
        return stopWith(kExitUsage);
    }
  }
  return true;
}

}  // namespace lmx
