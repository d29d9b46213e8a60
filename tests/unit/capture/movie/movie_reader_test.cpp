// Reading movies that nobody should trust.
#include "capture/movie/movie_reader.h"

#include <gtest/gtest.h>

#include <fstream>
#include <random>

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
