// Written as plain loops over rows of 16-bit numbers, which the compiler turns into vector instructions.
#include "capture/media/colour_matrix.h"

#include <algorithm>
#include <array>
#include <cmath>

// Inlined into a function for processors with wider vectors, which calls can't be.
#define LMX_INLINE [[gnu::always_inline]] inline

namespace lmx {
namespace {

constexpr int kStrip = 512;  // pixels of a row that are converted at a time; even

struct Range {
  double lumaOffset, lumaScale, chromaScale;
};
constexpr Range rangeOf(const ColourCode& code) {
  return code.fullRange ? Range{0, 255, 255} : Range{16, 219, 224};
}

constexpr int kHalf = 8 + 1;  // rounds to the nearest; the two or three products lost half a unit each
constexpr int kChromaOffset = 128 * 16 + kHalf;

std::int16_t fixed(double factor) { return static_cast<std::int16_t>(std::lround(factor * 8192)); }

LMX_INLINE std::int16_t narrow(int value) { return static_cast<std::int16_t>(value); }

/// A sample times a factor of 13 fractional digits: the product has four. The sample is widened by seven
/// digits first, so that the upper half of the product is all that is needed.
LMX_INLINE std::int16_t times(std::int16_t sample, std::int16_t factor) {
  return narrow((static_cast<int>(narrow(sample * 128)) * factor) >> 16);
}

/// The same for the average of four samples, given their sum.
LMX_INLINE std::int16_t timesQuarter(std::int16_t sum, std::int16_t factor) {
  return narrow((static_cast<int>(narrow(sum * 32)) * factor) >> 16);
}

LMX_INLINE std::uint8_t byteFrom(std::int16_t withFourDigits) {
  return static_cast<std::uint8_t>(std::clamp<std::int16_t>(narrow(withFourDigits >> 4), 0, 255));
}

LMX_INLINE std::int16_t centred(std::uint8_t chroma) { return narrow(chroma - 128); }

}  // namespace

ColourMatrix::ColourMatrix(ColourCode from, ColourCode to) {
  const Range in = rangeOf(from);
  const Range out = rangeOf(to);
  const double green = 1 - from.redWeight - from.blueWeight;
  // Red and blue are luma plus a multiple of one chroma value, green is what is left of luma.
  const double redFromCr = 2 * (1 - from.redWeight);
  const double blueFromCb = 2 * (1 - from.blueWeight);
  const double greenFromCr = -redFromCr * from.redWeight / green;
  const double greenFromCb = -blueFromCb * from.blueWeight / green;
  const double toGreen = 1 - to.redWeight - to.blueWeight;
  const double lumaFromCb = to.blueWeight * blueFromCb + toGreen * greenFromCb;
  const double lumaFromCr = to.redWeight * redFromCr + toGreen * greenFromCr;
  const double toCb = 0.5 / (1 - to.blueWeight);
  const double toCr = 0.5 / (1 - to.redWeight);
  const double lumaGain = out.lumaScale / in.lumaScale;
  const double chromaGain = out.chromaScale / in.chromaScale;
  luma_ = fixed(lumaGain);
  luma_from_cb_ = fixed(lumaFromCb * out.lumaScale / in.chromaScale);
  luma_from_cr_ = fixed(lumaFromCr * out.lumaScale / in.chromaScale);
  cb_ = fixed(toCb * (blueFromCb - lumaFromCb) * chromaGain);
  cb_from_cr_ = fixed(-toCb * lumaFromCr * chromaGain);
  cr_ = fixed(toCr * (redFromCr - lumaFromCr) * chromaGain);
  cr_from_cb_ = fixed(-toCr * lumaFromCb * chromaGain);
  luma_offset_ = static_cast<int>(std::lround((out.lumaOffset - in.lumaOffset * lumaGain) * 16)) + kHalf;
}

LMX_INLINE void ColourMatrix::convertRows(const PlanesIn& in, const PlanesOut& out, int width,
                                          int height) const {
  const ColourMatrix matrix = *this;  // a copy of its own: the compiler need not expect the planes to be here
  std::array<std::int16_t, kStrip> shift;
  for (int y = 0; y < height; y += 2) {
    for (int x = 0; x < width; x += kStrip) {
      const int pixels = std::min(kStrip, width - x);
      matrix.convertChroma(in, out, x / 2, y / 2, (pixels + 1) / 2, shift.data());
      matrix.convertLuma(in, out, x, y, pixels, shift.data());
      if (y + 1 < height) matrix.convertLuma(in, out, x, y + 1, pixels, shift.data());
    }
  }
}

LMX_INLINE void ColourMatrix::convertChroma(const PlanesIn& in, const PlanesOut& out, int x, int y, int count,
                                            std::int16_t* shift) const {
  const std::uint8_t* cbIn = in.data[1] + y * in.stride[1] + x;
  const std::uint8_t* crIn = in.data[2] + y * in.stride[2] + x;
  std::uint8_t* cbOut = out.data[1] + y * out.stride[1] + x;
  std::uint8_t* crOut = out.data[2] + y * out.stride[2] + x;
  for (int i = 0; i < count; ++i) {
    const std::int16_t cb = centred(cbIn[i]);
    const std::int16_t cr = centred(crIn[i]);
    // NOLINTNEXTLINE(bugprone-implicit-widening-of-multiplication-result): a strip is short
    shift[2 * i] = shift[2 * i + 1] =
        narrow(times(cb, luma_from_cb_) + times(cr, luma_from_cr_) + luma_offset_);
    cbOut[i] = byteFrom(narrow(times(cb, cb_) + times(cr, cb_from_cr_) + kChromaOffset));
    crOut[i] = byteFrom(narrow(times(cr, cr_) + times(cb, cr_from_cb_) + kChromaOffset));
  }
}

LMX_INLINE void ColourMatrix::convertLuma(const PlanesIn& in, const PlanesOut& out, int x, int y, int count,
                                          const std::int16_t* shift) const {
  const std::uint8_t* from = in.data[0] + y * in.stride[0] + x;
  std::uint8_t* to = out.data[0] + y * out.stride[0] + x;
  for (int i = 0; i < count; ++i) to[i] = byteFrom(narrow(times(from[i], luma_) + shift[i]));
}

#if defined(__x86_64__)
[[gnu::target("avx2")]] void ColourMatrix::convertWide(const PlanesIn& in, const PlanesOut& out, int width,
                                                       int height) const {
  convertRows(in, out, width, height);
}
#endif

void ColourMatrix::convert(const PlanesIn& in, const PlanesOut& out, int width, int height) const {
#if defined(__x86_64__)
  if (__builtin_cpu_supports("avx2") != 0) return convertWide(in, out, width, height);
#endif
  convertRows(in, out, width, height);
}

// ---- RGB

struct RGBMatrix::Strip {
  std::array<std::array<std::int16_t, kStrip>, 3> colours;

