// Directories and files that survive a crash.
#include "support/directories.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "support/unique_fd.h"

namespace lmx {
namespace {

int makeOne(const std::string& path, mode_t mode) {
  if (mkdir(path.c_str(), mode) == 0) return 0;
  const int error = errno;
  struct stat info {};
  if (stat(path.c_str(), &info) == 0) return S_ISDIR(info.st_mode) ? 0 : ENOTDIR;
  return error;
}

int writeAndSync(int fd, const std::string& content) {
  std::size_t done = 0;
  while (done < content.size()) {
    const ssize_t n = write(fd, content.data() + done, content.size() - done);
    if (n < 0 && errno == EINTR) continue;
    if (n < 0) return errno;
    done += static_cast<std::size_t>(n);
  }
  return fsync(fd) == 0 ? 0 : errno;
}

}  // namespace

int mkdir_p(const char* path, mode_t mode) {
  const std::string whole = path == nullptr ? "" : path;
  if (whole.empty()) return ENOENT;
  for (std::size_t at = whole.find('/', 1); at != std::string::npos; at = whole.find('/', at + 1)) {
    if (const int error = makeOne(whole.substr(0, at), mode)) return error;
  }
  return makeOne(whole, mode);
}

int syncDirectory(const std::string& directory) {
  const UniqueFd fd(open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!fd.valid()) return errno;
  return fsync(fd.get()) == 0 ? 0 : errno;
}

int writeFileAtomically(const std::string& path, const std::string& content, mode_t mode) {
  struct stat old {};
  const bool replaces = stat(path.c_str(), &old) == 0;
  std::string temporary = path + ".XXXXXX";
  UniqueFd file(mkostemp(temporary.data(), O_CLOEXEC));
  if (!file.valid()) return errno;
  int error = fchmod(file.get(), replaces ? old.st_mode & 07777 : mode) == 0 ? 0 : errno;
  // Only root may give a file away; a file that becomes ours is better than none.
  if (replaces && fchown(file.get(), old.st_uid, old.st_gid) != 0) errno = 0;
  if (error == 0) error = writeAndSync(file.get(), content);
  if (error == 0 && rename(temporary.c_str(), path.c_str()) != 0) error = errno;
  if (error != 0) {
    unlink(temporary.c_str());
    return error;
  }
  const std::size_t slash = path.rfind('/');
  return syncDirectory(slash == std::string::npos ? "." : slash == 0 ? "/" : path.substr(0, slash));
}

}  // namespace lmx
