// The recording settings on standard output, for the operator.
#pragma once

namespace lmx {

/// What the daemon reads from the preferences file.
void dumpDaemon();
/// What the ad-hoc mode reads from the preferences domain.
void dumpAdHoc();

}  // namespace lmx
