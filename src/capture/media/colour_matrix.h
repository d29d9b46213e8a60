// Converts the colours of 8-bit pictures: from one Y'CbCr to another, and from RGB. Pure.
#pragma once
#include <cstddef>
#include <cstdint>

namespace lmx {

/// How Y'CbCr numbers stand for red, green and blue: the weights of red and blue in the luma, and whether
/// luma takes 0…255 (full range) or 16…235 (limited range).
struct ColourCode {
  double redWeight = 0.2126;
  double blueWeight = 0.0722;
  bool fullRange = false;
  bool operator==(const ColourCode&) const = default;
};
inline constexpr ColourCode kBT601{0.299, 0.114, false};
inline constexpr ColourCode kBT601Full{0.299, 0.114, true};
inline constexpr ColourCode kBT709{0.2126, 0.0722, false};

/// The planes of a 4:2:0 picture; chroma planes have half of width and height, rounded up.
struct PlanesIn {
  const std::uint8_t* data[3];
  std::ptrdiff_t stride[3];  ///< bytes a row
};
struct PlanesOut {
  std::uint8_t* data[3];
  std::ptrdiff_t stride[3];
};

/// Fixed-point conversion between two codes. Copyable, thread-safe.
class ColourMatrix {
 public:
  ColourMatrix(ColourCode from, ColourCode to);
  /// Converts a picture of `width` x `height`. `in` and `out` may be the same planes.
  void convert(const PlanesIn& in, const PlanesOut& out, int width, int height) const;

 private:
  void convertRows(const PlanesIn& in, const PlanesOut& out, int width, int height) const;
  void convertWide(const PlanesIn& in, const PlanesOut& out, int width, int height) const;
  /// @param shift  takes for each pixel of the rows what their luma changes by
  void convertChroma(const PlanesIn& in, const PlanesOut& out, int x, int y, int count,
                     std::int16_t* shift) const;
  void convertLuma(const PlanesIn& in, const PlanesOut& out, int x, int y, int count,
                   const std::int16_t* shift) const;

  // Thirteen binary digits after the point.
  std::int16_t luma_, luma_from_cb_, luma_from_cr_;
  std::int16_t cb_, cb_from_cr_, cr_, cr_from_cb_;
  int luma_offset_;  ///< four binary digits after the point
};

/// Fixed-point conversion from RGB to Y'CbCr. Copyable, thread-safe.
class RGBMatrix {
 public:
  /// @param fullRange  whether black is 0 and white 255; otherwise 16 and 235
  RGBMatrix(bool fullRange, ColourCode to);
  /// Converts `width` x `height` pixels of four bytes each, blue, green, red and one that is ignored.
  /// @param stride  bytes a row
  void convert(const std::uint8_t* pixels, std::ptrdiff_t stride, const PlanesOut& out, int width,
               int height) const;

 private:
  struct Strip;
  void convertRows(const std::uint8_t* pixels, std::ptrdiff_t stride, const PlanesOut& out, int width,
                   int height) const;
  void convertWide(const std::uint8_t* pixels, std::ptrdiff_t stride, const PlanesOut& out, int width,
                   int height) const;
  void convertLuma(const Strip& strip, std::uint8_t* out, int count) const;
  void convertChroma(const Strip& upper, const Strip& lower, std::uint8_t* cb, std::uint8_t* cr,
                     int count) const;

  // Blue, green, red. Thirteen binary digits after the point.
  std::int16_t luma_[3], cb_[3], cr_[3];
  int luma_offset_;  ///< four binary digits after the point
};

}  // namespace lmx
