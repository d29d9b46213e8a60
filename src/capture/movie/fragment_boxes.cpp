// The boxes of a fragment.
#include "capture/movie/fragment_boxes.h"

#include "capture/movie/box_writer.h"

namespace lmx {
namespace {

constexpr std::uint32_t kSyncFlags = 0x02000000;                        // depends on no other sample
constexpr std::uint32_t kNotSyncFlags = 0x01000000 | kSampleIsNotSync;  // depends on others

void trackFragmentBox(BoxWriter& w, const TrackFragment& track, std::size_t* dataOffsetAt) {
  w.box("traf", [&] {
    w.fullBox("tfhd", 0, 0x020000, [&] { w.u32(track.trackNumber); });  // offsets count from the moof
    w.fullBox("tfdt", 1, 0, [&] { w.u64(track.baseTime); });
    // data offset, and for each sample: duration, size, flags
    w.fullBox("trun", 0, 0x000701, [&] {
      w.u32(static_cast<std::uint32_t>(track.samples.size()));
      *dataOffsetAt = w.size();
      w.u32(0);
      for (const FragmentSample& sample : track.samples) {
        w.u32(sample.duration);
        w.u32(sample.size);
        w.u32(sample.sync ? kSyncFlags : kNotSyncFlags);
      }
    });
  });
}

std::uint64_t bytesOf(const TrackFragment& track) {
  std::uint64_t total = 0;
  for (const FragmentSample& sample : track.samples) total += sample.size;
  return total;
}

}  // namespace

Bytes fragmentHeader(std::uint32_t sequence, const std::vector<TrackFragment>& tracks) {
  Bytes out;
  BoxWriter w(out);
  std::vector<std::size_t> offsetsAt(tracks.size());
  w.box("moof", [&] {
    w.fullBox("mfhd", 0, 0, [&] { w.u32(sequence); });
    for (std::size_t i = 0; i < tracks.size(); ++i) trackFragmentBox(w, tracks[i], &offsetsAt[i]);
  });
  std::uint64_t data = out.size() + 8;
  for (std::size_t i = 0; i < tracks.size(); ++i) {
    w.patch32(offsetsAt[i], static_cast<std::uint32_t>(data));
    data += bytesOf(tracks[i]);
  }
  w.u32(static_cast<std::uint32_t>(data - out.size()));
  w.text("mdat");
  return out;
}

}  // namespace lmx
