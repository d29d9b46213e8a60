// What the ad-hoc client asks of the daemon. Pure.
#pragma once
#include <string>

#include "model/run_options.h"

namespace lmx {

/// The command line for the request in `options`, with its line feed. Values are put in as they are.
std::string adHocCommand(const RunOptions& options);

}  // namespace lmx
