// Reads and writes whole blocks at an offset.
#pragma once
#include <cstdint>
#include <span>

namespace lmx {

/// Writes all of `bytes` at `offset`. @return 0 or the errno; part of it may be written then
int writeAllAt(int fd, std::span<const std::uint8_t> bytes, std::uint64_t offset);

/// Fills `bytes` from `offset` on. @return 0 or the errno; EIO when the file ends before
int readAllAt(int fd, std::span<std::uint8_t> bytes, std::uint64_t offset);

}  // namespace lmx
