// Raw media and marks on one side, a movie and what of it is not real on the other.
#include "capture/media_cutter.h"

#include <gtest/gtest.h>

#include <utility>
#include <vector>

#include "capture/gst/gst_handles.h"
#include "tests/unit/capture/capture_harness.h"
#include "tests/unit/capture/movie/movie_check.h"

namespace lmx {
namespace {

using testing::decodeMovie;
using testing::Folder;

constexpr PictureSize kSize{64, 64};
constexpr double kFrame = 1.0 / 30.0;
constexpr double kChunk = 0.01;  // seconds

BufferHandle greyPicture() {
  constexpr gsize kBytes = gsize{kSize.width} * gsize{kSize.height} * 3 / 2;
  BufferHandle buffer(gst_buffer_new_allocate(nullptr, kBytes, nullptr));
  gst_buffer_memset(buffer.get(), 0, 128, kBytes);
  return buffer;
}

BufferHandle quietChunk() {
  constexpr gsize kBytes = gsize{480} * 2 * sizeof(float);
  BufferHandle buffer(gst_buffer_new_allocate(nullptr, kBytes, nullptr));
  gst_buffer_memset(buffer.get(), 0, 0, kBytes);
  return buffer;
}

/// A capture of a camera and a microphone that is fed by hand.
class Cut {
 public:
  struct Silence {
    double from = 0;
    double seconds = 0;
  };

  Cut() {
    ensureGStreamer();
    GrowingMovie movie;
    EXPECT_EQ(movie.create(path()), 0);
    movie_ = std::make_unique<MovieOutput>(encoding_, std::move(movie), *journal_, patience_,
                                           [](const CaptureError& error) { ADD_FAILURE() << error.message; });
    cutter_ = std::make_unique<MediaCutter>(
        encoding_, 0.0,
        MediaCutter::Surroundings{.marks = marks_,
                                  .journal = *journal_,
                                  .movie = *movie_,
                                  .convert = [](const RawMedium& /*frame*/) { return greyPicture(); },
                                  .heard = [](const RawMedium& /*chunk*/) {},
                                  .silenced =
                                      [this](double t, double seconds) {
                                        silences_.push_back({t, seconds});
                                      },
                                  .soundComes = [] { return true; },
                                  .now = [this] { return now_.value_or(cutter_->frames().horizon()); }});
  }
  /// Feeds what the camera and the microphone give from `from` to `to`, seconds of running time, as it comes.
  /// @param hole  when the microphone gives nothing
  void media(double from, double to, Span hole = {0, 0}) {
    double heard = from;
    const auto soundUntil = [&](double t) {
      for (; heard < t - 1e-9; heard += kChunk)
        if (!hole.contains(heard + 1e-9)) sound(heard, heard + kChunk);
    };
    for (double t = from; t < to - 1e-9; t += kFrame) {
      picture(t);
      soundUntil(t + kFrame);
    }
    soundUntil(to);
  }
  void picture(double t) { cutter_->feedFrame({greyPicture(), t}); }
  void sound(double from, double to) {
    RawMedia chunks;
    for (double t = from; t < to - 1e-9; t += kChunk) chunks.push_back({quietChunk(), t});
    cutter_->feedSound(std::move(chunks));
  }
  /// @return length of picture and sound in the movie, seconds
  std::pair<double, double> close(double end) {
    cutter_->close(end);
    movie_->close(cutter_->frames().frames(), cutter_->samples());
    const auto movie = decodeMovie(path());
    EXPECT_EQ(movie.problem, "");
    return {movie.duration, static_cast<double>(movie.sound.size()) / movie.sampleRate};
  }
  /// The running time from now on; otherwise it is that of the pictures.
  void setNow(double now) { now_ = now; }
  CaptureMarks& marks() { return marks_; }
  [[nodiscard]] std::uint32_t frames() const { return cutter_->recordedFrames(); }
  [[nodiscard]] const std::vector<Silence>& silences() const { return silences_; }
  [[nodiscard]] std::string path() const { return folder_.file("media.mov"); }

