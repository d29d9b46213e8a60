// Building movie boxes.
#include "capture/movie/movie_boxes.h"

#include <algorithm>
#include <string_view>

namespace lmx {
namespace {

constexpr std::uint32_t kMovieTimescale = 90000;

/// Appends big-endian fields; boxes nest and get their sizes when they end.
class BoxWriter {
 public:
  explicit BoxWriter(Bytes& out) : out_(out) {}

  template <class Body>
  void box(std::string_view type, Body body) {
    const std::size_t start = out_.size();
    u32(0);
    text(type);
    body();
    patch32(start, static_cast<std::uint32_t>(out_.size() - start));
  }
  template <class Body>
  void fullBox(std::string_view type, std::uint8_t version, std::uint32_t flags, Body body) {
    box(type, [&] {
      u32(static_cast<std::uint32_t>(version) << 24 | flags);
      body();
    });
  }
  void u8(unsigned v) { out_.push_back(static_cast<std::uint8_t>(v)); }
  void u16(unsigned v) {
    u8(v >> 8 & 0xFF);
    u8(v & 0xFF);
  }
  void u32(std::uint32_t v) {
    u16(v >> 16);
    u16(v & 0xFFFF);
  }
  void u64(std::uint64_t v) {
    u32(static_cast<std::uint32_t>(v >> 32));
    u32(static_cast<std::uint32_t>(v));
  }
  void zeros(std::size_t n) { out_.insert(out_.end(), n, 0); }
  void text(std::string_view t) { out_.insert(out_.end(), t.begin(), t.end()); }
  void bytes(std::span<const std::uint8_t> b) { out_.insert(out_.end(), b.begin(), b.end()); }
  [[nodiscard]] std::size_t size() const { return out_.size(); }
  void patch32(std::size_t at, std::uint32_t v) {
    for (int i = 0; i < 4; ++i)
      out_[at + static_cast<std::size_t>(i)] = static_cast<std::uint8_t>(v >> (24 - 8 * i));
  }

 private:
  Bytes& out_;
};

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

/// A track; `sampleTables` writes what follows "stsd".
template <class Tables>
void trackBox(BoxWriter& w, const TrackFormat& format, std::uint32_t number, std::uint64_t mediaDuration,
              Tables sampleTables) {
  const auto movieDuration = format.timescale == 0 ? 0 : mediaDuration * kMovieTimescale / format.timescale;
  w.box("trak", [&] {
    trackHeaderBox(w, format, number, movieDuration);
    w.box("mdia", [&] {
      w.fullBox("mdhd", 1, 0, [&] {
        w.u64(0);
        w.u64(0);
        w.u32(format.timescale);
        w.u64(mediaDuration);
        w.u16(0x55C4);  // language undetermined
        w.u16(0);
      });
      handlerBox(w, "mhlr", format.isVideo ? "vide" : "soun",
                 format.isVideo ? "VideoHandler" : "SoundHandler");
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

constexpr std::uint32_t kSyncFlags = 0x02000000;     // depends on no other sample
constexpr std::uint32_t kNotSyncFlags = 0x01010000;  // depends on others, is no key frame

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
      trackBox(w, track.format, ++number, track.totalDuration, [&] { fullSampleTables(w, track); });
    }
  });
  return out;
}

}  // namespace lmx
