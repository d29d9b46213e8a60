// A disk that loses data, or takes none.
#pragma once

namespace lmx::testing {

/// While it lives, fdatasync of this program does not return. Any thread.
class HeldSyncs {
 public:
  HeldSyncs();
  ~HeldSyncs();
  HeldSyncs(const HeldSyncs&) = delete;
  HeldSyncs& operator=(const HeldSyncs&) = delete;
  [[nodiscard]] static bool anyHeld();
};

/// The next `count` calls of fdatasync in this program fail with EIO, those behind them succeed. Any thread.
void failNextSyncs(int count);

}  // namespace lmx::testing
