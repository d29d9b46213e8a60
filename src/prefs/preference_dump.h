// Prints the recording settings on standard output, for the operator.
#pragma once

namespace lmx {

/// Settings that the daemon reads from the preferences file.
void dumpDaemon();
/// Settings that ad-hoc mode reads from the preferences domain.
void dumpAdHoc();

}  // namespace lmx
