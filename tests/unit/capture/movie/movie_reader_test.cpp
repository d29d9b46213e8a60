// Reading movies that nobody should trust.
#include "capture/movie/movie_reader.h"

#include <gtest/gtest.h>

#include <fstream>
#include <random>

#include "capture/movie/fragment_boxes.h"
#include "capture/movie/movie_boxes.h"
#include "tests/unit/capture/capture_harness.h"
#include "tests/unit/capture/movie/sample_movies.h"

namespace lmx {
namespace {

using testing::Folder;
using testing::writeSampleMovie;

TEST(ReadMovieIndex, OtherFilesAreRefused) {
  const Folder folder;
  EXPECT_FALSE(readMovieIndex(folder.file("missing")));
  std::ofstream(folder.file("text")) << std::string(5000, 'x');
  EXPECT_FALSE(readMovieIndex(folder.file("text")));
}

/// Where a fragment's head holds the fields of its only sample.
constexpr std::size_t kDataOffsetAt = 84;
constexpr std::size_t kSampleSizeAt = 92;

/// Frames that are read of a movie of one frame of 100 bytes, with one byte of its fragment's head changed.
std::size_t framesRead(const Folder& folder, std::size_t at, std::uint8_t value) {
  Bytes fragment = fragmentHeader(1, {{1, 0, {{100, 1000, true}}}});
  EXPECT_EQ(fragment[kDataOffsetAt + 3], fragment.size()) << "the head is not laid out as this test thinks";
  EXPECT_EQ(fragment[kSampleSizeAt + 3], 100);
  fragment[at] = value;
  fragment.resize(fragment.size() + 100);
  std::ofstream file(folder.file("m.mov"), std::ios::binary);
  for (const Bytes& part : {fileStart(), fragmentedHeader({testing::sampleFormats().front()}), fragment})
    file.write(reinterpret_cast<const char*>(part.data()), static_cast<std::streamsize>(part.size()));
  file.close();
  const auto index = readMovieIndex(folder.file("m.mov"));
  return index ? index->tracks.front().sizes.size() : 0;
}

TEST(ReadMovieIndex, SamplesOutsideOfTheirMediaAreRefused) {
  const Folder folder;
  EXPECT_EQ(framesRead(folder, kSampleSizeAt + 3, 100), 1U);
  EXPECT_EQ(framesRead(folder, kSampleSizeAt + 3, 99), 1U);
  EXPECT_EQ(framesRead(folder, kSampleSizeAt + 3, 101), 0U) << "one byte too long";
  EXPECT_EQ(framesRead(folder, kSampleSizeAt, 0xFF), 0U) << "4 GB long";
  EXPECT_EQ(framesRead(folder, kDataOffsetAt + 3, 107), 0U) << "begins in the head";
  EXPECT_EQ(framesRead(folder, kDataOffsetAt, 0xFF), 0U) << "begins behind the file";
}

TEST(ReadMovieIndex, KnowsWhatIsNotPresented) {
  const Folder folder;
  auto formats = testing::sampleFormats();
  for (const std::uint32_t priming : {0U, 1024U, 2047U}) {  // earlier versions wrote no edit list
    formats[1].priming = priming;
    const std::string path = folder.file(std::to_string(priming));
    GrowingMovie movie;
    ASSERT_EQ(movie.create(path), 0);
    ASSERT_EQ(movie.begin(formats), 0);
    ASSERT_EQ(movie.append(testing::sampleFragment(0)), 0);
    const auto index = readMovieIndex(path);
    ASSERT_TRUE(index);
    EXPECT_EQ(index->tracks[0].format.priming, 0U);
    EXPECT_EQ(index->tracks[1].format.priming, priming);
    EXPECT_EQ(index->tracks[1].presented(), 23U * 1024 - priming);
    EXPECT_LE(movieTimeNow() - index->created, 60U);
  }
}

TEST(ReadMovieIndex, AnyCorruptionIsSurvived) {
  const Folder folder;
  writeSampleMovie(folder.file("a.mov"), 2, false);
  std::ifstream in(folder.file("a.mov"), std::ios::binary);
  const std::string good((std::istreambuf_iterator<char>(in)), {});
  std::mt19937 random(11);  // NOLINT: the same numbers every time
  for (int round = 0; round < 2000; ++round) {
    std::string bad = good;
    for (int i = 0; i < 3; ++i) bad[random() % bad.size()] = static_cast<char>(random());
    std::ofstream(folder.file("bad.mov"), std::ios::binary) << bad;
    const auto index = readMovieIndex(folder.file("bad.mov"));
    if (index) {
      EXPECT_LE(index->mediaEnd, bad.size());
    }
  }
}

}  // namespace
}  // namespace lmx
