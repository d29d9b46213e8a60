// Copying parts of a movie.
#include "capture/movie/movie_copy.h"

#include <gtest/gtest.h>

#include <fstream>

#include "capture/movie/movie_reader.h"
#include "tests/unit/capture/capture_harness.h"
#include "tests/unit/capture/movie/sample_movies.h"

namespace lmx {
namespace {

using testing::Folder;
using testing::writeSampleMovie;

TEST(CopyMovieRanges, CopiesFramesAndTheirSound) {
  const Folder folder;
  writeSampleMovie(folder.file("a.mov"), 4, true);
  const auto index = readMovieIndex(folder.file("a.mov"));
  ASSERT_EQ(
      copyMovieRanges(folder.file("a.mov"), *index, {{15, 20}, {30, 60}}, 1.0 / 30.0, folder.file("b.mov")),
      0);
  std::ifstream copy(folder.file("b.mov"), std::ios::binary);
  const std::string bytes((std::istreambuf_iterator<char>(copy)), {});
  for (const int number : {15, 19, 30, 59}) {
    EXPECT_NE(bytes.find(std::string(20, static_cast<char>(number))), std::string::npos) << number;
  }
  for (const int number : {14, 20, 29}) {
    EXPECT_EQ(bytes.find(std::string(20, static_cast<char>(number))), std::string::npos) << number;
  }
}

}  // namespace
}  // namespace lmx
