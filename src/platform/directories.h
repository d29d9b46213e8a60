// Creating and syncing directories, and replacing files atomically.
#pragma once
#include <sys/types.h>

#include <string>

namespace lmx {

/// Creates `path` and every missing parent with `mode`. An existing directory is success.
/// @return 0, or the errno of the failure (ENOTDIR when a file stands in the way).
int mkdir_p(const char* path, mode_t mode);

/// Makes a rename or unlink in `directory` survive a power cut. @return 0 or the errno.
int syncDirectory(const std::string& directory);

/// What becomes of the mode and the owner of a file that is replaced.
enum class OldAccess {
  keep,     ///< the new file takes them over (the owner where permitted)
  discard,  ///< the new file has the mode given and the process's owner, as if there had been no file
};

/// Writes `content` to a temporary file beside `path`, syncs it, renames it over `path` and syncs the
/// directory. A new file gets `mode`; `old` says what happens when it replaces another one.
/// @return 0 or the errno; on failure no temporary file is left behind
int writeFileAtomically(const std::string& path, const std::string& content, mode_t mode,
                        OldAccess old = OldAccess::keep);

/// Gives the file `path` a second name, "PATH.unreadable-N", so that replacing it loses nothing. Needs no
/// read permission. Where hard links are not supported the file is renamed instead.
/// @return the new name, or an empty string on failure (see errno)
std::string keepUnderAnotherName(const std::string& path);

}  // namespace lmx
