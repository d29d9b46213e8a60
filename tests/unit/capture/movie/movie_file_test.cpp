// The growing movie: written, cut off anywhere, read back, made whole, copied.
#include "capture/movie/movie_file.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <random>

#include "capture/movie/movie_boxes.h"
#include "capture/source/device_id.h"
#include "capture/source/test_picture.h"
#include "capture/store/finished_capture.h"
#include "support/time_value.h"
#include "tests/unit/capture/capture_harness.h"
#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

using testing::Folder;

std::vector<TrackFormat> formats() {
  const Bytes config{1, 100, 0, 40, 0xFF, 0xE1, 0, 0};
  return {{.isVideo = true,
           .timescale = 30000,
           .width = 64,
           .height = 36,
           .sampleDescription = videoSampleDescription(64, 36, config)},
          {.timescale = 48000, .sampleDescription = audioSampleDescription(48000, 2, Bytes{0x11, 0x90})}};
}

/// Fragment `n`: 15 frames of half a second and their sound; every sample is filled with its own number.
std::vector<EncodedSample> fragment(std::uint32_t n) {
  std::vector<EncodedSample> samples;
  for (std::uint32_t i = 0; i < 15; ++i) {
    const auto number = static_cast<std::uint8_t>(n * 15 + i);
    samples.push_back({.track = 0, .data = Bytes(20 + i, number), .duration = 1000, .sync = i == 0});
  }
  for (std::uint32_t i = 0; i < 23; ++i) {
    samples.push_back({.track = 1, .data = Bytes(7, static_cast<std::uint8_t>(128 + n)), .duration = 1024});
  }
  return samples;
}

void write(const std::string& path, std::uint32_t fragments, bool finish) {
  GrowingMovie movie;
  ASSERT_EQ(movie.create(path), 0);
  ASSERT_EQ(movie.begin(formats()), 0);
  for (std::uint32_t n = 0; n < fragments; ++n) ASSERT_EQ(movie.append(fragment(n)), 0);
  if (finish) {
    ASSERT_EQ(movie.finish(), 0);
  }
}

/// First byte of each sample of a track, as the index places it.
std::vector<int> firstBytes(const std::string& path, const TrackIndex& track) {
  std::ifstream file(path, std::ios::binary);
  std::vector<int> bytes;
  std::size_t sample = 0;
  for (const Chunk& chunk : track.chunks) {
    std::uint64_t at = chunk.offset;
    for (std::uint32_t i = 0; i < chunk.samples; ++i, ++sample) {
      file.seekg(static_cast<std::streamoff>(at));
      bytes.push_back(file.get());
      at += track.sizes[sample];
    }
  }
  return bytes;
}

TEST(GrowingMovie, ReadsBackAsWritten) {
  for (const bool finished : {false, true}) {
    const Folder folder;
    const std::string path = folder.file("m.mov");
    write(path, 4, finished);
    const auto index = readMovieIndex(path);
    ASSERT_TRUE(index);
    ASSERT_EQ(index->tracks.size(), 2U);
    EXPECT_EQ(index->tracks[0].sizes.size(), 60U);
    EXPECT_EQ(index->tracks[0].syncSamples, (std::vector<std::uint32_t>{0, 15, 30, 45}));
    EXPECT_EQ(index->tracks[0].totalDuration, 60000U);
    EXPECT_EQ(index->tracks[0].format.width, 64);
    EXPECT_EQ(index->tracks[1].sizes.size(), 92U);
    const auto bytes = firstBytes(path, index->tracks[0]);
    for (int i = 0; i < 60; ++i) EXPECT_EQ(bytes[static_cast<std::size_t>(i)], i);
  }
}

TEST(GrowingMovie, CutOffAnywhereKeepsItsWholeFragments) {
  const Folder folder;
  const std::string whole = folder.file("whole.mov");
  write(whole, 4, false);
  const auto size = std::filesystem::file_size(whole);
  std::mt19937 random(3);  // NOLINT: the same numbers every time
  std::size_t before = 0;
  for (std::uintmax_t step = 0; before < 60 && step <= size; step += 1 + random() % 40) {
    const std::uintmax_t cut = step + 40 > size ? size : step;  // the whole file is the last one tried
    const std::string path = folder.file("cut.mov");
    std::filesystem::copy_file(whole, path, std::filesystem::copy_options::overwrite_existing);
    std::filesystem::resize_file(path, cut);
    const auto index = readMovieIndex(path);
    if (!index) {
      EXPECT_EQ(before, 0U);
      continue;
    }
    const std::size_t frames = index->tracks[0].sizes.size();
    EXPECT_EQ(frames % 15, 0U);
    EXPECT_GE(frames, before);
    EXPECT_LE(index->mediaEnd, cut);
    before = frames;
    if (frames == 0) continue;
    ASSERT_EQ(finishMovieInPlace(path, *index), 0);
    const auto again = readMovieIndex(path);
    ASSERT_TRUE(again);
    EXPECT_EQ(again->tracks[0].sizes, index->tracks[0].sizes);
  }
  EXPECT_EQ(before, 60U);
}

