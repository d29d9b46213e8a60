// The output of -i.
#pragma once
#include <string>

#include "capture/api/capture_framework.h"
#include "model/codes.h"

namespace lmx {

/// Prints "ad-hoc-prefs", "daemon-prefs" or "zq-device-list". Prints nothing for any other kind.
ProcessEnd printInformation(const std::string& kind, CaptureFramework& framework);

}  // namespace lmx
