// The usage text.
#pragma once
#include <string>

namespace lmx {

/// Prints the usage text on standard error. @param tool  the name by which the program was called
void usageForTool(const std::string& tool);
/// The last component of argv[0]; empty for null.
std::string toolNameFromPathArg(const char* argument);

}  // namespace lmx
