// The commands that the ad-hoc client sends to the daemon. Pure.
#pragma once
#include <string>

#include "model/run_options.h"

namespace lmx {

/// The command for the request in `options`, with its line feed. Values are inserted unescaped.
std::string adHocCommand(const RunOptions& options);

}  // namespace lmx
