// "stsd" boxes of H.264 and AAC.
#include "capture/movie/sample_description.h"

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

}  // namespace

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
