// Headers of fragmented and of whole movies.
#include "capture/movie/movie_boxes.h"

#include <algorithm>
#include <chrono>
#include <string_view>

#include "capture/movie/box_writer.h"

namespace lmx {
namespace {

constexpr std::uint32_t kMovieTimescale = 90000;

void identityMatrix(BoxWriter& w) {
  for (const std::uint32_t v : {0x00010000U, 0U, 0U, 0U, 0x00010000U, 0U, 0U, 0U, 0x40000000U}) w.u32(v);
}

/// When a movie was made and last changed, seconds since 1904-01-01 UTC.
struct Times {
  std::uint64_t created = 0;
  std::uint64_t modified = 0;
  void write(BoxWriter& w) const {
    w.u64(created);
    w.u64(modified);
  }
};

void movieHeaderBox(BoxWriter& w, const Times& times, std::uint64_t duration, std::uint32_t nextTrack) {
  w.fullBox("mvhd", 1, 0, [&] {
    times.write(w);
    w.u32(kMovieTimescale);
    w.u64(duration);
    w.u32(0x00010000);  // normal speed
    w.u16(0x0100);      // full volume
    w.zeros(10);
    identityMatrix(w);
    w.zeros(24);
    w.u32(nextTrack);
  });
}

void trackHeaderBox(BoxWriter& w, const TrackFormat& format, const Times& times, std::uint32_t number,
                    std::uint64_t duration) {
  w.fullBox("tkhd", 1, 3, [&] {  // enabled, in the movie
    times.write(w);
    w.u32(number);
    w.u32(0);
    w.u64(duration);
    w.zeros(8);
    w.u16(0);
    w.u16(0);
    w.u16(format.isVideo ? 0 : 0x0100);
    w.u16(0);
    identityMatrix(w);
    w.u32(static_cast<std::uint32_t>(format.width) << 16);
    w.u32(static_cast<std::uint32_t>(format.height) << 16);
  });
}

/// Length of the movie, movie timescale units. GStreamer's demuxer compares it with the media time of packets
/// and would leave out a last packet of sound that begins, in the media, where the movie ends.
std::uint64_t movieDuration(const MovieIndex& index) {
  std::uint64_t longest = 0;
  for (const TrackIndex& track : index.tracks) {
    if (track.sizes.empty()) continue;
    std::uint64_t end = track.presented();
    if (track.format.priming > 0) end = std::max(end, track.totalDuration - track.durations.back().duration);
    const std::uint64_t units = (end * kMovieTimescale + track.format.timescale - 1) / track.format.timescale;
    longest = std::max(longest, units + (track.format.priming > 0 ? 1 : 0));
  }
  return longest;
}

/// One edit: the media without their priming.
/// @param duration  movie timescale units; 0 in front of fragments: all that follows
void editListBox(BoxWriter& w, std::uint32_t priming, std::uint64_t duration) {
  if (priming == 0) return;
  const bool wide = duration > 0xFFFFFFFFULL;
  w.box("edts", [&] {
    w.fullBox("elst", wide ? 1 : 0, 0, [&] {
      w.u32(1);
      if (wide) {
        w.u64(duration);
        w.u64(priming);
      } else {
        w.u32(static_cast<std::uint32_t>(duration));
        w.u32(priming);
      }
      w.u32(0x00010000);  // normal speed
    });
  });
}

void handlerBox(BoxWriter& w, std::string_view type, std::string_view subtype, std::string_view name) {
  w.fullBox("hdlr", 0, 0, [&] {
    w.text(type);
    w.text(subtype);
    w.zeros(12);
    w.u8(static_cast<unsigned>(name.size()));
    w.text(name);
  });
}

void dataInformationBox(BoxWriter& w) {
  w.box("dinf", [&] {
    w.fullBox("dref", 0, 0, [&] {
      w.u32(1);
      w.fullBox("url ", 0, 1, [] {});  // in this file
    });
  });
}

void mediaHeaderBox(BoxWriter& w, const Times& times, std::uint32_t timescale, std::uint64_t duration) {
  w.fullBox("mdhd", 1, 0, [&] {
    times.write(w);
    w.u32(timescale);
    w.u64(duration);
    w.u16(0x55C4);  // language undetermined
    w.u16(0);
  });
}

/// @param sampleTables  writes what follows "stsd"
template <class Tables>
void mediaInformationBox(BoxWriter& w, const TrackFormat& format, Tables sampleTables) {
  w.box("minf", [&] {
    if (format.isVideo) {
      w.fullBox("vmhd", 0, 1, [&] { w.zeros(8); });
    } else {
      w.fullBox("smhd", 0, 0, [&] { w.zeros(4); });
    }
    handlerBox(w, "dhlr", "url ", "DataHandler");
    dataInformationBox(w);
    w.box("stbl", [&] {
      w.bytes(format.sampleDescription);
      sampleTables();
    });
  });
}

/// @param track  its index may be empty
/// @param sampleTables  writes what follows "stsd"
template <class Tables>
void trackBox(BoxWriter& w, const TrackIndex& track, const Times& times, std::uint32_t number,
              Tables sampleTables) {
  const TrackFormat& format = track.format;
  const auto duration = format.timescale == 0 ? 0 : track.presented() * kMovieTimescale / format.timescale;
  w.box("trak", [&] {
    trackHeaderBox(w, format, times, number, duration);
    editListBox(w, format.priming, duration);
    w.box("mdia", [&] {
      mediaHeaderBox(w, times, format.timescale, track.totalDuration);
      handlerBox(w, "mhlr", format.isVideo ? "vide" : "soun",
                 format.isVideo ? "VideoHandler" : "SoundHandler");
      mediaInformationBox(w, format, sampleTables);
    });
  });
}

void emptySampleTables(BoxWriter& w) {
  w.fullBox("stts", 0, 0, [&] { w.u32(0); });
  w.fullBox("stsc", 0, 0, [&] { w.u32(0); });
  w.fullBox("stsz", 0, 0, [&] {
    w.u32(0);
    w.u32(0);
  });
  w.fullBox("stco", 0, 0, [&] { w.u32(0); });
}

void sampleToChunkBox(BoxWriter& w, const std::vector<Chunk>& chunks) {
  w.fullBox("stsc", 0, 0, [&] {
    const std::size_t countAt = w.size();
    w.u32(0);
    std::uint32_t entries = 0;
    std::uint32_t last = 0;
    for (std::size_t i = 0; i < chunks.size(); ++i) {
      if (chunks[i].samples == last) continue;
      last = chunks[i].samples;
      w.u32(static_cast<std::uint32_t>(i + 1));
      w.u32(last);
      w.u32(1);
      ++entries;
    }
    w.patch32(countAt, entries);
  });
}

void chunkOffsetBox(BoxWriter& w, const std::vector<Chunk>& chunks) {
  const bool wide = !chunks.empty() && chunks.back().offset > 0xFFFFFFFFULL;
  w.fullBox(wide ? "co64" : "stco", 0, 0, [&] {
    w.u32(static_cast<std::uint32_t>(chunks.size()));
    for (const Chunk& chunk : chunks) {
      if (wide) {
        w.u64(chunk.offset);
      } else {
        w.u32(static_cast<std::uint32_t>(chunk.offset));
      }
    }
  });
}

/// Says that a decoder of sound is right from the second packet on.
void rollGroupBoxes(BoxWriter& w, std::size_t samples) {
  constexpr unsigned kOneBefore = 0xFFFF;  // -1
  w.fullBox("sgpd", 1, 0, [&] {
    w.text("roll");
    w.u32(2);  // bytes of an entry
    w.u32(1);
    w.u16(kOneBefore);
  });
  w.fullBox("sbgp", 0, 0, [&] {
    w.text("roll");
    w.u32(1);
    w.u32(static_cast<std::uint32_t>(samples));
    w.u32(1);
  });
}

void fullSampleTables(BoxWriter& w, const TrackIndex& track) {
  w.fullBox("stts", 0, 0, [&] {
    w.u32(static_cast<std::uint32_t>(track.durations.size()));
    for (const DurationRun& run : track.durations) {
      w.u32(run.count);
      w.u32(run.duration);
    }
  });
  if (track.format.isVideo) {
    w.fullBox("stss", 0, 0, [&] {
      w.u32(static_cast<std::uint32_t>(track.syncSamples.size()));
      for (const std::uint32_t sample : track.syncSamples) w.u32(sample + 1);
    });
  }
  sampleToChunkBox(w, track.chunks);
  w.fullBox("stsz", 0, 0, [&] {
    w.u32(0);
    w.u32(static_cast<std::uint32_t>(track.sizes.size()));
    for (const std::uint32_t size : track.sizes) w.u32(size);
  });
  chunkOffsetBox(w, track.chunks);
  if (!track.format.isVideo) rollGroupBoxes(w, track.sizes.size());
}

}  // namespace

Bytes fileStart() {
  Bytes out;
  BoxWriter w(out);
  w.box("ftyp", [&] {
    w.text("qt  ");
    w.u32(0x200);
    w.text("qt  ");
  });
  w.box("free", [&] { w.zeros(kPlaceholderSize - 8); });
  return out;
}

std::uint64_t movieTimeNow() {
  constexpr std::uint64_t kFrom1904To1970 = 2082844800;
  const auto now = std::chrono::system_clock::now().time_since_epoch();
  return kFrom1904To1970 +
         static_cast<std::uint64_t>(std::chrono::duration_cast<std::chrono::seconds>(now).count());
}

Bytes fragmentedHeader(const std::vector<TrackFormat>& tracks, std::uint64_t created) {
  const Times times{created, created};
  Bytes out;
  BoxWriter w(out);
  w.box("moov", [&] {
    movieHeaderBox(w, times, 0, static_cast<std::uint32_t>(tracks.size() + 1));
    std::uint32_t number = 0;
    for (const TrackFormat& format : tracks) {
      trackBox(w, {.format = format}, times, ++number, [&] { emptySampleTables(w); });
    }
    w.box("mvex", [&] {
      for (std::uint32_t i = 1; i <= tracks.size(); ++i) {
        w.fullBox("trex", 0, 0, [&] {
          w.u32(i);
          w.u32(1);
          w.zeros(12);
        });
      }
    });
  });
  return out;
}

Bytes mediaHead(std::uint64_t mediaEnd) {
  Bytes out;
  BoxWriter w(out);
  w.u32(1);
  w.text("mdat");
  w.u64(mediaEnd - kFileTypeSize);
  return out;
}

Bytes movieHeader(const MovieIndex& index, std::uint64_t modified) {
  const Times times{index.created, modified};
  Bytes out;
  std::size_t samples = 0;
  for (const TrackIndex& track : index.tracks) samples += track.sizes.size();
  out.reserve(samples * 5 + 4096);
  BoxWriter w(out);
  w.box("moov", [&] {
    movieHeaderBox(w, times, movieDuration(index), static_cast<std::uint32_t>(index.tracks.size() + 1));
    std::uint32_t number = 0;
    for (const TrackIndex& track : index.tracks) {
      if (track.sizes.empty()) continue;  // some players refuse a movie with an empty track
      trackBox(w, track, times, ++number, [&] { fullSampleTables(w, track); });
    }
  });
  return out;
}

}  // namespace lmx
