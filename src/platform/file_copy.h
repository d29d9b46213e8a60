// Copies a file so that an incomplete copy is never visible under the target's name.
#pragma once
#include <sys/types.h>

#include <string>

namespace lmx {

/// Copies `from` to the new name `to` with `mode` and syncs it. The copy appears under its name only once
/// it is complete.
/// @return 0 or the errno; EEXIST when `to` exists, which is never replaced
int copyFileToNewName(const std::string& from, const std::string& to, mode_t mode);

}  // namespace lmx
