// The directory that stands in front of the system's fixed paths in these tests.
#pragma once
#include <string>

namespace lmx::testing {

/// Made before main, since the environment is read once; removed when the program ends.
const std::string& testRoot();

}  // namespace lmx::testing
