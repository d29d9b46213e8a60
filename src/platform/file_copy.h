// Copying a file without ever showing half of it.
#pragma once
#include <string>

namespace lmx {

/// Copies `from` to the new name `to`, mode 0644, synced. The copy appears under its name only when it is
/// whole.
/// @return 0 or the errno; EEXIST when the name is taken, which is never replaced
int copyFileToNewName(const std::string& from, const std::string& to);

}  // namespace lmx
