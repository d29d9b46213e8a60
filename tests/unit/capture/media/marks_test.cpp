// Marks into spans, spans into frames and samples.
#include <gtest/gtest.h>

#include <cmath>
#include <random>

#include "capture/media/request_marks.h"
#include "capture/media/span_cutter.h"
#include "capture/store/journal.h"

namespace lmx {
namespace {

constexpr double kFrame = 1.0 / 30.0;

std::vector<Span> spansOf(const RequestMarks& marks, const std::string& uuid) {
  return marks.find(uuid)->spans;
}

TEST(RequestMarks, SpansAreHalfOpen) {
  RequestMarks marks;
  marks.start("R", 1, nullptr);
  marks.stop("R", 2);
  EXPECT_FALSE(marks.wanted(0.999));
  EXPECT_TRUE(marks.wanted(1));
  EXPECT_TRUE(marks.wanted(1.999));
  EXPECT_FALSE(marks.wanted(2));
}

TEST(RequestMarks, SecondStartOfAnOpenSpanChangesNothing) {
  RequestMarks marks;
  marks.start("R", 1, nullptr);
  marks.start("R", 5, nullptr);
  EXPECT_EQ(spansOf(marks, "R"), (std::vector<Span>{{.start = 1}}));
}

TEST(RequestMarks, StartBeforeTheLastStopCountsFromThere) {
  RequestMarks marks;
  marks.start("R", 1, nullptr);
  marks.stop("R", 5);
  marks.start("R", 3, nullptr);
  EXPECT_EQ(spansOf(marks, "R"), (std::vector<Span>{{1, 5}, {.start = 5}}));
}

TEST(RequestMarks, StopBeforeTheStartLeavesAnEmptySpan) {
  RequestMarks marks;
  marks.start("R", 5, nullptr);
  marks.stop("R", 3);
  EXPECT_EQ(spansOf(marks, "R"), (std::vector<Span>{{5, 5}}));
  EXPECT_TRUE(marks.starving(5));
}

TEST(RequestMarks, SecondStopOnlyCutsShorter) {
  RequestMarks marks;
  marks.start("R", 1, nullptr);
  marks.stop("R", 5);
  marks.stop("R", 7);
  EXPECT_EQ(spansOf(marks, "R").back().stop, 5);
  marks.stop("R", 4);
  EXPECT_EQ(spansOf(marks, "R").back().stop, 4);
}

TEST(RequestMarks, StopOfAnUnknownRequestIsIgnored) {
  RequestMarks marks;
  marks.stop("R", 1);
  EXPECT_EQ(marks.find("R"), nullptr);
}

TEST(RequestMarks, PauseKeepsEverybodyOut) {
  RequestMarks marks;
  marks.start("R", 0, nullptr);
  marks.pause(2);
  EXPECT_TRUE(marks.paused());
  marks.resume(3);
  EXPECT_TRUE(marks.wanted(1.9));
  EXPECT_FALSE(marks.wanted(2.5));
  EXPECT_TRUE(marks.wanted(3));
  EXPECT_DOUBLE_EQ(marks.elapsed("R", 10), 9);
}

TEST(RequestMarks, CancelledRequestWantsNothing) {
  RequestMarks marks;
  marks.start("A", 0, nullptr);
  marks.start("B", 1, nullptr);
  marks.cancel("A");
  EXPECT_FALSE(marks.wanted(0.5));
  EXPECT_TRUE(marks.wanted(1.5));
  EXPECT_TRUE(marks.othersPending("A"));
  EXPECT_FALSE(marks.othersPending("B"));
}

TEST(RequestMarks, StartsBetweenTellsWhereAKeyFrameMustBe) {
  RequestMarks marks;
  marks.start("A", 1.0, nullptr);
  EXPECT_TRUE(marks.startsBetween(0.99, 1.02));
  EXPECT_FALSE(marks.startsBetween(1.0, 1.03));
}

TEST(FrameCutter, CutsWithoutAGap) {
  FrameCutter cutter(kFrame);
  std::vector<std::uint32_t> places;
  for (int n = 0; n < 40; ++n) {
    const bool wanted = (n >= 5 && n < 10) || n >= 20;
    const FrameDecision decision = cutter.decide(n * kFrame, wanted, false);
    EXPECT_EQ(decision.take, wanted);
    EXPECT_EQ(decision.forceKey, n == 5 || n == 20);
    if (decision.take) places.push_back(decision.place);
  }
  for (std::size_t i = 0; i < places.size(); ++i) EXPECT_EQ(places[i], i);
  ASSERT_EQ(cutter.runs().size(), 2U);
  EXPECT_EQ(cutter.runs()[1].firstFrame, 5U);
}

TEST(FrameCutter, MissingFrameKeepsItsPlace) {
  FrameCutter cutter(kFrame);
  cutter.decide(0, true, false);
  EXPECT_EQ(cutter.decide(3 * kFrame, true, false).place, 3U);
  EXPECT_FALSE(cutter.decide(3.2 * kFrame, true, false).take);
}

TEST(FrameCutter, SpanThatBeginsInsideARunGetsAKeyFrame) {
  FrameCutter cutter(kFrame);
  cutter.decide(0, true, false);
  EXPECT_TRUE(cutter.decide(kFrame, true, true).forceKey);
}

/// Any frames, spans and chunk sizes: every recorded sample is the one that belongs there by its time stamp.
TEST(SoundCutter, PlacesEverySampleByItsTime) {
  std::mt19937 random(7);  // NOLINT: the same numbers every time
  for (int round = 0; round < 200; ++round) {
    const int rate = 48000;
    const std::uint32_t chunk = std::uniform_int_distribution<std::uint32_t>(100, 3000)(random);
    std::vector<bool> wanted(90);
    for (std::size_t n = 1; n < wanted.size(); ++n)
      wanted[n] = random() % 8 == 0 ? !wanted[n - 1] : wanted[n - 1];
    FrameCutter frames(kFrame);
    SoundCutter sound(frames, rate);
    std::vector<std::int64_t> out;  // sample number of the source, -1 for silence
    std::int64_t next = 0;
    const auto feed = [&](double horizon) {
      while (static_cast<double>(next + chunk) / rate <= horizon + 1e-6) {
        for (const SoundPiece& piece : sound.cut(static_cast<double>(next) / rate, chunk)) {
          out.insert(out.end(), piece.silence, -1);
          for (std::uint32_t i = 0; i < piece.count; ++i) out.push_back(next + piece.offset + i);
        }
        next += chunk;
      }
    };
    for (std::size_t n = 0; n < wanted.size(); ++n) {
      frames.decide(static_cast<double>(n) * kFrame, wanted[n], false);
      feed(frames.horizon());
    }
    frames.close();
    feed(10);
    out.insert(out.end(), sound.missingAtEnd(), -1);
    std::vector<std::int64_t> expected;
    for (std::size_t n = 0; n < wanted.size(); ++n) {
      if (!wanted[n]) continue;
      for (int i = 0; i < rate / 30; ++i) expected.push_back(static_cast<std::int64_t>(n) * rate / 30 + i);
    }
    ASSERT_EQ(out, expected) << "round " << round << ", chunks of " << chunk;
  }
}

TEST(SoundCutter, LateMicrophoneBeginsWithSilence) {
  FrameCutter frames(kFrame);
  SoundCutter sound(frames, 48000);
  for (int n = 0; n < 3; ++n) frames.decide(n * kFrame, true, false);
  const auto pieces = sound.cut(0.02, 480);
  ASSERT_EQ(pieces.size(), 1U);
  EXPECT_EQ(pieces[0], (SoundPiece{.silence = 960, .offset = 0, .count = 480}));
}

TEST(SoundCutter, WanderingClockIsCorrectedBeyondTheToleranceOnly) {
  FrameCutter frames(0.01);
  SoundCutter sound(frames, 48000, 0.015);
  double t = 0;
  for (int n = 0; n < 60000; ++n) {  // ten minutes; the microphone's second lasts 1.0002 of ours
    frames.decide(n * 0.01, true, false);
    while (t + 0.010002 <= frames.horizon()) {
      sound.cut(t, 480);
      t += 0.010002;
    }
    const double error = static_cast<double>(sound.position()) / 48000 - t;
    ASSERT_LT(std::abs(error), 0.0151);
  }
  EXPECT_NEAR(static_cast<double>(sound.corrected()) / 48000, 600 * 0.0002, 0.02);
}

TEST(FramesOf, RoundsMarksUpToFrames) {
  const std::vector<MovieRun> runs{{.sessionTime = 10, .firstFrame = 0},
                                   {.sessionTime = 20, .firstFrame = 30}};
  Request request{.uuid = "R", .parameters = nullptr, .spans = {{10.05, 10.5}, {20.0, 20.2}}};
  EXPECT_EQ(framesOf(request, runs, kFrame, 60), (std::vector<FrameRange>{{2, 15}, {30, 36}}));
  request.spans = {{9, 30}};
  EXPECT_TRUE(coversAll(framesOf(request, runs, kFrame, 60), 60));
  request.spans = {{11, 12}};
  EXPECT_TRUE(framesOf(request, runs, kFrame, 60).empty());
}

TEST(Journal, TellsWhatWasWritten) {
  const std::string text =
      "capture 2 0.033333333333 1000.5\nrun 1.5000000 0\n"
      "start R 1.4000000 RecordingMetadata_TITLE My%20Talk%2C%20100%25 empty %\nstop R 3.0\nrun 5.0 45\n"
      "start R 4.9\nmovie R /r/R.mov\nstart B 6\ncancel B\nstart C 7\ndone C\nstart D 8 torn";
  const CaptureRecord record = parseJournal(text);
  EXPECT_EQ(record.recordingType, 2);
  EXPECT_NEAR(record.wallOffset, 1000.5, 1e-9);
  ASSERT_EQ(record.runs.size(), 2U);
  EXPECT_EQ(record.runs[1].firstFrame, 45U);
  const Request* request = record.marks.find("R");
  ASSERT_NE(request, nullptr);
  EXPECT_EQ(lookUp(request->parameters, "RecordingMetadata_TITLE"), "My Talk, 100%");
  EXPECT_EQ(lookUp(request->parameters, "empty"), "");
  EXPECT_EQ(request->spans.size(), 2U);
  EXPECT_TRUE(record.marks.find("B")->cancelled);
  EXPECT_TRUE(record.marks.find("C")->done);
  EXPECT_EQ(record.marks.find("D"), nullptr);
  EXPECT_EQ(record.movies.at("R"), "/r/R.mov");
}

TEST(Journal, GarbageIsSkipped) {
  const CaptureRecord record = parseJournal("\n\nnonsense\nstart\nstart R\nrun x\nstop R 1 2 3\n%%%\n");
  EXPECT_TRUE(record.runs.empty());
  EXPECT_TRUE(record.marks.requests().empty());
}

}  // namespace
}  // namespace lmx
