// Makes and removes the folder of a capture.
#include "capture/store/capture_files.h"

#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "platform/directories.h"
#include "platform/paths.h"

namespace lmx {
namespace {

int makeFolder(const std::string& folder) {
  // The end of an earlier capture removes the common folder if it is empty, possibly right now: try again.
  int error = ENOENT;
  for (int attempt = 0; error == ENOENT && attempt < 10; ++attempt) error = mkdir_p(folder.c_str(), 0700);
  return error;
}

}  // namespace

std::string captureFolderOf(const std::string& repository) { return repository + "/.lmxagentd"; }

void removeCaptureFiles(const std::string& folder) {
  for (const char* name : {kMediaName, kPartName, kJournalName}) unlink((folder + "/" + name).c_str());
  rmdir(folder.c_str());
  rmdir(directoryOf(folder).c_str());  // only succeeds for the last capture
}

Result<CaptureFiles, CaptureError> CaptureFiles::create(const std::string& repository,
                                                        const std::string& uuid) {
  CaptureFiles files;
  files.folder = captureFolderOf(repository) + "/" + uuid;
  if (const int error = makeFolder(files.folder)) {
    return CaptureError{CaptureError::kDomain, kWriteFailed,
                        "can't make " + files.folder + ": " + std::strerror(error)};
  }
  auto journal = Journal::create(files.folder + "/" + kJournalName);
  const int error =
      journal ? files.movie.create(files.folder + "/" + kMediaName) : journal.error().systemError;
  if (error == 0) {
    files.journal = *std::move(journal);
    return files;
  }
  if (journal) removeCaptureFiles(files.folder);
  rmdir(files.folder.c_str());
  return CaptureError{CaptureError::kDomain, error == ENOSPC ? kNoSpace : kWriteFailed,
                      "can't write to " + files.folder + ": " + std::strerror(error)};
}

}  // namespace lmx
