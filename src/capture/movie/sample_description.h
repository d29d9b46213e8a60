// The "stsd" boxes that tell a player how a track is encoded (ISO/IEC 14496-12, QuickTime File Format). Pure.
#pragma once
#include <cstdint>
#include <span>

#include "capture/movie/movie_index.h"

namespace lmx {

/// "stsd" of an H.264 track in the colours of BT.709. @param avcC  decoder configuration record (ISO/IEC
/// 14496-15)
Bytes videoSampleDescription(std::uint16_t width, std::uint16_t height, std::span<const std::uint8_t> avcC);

/// AudioSpecificConfig (ISO/IEC 14496-3) of AAC-LC without band replication; known before any sound is
/// encoded.
/// @param sampleRate  Hz  @param channels  1 to 6
Bytes audioSpecificConfig(std::uint32_t sampleRate, unsigned channels);

/// "stsd" of an AAC track. @param config  AudioSpecificConfig (ISO/IEC 14496-3), at most some hundred bytes
Bytes audioSampleDescription(std::uint32_t sampleRate, std::uint16_t channels,
                             std::span<const std::uint8_t> config);

}  // namespace lmx
