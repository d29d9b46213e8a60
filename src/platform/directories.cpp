// Creates directories with their parents, and replaces files so that a power cut leaves the old or the new
// one.
#include "platform/directories.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <string_view>

#include "platform/paths.h"
#include "support/unique_fd.h"

namespace lmx {
namespace {

bool isDirectory(const char* path) {
  struct stat status {};
  return stat(path, &status) == 0 && S_ISDIR(status.st_mode);
}

/// mkdir that treats an existing directory as success, whatever errno the file system reports (read-only ones
/// differ).
int makeOne(const char* path, mode_t mode) {
  if (mkdir(path, mode) == 0) return 0;
  const int error = errno;
  if (isDirectory(path)) return 0;
  return error == EEXIST ? ENOTDIR : error;
}

int writeAll(int fd, std::string_view content) {
  while (!content.empty()) {
    const ssize_t written = write(fd, content.data(), content.size());
    if (written < 0 && errno == EINTR) continue;
    if (written < 0) return errno;
    content.remove_prefix(static_cast<std::size_t>(written));
  }
  return 0;
}

/// Gives the new file the mode and owner of the one it replaces, or `mode` when there is none.
int takeOverAccess(int fd, const std::string& path, mode_t mode) {
  struct stat old {};
  if (stat(path.c_str(), &old) == 0 && S_ISREG(old.st_mode)) {
    mode = old.st_mode & 07777;
    // Only root may change the owner. Failing to keep it must not widen access for others, and it does not:
    // the mode stays the same.
    if (fchown(fd, old.st_uid, old.st_gid) != 0 && errno != EPERM) return errno;
  }
  return fchmod(fd, mode) == 0 ? 0 : errno;
}

int setAccess(int fd, const std::string& path, mode_t mode, OldAccess old) {
  if (old == OldAccess::keep) return takeOverAccess(fd, path, mode);
  return fchmod(fd, mode) == 0 ? 0 : errno;
}

int fillAndRename(int fd, const std::string& temporary, const std::string& path, const std::string& content,
                  mode_t mode, OldAccess old) {
  if (const int error = writeAll(fd, content)) return error;
  if (const int error = setAccess(fd, path, mode, old)) return error;
  if (fsync(fd) != 0) return errno;
  if (rename(temporary.c_str(), path.c_str()) != 0) return errno;
  return 0;
}

}  // namespace

int mkdir_p(const char* path, mode_t mode) {
  if (path == nullptr || *path == '\0') return ENOENT;
  const std::string whole(path);
  for (auto slash = whole.find('/', 1); slash != std::string::npos; slash = whole.find('/', slash + 1)) {
    if (const int error = makeOne(whole.substr(0, slash).c_str(), mode)) return error;
  }
  return makeOne(path, mode);
}

int syncDirectory(const std::string& directory) {
  const UniqueFd fd(open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!fd.valid()) return errno;
  return fsync(fd.get()) == 0 ? 0 : errno;
}

int writeFileAtomically(const std::string& path, const std::string& content, mode_t mode, OldAccess old) {
  const std::string directory = directoryOf(path);
  std::string temporary = directory + "/.lmx-" + path.substr(path.rfind('/') + 1) + ".XXXXXX";
  const UniqueFd fd(mkostemp(temporary.data(), O_CLOEXEC));
  if (!fd.valid()) return errno;
  if (const int error = fillAndRename(fd.get(), temporary, path, content, mode, old)) {
    unlink(temporary.c_str());
    return error;
  }
  return syncDirectory(directory);
}

std::string keepUnderAnotherName(const std::string& path) {
  struct stat status {};
  for (int number = 1; number < 1000; ++number) {
    std::string copy = path + ".unreadable-" + std::to_string(number);
    if (link(path.c_str(), copy.c_str()) == 0) return copy;
    if (errno == EEXIST) continue;
    // Some file systems have no hard links. There the file is renamed instead.
    const int error = errno;
    const bool noLinks = error == EPERM || error == EOPNOTSUPP || error == ENOSYS;
    const bool isFile = lstat(path.c_str(), &status) == 0 && S_ISREG(status.st_mode);
    if (noLinks && isFile && lstat(copy.c_str(), &status) == 0) continue;
    if (noLinks && isFile && rename(path.c_str(), copy.c_str()) == 0) return copy;
    errno = error;
    break;
  }
  return {};
}

}  // namespace lmx