 private:
  Folder folder_;
  const MovieEncoding encoding_{VideoEncoding{kSize, {30, 1}}, AudioEncoding{}};
  std::shared_ptr<Journal> journal_ = *Journal::create(folder_.file("journal"));
  CaptureMarks marks_{journal_};
  Deadline patience_;
  std::vector<Silence> silences_;
  std::optional<double> now_;
  std::unique_ptr<MovieOutput> movie_;
  std::unique_ptr<MediaCutter> cutter_;
};

TEST(MediaCutter, SoundThatIsThereIsNoSilence) {
  Cut cut;
  cut.marks().start("R", 0, nullptr);
  cut.media(0, 2);
  cut.close(2);
  EXPECT_TRUE(cut.silences().empty()) << cut.silences().size();
}

TEST(MediaCutter, SoundThatComesAMomentAfterABurstOfPicturesIsNoSilence) {
  Cut cut;
  cut.marks().start("R", 0, nullptr);
  cut.media(0, 2);
  cut.setNow(4);
  for (double t = 2; t < 4 - 1e-9; t += kFrame) {
    cut.picture(t);
    cut.sound(t, t);  // a batch without sound
  }
  EXPECT_TRUE(cut.silences().empty());
  cut.setNow(4.5);
  cut.sound(2, 4);
  cut.close(4);
  EXPECT_TRUE(cut.silences().empty()) << cut.silences().front().seconds;
}

TEST(MediaCutter, SoundThatDoesNotComeAfterABurstIsSilenceASecondLater) {
  Cut cut;
  cut.marks().start("R", 0, nullptr);
  cut.media(0, 2);
  cut.setNow(4);
  for (double t = 2; t < 4 - 1e-9; t += kFrame) cut.picture(t);
  cut.sound(4, 4);
  cut.setNow(5.1);
  cut.picture(4);
  cut.sound(4, 4);
  ASSERT_FALSE(cut.silences().empty());
  EXPECT_NEAR(cut.silences().front().from, 2, 0.001);
  EXPECT_NEAR(cut.silences().front().seconds, 1, 0.1);
}

TEST(MediaCutter, SilenceIsToldWithItsTime) {
  Cut cut;
  cut.marks().start("R", 1, nullptr);  // the movie's times are others than the capture's
  cut.media(1, 7, {4, 5.2});
  cut.close(7);
  double seconds = 0;
  ASSERT_FALSE(cut.silences().empty());
  EXPECT_NEAR(cut.silences().front().from, 4.0, 0.001);
  for (const auto& silence : cut.silences()) {
    EXPECT_GT(silence.seconds, 0);
    EXPECT_NEAR(silence.from, 4.0 + seconds, 0.001) << "one follows the other";
    seconds += silence.seconds;
  }
  EXPECT_NEAR(seconds, 1.2, 0.001);
}

TEST(MediaCutter, SilenceBehindACutIsToldWithTheTimeOfTheCapture) {
  Cut cut;
  cut.marks().start("R", 0, nullptr);
  cut.marks().pause(1);
  cut.marks().resume(11);
  cut.media(0, 11);
  cut.media(11, 13, {11, 11.5});
  cut.close(13);
  ASSERT_EQ(cut.silences().size(), 1U);
  EXPECT_NEAR(cut.silences().front().from, 11.0, 0.001);
  EXPECT_NEAR(cut.silences().front().seconds, 0.5, 0.001);
}

TEST(MediaCutter, SoundBesideACameraThatIsAwayIsKeptToTheStop) {
  Cut cut;
  cut.marks().start("R", 0, nullptr);
  cut.media(0, 3);
  cut.sound(3, 7.2);
  cut.marks().end(CaptureMarks::Ending::stop, 7);
  const auto [picture, sound] = cut.close(7);
  EXPECT_NEAR(picture, 7, 0.03);
  EXPECT_NEAR(sound, 7, 0.03);
  EXPECT_TRUE(cut.silences().empty());
  EXPECT_EQ(cut.frames(), 210U);
}

TEST(MediaCutter, APauseWhileTheCameraIsAwayKeepsWhatWasSaidBeforeIt) {
  Cut cut;
  cut.marks().start("R", 0, nullptr);
  cut.media(0, 2);
  cut.marks().pause(5);
  cut.sound(2, 9);
  cut.picture(9);  // it is back
  EXPECT_EQ(cut.frames(), 150U) << "five seconds";
  cut.marks().resume(9.5);
  cut.media(9.5, 10.5);
  const auto [picture, sound] = cut.close(10.5);
  EXPECT_NEAR(picture, 6, 0.05);
  EXPECT_NEAR(sound, 6, 0.05);
  EXPECT_TRUE(cut.silences().empty());
}

TEST(MediaCutter, ASlowCamerasLastPictureLastsUntilTheStop) {
  Cut cut;
  cut.marks().start("R", 0, nullptr);
  for (double t = 0; t < 3.3; t += 0.43) cut.picture(t);  // up to 3.01
  cut.sound(0, 4);
  cut.marks().stop("R", 3.4);
  cut.picture(3.44);
  const auto [picture, sound] = cut.close(3.4);
  EXPECT_NEAR(picture, 3.4, 0.03);
  EXPECT_NEAR(sound, 3.4, 0.03);
}

TEST(MediaCutter, NothingIsProlongedBehindWhatIsWanted) {
  Cut cut;
  cut.marks().start("R", 0, nullptr);
  cut.marks().stop("R", 2);
  cut.media(0, 2.5);
  const auto [picture, sound] = cut.close(8);
  EXPECT_NEAR(picture, 2, 0.03);
  EXPECT_NEAR(sound, 2, 0.03);
}

}  // namespace
}  // namespace lmx
