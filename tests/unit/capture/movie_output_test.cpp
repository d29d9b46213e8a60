// Raw frames and sound on one side, a movie on the other.
#include "capture/movie_output.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <complex>
#include <filesystem>
#include <numbers>
#include <numeric>
#include <random>

#include "capture/gst/video_encoders.h"
#include "capture/movie/movie_copy.h"
#include "capture/movie/movie_reader.h"
#include "capture/source/test_picture.h"
#include "tests/unit/capture/capture_harness.h"
#include "tests/unit/capture/movie/movie_check.h"
#include "tests/unit/doubles/log_capture.h"
#include "tests/unit/doubles/wait_until.h"

namespace lmx {
namespace {

using testing::decodeMovie;
using testing::Folder;
using testing::Streams;
using Numbers = std::vector<std::uint32_t>;

constexpr PictureSize kSize{160, 90};
constexpr double kFrame = 1.0 / 30.0;

/// A picture with `number` written into it.
BufferHandle pictureOf(std::uint32_t number) {
  const auto luma = static_cast<std::size_t>(kSize.width) * static_cast<std::size_t>(kSize.height);
  BufferHandle buffer(gst_buffer_new_allocate(nullptr, luma * 3 / 2, nullptr));
  gst_buffer_memset(buffer.get(), 0, 128, luma * 3 / 2);
  GstMapInfo map;
  gst_buffer_map(buffer.get(), &map, GST_MAP_WRITE);
  drawFrameNumber({{map.data, luma}, kSize.width, kSize.height, kSize.width}, number);
  gst_buffer_unmap(buffer.get(), &map);
  return buffer;
}

/// An output into a folder. Frames bear their places as numbers.
class Output {
 public:
  explicit Output(const MovieEncoding& encoding) : encoding_(encoding) {
    if (encoding_.video) encoding_.video->size = kSize;
    ensureGStreamer();
    journal_ = *Journal::create(folder_.file("journal"));
    GrowingMovie movie;
    EXPECT_EQ(movie.create(path()), 0);
    output_ =
        std::make_unique<MovieOutput>(encoding_, std::move(movie), *journal_, patience_,
                                      [this](const CaptureError& error) { ADD_FAILURE() << error.message; });
    EXPECT_TRUE(output_->start());
  }
  void frames(const Numbers& places, const Numbers& keys = {}) {
    for (const std::uint32_t place : places) {
      const bool key = std::find(keys.begin(), keys.end(), place) != keys.end();
      output_->pushFrame(pictureOf(place).get(), place, key);
    }
  }
  void close(std::uint32_t totalFrames, std::int64_t samples = 0) {
    output_->close(totalFrames, samples);
    EXPECT_EQ(output_->framesWritten(totalFrames), totalFrames);
  }
  /// Copies ranges of the closed movie. @return the copy's path
  std::string copy(const std::vector<FrameRange>& ranges) {
    const auto index = readMovieIndex(path());
    EXPECT_TRUE(index);
    EXPECT_EQ(copyMovieRanges(path(), *index, ranges, kFrame, folder_.file("copy.mov")), 0);
    return folder_.file("copy.mov");
  }
  [[nodiscard]] std::string path() const { return folder_.file("media.mov"); }
  MovieOutput& operator*() { return *output_; }

