// Command-line tools that change the preferences file. They report errors on standard error.
#pragma once
#include "platform/child_process.h"

namespace lmx {

/// Sets "PreviewPath" in the preferences file.
/// @param path  null or empty: not given
/// @return exit status: 0, 64 without a path, 73 when the file can't be written
int setPreviewPath(const char* path);

/// Binds a simulated camera to `server` with the server's tool and sets the preferences up for recordings of
/// the file `path`. Existing identifiers are kept. Blocks until the tool has ended.
/// @param path, user, server  null or empty: not given
/// @return exit status: 0; 64 when an argument is missing; 71 when the tool can't be started; the tool's own
/// status when it fails; 76 when its output is unexpected; 73 when the file can't be written
int bindTestCamera(const char* path, const char* user, const char* server, ChildRunner& children);

}  // namespace lmx
