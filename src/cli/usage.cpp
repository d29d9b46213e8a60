// Prints the usage text.
#include "cli/usage.h"

#include <cstdio>
#include <cstring>

#include "agent/agent_environment.h"

namespace lmx {

std::string toolNameFromPathArg(const char* argument) {
  const char* slash = argument == nullptr ? nullptr : std::strrchr(argument, '/');
  return slash != nullptr ? slash + 1 : argument != nullptr ? argument : "";
}

void usageForTool(const std::string& tool) {
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

}  // namespace lmx
