// The growing movie: written, cut off anywhere, made whole.
#include "capture/movie/growing_movie.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <random>

#include "capture/movie/movie_finish.h"
#include "capture/movie/movie_reader.h"
#include "tests/unit/capture/capture_harness.h"
#include "tests/unit/capture/movie/sample_movies.h"

namespace lmx {
namespace {

using testing::firstBytes;
using testing::Folder;
using testing::writeSampleMovie;

TEST(GrowingMovie, ReadsBackAsWritten) {
  for (const bool finished : {false, true}) {
    const Folder folder;
    const std::string path = folder.file("m.mov");
    writeSampleMovie(path, 4, finished);
    const auto index = readMovieIndex(path);
    ASSERT_TRUE(index);
    ASSERT_EQ(index->tracks.size(), 2U);
    EXPECT_EQ(index->tracks[0].sizes.size(), 60U);
    EXPECT_EQ(index->tracks[0].syncSamples, (std::vector<std::uint32_t>{0, 15, 30, 45}));
    EXPECT_EQ(index->tracks[0].totalDuration, 60000U);
    EXPECT_EQ(index->tracks[0].format.width, 64);
    EXPECT_EQ(index->tracks[1].sizes.size(), 92U);
    const auto bytes = firstBytes(path, index->tracks[0]);
    for (int i = 0; i < 60; ++i) EXPECT_EQ(bytes[static_cast<std::size_t>(i)], i);
  }
}

TEST(GrowingMovie, CutOffAnywhereKeepsItsWholeFragments) {
  const Folder folder;
  const std::string whole = folder.file("whole.mov");
  writeSampleMovie(whole, 4, false);
  const auto size = std::filesystem::file_size(whole);
  std::mt19937 random(3);  // NOLINT: the same numbers every time
  std::size_t before = 0;
  for (std::uintmax_t step = 0; before < 60 && step <= size; step += 1 + random() % 40) {
    const std::uintmax_t cut = step + 40 > size ? size : step;  // the whole file is the last one tried
    const std::string path = folder.file("cut.mov");
    std::filesystem::copy_file(whole, path, std::filesystem::copy_options::overwrite_existing);
    std::filesystem::resize_file(path, cut);
    const auto index = readMovieIndex(path);
    if (!index) {
      EXPECT_EQ(before, 0U);
      continue;
    }
    const std::size_t frames = index->tracks[0].sizes.size();
    EXPECT_EQ(frames % 15, 0U);
    EXPECT_GE(frames, before);
    EXPECT_LE(index->mediaEnd, cut);
    before = frames;
    if (frames == 0) continue;
    ASSERT_EQ(finishMovieInPlace(path, *index), 0);
    const auto again = readMovieIndex(path);
    ASSERT_TRUE(again);
    EXPECT_EQ(again->tracks[0].sizes, index->tracks[0].sizes);
  }
  EXPECT_EQ(before, 60U);
}

TEST(GrowingMovie, NeverOverwritesAFile) {
  const Folder folder;
  writeSampleMovie(folder.file("m.mov"), 1, true);
  GrowingMovie movie;
  EXPECT_EQ(movie.create(folder.file("m.mov")), EEXIST);
}

}  // namespace
}  // namespace lmx