  LMX_INLINE void read(const std::uint8_t* pixels, int count) {
    for (int i = 0; i < count; ++i) {
      for (std::size_t c = 0; c < 3; ++c)
        colours[c][static_cast<std::size_t>(i)] = pixels[4 * i + static_cast<int>(c)];
    }
    // The last chroma sample of an odd row has a neighbour all the same.
    if (count % 2 != 0) {
      const auto last = static_cast<std::size_t>(count - 1);
      for (auto& colour : colours) colour[last + 1] = colour[last];
    }
  }
};

RGBMatrix::RGBMatrix(bool fullRange, ColourCode to) {
  const Range out = rangeOf(to);
  const double gain = fullRange ? 1.0 / 255 : 1.0 / 219;
  const double weights[3] = {to.blueWeight, 1 - to.redWeight - to.blueWeight, to.redWeight};
  for (int c = 0; c < 3; ++c) {
    luma_[c] = fixed(weights[c] * out.lumaScale * gain);
    cb_[c] = fixed(((c == 0 ? 1 : 0) - weights[c]) * 0.5 / (1 - to.blueWeight) * out.chromaScale * gain);
    cr_[c] = fixed(((c == 2 ? 1 : 0) - weights[c]) * 0.5 / (1 - to.redWeight) * out.chromaScale * gain);
  }
  const double black = fullRange ? 0 : 16 * gain * out.lumaScale;
  luma_offset_ = static_cast<int>(std::lround((out.lumaOffset - black) * 16)) + kHalf;
}

LMX_INLINE void RGBMatrix::convertLuma(const Strip& strip, std::uint8_t* out, int count) const {
  const auto& [blue, green, red] = strip.colours;
  for (int i = 0; i < count; ++i) {
    const auto at = static_cast<std::size_t>(i);
    out[i] = byteFrom(narrow(times(blue[at], luma_[0]) + times(green[at], luma_[1]) +
                             times(red[at], luma_[2]) + luma_offset_));
  }
}

LMX_INLINE void RGBMatrix::convertChroma(const Strip& upper, const Strip& lower, std::uint8_t* cb,
                                         std::uint8_t* cr, int count) const {
  const auto sum = [&](std::size_t colour, std::size_t at) {
    return narrow(upper.colours[colour][at] + upper.colours[colour][at + 1] + lower.colours[colour][at] +
                  lower.colours[colour][at + 1]);
  };
  for (int i = 0; i < count; ++i) {
    const auto at = 2 * static_cast<std::size_t>(i);
    const std::int16_t blue = sum(0, at);
    const std::int16_t green = sum(1, at);
    const std::int16_t red = sum(2, at);
    cb[i] = byteFrom(narrow(timesQuarter(blue, cb_[0]) + timesQuarter(green, cb_[1]) +
                            timesQuarter(red, cb_[2]) + kChromaOffset));
    cr[i] = byteFrom(narrow(timesQuarter(blue, cr_[0]) + timesQuarter(green, cr_[1]) +
                            timesQuarter(red, cr_[2]) + kChromaOffset));
  }
}

LMX_INLINE void RGBMatrix::convertRows(const std::uint8_t* pixels, std::ptrdiff_t stride,
                                       const PlanesOut& out, int width, int height) const {
  const RGBMatrix matrix = *this;
  Strip upper, lower;
  for (int y = 0; y < height; y += 2) {
    const bool pair = y + 1 < height;
    for (int x = 0; x < width; x += kStrip) {
      const int count = std::min(kStrip, width - x);
      const std::uint8_t* from = pixels + y * stride + std::ptrdiff_t{4} * x;
      std::uint8_t* luma = out.data[0] + y * out.stride[0] + x;
      upper.read(from, count);
      matrix.convertLuma(upper, luma, count);
      lower.read(pair ? from + stride : from, count);
      if (pair) matrix.convertLuma(lower, luma + out.stride[0], count);
      matrix.convertChroma(upper, lower, out.data[1] + y / 2 * out.stride[1] + x / 2,
                           out.data[2] + y / 2 * out.stride[2] + x / 2, (count + 1) / 2);
    }
  }
}

#if defined(__x86_64__)
[[gnu::target("avx2")]] void RGBMatrix::convertWide(const std::uint8_t* pixels, std::ptrdiff_t stride,
                                                    const PlanesOut& out, int width, int height) const {
  convertRows(pixels, stride, out, width, height);
}
#endif

void RGBMatrix::convert(const std::uint8_t* pixels, std::ptrdiff_t stride, const PlanesOut& out, int width,
                        int height) const {
#if defined(__x86_64__)
  if (__builtin_cpu_supports("avx2") != 0) return convertWide(pixels, stride, out, width, height);
#endif
  convertRows(pixels, stride, out, width, height);
}

}  // namespace lmx
