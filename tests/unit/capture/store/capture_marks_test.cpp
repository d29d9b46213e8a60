// Marks of a running capture, and its end.
#include "capture/store/capture_marks.h"

#include <gtest/gtest.h>

#include <fstream>
#include <iterator>

#include "capture/store/capture_record.h"
#include "tests/unit/capture/capture_harness.h"

namespace lmx {
namespace {

using testing::Folder;
using Ending = CaptureMarks::Ending;

class CaptureMarksTest : public ::testing::Test {
 protected:
  [[nodiscard]] CaptureRecord journal() const {
    std::ifstream file(folder_.file("journal"));
    return parseJournal(std::string((std::istreambuf_iterator<char>(file)), {}));
  }
  Folder folder_;
  CaptureMarks marks_{*Journal::create(folder_.file("journal"))};
};

TEST_F(CaptureMarksTest, AreJournalledAsTheyCome) {
  marks_.start("A", 1, nullptr);
  marks_.stop("A", 2);
  marks_.start("B", 3, nullptr);
  marks_.cancel("B");
  marks_.stop("unknown", 4);
  const CaptureRecord record = journal();
  EXPECT_EQ(record.marks.find("A")->spans, (std::vector<Span>{{1, 2}}));
  EXPECT_TRUE(record.marks.find("B")->cancelled);
  EXPECT_EQ(record.marks.requests().size(), 2U);
}

TEST_F(CaptureMarksTest, WhatIsToBeSubmittedCanNotBeCancelledAnyMore) {
  marks_.start("A", 1, nullptr);
  marks_.stop("A", 2);
  marks_.submit("A");
  marks_.submit("A");
  marks_.cancel("A");
  marks_.start("B", 1, nullptr);
  marks_.cancel("B");
  marks_.submit("B");
  const CaptureRecord record = journal();
  EXPECT_TRUE(record.marks.find("A")->submit);
  EXPECT_FALSE(record.marks.find("A")->cancelled);
  EXPECT_TRUE(record.marks.find("B")->cancelled);
  EXPECT_FALSE(record.marks.find("B")->submit);
  EXPECT_TRUE(record.intact || record.frameSeconds == 0) << "every line was understood";
}

TEST_F(CaptureMarksTest, TheFirstEndCounts) {
  EXPECT_FALSE(marks_.endTime());
  EXPECT_TRUE(marks_.end(Ending::stop, 5));
  EXPECT_FALSE(marks_.end(Ending::cancel, 6));
  EXPECT_EQ(marks_.endTime(), 5);
  EXPECT_FALSE(marks_.cancelled());
}

TEST_F(CaptureMarksTest, WithoutATimeTheEndIsTheLastMark) {
  marks_.start("A", 1, nullptr);
  marks_.stop("A", 7);
  marks_.start("B", 2, nullptr);
  marks_.stop("B", 4);
  marks_.end(Ending::stop, std::nullopt);
  EXPECT_EQ(marks_.endTime(), 7);
}

TEST_F(CaptureMarksTest, NoRequestBeginsOnceItEnds) {
  marks_.start("A", 1, nullptr);
  marks_.end(Ending::stop, 5);
  marks_.start("B", 4, nullptr);
  marks_.stop("A", 3);
  const RequestMarks closed = marks_.close();
  EXPECT_EQ(closed.find("B"), nullptr);
  EXPECT_EQ(closed.find("A")->spans, (std::vector<Span>{{1, 3}}));
}

TEST_F(CaptureMarksTest, NothingChangesOnceItIsClosed) {
  marks_.start("A", 1, nullptr);
  marks_.close();
  marks_.stop("A", 3);
  marks_.pause(2);
  EXPECT_FALSE(marks_.end(Ending::stop, 5));
  EXPECT_DOUBLE_EQ(marks_.elapsed("A", 9), 8);
  EXPECT_TRUE(journal().marks.find("A")->spans.back().open());
}

TEST_F(CaptureMarksTest, ACancelledCaptureIsWorthlessUnlessSomebodyWaits) {
  marks_.start("A", 1, nullptr);
  marks_.end(Ending::cancel, 5);
  EXPECT_FALSE(marks_.worthless());
  marks_.cancel("A");
  EXPECT_TRUE(marks_.worthless());
}

TEST_F(CaptureMarksTest, TheTagCountsFromWhereItWasSet) {
  marks_.tag("T", 2);
  EXPECT_DOUBLE_EQ(marks_.elapsed("T", 5), 3);
  marks_.untag("T", 6);
  EXPECT_DOUBLE_EQ(marks_.elapsed("T", 9), 4);
  EXPECT_TRUE(journal().marks.requests().empty());
}

TEST_F(CaptureMarksTest, ARequestThatEndedBeforeTheFirstFrameGetsIt) {
  marks_.start("A", 1, nullptr);
  marks_.stop("A", 1);
  EXPECT_TRUE(marks_.wishAt(0.9, 1.1, true).wanted);
  EXPECT_FALSE(marks_.wishAt(0.9, 1.1, false).wanted);
}

}  // namespace
}  // namespace lmx
