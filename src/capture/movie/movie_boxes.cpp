// Headers of fragmented and of whole movies.
#include "capture/movie/movie_boxes.h"

#include <algorithm>
#include <string_view>

#include "capture/movie/box_writer.h"

namespace lmx {
namespace {

constexpr std::uint32_t kMovieTimescale = 90000;

void identityMatrix(BoxWriter& w) {
  for (const std::uint32_t v : {0x00010000U, 0U, 0U, 0U, 0x00010000U, 0U, 0U, 0U, 0x40000000U}) w.u32(v);
}

void movieHeaderBox(BoxWriter& w, std::uint64_t duration, std::uint32_t nextTrack) {
  w.fullBox("mvhd", 1, 0, [&] {
    w.u64(0);
    w.u64(0);
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

void trackHeaderBox(BoxWriter& w, const TrackFormat& format, std::uint32_t number, std::uint64_t duration) {
  w.fullBox("tkhd", 1, 3, [&] {  // enabled, in the movie
    w.u64(0);
    w.u64(0);
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

void mediaHeaderBox(BoxWriter& w, std::uint32_t timescale, std::uint64_t duration) {
  w.fullBox("mdhd", 1, 0, [&] {
    w.u64(0);
    w.u64(0);
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

/// @param mediaDuration  timescale units of the track
/// @param sampleTables  writes what follows "stsd"
template <class Tables>
void trackBox(BoxWriter& w, const TrackFormat& format, std::uint32_t number, std::uint64_t mediaDuration,
              Tables sampleTables) {
  const auto movieDuration = format.timescale == 0 ? 0 : mediaDuration * kMovieTimescale / format.timescale;
  w.box("trak", [&] {
    trackHeaderBox(w, format, number, movieDuration);
    w.box("mdia", [&] {
      mediaHeaderBox(w, format.timescale, mediaDuration);
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

Bytes fragmentedHeader(const std::vector<TrackFormat>& tracks) {
  Bytes out;
  BoxWriter w(out);
  w.box("moov", [&] {
    movieHeaderBox(w, 0, static_cast<std::uint32_t>(tracks.size() + 1));
    std::uint32_t number = 0;
    for (const TrackFormat& format : tracks) trackBox(w, format, ++number, 0, [&] { emptySampleTables(w); });
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

Bytes movieHeader(const MovieIndex& index) {
  Bytes out;
  std::size_t samples = 0;
  for (const TrackIndex& track : index.tracks) samples += track.sizes.size();
  out.reserve(samples * 5 + 4096);
  BoxWriter w(out);
  w.box("moov", [&] {
    movieHeaderBox(w, static_cast<std::uint64_t>(index.seconds() * kMovieTimescale),
                   static_cast<std::uint32_t>(index.tracks.size() + 1));
    std::uint32_t number = 0;
    for (const TrackIndex& track : index.tracks) {
      if (track.sizes.empty()) continue;  // some players refuse a movie with an empty track
      trackBox(w, track.format, ++number, track.totalDuration, [&] { fullSampleTables(w, track); });
    }
  });
  return out;
}

}  // namespace lmx
