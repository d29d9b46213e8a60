// Copies and renames files without replacing any, and without showing an incomplete copy.
#pragma once
#include <sys/types.h>

#include <string>

namespace lmx {

/// Copies `from` to the new name `to` with `mode` and syncs it. The copy appears under its name only once
/// it is complete.
/// @return 0 or the errno; EEXIST when `to` exists, which is never replaced
int copyFileToNewName(const std::string& from, const std::string& to, mode_t mode);

/// Renames `from` to the new name `to` on the same file system. @return 0 or the errno; EEXIST when `to`
/// exists (also as a dangling link), which is never replaced
int renameToFreeName(const std::string& from, const std::string& to);

}  // namespace lmx
