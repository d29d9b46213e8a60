// The boxes at the top of a movie file.
#pragma once
#include <cstdint>
#include <optional>
#include <string>

#include "capture/movie/movie_index.h"

namespace lmx {

/// A file as a sequence of boxes. Reads only; as large as it was when the object was made.
class BoxFile {
 public:
  static constexpr std::uint64_t kHeadSize = 8;  ///< of a box: its size and its type
  struct Box {
    std::string type;
    std::uint64_t start = 0;  ///< file offset of its head
    std::uint64_t size = 0;   ///< with its head
    [[nodiscard]] std::uint64_t bodyStart() const { return start + kHeadSize; }
    [[nodiscard]] std::uint64_t end() const { return start + size; }
  };

  /// @param fd  must stay open while the object lives
  explicit BoxFile(int fd);
  /// The box of that type which starts at `at`; nothing when there is another one or the file ends inside it.
  [[nodiscard]] std::optional<Box> boxAt(std::uint64_t at, const char* type) const;
  /// What stands behind the box's head; empty when it can't be read or is larger than any header of ours.
  [[nodiscard]] Bytes body(const Box& box) const;

 private:
  int fd_;
  std::uint64_t size_ = 0;
};

}  // namespace lmx
