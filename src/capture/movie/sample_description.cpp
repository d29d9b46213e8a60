// "stsd" boxes of H.264 and AAC.
#include "capture/movie/sample_description.h"

#include <algorithm>
#include <array>

#include "capture/movie/box_writer.h"

namespace lmx {
namespace {

/// A descriptor of ISO/IEC 14496-1 with a one-byte length.
void descriptorHead(BoxWriter& w, unsigned tag, std::size_t length) {
  w.u8(tag);
  w.u8(static_cast<unsigned>(length));
}

void elementaryStreamBox(BoxWriter& w, std::span<const std::uint8_t> config) {
  w.fullBox("esds", 0, 0, [&] {
    const std::size_t specific = 2 + config.size();
    const std::size_t decoder = 2 + 13 + specific;
    descriptorHead(w, 3, 3 + decoder + 3);
    w.u16(2);
    w.u8(0);
    descriptorHead(w, 4, 13 + specific);
    w.u8(0x40);  // MPEG-4 audio
    w.u8(0x15);  // audio stream
    w.zeros(3);
    w.u32(0);
    w.u32(0);
    descriptorHead(w, 5, config.size());
    w.bytes(config);
    descriptorHead(w, 6, 1);
    w.u8(2);
  });
}

/// Collects bits to bytes, most significant first.
class BitWriter {
 public:
  void put(std::uint32_t value, unsigned bits) {
    for (; bits > 0; --bits, ++used_) {
      if (used_ % 8 == 0) bytes_.push_back(0);
      if ((value >> (bits - 1) & 1U) != 0) bytes_.back() |= static_cast<std::uint8_t>(0x80U >> used_ % 8);
    }
  }
  [[nodiscard]] Bytes bytes() const { return bytes_; }

 private:
  Bytes bytes_;
  std::size_t used_ = 0;
};

}  // namespace

Bytes audioSpecificConfig(std::uint32_t sampleRate, unsigned channels) {
  static constexpr std::array<std::uint32_t, 13> kRates{96000, 88200, 64000, 48000, 44100, 32000, 24000,
                                                        22050, 16000, 12000, 11025, 8000,  7350};
  constexpr std::uint32_t kOtherRate = 15;
  BitWriter w;
  w.put(2, 5);  // AAC-LC
  const auto known = std::find(kRates.begin(), kRates.end(), sampleRate);
  if (known != kRates.end()) {
    w.put(static_cast<std::uint32_t>(known - kRates.begin()), 4);
  } else {
    w.put(kOtherRate, 4);
    w.put(sampleRate, 24);
  }
  w.put(channels, 4);
  w.put(0, 3);  // packets of 1,024 samples, nothing else
  // Players need not look for band replication in the stream: there is none.
  w.put(0x2B7, 11);
  w.put(5, 5);
  w.put(0, 1);
  return w.bytes();
}

Bytes videoSampleDescription(std::uint16_t width, std::uint16_t height, std::span<const std::uint8_t> avcC) {
  Bytes out;
  BoxWriter w(out);
  w.fullBox("stsd", 0, 0, [&] {
    w.u32(1);
    w.box("avc1", [&] {
      w.zeros(6);
      w.u16(1);
      w.zeros(16);
      w.u16(width);
      w.u16(height);
      w.u32(0x00480000);  // 72 dpi
      w.u32(0x00480000);
      w.u32(0);
      w.u16(1);
      w.u8(5);
      w.text("H.264");
      w.zeros(26);
      w.u16(24);
      w.u16(0xFFFF);
      w.box("avcC", [&] { w.bytes(avcC); });
      w.box("colr", [&] {
        w.text("nclc");
        for (int i = 0; i < 3; ++i) w.u16(1);  // primaries, transfer and matrix of BT.709
      });
    });
  });
  return out;
}

Bytes audioSampleDescription(std::uint32_t sampleRate, std::uint16_t channels,
                             std::span<const std::uint8_t> config) {
  Bytes out;
  BoxWriter w(out);
  w.fullBox("stsd", 0, 0, [&] {
    w.u32(1);
    w.box("mp4a", [&] {
      w.zeros(6);
      w.u16(1);
      w.u16(1);  // version 1: QuickTime's own form for compressed sound
      w.u16(0);
      w.u32(0);
      w.u16(channels);
      w.u16(16);
      w.u16(0xFFFE);
      w.u16(0);
      w.u32(sampleRate << 16);
      w.u32(1024);
      w.u32(0);
      w.u32(0);
      w.u32(2);
      w.box("wave", [&] {
        w.box("frma", [&] { w.text("mp4a"); });
        w.box("mp4a", [&] { w.u32(0); });
        elementaryStreamBox(w, config);
        w.u32(8);
        w.u32(0);
      });
    });
  });
  return out;
}

}  // namespace lmx