 private:
  Folder folder_;
  MovieEncoding encoding_;
  std::shared_ptr<Journal> journal_;
  Deadline patience_;
  std::unique_ptr<MovieOutput> output_;
};

MovieEncoding pictureOnly() { return {VideoEncoding{{}, {30, 1}}, std::nullopt}; }

/// Numbers and times (in frames) of a movie's pictures, and where the last one ends.
struct Shown {
  Numbers numbers;
  Numbers times;
  std::uint32_t end = 0;
};

Shown shownIn(const std::string& path) {
  const auto movie = decodeMovie(path, Streams::picture);
  EXPECT_EQ(movie.problem, "");
  Shown shown;
  for (std::size_t i = 0; i < movie.frameTimes.size(); ++i) {
    const double time = movie.frameTimes[i] / kFrame;
    // Those that are there to be decoded only.
    if (i + 1 < movie.frameTimes.size() && movie.frameTimes[i + 1] / kFrame - time < 0.1) continue;
    shown.numbers.push_back(movie.frameNumbers[i]);
    shown.times.push_back(static_cast<std::uint32_t>(std::lround(time)));
    EXPECT_NEAR(time, shown.times.back(), 0.02);
  }
  shown.end = static_cast<std::uint32_t>(std::lround(movie.duration / kFrame));
  return shown;
}

TEST(MovieOutput, AFrameBeforeAHoleIsShownForLonger) {
  Output output(pictureOnly());
  Numbers places{2, 3, 4, 9};  // holes in front and in the middle
  for (std::uint32_t place = 12; place < 40; place += 2) places.push_back(place);  // over several fragments
  places.push_back(90);                                                            // behind a long one
  output.frames(places, {2});
  output.close(100);
  const Shown shown = shownIn(output.path());
  EXPECT_EQ(shown.numbers, places) << "nothing is encoded twice";
  places.front() = 0;
  EXPECT_EQ(shown.times, places);
  EXPECT_EQ(shown.end, 100U);
}

TEST(MovieOutput, APictureDoesNotWaitForItsSound) {
  for (const bool withSound : {false, true}) {
    MovieEncoding encoding = pictureOnly();
    encoding.audio = AudioEncoding{};
    Output output(encoding);
    Numbers places;
    for (std::uint32_t place = 0; place < 60; ++place) places.push_back(place);
    output.frames(places);
    const auto onDisk = [&] {
      const auto index = readMovieIndex(output.path());
      return index && index->video()->sizes.size() >= 30;
    };
    EXPECT_TRUE(testing::waitUntil(onDisk)) << "a crash now would lose more than half a second";
    if (withSound) (*output).pushSound(nullptr, 96000);
    output.close(60, 96000);
    const auto movie = decodeMovie(output.path(), withSound ? Streams::both : Streams::picture);
    EXPECT_EQ(movie.problem, "");
    EXPECT_EQ(movie.frameNumbers, places);
    EXPECT_NEAR(movie.duration, 2.0, 0.03);
  }
}

/// A still picture costs next to nothing, noise no more than the ceiling.
TEST(MovieOutput, TakesTheBitsThatThePictureNeeds) {
  const auto kilobits = [](bool noise) {
    Output output(pictureOnly());
    std::mt19937 random(5);  // NOLINT: the same numbers every time
    const BufferHandle still = pictureOf(7);
    for (std::uint32_t place = 0; place < 300; ++place) {
      BufferHandle picture(gst_buffer_copy_deep(still.get()));
      GstMapInfo map;
      gst_buffer_map(picture.get(), &map, GST_MAP_WRITE);
      if (noise) std::generate_n(map.data, map.size, [&] { return static_cast<guint8>(random()); });
      gst_buffer_unmap(picture.get(), &map);
      (*output).pushFrame(picture.get(), place, place == 0);
    }
    output.close(300);
    return static_cast<double>(std::filesystem::file_size(output.path())) * 8 / 10 / 1000;
  };
  const int ceiling = videoBitRate({kSize, {30, 1}});
  EXPECT_LT(kilobits(false), ceiling * 0.1);
  EXPECT_GT(kilobits(true), ceiling * 0.5) << "the test's noise needs all it can get";
  EXPECT_LT(kilobits(true), ceiling * 1.5) << "ten seconds may hold twelve seconds' bits";
}

TEST(MovieOutput, ASlowCamerasKeyFramesAreTwoSecondsApartAtMost) {
  Output output(pictureOnly());
  Numbers places;
  for (std::uint32_t place = 0; place < 600; place += 15) places.push_back(place);
  output.frames(places, {0});
  output.close(600);
  const auto index = readMovieIndex(output.path());
  ASSERT_TRUE(index);
  EXPECT_EQ(index->video()->syncSamples, (Numbers{0, 4, 8, 12, 16, 20, 24, 28, 32, 36}));
}

TEST(MovieOutput, ACopyMayBeginAndEndInsideALongFrame) {
  Output output(pictureOnly());
  output.frames({0, 10, 20, 24, 30, 40, 41}, {0, 10, 30});
  output.close(60);
  struct Case {
    std::vector<FrameRange> ranges;
    Numbers numbers;
    Numbers times;
    std::uint32_t end;
  };
  for (const Case& c : {
           Case{{{13, 22}}, {10, 20}, {0, 7}, 9},  // begins inside a key frame, which is shortened
           Case{{{26, 35}}, {30}, {0}, 9},         // inside another one: a key frame follows
           Case{{{22, 26}}, {20, 24}, {0, 2}, 4},  // none follows: the key frame before is decoded, not shown
           Case{{{0, 5}, {35, 50}}, {0, 30, 40, 41}, {0, 5, 10, 11}, 20},
           Case{{{45, 60}}, {41}, {0}, 15},  // all of it within one frame
           Case{{{12, 13}}, {10}, {0}, 1},
       }) {
    const Shown shown = shownIn(output.copy(c.ranges));
    EXPECT_EQ(shown.numbers, c.numbers) << c.ranges.front().first;
    EXPECT_EQ(shown.times, c.times) << c.ranges.front().first;
    EXPECT_EQ(shown.end, c.end) << c.ranges.front().first;
  }
}

/// What is left of a sound when the sine in it is taken away, as a part of that sine; the ends don't count.
double besidesSine(const std::vector<float>& sound, double hertz) {
  constexpr std::size_t kPiece = 4800;  // whole periods of any multiple of 10 Hz
  double left = 0;
  double all = 0;
  for (std::size_t begin = 24000; begin + kPiece <= sound.size() - 24000; begin += kPiece) {
    const auto turned = [&](std::size_t i) {
      return std::polar(1.0, 2 * std::numbers::pi * hertz * static_cast<double>(i) / 48000);
    };
    std::complex<double> sine = 0;  // strength and phase in this piece
    for (std::size_t i = begin; i < begin + kPiece; ++i)
      sine += 2.0 / kPiece * sound[i] * std::conj(turned(i));
    for (std::size_t i = begin; i < begin + kPiece; ++i)
      left += std::pow(sound[i] - (sine * turned(i)).real(), 2);
    all += std::norm(sine) / 2 * kPiece;
  }
  return std::sqrt(left / all);
}

TEST(MovieOutput, ASteadyToneStaysSteady) {
  constexpr std::size_t kSamples = std::size_t{48000} * 5;
  constexpr double kHertz = 1010;
  MovieEncoding encoding;
  encoding.audio = AudioEncoding{};
  for (const double right : {1.0, 0.0}) {
    Output output(encoding);
    std::vector<float> samples;
    for (std::size_t i = 0; i < kSamples; ++i) {
      const double sine = 0.7 * std::sin(2 * std::numbers::pi * static_cast<double>(i) * kHertz / 48000);
      samples.insert(samples.end(), {static_cast<float>(sine), static_cast<float>(sine * right)});
    }
    (*output).pushSound(samples.data(), kSamples);
    output.close(0, kSamples);
    const auto movie = decodeMovie(output.path(), Streams::sound);
    ASSERT_GE(movie.sound.size(), kSamples - 1024);
    EXPECT_LT(besidesSine(movie.sound, kHertz), 0.04) << "the right side is " << right << " of the left";
  }
}

/// Hardware that worked when it was tried out and is taken when the recording begins.
TEST(MovieOutput, HardwareThatIsTakenIsReplacedWithoutHarm) {
  ensureGStreamer();
  testing::LogCapture log;
  const auto uses = std::make_shared<int>(0);
  const VideoEncoderKind hardware{"hardware", [uses](const VideoEncoding& video) {
                                    const std::string working = softwareEncoder().elements(video);
                                    if ((*uses)++ == 0) return working;
                                    return working +
                                           " ! tee name=t t. ! filesink location=/dev/null/device t.";
                                  }};
  VideoEncoderChoice::instance().tryOut({hardware});
  ASSERT_TRUE(log.mentions("Pictures are encoded with hardware"));
  MovieEncoding encoding = pictureOnly();
  encoding.audio = AudioEncoding{};
  {
    Output output(encoding);  // an error that it tells is a failure
    Numbers places(60);
    std::iota(places.begin(), places.end(), 0);
    output.frames(places);
    (*output).pushSound(nullptr, 96000);
    output.close(60, 96000);
    const auto movie = decodeMovie(output.path());
    EXPECT_EQ(movie.problem, "");
    EXPECT_EQ(movie.frameNumbers, places);
  }
  EXPECT_EQ(*uses, 2);
  EXPECT_TRUE(log.mentions("hardware could not be started ("));
  EXPECT_TRUE(log.mentions("/dev/null/device")) << "the reason";
  EXPECT_FALSE(log.mentions("describes its sound otherwise"));
  VideoEncoderChoice::instance().tryOut({softwareEncoder()});
}

}  // namespace
}  // namespace lmx
