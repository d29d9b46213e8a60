// What is not real in a movie.
#include "capture/media/gap_ledger.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

std::string joined(const std::vector<GapLedger::Words>& lines) {
  std::string text;
  for (const auto& words : lines) {
    for (const auto& word : words) text += word + (&word == &words.back() ? "\n" : " ");
  }
  return text;
}

TEST(GapLedger, NothingToSay) {
  GapLedger ledger(5);
  EXPECT_EQ(joined(ledger.journalWords(100)), "");
  EXPECT_EQ(joined(ledger.finish(200)), "");
  EXPECT_EQ(ledger.summary(), "");
}

TEST(GapLedger, EachKindHasItsLineAndItsWords) {
  struct Row {
    void (*note)(GapLedger&);
    const char* journal;
    const char* summary;
  };
  const Row rows[] = {
      {[](GapLedger& l) { l.framesDropped(130, 148); }, "gap frames 130.000 130.000 148\n",
       "148 frames lost, from 0:00:30 on"},
      {[](GapLedger& l) { l.silencePutIn(100, 2.5); }, "gap silence 100.000 102.500 2.500\n",
       "2.50 s of silence put in, from 0:00:00 on"},
      {[](GapLedger& l) {
         l.microphoneLost(160);
         l.microphoneLost(170);
         l.microphoneBack(3760.4);
         l.microphoneBack(3800);
       },
       "gap microphone 160.000 3760.400\n", "microphone away from 0:01:00 to 1:01:00"},
      {[](GapLedger& l) {
         l.cameraLost(110);
         l.cameraBack(117);
       },
       "gap camera 110.000 117.000\n", "camera away from 0:00:10 to 0:00:17"},
      {[](GapLedger& l) { l.clockStepped(7300, -3600); }, "gap clock 7300.000 -3600.000\n",
       "clock set by -3600.000 s at 2:00:00"},
      {[](GapLedger& l) { l.pictureSizeChanged(101, 1280, 720); }, "gap size 101.000 1280x720\n",
       "picture scaled from 1280x720 at 0:00:01"},
      {[](GapLedger& l) { l.soundCorrected(102.4); }, "gap speed 102.400\n", "sound made slower by 102 ppm"},
      {[](GapLedger& l) { l.soundCorrected(-50); }, "gap speed -50.000\n", "sound made faster by 50 ppm"},
      {[](GapLedger& l) { l.microphoneLost(160); }, "gap microphone 160.000 9999.000\n",
       "microphone away from 0:01:00 to 2:44:59"},
  };
  for (const Row& row : rows) {
    GapLedger ledger(100);
    row.note(ledger);
    std::string lines = joined(ledger.journalWords(9000));
    lines += joined(ledger.finish(9999));
    EXPECT_EQ(lines, row.journal);
    EXPECT_EQ(ledger.summary(), std::string("Not real in this recording: ") + row.summary);
  }
}

TEST(GapLedger, LossesThatGoOnAreOneLine) {
  GapLedger ledger;
  for (int i = 0; i < 600; ++i) ledger.framesDropped(i * 0.1, 1);
  EXPECT_EQ(joined(ledger.journalWords(60)), "") << "it may go on";
  EXPECT_EQ(joined(ledger.journalWords(70)), "gap frames 0.000 59.900 600\n");
  EXPECT_EQ(joined(ledger.journalWords(71)), "");
  ledger.framesDropped(100, 2);
  ledger.framesDropped(120, 3);
  EXPECT_EQ(joined(ledger.journalWords(121)), "gap frames 100.000 100.000 2\n");
  EXPECT_EQ(joined(ledger.finish(122)), "gap frames 120.000 120.000 3\n");
  EXPECT_EQ(ledger.summary(), "Not real in this recording: 605 frames lost, from 0:00:00 on");
}

TEST(GapLedger, HoursOfTroubleStayShort) {
  GapLedger ledger;
  std::size_t lines = 0;
  for (int i = 0; i < 10000; ++i) {
    ledger.framesDropped(i * 60, 1);
    ledger.cameraLost(i * 60);
    ledger.cameraBack(i * 60 + 5);
    lines += ledger.journalWords(i * 60 + 30).size();
  }
  EXPECT_EQ(lines, 400U);
  EXPECT_TRUE(ledger.finish(1e6).empty());
  EXPECT_EQ(
      ledger.summary(),
      "Not real in this recording: 10000 frames lost, from 0:00:00 on; camera away from 0:00:00 to 0:00:05; "
      "camera away from 0:01:00 to 0:01:05; camera away from 0:02:00 to 0:02:05 and 9997 times more");
}

TEST(GapLedger, ATouchOfSilenceIsNotWorthALine) {
  GapLedger ledger;
  ledger.silencePutIn(0, 0.004);
  EXPECT_EQ(joined(ledger.finish(10)), "");
  EXPECT_EQ(ledger.summary(), "");
}

TEST(GapLedger, NoSilenceIsNoEntry) {
  GapLedger ledger;
  for (int i = 0; i < 100; ++i) ledger.silencePutIn(i, 0);
  ledger.silencePutIn(50, 1);
  for (int i = 52; i < 100; ++i) ledger.silencePutIn(i, 0);
  EXPECT_EQ(joined(ledger.journalWords(61)), "gap silence 50.000 51.000 1.000\n");
}

TEST(GapLedger, SeveralAreOneSentence) {
  GapLedger ledger;
  ledger.silencePutIn(10, 1);
  ledger.silencePutIn(11, 1);
  ledger.soundCorrected(-7);
  EXPECT_EQ(joined(ledger.finish(10)), "gap silence 10.000 12.000 2.000\ngap speed -7.000\n");
  EXPECT_EQ(
      ledger.summary(),
      "Not real in this recording: 2.00 s of silence put in, from 0:00:10 on; sound made faster by 7 ppm");
}

}  // namespace
}  // namespace lmx
