// A disk that loses data.
#pragma once

namespace lmx::testing {

/// The next `count` calls of fdatasync in this program fail with EIO, those behind them succeed. Any thread.
void failNextSyncs(int count);

}  // namespace lmx::testing
