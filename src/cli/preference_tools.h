// The command line's tools that change the preferences file. They say what is wrong on standard error.
#pragma once
#include "platform/child_process.h"

namespace lmx {

/// Sets "PreviewPath" in the preferences file. @param path  null or empty: none was given
/// @return exit status: 0, 64 without a path, 73 when the file can't be written
int setPreviewPath(const char* path);

/// Binds a simulated camera to `server` with the server's tool and prepares the preferences for recordings of
/// the file `path`. Identifiers that are there already are kept. Blocks until the tool has ended.
/// @param path, user, server  null or empty: not given
/// @return exit status: 0; 64 when something was not given; 71 when the tool can't be started; the tool's own
/// when it fails; 76 when it says something else than expected; 73 when the file can't be written
int bindTestCamera(const char* path, const char* user, const char* server, ChildRunner& children);

}  // namespace lmx
