// When pictures that can't be read are news.
#include "capture/media/unreadable_pictures.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

using News = UnreadablePictures::News;

TEST(UnreadablePictures, AreHopelessAfterTenSeconds) {
  UnreadablePictures pictures;
  EXPECT_EQ(pictures.note(100, true), News::none);
  for (double t = 101; t < 111; t += 0.5) EXPECT_EQ(pictures.note(t, false), News::none) << t;
  EXPECT_EQ(pictures.note(111, false), News::hopeless);
  EXPECT_EQ(pictures.note(150, false), News::none) << "once";
}

TEST(UnreadablePictures, ThatCanBeReadAgainAreNews) {
  UnreadablePictures pictures;
  pictures.note(1, false);
  EXPECT_EQ(pictures.note(8, true), News::again);
  EXPECT_EQ(pictures.lasted(), 7);
  EXPECT_EQ(pictures.note(9, true), News::none);
  EXPECT_EQ(pictures.note(10, false), News::none);
  EXPECT_EQ(pictures.note(19, false), News::none) << "the ten seconds begin again";
}

TEST(UnreadablePictures, EverySecondOneIsNoNews) {
  UnreadablePictures pictures;
  for (int i = 0; i < 1000; ++i) EXPECT_EQ(pictures.note(i / 30.0, i % 2 == 0), News::none);
}

}  // namespace
}  // namespace lmx
