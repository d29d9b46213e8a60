// From marks to spans.
#include "capture/media/request_marks.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

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

TEST(RequestMarks, NoSpanBeginsOnceItIsToBeSubmitted) {
  RequestMarks marks;
  marks.start("A", 1, nullptr);
  marks.stop("A", 2);
  marks.submit("A");
  marks.start("A", 3, nullptr);
  EXPECT_EQ(marks.find("A")->spans, (std::vector<Span>{{1, 2}}));
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

TEST(RequestMarks, WhatIsWantedHasAnEnd) {
  RequestMarks marks;
  EXPECT_FALSE(marks.wantedUntil(10));
  marks.start("A", 1, nullptr);
  EXPECT_FALSE(marks.wantedUntil(1));
  EXPECT_EQ(marks.wantedUntil(3), 3);
  marks.pause(4);
  EXPECT_EQ(marks.wantedUntil(5), 4);
  marks.resume(6);
  marks.pause(6.5);
  marks.resume(8);
  EXPECT_EQ(marks.wantedUntil(6), 4);
  EXPECT_EQ(marks.wantedUntil(6.2), 6.2);
  EXPECT_EQ(marks.wantedUntil(7), 6.5);
  EXPECT_EQ(marks.wantedUntil(9), 9);
  marks.stop("A", 10);
  EXPECT_EQ(marks.wantedUntil(20), 10);
  marks.start("B", 3, nullptr);
  marks.stop("B", 15);
  EXPECT_EQ(marks.wantedUntil(20), 15);
  marks.cancel("B");
  EXPECT_EQ(marks.wantedUntil(20), 10);
}

TEST(RequestMarks, StartsBetweenTellsWhereAKeyFrameMustBe) {
  RequestMarks marks;
  marks.start("A", 1.0, nullptr);
  EXPECT_TRUE(marks.startsBetween(0.99, 1.02));
  EXPECT_FALSE(marks.startsBetween(1.0, 1.03));
}

}  // namespace
}  // namespace lmx
