// The header boxes of a QuickTime movie (ISO/IEC 14496-12, QuickTime File Format) as bytes. Pure.
#pragma once
#include <cstdint>
#include <vector>

#include "capture/movie/movie_index.h"

namespace lmx {

/// What stands in front of a growing movie's header: "ftyp", then a placeholder. When the movie is finished
/// the placeholder becomes the head of one "mdat" over all fragments.
inline constexpr std::uint64_t kFileTypeSize = 20;
inline constexpr std::uint64_t kPlaceholderSize = 16;

/// Now as movie files count it: seconds since 1904-01-01 UTC.
std::uint64_t movieTimeNow();

/// "ftyp" and the placeholder.
Bytes fileStart();
/// "moov" of a movie whose samples follow in fragments. @param created  see movieTimeNow
Bytes fragmentedHeader(const std::vector<TrackFormat>& tracks, std::uint64_t created = 0);
/// The head of the "mdat" that takes the placeholder's place.
/// @param mediaEnd  file offset behind the media, which begin behind "ftyp"
Bytes mediaHead(std::uint64_t mediaEnd);
/// "moov" of a whole movie. Tracks without samples are left out.
/// @param modified  see movieTimeNow
Bytes movieHeader(const MovieIndex& index, std::uint64_t modified);

}  // namespace lmx
