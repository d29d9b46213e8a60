// Making and syncing directories.
#pragma once
#include <sys/types.h>

#include <string>

namespace lmx {

/// Creates `path` and every missing parent with `mode`. An existing directory is success.
/// @return 0, or the errno of the failure (ENOTDIR when a file stands in the way).
int mkdir_p(const char* path, mode_t mode);

/// Makes a rename or unlink in `directory` survive a power cut. @return 0 or the errno.
int syncDirectory(const std::string& directory);

/// Writes `content` beside `path`, syncs it, renames it over `path` and syncs the directory.
/// The mode (and, where allowed, the owner) of an existing file is kept, else `mode` holds. @return 0 or the
/// errno; on failure nothing is left behind.
int writeFileAtomically(const std::string& path, const std::string& content, mode_t mode);

/// Gives the file `path` a second name, "PATH.unreadable-N", so that replacing it loses nothing; needs no
/// right to read it. Where a file can have one name only, the second replaces the first. @return that name,
/// empty when it could not be done (errno tells why)
std::string keepUnderAnotherName(const std::string& path);

}  // namespace lmx