TEST(GrowingMovie, NeverOverwritesAFile) {
  const Folder folder;
  write(folder.file("m.mov"), 1, true);
  GrowingMovie movie;
  EXPECT_EQ(movie.create(folder.file("m.mov")), EEXIST);
}

TEST(CopyMovieRanges, CopiesFramesAndTheirSound) {
  const Folder folder;
  write(folder.file("a.mov"), 4, true);
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

TEST(ReadMovieIndex, OtherFilesAreRefused) {
  const Folder folder;
  EXPECT_FALSE(readMovieIndex(folder.file("missing")));
  std::ofstream(folder.file("text")) << std::string(5000, 'x');
  EXPECT_FALSE(readMovieIndex(folder.file("text")));
}

TEST(ReadMovieIndex, AnyCorruptionIsSurvived) {
  const Folder folder;
  write(folder.file("a.mov"), 2, false);
  std::ifstream in(folder.file("a.mov"), std::ios::binary);
  const std::string good((std::istreambuf_iterator<char>(in)), {});
  std::mt19937 random(11);  // NOLINT: the same numbers every time
  for (int round = 0; round < 2000; ++round) {
    std::string bad = good;
    for (int i = 0; i < 3; ++i) bad[random() % bad.size()] = static_cast<char>(random());
    std::ofstream(folder.file("bad.mov"), std::ios::binary) << bad;
    const auto index = readMovieIndex(folder.file("bad.mov"));
    if (index) {
      EXPECT_LE(index->mediaEnd, bad.size());
    }
  }
}

// ---- what a crash leaves

/// A capture folder as a killed process leaves it: half a second a fragment, marks from 0 on.
std::string crashedCapture(const Folder& repository, const std::string& journal, std::uint32_t fragments) {
  std::string folder = captureFolderOf(repository.path()) + "/capture";
  std::filesystem::create_directories(folder);
  std::ofstream(folder + "/journal") << journal;
  write(folder + "/media.mov", fragments, false);
  return folder;
}

constexpr const char* kJournal =
    "capture 2 0.033333333333 1000.0\nstart R 0.0 RecordingMetadata_RECORDING_UUID LECTURE\nrun 0.0 0\n";

TEST(Recovery, MakesAMovieNamedForTheRecording) {
  const Folder repository;
  const auto capture = FinishedCapture::openAbandoned(crashedCapture(repository, kJournal, 4));
  ASSERT_TRUE(capture);
  const auto recovered = capture->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  EXPECT_EQ(recovered[0].path, repository.file("LECTURE.mov"));
  EXPECT_NEAR(recovered[0].duration, 2.0, 1e-6);
  EXPECT_NEAR(recovered[0].startTime, 1000.0, 1e-6);
  EXPECT_NEAR(recovered[0].stopTime, 1002.0, 1e-6);
  EXPECT_EQ(recovered[0].recordingType, 2);
  EXPECT_TRUE(std::filesystem::exists(captureFolderOf(repository.path())));
  recovered[0].forget();
  EXPECT_FALSE(std::filesystem::exists(captureFolderOf(repository.path())));
  EXPECT_EQ(readMovieIndex(repository.file("LECTURE.mov"))->tracks[0].sizes.size(), 60U);
}

TEST(Recovery, DoesNotOverwriteAMovie) {
  const Folder repository;
  std::ofstream(repository.file("LECTURE.mov")) << "earlier";
  const auto capture = FinishedCapture::openAbandoned(crashedCapture(repository, kJournal, 1));
  const auto recovered = capture->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  EXPECT_EQ(recovered[0].path, repository.file("LECTURE-recovered.mov"));
}

TEST(Recovery, OfAMovieThatOnlyLacksItsDocument) {
  const Folder repository;
  const std::string journal = std::string(kJournal) + "movie R " + repository.file("LECTURE.mov") + "\n";
  const std::string folder = crashedCapture(repository, journal, 2);
  std::filesystem::rename(folder + "/media.mov", repository.file("LECTURE.mov"));
  const auto recovered = FinishedCapture::openAbandoned(folder)->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  EXPECT_EQ(recovered[0].path, repository.file("LECTURE.mov"));
  EXPECT_NEAR(recovered[0].duration, 1.0, 1e-6);
  EXPECT_NEAR(recovered[0].startTime, 1000.0, 1e-6);
}

TEST(Recovery, CancelledAndHandedOverRequestsDoNotComeBack) {
  const Folder repository;
  const std::string folder = crashedCapture(repository, std::string(kJournal) + "cancel R\n", 2);
  EXPECT_TRUE(FinishedCapture::openAbandoned(folder)->recoverPending(repository.path()).empty());
  EXPECT_TRUE(std::filesystem::is_empty(repository.path()));
}

TEST(Recovery, OfANameTooLongForAFile) {
  const Folder repository;
  const std::string uuid = std::string(199, 'a') + "\u00E4" + std::string(200, 'b');
  const auto capture = FinishedCapture::openAbandoned(crashedCapture(
      repository,
      "capture 2 0.0333333 0\nstart R 0.0 RecordingMetadata_RECORDING_UUID " + uuid + "\nrun 0 0\n", 1));
  const auto recovered = capture->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  EXPECT_EQ(recovered[0].path, repository.file(std::string(199, 'a') + ".mov"));
}

TEST(Recovery, TakesHalfACopyAway) {
  const Folder repository;
  const std::string folder = crashedCapture(repository, kJournal, 2);
  std::ofstream(folder + "/movie.part") << "half";
  const auto recovered = FinishedCapture::openAbandoned(folder)->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  recovered[0].forget();
  EXPECT_FALSE(std::filesystem::exists(folder));
}

TEST(Recovery, NameCannotLeaveTheRepository) {
  const Folder repository;
  const auto capture = FinishedCapture::openAbandoned(crashedCapture(
      repository, "capture 2 0.0333333 0\nstart R 0.0 RecordingMetadata_RECORDING_UUID ../../evil\nrun 0 0\n",
      1));
  const auto recovered = capture->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  EXPECT_EQ(recovered[0].path, repository.file(".._.._evil.mov"));
}

TEST(Recovery, CaptureOfALivingProcessIsLeftAlone) {
  const Folder repository;
  const std::string folder = crashedCapture(repository, kJournal, 1);
  const auto living = Journal::open(folder + "/journal", true);
  ASSERT_TRUE(living);
  EXPECT_FALSE(FinishedCapture::openAbandoned(folder));
}

TEST(Recovery, WithoutMediaLeavesNothing) {
  const Folder repository;
  const std::string folder = captureFolderOf(repository.path()) + "/capture";
  std::filesystem::create_directories(folder);
  std::ofstream(folder + "/journal") << kJournal;
  const std::ofstream empty(folder + "/media.mov");
  EXPECT_TRUE(FinishedCapture::openAbandoned(folder)->recoverPending(repository.path()).empty());
  EXPECT_TRUE(std::filesystem::is_empty(repository.path()));
}

TEST(Recovery, ADamagedJournalMakesOneRecordingOfAllTheMedia) {
  const std::string start = "start R 0.5 RecordingMetadata_RECORDING_UUID LECTURE\n";
  struct Case {
    const char* what;
    std::string journal;
    std::string name;
  };
  const Case cases[] = {
      {"zeros after a power cut", std::string(200, '\0'), "capture.mov"},
      {"empty", "", "capture.mov"},
      {"no run", "capture 2 0.033333333333 1000.0\n" + start, "LECTURE.mov"},
      {"no capture", start + "run 0.0 0\n", "LECTURE.mov"},
      {"no request", "capture 2 0.033333333333 1000.0\nrun 0.0 0\n", "capture.mov"},
      {"a torn line in the middle", std::string(kJournal) + "stostop R 0.5\n", "LECTURE.mov"},
      {"cancelled, in doubt", std::string(kJournal) + "cancel R\nxyz\n", "LECTURE.mov"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    const Folder repository;
    const std::string folder = crashedCapture(repository, c.journal, 4);
    const auto capture = FinishedCapture::openAbandoned(folder);
    ASSERT_TRUE(capture);
    const auto recovered = capture->recoverPending(repository.path());
    ASSERT_EQ(recovered.size(), 1U);
    EXPECT_EQ(recovered[0].path, repository.file(c.name));
    EXPECT_NEAR(recovered[0].duration, 2.0, 1e-6);
    EXPECT_EQ(recovered[0].recordingType, 2);
    EXPECT_NEAR(recovered[0].stopTime, secondsSinceReferenceDate(), 60) << "when the file was last written";
    EXPECT_EQ(readMovieIndex(repository.file(c.name))->tracks[0].sizes.size(), 60U);
    recovered[0].forget();
    EXPECT_FALSE(std::filesystem::exists(folder));
  }
}

TEST(Recovery, MediaWithoutAJournalAreKept) {
  const Folder repository;
  const std::string folder = crashedCapture(repository, "", 2);
  std::filesystem::remove(folder + "/journal");
  const auto recovered = FinishedCapture::openAbandoned(folder)->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  EXPECT_EQ(recovered[0].path, repository.file("capture.mov"));
}

TEST(Recovery, WhatCannotBeReadIsLeftAlone) {
  testing::LogCapture log;
  const Folder repository;
  const std::string folder = crashedCapture(repository, kJournal, 2);
  std::ofstream(folder + "/media.mov") << "no movie at all";
  EXPECT_FALSE(FinishedCapture::openAbandoned(folder));
  EXPECT_TRUE(log.waitForPart("media.mov can't be read"));
  EXPECT_TRUE(std::filesystem::exists(folder + "/media.mov") && std::filesystem::exists(folder + "/journal"));
}

/// Makes fragment `number` of the media in `folder` unreadable and puts `behind` bytes behind the last one,
/// as a bad block in the middle of a long recording looks to the reader. @return where the fragment's samples
/// begin
std::uint64_t damageFragment(const std::string& folder, std::size_t number, std::size_t behind) {
  const auto index = readMovieIndex(folder + "/media.mov");
  if (!index) return 0;
  const std::uint64_t samples = index->tracks[0].chunks[number].offset;
  std::fstream media(folder + "/media.mov", std::ios::in | std::ios::out | std::ios::binary);
  media.seekp(static_cast<std::streamoff>(samples - 40));  // in its head
  media << std::string(40, '\0');
  media.seekp(0, std::ios::end);
  media << std::string(behind, 'x');
  return samples;
}

TEST(Recovery, MediaWhoseFirstFragmentIsDamagedStay) {
  testing::LogCapture log;
  const Folder repository;
  const std::string folder = crashedCapture(repository, kJournal, 4);
  ASSERT_GT(damageFragment(folder, 0, 3U << 20), 0U);
  EXPECT_FALSE(FinishedCapture::openAbandoned(folder));
  EXPECT_TRUE(log.waitForPart("its fragments are damaged"));
  EXPECT_GT(std::filesystem::file_size(folder + "/media.mov"), 3U << 20);
}

TEST(Recovery, MediaWithABadBlockInTheMiddleStayAsTheyAre) {
  const Folder repository;
  const std::string folder = crashedCapture(repository, kJournal, 4);
  const std::uint64_t third = damageFragment(folder, 2, 20U << 20);
  ASSERT_GT(third, 0U);
  const auto size = std::filesystem::file_size(folder + "/media.mov");
  const auto recovered = FinishedCapture::openAbandoned(folder)->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  EXPECT_NEAR(recovered[0].duration, 1.0, 1e-6);
  recovered[0].forget();
  EXPECT_EQ(std::filesystem::file_size(folder + "/media.mov"), size);
  const auto kept = std::filesystem::file_size(repository.file("LECTURE.mov"));
  EXPECT_TRUE(kept > 1000 && kept < third) << kept;
}

// ---- small pieces

TEST(DeviceID, KindsAndOptions) {
  EXPECT_EQ(parseDeviceID("v4l2:usb-1").kind, DeviceKind::hardware);
  EXPECT_EQ(parseDeviceID("file:///a/b.mov").name, "/a/b.mov");
  EXPECT_EQ(parseDeviceID("rtsp://host/x").kind, DeviceKind::network);
  EXPECT_EQ(parseDeviceID("/dev/video0").kind, DeviceKind::unknown);
  const DeviceID id = parseDeviceID("test://video?size=321x180&lost-after=2.5&speed=max");
  EXPECT_EQ(id.name, "video");
  EXPECT_EQ(pictureSize(id).width, 320);
  EXPECT_EQ(pictureSize(id).height, 180);
  EXPECT_EQ(id.seconds("lost-after"), 2.5);
  EXPECT_FALSE(id.seconds("eos-after"));
  EXPECT_TRUE(id.asFastAsPossible());
  EXPECT_EQ(pictureSize(parseDeviceID("test://video?size=nonsense")).width, 1280);
}

TEST(FrameRate, TelevisionRatesAreExact) {
  EXPECT_EQ(frameRateFrom(30), (FrameRate{30, 1}));
  EXPECT_EQ(frameRateFrom(29.97), (FrameRate{30000, 1001}));
  EXPECT_EQ(frameRateFrom(23.976), (FrameRate{24000, 1001}));
  EXPECT_EQ(frameRateFrom(12.5), (FrameRate{12500, 1000}));
}

TEST(TestPicture, FrameNumberSurvivesAnyValue) {
  std::vector<std::uint8_t> bytes(std::size_t{64} * 36, 90);
  const LumaPlane plane{bytes, 64, 36, 64};
  for (const std::uint32_t number : {0U, 1U, 0x80000000U, 0xFFFFFFFFU, 123456789U}) {
    drawFrameNumber(plane, number);
    EXPECT_EQ(readFrameNumber(plane), number);
  }
  EXPECT_EQ(clockText(3723.25), "01:02:03.250");
}

}  // namespace
}  // namespace lmx
