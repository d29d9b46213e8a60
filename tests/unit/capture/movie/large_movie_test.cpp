// Movies that outgrow 32 bits: more than 4 GB, and half a day.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <string_view>

#include "capture/movie/box_reader.h"
#include "capture/movie/file_io.h"
#include "capture/movie/fragment_boxes.h"
#include "capture/movie/movie_boxes.h"
#include "capture/movie/movie_copy.h"
#include "capture/movie/movie_finish.h"
#include "capture/movie/movie_reader.h"
#include "support/unique_fd.h"
#include "tests/unit/capture/capture_harness.h"
#include "tests/unit/capture/movie/sample_movies.h"

namespace lmx {
namespace {

using testing::firstBytes;
using testing::Folder;
using testing::sampleFormats;
using Body = std::span<const std::uint8_t>;

constexpr std::uint32_t kGigabyte = 1U << 30;

/// The body of the box that `path` leads to, box in box; of the first one where several have the name.
Body find(Body bytes, std::initializer_list<std::string_view> path) {
  for (const std::string_view name : path) {
    Body found;
    forEachBox(bytes, [&](std::string_view type, Body body, Body) {
      if (type == name && found.empty()) found = body;
    });
    bytes = found;
  }
  return bytes;
}

std::uint64_t number(Body box, std::size_t at, std::size_t bytes) {
  std::uint64_t value = 0;
  for (const std::uint8_t byte : box.subspan(at, bytes)) value = value << 8 | byte;
  return value;
}

/// A movie of six frames of 1 GB each and sixteen small ones, all holes but for the first byte of each small
/// one: its number.
std::uint64_t writeSparseMovie(const std::string& path) {
  const UniqueFd file(open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600));
  std::uint64_t end = 0;
  const auto append = [&](const Bytes& bytes) {
    EXPECT_EQ(writeAllAt(file.get(), bytes, end), 0);
    end += bytes.size();
  };
  append(fileStart());
  append(fragmentedHeader({sampleFormats().front()}));
  std::uint32_t sequence = 0;
  for (; sequence < 6; ++sequence) {
    append(fragmentHeader(sequence + 1, {{1, sequence * 1000U, {{kGigabyte, 1000, true}}}}));
    end += kGigabyte;
  }
  TrackFragment last{1, 6000, {}};
  for (int i = 0; i < 16; ++i) last.samples.push_back({100, 1000, i == 0});
  append(fragmentHeader(++sequence, {last}));
  for (std::uint8_t i = 0; i < 16; ++i) {
    Bytes sample(100, i);
    append(sample);
  }
  return end;
}

TEST(LargeMovie, IsReadFinishedAndCopiedBeyondFourGigabytes) {
  const Folder folder;
  const std::string path = folder.file("large.mov");
  const std::uint64_t end = writeSparseMovie(path);
  ASSERT_GT(end, 6ULL * kGigabyte);
  const auto index = readMovieIndex(path);
  ASSERT_TRUE(index);
  EXPECT_EQ(index->mediaEnd, end);
  const TrackIndex& track = index->tracks.front();
  ASSERT_EQ(track.sizes.size(), 22U);
  EXPECT_EQ(track.chunks[5].offset,
            track.chunks[0].offset + 5 * (track.chunks[1].offset - track.chunks[0].offset));
  EXPECT_EQ(track.chunks.back().offset, end - 16 * 100);

  ASSERT_EQ(finishMovieInPlace(path, *index), 0);
  Bytes start(kFileTypeSize + kPlaceholderSize);
  Bytes header(std::filesystem::file_size(path) - end);
  const UniqueFd file(open(path.c_str(), O_RDONLY | O_CLOEXEC));
  ASSERT_EQ(readAllAt(file.get(), start, 0), 0);
  ASSERT_EQ(readAllAt(file.get(), header, end), 0);
  EXPECT_EQ(number(start, kFileTypeSize, 4), 1U) << "the size stands in 64 bits";
  EXPECT_EQ(number(start, kFileTypeSize + 8, 8), end - kFileTypeSize);
  const Body offsets = find(header, {"moov", "trak", "mdia", "minf", "stbl", "co64"});
  ASSERT_EQ(offsets.size(), 8 + 7 * 8);
  for (std::size_t i = 0; i < 7; ++i) EXPECT_EQ(number(offsets, 8 + 8 * i, 8), track.chunks[i].offset) << i;
  EXPECT_EQ(readMovieIndex(path)->tracks.front().sizes, track.sizes) << "a finished one reads the same";

  ASSERT_EQ(copyMovieRanges(path, *index, {{6, 22}}, 1.0 / 30.0, folder.file("copy.mov")), 0);
  Bytes copied(16 * 100);
  const UniqueFd copy(open(folder.file("copy.mov").c_str(), O_RDONLY | O_CLOEXEC));
  ASSERT_EQ(readAllAt(copy.get(), copied, kFileTypeSize + kPlaceholderSize), 0);
  for (std::size_t i = 0; i < 16; ++i) EXPECT_EQ(copied[i * 100], i);
}

/// Twelve hours of picture and sound, a fragment each half second.
MovieIndex halfADay() {
  MovieIndex index;
  for (const TrackFormat& format : sampleFormats()) index.tracks.push_back({.format = format});
  index.mediaEnd = 1000;
  for (std::uint64_t fragment = 0, packets = 0; fragment < 12 * 3600 * 2; ++fragment) {
    index.tracks[0].chunks.push_back({index.mediaEnd, 0});
    for (int frame = 0; frame < 15; ++frame) index.tracks[0].addSample(10'000, 1000, frame == 0);
    index.mediaEnd += 150'000;
    index.tracks[1].chunks.push_back({index.mediaEnd, 0});
    for (; packets * 1024 < (fragment + 1) * 24'000; ++packets) {
      index.tracks[1].addSample(340, 1024, true);
      index.mediaEnd += 340;
    }
  }
  return index;
}

TEST(LargeMovie, TheIndexOfTwelveHoursIsComplete) {
  constexpr std::uint64_t kSeconds = 12 * 3600;
  const MovieIndex index = halfADay();
  EXPECT_NEAR(index.seconds(), kSeconds, 0.03);
  ASSERT_GT(index.mediaEnd, 13'000'000'000ULL);
  const Bytes header = movieHeader(index, 0);
  EXPECT_NEAR(static_cast<double>(number(find(header, {"moov", "mvhd"}), 24, 8)) / 90000, kSeconds, 0.03);
  const Body video = find(header, {"moov", "trak"});
  EXPECT_EQ(number(find(video, {"tkhd"}), 28, 8), kSeconds * 90000);
  EXPECT_EQ(number(find(video, {"mdia", "mdhd"}), 24, 8), kSeconds * 30000);
  const Body tables = find(video, {"mdia", "minf", "stbl"});
  const Body durations = find(tables, {"stts"});
  ASSERT_EQ(durations.size(), 16U) << "all frames are equally long: one entry";
  EXPECT_EQ(number(durations, 8, 4), kSeconds * 30);
  EXPECT_EQ(number(find(tables, {"stsz"}), 8, 4), kSeconds * 30);
  EXPECT_EQ(number(find(tables, {"stss"}), 4, 4), kSeconds * 2);
  const Body offsets = find(tables, {"co64"});
  ASSERT_EQ(number(offsets, 4, 4), kSeconds * 2);
  EXPECT_EQ(number(offsets, offsets.size() - 8, 8), index.tracks[0].chunks.back().offset);
}

}  // namespace
}  // namespace lmx
