// The queue between the encoder and a disk that is slow, or a track that never begins.
#include "capture/store/movie_writer.h"

#include <gtest/gtest.h>

#include <future>

#include "capture/movie/movie_reader.h"
#include "tests/unit/capture/capture_harness.h"
#include "tests/unit/capture/failing_sync.h"
#include "tests/unit/capture/movie/sample_movies.h"
#include "tests/unit/doubles/wait_until.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;
using testing::Folder;
using testing::sampleFormats;
using testing::sampleFragment;
using testing::waitUntil;

struct Writing {
  Writing() {
    GrowingMovie movie;
    EXPECT_EQ(movie.create(path()), 0);
    writer = std::make_unique<MovieWriter>(std::move(movie), 2, *journal, patience,
                                           [this](int error) { errors.push_back(error); });
  }
  [[nodiscard]] std::string path() const { return folder.file("media.mov"); }
  void addFragment(std::uint32_t n) const {
    for (EncodedSample& sample : sampleFragment(n)) writer->add(std::move(sample));
  }

  Folder folder;
  std::shared_ptr<Journal> journal = *Journal::create(folder.file("journal"));
  Deadline patience;
  std::vector<int> errors;
  std::unique_ptr<MovieWriter> writer;
};

TEST(MovieWriter, KeepsTheFormatThatItBeganWith) {
  Writing movie;
  auto formats = sampleFormats();
  EXPECT_TRUE(movie.writer->setFormat(1, formats[1]));
  formats[1].timescale = 44100;
  EXPECT_TRUE(movie.writer->setFormat(1, formats[1])) << "nothing is written yet";
  EXPECT_TRUE(movie.writer->setFormat(0, formats[0]));
  movie.addFragment(0);
  ASSERT_TRUE(waitUntil([&] { return readMovieIndex(movie.path()).has_value(); }));
  EXPECT_FALSE(movie.writer->setFormat(1, sampleFormats()[1]));
  EXPECT_EQ(movie.writer->finish(), 0);
  EXPECT_EQ(readMovieIndex(movie.path())->tracks[1].format.timescale, 44100U);
}

TEST(MovieWriter, AFullQueueIsWaitedForUntilThePatienceEnds) {
  Writing movie;
  for (std::uint32_t t = 0; t < 2; ++t) movie.writer->setFormat(t, sampleFormats()[t]);
  auto hang = std::make_unique<testing::HeldSyncs>();
  ASSERT_TRUE(waitUntil([&] {  // the writer syncs once a second
    movie.addFragment(0);
    return testing::HeldSyncs::anyHeld();
  }));
  const EncodedSample large{.track = 0, .data = Bytes(std::size_t{1} << 20), .duration = 1};
  auto feeding = std::async(std::launch::async, [&] {
    for (std::size_t i = 0; i < MovieWriter::kQueueLimit / large.data.size() + 10; ++i)
      movie.writer->add(large);
  });
  EXPECT_EQ(feeding.wait_for(300ms), std::future_status::timeout) << "the disk takes nothing";
  EXPECT_TRUE(movie.errors.empty());
  movie.patience.set(Deadline::Clock::now());
  ASSERT_EQ(feeding.wait_for(20s), std::future_status::ready);
  EXPECT_EQ(movie.errors, std::vector<int>{ETIMEDOUT});
  hang = nullptr;
  EXPECT_EQ(movie.writer->finish(), 0);
  EXPECT_GE(std::filesystem::file_size(movie.path()), MovieWriter::kQueueLimit) << "what was queued is kept";
}

TEST(MovieWriter, DoesNotCollectForATrackThatNeverBegins) {
  Writing movie;
  movie.writer->setFormat(1, sampleFormats()[1]);
  for (int second = 0; second < 40; ++second) {
    EXPECT_EQ(movie.errors.empty(), second <= 30) << second;
    movie.writer->add({.track = 1, .data = Bytes(10), .duration = 48000});
  }
  EXPECT_EQ(movie.errors, std::vector<int>{ENODATA});
}

}  // namespace
}  // namespace lmx
