// Prints settings and devices.
#include "cli/information.h"

#include <cstdio>
#include <exception>
#include <memory>

#include "capture/api/capture_framework.h"
#include "platform/log.h"
#include "prefs/preference_dump.h"
#include "prefs/recording_context.h"
#include "support/redacted.h"

namespace lmx {
namespace {

void printContext(const char* kind, const std::shared_ptr<LMRRecordingContext>& context) {
  std::fputs("\n", stdout);
  const std::string text = context ? describe(*context) : "(null)";
  LMPLogMessage(nullptr, kLogNotice, "Got recording context (with %s): %s", kind, text.c_str());
  std::fprintf(stderr, "Got recording context (with %s): %s\n", kind, text.c_str());
  std::fputs("\n", stdout);
}

}  // namespace

ProcessEnd printInformation(const std::string& kind, CaptureFramework& framework) {
  try {
    if (kind == "ad-hoc-prefs") {
      printContext("ad-hoc-prefs", newRecordingContextForAdHoc(framework));
      dumpAdHoc();
    } else if (kind == "daemon-prefs") {
      printContext("daemon-prefs", newRecordingContextForDaemon(framework));
      dumpDaemon();
    } else if (kind == "zq-device-list") {
      std::fputs(redacted(framework.deviceInformation(pictureLimitsInPrefs())).c_str(), stdout);
    }
  } catch (const std::exception& error) {
    LMPLogMessage(nullptr, kLogCritical, "Exception caught: %s", error.what());
    std::fprintf(stderr, "Exception caught: %s\n", error.what());
    return ProcessEnd::software;
  }
  return ProcessEnd::orderly;
}

}  // namespace lmx
