// Whether a depayloader may be given what an RTP packet carries.
#pragma once
#include <cstdint>
#include <span>

namespace lmx {

/// How the access units' headers of an "mpeg4-generic" stream (RFC 3640) are laid out: bits of each field.
struct AccessUnitLayout {
  int size = 0;  ///< 0: the packets have no headers
  int index = 0;
  int indexDelta = 0;
  int ctsDelta = 0;
  int dtsDelta = 0;
  int randomAccess = 0;  ///< 1 or 0
  int streamState = 0;
  int auxiliarySize = 0;
};

/// Of each of these: `payload` is what follows the packet's RTP header, without padding. False when
/// GStreamer's depayloader would read or write beyond its memory, end the process or give up the stream, so
/// that the packet must not reach it. Whether the picture or the sound within is any good is the decoder's
/// business. Pure.
bool harmlessAccessUnits(std::span<const std::uint8_t> payload, const AccessUnitLayout& layout);
bool harmlessH264(std::span<const std::uint8_t> payload);
bool harmlessH265(std::span<const std::uint8_t> payload);
bool harmlessJpeg(std::span<const std::uint8_t> payload);

}  // namespace lmx
