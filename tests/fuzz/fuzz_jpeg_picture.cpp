// Feeds arbitrary pictures to the check before the JPEG decoder.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <span>
#include <vector>

#include "capture/media/jpeg_picture.h"

namespace {

void require(bool holds) {
  if (!holds) std::abort();
}

/// A picture of 320 x 224 behind further headers.
std::vector<std::uint8_t> behind(std::span<const std::uint8_t> headers) {
  const std::uint8_t frame[] = {0xFF, 0xC0, 0, 11, 8, 0, 224, 1, 64, 1, 1, 0x22, 0};
  std::vector<std::uint8_t> picture = {0xFF,
                                       0xD8,
                                       0xFF,
                                       0xE1,
                                       static_cast<std::uint8_t>((headers.size() + 2) >> 8),
                                       static_cast<std::uint8_t>((headers.size() + 2) & 0xFF)};
  picture.insert(picture.end(), headers.begin(), headers.end());
  picture.insert(picture.end(), std::begin(frame), std::end(frame));
  return picture;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::span<const std::uint8_t> input(data, size);
  const bool alone = lmx::harmlessJpegPicture(input, 0, 0);
  require(!alone || (size >= 15 && data[0] == 0xFF && data[1] == 0xD8));
  for (const int height : {1, 16, 224, 1080, 65535})
    require(alone || !lmx::harmlessJpegPicture(input, 320, height));
  if (size <= 65000) {
    // What another header holds is not looked at.
    require(lmx::harmlessJpegPicture(behind(input), 320, 224));
    require(!lmx::harmlessJpegPicture(behind(input), 320, 240));
  }
  return 0;
}
