// The boxes of a QuickTime movie (ISO/IEC 14496-12 and -14, QuickTime File Format) as bytes. Pure.
#pragma once
#include <cstdint>
#include <span>
#include <vector>

#include "capture/movie/movie_index.h"

namespace lmx {

/// Size of what stands in front of the growing movie's header: "ftyp", then a placeholder that finishing
/// turns into the header of one "mdat" over all fragments.
inline constexpr std::uint64_t kFileTypeSize = 20;
inline constexpr std::uint64_t kPlaceholderSize = 16;

/// "stsd" for H.264. @param avcC  decoder configuration record (ISO/IEC 14496-15)
Bytes videoSampleDescription(std::uint16_t width, std::uint16_t height, std::span<const std::uint8_t> avcC);
/// "stsd" for AAC. @param config  AudioSpecificConfig (ISO/IEC 14496-3)
Bytes audioSampleDescription(std::uint32_t sampleRate, std::uint16_t channels,
                             std::span<const std::uint8_t> config);

/// "ftyp" and the placeholder.
Bytes fileStart();
/// "moov" of a movie whose samples follow in fragments.
Bytes fragmentedHeader(const std::vector<TrackFormat>& tracks);
/// "moof" and the head of its "mdat", for samples stored track after track behind it.
Bytes fragmentHeader(std::uint32_t sequence, const std::vector<TrackFragment>& tracks);
/// The "mdat" head that goes over the placeholder once `index` is complete.
Bytes mediaHead(std::uint64_t mediaEnd);
/// "moov" of a whole movie.
Bytes movieHeader(const MovieIndex& index);

}  // namespace lmx
