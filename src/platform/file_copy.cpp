// Copies to a temporary file beside the target, then renames it.
#include "platform/file_copy.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>

#include "platform/directories.h"
#include "platform/paths.h"
#include "support/unique_fd.h"

namespace lmx {
namespace {

int copyContents(int from, int to) {
  char buffer[1 << 16];
  for (;;) {
    const ssize_t n = read(from, buffer, sizeof buffer);
    if (n < 0 && errno == EINTR) continue;
    if (n < 0) return errno;
    if (n == 0) return fsync(to) == 0 ? 0 : errno;
    for (ssize_t done = 0; done < n;) {
      const ssize_t w = write(to, buffer + done, static_cast<std::size_t>(n - done));
      if (w < 0 && errno == EINTR) continue;
      if (w < 0) return errno;
      done += w;
    }
  }
}

bool nameTaken(const std::string& path) {
  struct stat status {};
  return lstat(path.c_str(), &status) == 0;  // true for a dangling link, too
}

}  // namespace

int renameToFreeName(const std::string& from, const std::string& to) {
  if (renameat2(AT_FDCWD, from.c_str(), AT_FDCWD, to.c_str(), RENAME_NOREPLACE) == 0) return 0;
  // Some file systems don't support RENAME_NOREPLACE. There only a check beforehand protects an existing
  // file.
  if (errno != EINVAL && errno != ENOSYS) return errno;
  if (nameTaken(to)) return EEXIST;
  return rename(from.c_str(), to.c_str()) == 0 ? 0 : errno;
}

int copyFileToNewName(const std::string& from, const std::string& to, mode_t mode) {
  if (nameTaken(to)) return EEXIST;
  const UniqueFd source(open(from.c_str(), O_RDONLY | O_CLOEXEC));
  if (!source.valid()) return errno;
  std::string temporary = directoryOf(to) + "/.lmx-copy.XXXXXX";
  const UniqueFd target(mkostemp(temporary.data(), O_CLOEXEC));
  if (!target.valid()) return errno;
  int error = copyContents(source.get(), target.get());
  if (error == 0 && fchmod(target.get(), mode) != 0) error = errno;
  if (error == 0) error = renameToFreeName(temporary, to);
  if (error != 0) {
    unlink(temporary.c_str());
    return error;
  }
  return syncDirectory(directoryOf(to));
}

}  // namespace lmx
