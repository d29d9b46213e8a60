// Reads the headers of JPEG pictures as libjpeg does.
#include "capture/media/jpeg_picture.h"

#include <algorithm>
#include <optional>

namespace lmx {
namespace {

using Bytes = std::span<const std::uint8_t>;

constexpr std::int64_t kMostPixels = 1 << 26;  // twice those of 8K; more is a damaged header
constexpr unsigned kBegin = 0xD8;
constexpr unsigned kEnd = 0xD9;
constexpr unsigned kScan = 0xDA;

struct Frame {
  int width = 0;
  int height = 0;
  int blockRows = 0;  ///< lines that the decoder writes at once

  friend bool operator==(const Frame&, const Frame&) = default;
};

unsigned twoBytes(Bytes bytes) { return static_cast<unsigned>(bytes[0]) << 8 | bytes[1]; }

bool beginsPicture(Bytes bytes) { return bytes.size() >= 2 && bytes[0] == 0xFF && bytes[1] == kBegin; }

bool describesFrame(unsigned marker) {
  return (marker >= 0xC0 && marker <= 0xC2) || marker == 0xC9 || marker == 0xCA;
}

bool standsAlone(unsigned marker) { return marker == 0x01 || (marker >= 0xD0 && marker <= 0xD7); }

/// Takes the next marker from `bytes`, and what is no marker before it. 0 when there is none.
unsigned takeMarker(Bytes& bytes) {
  unsigned marker = 0;
  while (marker == 0) {
    const auto isFill = [](std::uint8_t byte) { return byte == 0xFF; };
    const auto fill = std::find_if(bytes.begin(), bytes.end(), isFill);
    const auto found = std::find_if_not(fill, bytes.end(), isFill);
    if (found == bytes.end()) return 0;
    marker = *found;
    bytes = bytes.subspan(static_cast<std::size_t>(found - bytes.begin()) + 1);
  }
  return marker;
}

struct Sampling {
  int horizontal = 0;
  int vertical = 0;
};

/// @param component  three bytes
Sampling samplingOf(Bytes component) { return {component[1] >> 4, component[1] & 0xF}; }

/// Over a picture that is sampled otherwise the decoder gives up the whole stream.
bool decodable(Bytes components) {
  constexpr int kMostHorizontal = 4;
  constexpr int kMostVertical = 2;
  const Sampling most = samplingOf(components);
  if (most.horizontal > kMostHorizontal || most.vertical > kMostVertical) return false;
  for (; !components.empty(); components = components.subspan(3)) {
    const Sampling one = samplingOf(components);
    if (one.horizontal < 1 || one.horizontal > most.horizontal) return false;
    if (one.vertical < 1 || one.vertical > most.vertical) return false;
  }
  return true;
}

/// @param segment  from its length on
std::optional<Frame> frameFrom(Bytes segment) {
  constexpr std::size_t kBeforeComponents = 8;
  if (segment.size() < kBeforeComponents) return std::nullopt;
  const std::size_t components = segment[7];  // grey, or colour in three
  if (components != 1 && components != 3) return std::nullopt;
  if (segment.size() < kBeforeComponents + 3 * components) return std::nullopt;
  const Bytes sampled = segment.subspan(kBeforeComponents, 3 * components);
  if (!decodable(sampled)) return std::nullopt;
  return Frame{.width = static_cast<int>(twoBytes(segment.subspan(5))),
               .height = static_cast<int>(twoBytes(segment.subspan(3))),
               .blockRows = 8 * samplingOf(sampled).vertical};
}

/// Takes a picture's headers from `bytes` up to and with the one that describes its frame.
std::optional<Frame> takeFrame(Bytes& bytes) {
  if (!beginsPicture(bytes)) return std::nullopt;
  bytes = bytes.subspan(2);
  while (const unsigned marker = takeMarker(bytes)) {
    if (standsAlone(marker)) continue;
    if (marker == kBegin || marker == kEnd || marker == kScan || bytes.size() < 2) return std::nullopt;
    // The decoder would go on within a segment that is longer than the picture.
    const std::size_t length = twoBytes(bytes);
    if (length < 2 || length > bytes.size()) return std::nullopt;
    const Bytes segment = bytes.first(length);
    bytes = bytes.subspan(length);
    if (describesFrame(marker)) return frameFrom(segment);
  }
  return std::nullopt;
}

/// The decoder takes what is a little too low for two fields of an interlaced picture. Then it has nowhere to
/// write the lines that are too many, unless the whole picture's height is no multiple of those written at
/// once.
bool takenForField(const Frame& frame, int width, int height) {
  return frame.width == width && frame.height < height && height <= 2 * frame.height;
}

bool fitsAsField(const Frame& frame, int height) {
  return 2 * frame.height == height && (frame.height % frame.blockRows == 0 || height % frame.blockRows != 0);
}

/// Whether another picture follows, and each that does has the same frame.
bool repeats(const Frame& frame, Bytes bytes) {
  bool found = false;
  for (; bytes.size() >= 2; bytes = bytes.subspan(1)) {
    if (!beginsPicture(bytes)) continue;
    Bytes field = bytes;
    if (takeFrame(field) != frame) return false;
    found = true;
  }
  return found;
}

}  // namespace

bool harmlessJpegPicture(Bytes picture, int width, int height) {
  const auto frame = takeFrame(picture);
  if (!frame || std::int64_t{frame->width} * frame->height > kMostPixels) return false;
  if (!takenForField(*frame, width, height)) return true;
  return fitsAsField(*frame, height) && repeats(*frame, picture);
}

}  // namespace lmx
