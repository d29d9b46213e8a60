// Pictures that can't be read, and how long that may last. Pure.
#pragma once
#include <optional>

namespace lmx {

/// A picture that can't be read is replaced with the one before it: a lecture must not be that for hours
/// without anybody knowing. Not thread-safe.
class UnreadablePictures {
 public:
  enum class News {
    none,
    again,    ///< they can be read again, after a second at least
    hopeless  ///< none could be read for so long that none will be; once
  };

  /// @param t  running time of the picture, seconds; ascending
  News note(double t, bool readable);
  /// For how long none could be read before the last one that could, seconds.
  [[nodiscard]] double lasted() const { return lasted_; }

 private:
  std::optional<double> since_;  ///< the first of those that can't be read
  bool told_ = false;
  double lasted_ = 0;
};

}  // namespace lmx
