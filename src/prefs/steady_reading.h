// Settings files that can't be read for a moment.
#pragma once
#include <functional>
#include <optional>
#include <string>

#include "platform/plist/property_list.h"

namespace lmx {

/// What is known of a settings file.
struct SteadyReading {
  /// The contents, or why the file counts as missing. While it is unreadable: what was last read from it, or
  /// that error when nothing ever was.
  PlistResult file;
  std::optional<Error> unreadable;  ///< the passing reason why it can't be read at present
};

/// Whether the same file may be readable a moment later: no free descriptor or memory, an I/O error, no
/// permission and the like. A path that names no file, or no regular file, will not mend by itself.
bool isPassing(const Error& error);

/// Reads a property list. A passing failure does not count as a missing file. One error line says when such
/// failures begin, one notice when they are over, whoever reads: the memory is one for the process.
/// Thread-safe.
SteadyReading readSteadily(const std::string& path);

/// Reads with `reader` instead (empty: again from the file system), and forgets all that was read.
void setSettingsReaderForTesting(std::function<PlistResult(const std::string& path)> reader);

}  // namespace lmx
