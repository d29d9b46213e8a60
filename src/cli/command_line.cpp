// Reads options with getopt.
#include "cli/command_line.h"

#include <getopt.h>

#include <cstdio>
#include <ctime>
#include <optional>
#include <string>

#include "agent/agent_environment.h"
#include "cli/information.h"
#include "cli/preference_tools.h"
#include "cli/usage.h"
#include "model/codes.h"
#include "support/date_text.h"
#include "support/scan.h"
#include "support/time_value.h"
#include "support/utf8.h"

namespace lmx {
namespace {

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

/// The date `delay` (seconds, positive) from now, in the form that timers use.
std::optional<std::string> dateAfter(const char* delay) {
  const auto seconds = scanReal(delay);
  const auto now = lmp_gettimeofday();
  // A delay of more than 3000 years is a mistake.
  if (!now || !seconds || !(*seconds > 0) || *seconds > 1e11) return std::nullopt;
  const double begin = static_cast<double>(now->tv_sec) + static_cast<double>(now->tv_usec) * 1e-6;
  return dateText(static_cast<std::time_t>(begin + *seconds));
}

}  // namespace

bool CommandLine::parseArgs(char* const* argv, int count, int* exitCode) {
  int code = 0;
  const bool goOn = readOptions(argv, count, code);
  if (exitCode != nullptr) *exitCode = code;
  return goOn;
}

bool CommandLine::readOptions(char* const* argv, int count, int& exitCode) {
  optind = 0;  // makes GNU getopt start over
  opterr = 1;
  for (int option = 0; (option = getopt_long(count, argv, kShortOptions, kLongOptions, nullptr)) != -1;) {
    if (takeToolOption(option) || takeAdHocOption(option)) continue;
    exitCode = exitStatus(stopAtOption(option, count > 0 ? argv[0] : nullptr));
    return false;
  }
  if (!combinationAllowed()) {
    exitCode = exitStatus(ProcessEnd::usage);
    return false;
  }
  if (test_path_ == nullptr && preview_path_ == nullptr) return true;
  exitCode = runTools();
  return false;
}

ProcessEnd CommandLine::stopAtOption(int option, const char* program) {
  switch (option) {
    case 'f':
      std::fputs("The -f option requires a path in UTF-8\n", stderr);
      return ProcessEnd::operatingSystem;
    case 'i':
      return printInformation(optarg, framework_);
    case 'v':
      std::fprintf(stderr, "\nLumex lmxagentd (version %.0f)\n\n", kVersion);
      return ProcessEnd::orderly;
    default:
      usageForTool(toolNameFromPathArg(program));
      return option == 'h' || option == 'H' ? ProcessEnd::orderly : ProcessEnd::usage;
  }
}

bool CommandLine::takeToolOption(int option) {
  switch (option) {
    case 'c':
      server_ = optarg;
      return true;
    case 'd':
      duration_given_ = true;
      number_ = scanInteger(optarg).value_or(number_);
      options_.duration.set(number_);
      return true;
    case 'p':
      preview_path_ = optarg;
      return true;
    case 's':
      options_.submit_disabled.set(true);
      return true;
    case 't':
      test_path_ = optarg;
      return true;
    case 'Z':
      number_ = scanInteger(optarg).value_or(number_);
      options_.unattended.set(number_);
      return true;
    default:
      return false;
  }
}

void CommandLine::ask(AdHocRequest request) {
  options_.adhoc.set(true);
  options_.adhoc_request_type.set(request);
}

bool CommandLine::takeAdHocOption(int option) {
  switch (option) {
    case 'f':
      if (!isUtf8(optarg)) return false;
      options_.adhoc.set(true);
      options_.adhoc_output_file.set(optarg);
      return true;
    case 'u':
      options_.user.set(optarg);
      return true;
    case 'P':
      options_.password.set(optarg);
      return true;
    case 'S':
      ask(kAdHocStatus);
      return true;
    case 'L':
      ask(kAdHocTimerList);
      return true;
    case 'R':
      ask(kAdHocTimerRevoke);
      options_.timer_id.set(optarg);
      return true;
    case 'T':
      options_.start_timer.set(optarg);
      return true;
    case 'U':
      if (const auto start = dateAfter(optarg)) options_.start_timer.set(start);
      return true;
    default:
      return false;
  }
}

bool CommandLine::combinationAllowed() const {
  if (duration_given_ && !options_.adhoc.get()) {
    std::fputs("The -d option only applies to ad-hoc mode (requires a file path)\n", stderr);
    return false;
  }
  if (!options_.user.get() && options_.adhoc.get() && !options_.submit_disabled.get() &&
      options_.adhoc_request_type.get() == kAdHocRecording) {
    std::fputs("A user name is required for ad-hoc file submission.\n", stderr);
    return false;
  }
  return true;
}

int CommandLine::runTools() {
  if (test_path_ != nullptr) {
    const auto user = options_.user.get();
    const int status = bindTestCamera(test_path_, user ? user->c_str() : nullptr, server_, children_);
    if (status != 0) return status;
  }
  return preview_path_ == nullptr ? 0 : setPreviewPath(preview_path_);
}

}  // namespace lmx
