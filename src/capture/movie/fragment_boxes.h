// The boxes of one fragment of a growing movie (ISO/IEC 14496-12). Pure.
#pragma once
#include <cstdint>
#include <vector>

#include "capture/movie/movie_index.h"

namespace lmx {

/// A sample as it goes into a fragment.
struct FragmentSample {
  std::uint32_t size = 0;      ///< bytes
  std::uint32_t duration = 0;  ///< timescale units
  bool sync = true;            ///< depends on no other sample
};

/// The samples of one track in a fragment.
struct TrackFragment {
  std::uint32_t trackNumber = 0;  ///< from 1
  std::uint64_t baseTime = 0;     ///< decode time of the first sample, timescale units
  std::vector<FragmentSample> samples;
};

/// In the flags of a fragment's sample: it is no key frame.
inline constexpr std::uint32_t kSampleIsNotSync = 0x00010000;

/// "moof" and the head of its "mdat". The samples stand behind it track after track, in the order of
/// `tracks`. All samples together must be smaller than 4 GB.
/// @param sequence  number of the fragment, from 1
Bytes fragmentHeader(std::uint32_t sequence, const std::vector<TrackFragment>& tracks);

}  // namespace lmx
