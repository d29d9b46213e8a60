// Reading a journal.
#include "capture/store/capture_record.h"

#include <gtest/gtest.h>

#include "model/codes.h"

namespace lmx {
namespace {

TEST(ParseJournal, TellsWhatWasWritten) {
  const std::string text =
      "capture 2 0.033333333333 1000.5\nrun 1.5000000 0\n"
      "start R 1.4000000 RecordingMetadata_TITLE My%20Talk%2C%20100%25 empty %\nstop R 3.0\nrun 5.0 45\n"
      "start R 4.9\nmovie R /r/R.mov\nstart B 6\ncancel B\nstart C 7\ndone C\nstart D 8 torn";
  const CaptureRecord record = parseJournal(text);
  EXPECT_EQ(record.recordingType, kRecordingTypeAudioVideo);
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

TEST(ParseJournal, ANumberThatIsNoneIsDamage) {
  const std::string capture = "capture 2 0.04 1000\n";
  EXPECT_TRUE(parseJournal(capture + "start R 1\nrun 1 0\n").intact);
  for (const char* line :
       {"start R x\n", "start R nan\n", "start R 1\nrun 1e999 0\n", "start R 1\nrun 1 -1\n",
        "start R 1\nrun 1 4294967296\n", "start R 1\nstop R 5x\n", "start R inf\n"}) {
    EXPECT_FALSE(parseJournal(capture + line).intact) << line;
  }
}

TEST(ParseJournal, GapsAreNoDamage) {
  const std::string text = "capture 2 0.04 1000\nstart R 1\nrun 1 0\n";
  for (const char* line :
       {"gap frames 1.0 2.0 5\n", "gap size 1.0 1280x720\n", "gap of another version\n", "gap\n"}) {
    EXPECT_TRUE(parseJournal(text + line).intact) << line;
  }
}

TEST(ParseJournal, AFrameOfNoLengthIsDamage) {
  for (const char* length : {"0", "-1", "1e-300", "1e300", "nan"}) {
    const std::string text = std::string("capture 2 ") + length + " 1000\nstart R 1\nrun 1 0\n";
    EXPECT_FALSE(parseJournal(text).intact) << length;
  }
}

TEST(ParseJournal, GarbageIsSkipped) {
  const CaptureRecord record = parseJournal("\n\nnonsense\nstart\nstart R\nrun x\nstop R 1 2 3\n%%%\n");
  EXPECT_TRUE(record.runs.empty());
  EXPECT_TRUE(record.marks.requests().empty());
}

}  // namespace
}  // namespace lmx
