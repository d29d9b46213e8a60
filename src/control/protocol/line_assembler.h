// Turns received chunks into lines, at most one line a chunk.
#pragma once
#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

namespace lmx {

/// Most bytes kept of a command that has not ended yet: a peer must not own the machine's memory.
inline constexpr std::size_t kPartialCommandLimit = 1U << 20;

/// Pure; one thread at a time. Holds the partial command, which outlives connections on purpose: what one
/// peer left unfinished stands in front of the first line of the next.
class LineAssembler {
 public:
  /// What one chunk led to.
  struct Result {
    std::optional<std::string>
        line;               ///< the one line to execute; keeps its line feed when it came in one chunk
    bool appended = false;  ///< the chunk went behind an existing partial command
    bool dropped = false;   ///< the partial command outgrew the limit and is gone
    bool operator==(const Result&) const = default;
  };

  explicit LineAssembler(std::size_t limit = kPartialCommandLimit) : limit_(limit) {}

  /// Takes one chunk; what follows an embedded NUL is ignored. Only the first line feed of a chunk ends a
  /// line: further lines wait, with their line feeds, and are joined in front of the next chunk's first line.
  /// A command longer than the limit is dropped with all that came of it so far, its line feed included;
  /// what comes next begins a new command.
  Result feed(std::string_view received);

  /// The bytes that wait for their line feed; absent is not the same as empty.
  [[nodiscard]] const std::optional<std::string>& partialCommand() const { return partial_; }

 private:
  std::size_t limit_;
  std::optional<std::string> partial_;
};

}  // namespace lmx
