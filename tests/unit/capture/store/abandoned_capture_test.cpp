// What a crash leaves of a capture, and what becomes of it.
#include "capture/store/abandoned_capture.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>

#include "capture/movie/movie_reader.h"
#include "capture/store/capture_files.h"
#include "model/codes.h"
#include "support/time_value.h"
#include "tests/unit/capture/capture_harness.h"
#include "tests/unit/capture/movie/sample_movies.h"
#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

using testing::Folder;
using testing::writeSampleMovie;

/// A capture folder as a killed process leaves it: half a second a fragment, marks from 0 on.
std::string crashedCapture(const Folder& repository, const std::string& journal, std::uint32_t fragments) {
  std::string folder = captureFolderOf(repository.path()) + "/capture";
  std::filesystem::create_directories(folder);
  std::ofstream(folder + "/journal") << journal;
  writeSampleMovie(folder + "/media.mov", fragments, false);
  return folder;
}

constexpr const char* kJournal =
    "capture 2 0.033333333333 1000.0\nstart R 0.0 RecordingMetadata_RECORDING_UUID LECTURE\nrun 0.0 0\n";

TEST(Recovery, MakesAMovieNamedForTheRecording) {
  const Folder repository;
  const auto capture = openAbandonedCapture(crashedCapture(repository, kJournal, 4));
  ASSERT_TRUE(capture);
  const auto recovered = capture->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  EXPECT_EQ(recovered[0].path, repository.file("LECTURE.mov"));
  EXPECT_NEAR(recovered[0].duration, 2.0, 1e-6);
  EXPECT_NEAR(recovered[0].startTime, 1000.0, 1e-6);
  EXPECT_NEAR(recovered[0].stopTime, 1002.0, 1e-6);
  EXPECT_EQ(recovered[0].recordingType, kRecordingTypeAudioVideo);
  EXPECT_TRUE(std::filesystem::exists(captureFolderOf(repository.path())));
  recovered[0].forget();
  EXPECT_FALSE(std::filesystem::exists(captureFolderOf(repository.path())));
  EXPECT_EQ(readMovieIndex(repository.file("LECTURE.mov"))->tracks[0].sizes.size(), 60U);
}

/// A camera that gave every third frame: what counts is how long they are shown.
TEST(Recovery, CountsTheTimeThatFramesAreShown) {
  for (const bool damaged : {false, true}) {
    const Folder repository;
    const auto folder =
        crashedCapture(repository, kJournal + std::string(damaged ? "run x\n" : "stop R 2\n"), 0);
    GrowingMovie movie;
    std::filesystem::remove(folder + "/media.mov");
    ASSERT_EQ(movie.create(folder + "/media.mov"), 0);
    ASSERT_EQ(movie.begin({testing::sampleFormats().front()}), 0);
    for (int i = 0; i < 30; ++i) {
      ASSERT_EQ(movie.append({{.data = Bytes(20), .duration = i == 0 ? 1000U : 3000U, .sync = i % 10 == 0}}),
                0);
    }
    const auto capture = openAbandonedCapture(folder);
    ASSERT_TRUE(capture);
    const auto recovered = capture->recoverPending(repository.path());
    ASSERT_EQ(recovered.size(), 1U);
    EXPECT_NEAR(recovered[0].duration, damaged ? 88.0 / 30 : 60.0 / 30, 1e-6);
  }
}

TEST(Recovery, TellsWhatHadBeenStopped) {
  for (const auto& [lines, submit] : std::vector<std::pair<std::string, bool>>{
           {"", false},
           {"stop R 1\n", false},  // may be a pause
           {"stop R 1\nsubmit R\n", true},
           {"stop R 1\nsubmit R\nqueued R\n", false},
           {"stop R 1\nsubmit R\ncancel R\n", true},
           {"stop R 1\nsubmit R\nrun x\n", true}}) {  // a damaged journal
    const Folder repository;
    const auto capture = openAbandonedCapture(crashedCapture(repository, kJournal + lines, 4));
    ASSERT_TRUE(capture);
    const auto recovered = capture->recoverPending(repository.path());
    ASSERT_EQ(recovered.size(), 1U) << lines;
    EXPECT_EQ(recovered[0].submit, submit) << lines;
    EXPECT_EQ(recovered[0].request, "R") << lines;
  }
}

/// The process was killed after its job had been stored.
TEST(Recovery, OfWhatHasItsJobAlreadyMakesNothing) {
  const Folder repository;
  const auto folder = crashedCapture(repository, std::string(kJournal) + "stop R 2\nsubmit R\n", 4);
  const auto capture = openAbandonedCapture(folder);
  ASSERT_TRUE(capture);
  const auto known = [](const std::string& request) { return request == "R"; };
  EXPECT_TRUE(capture->recoverPending(repository.path(), known).empty());
  EXPECT_FALSE(std::filesystem::exists(repository.file("LECTURE.mov")));
  EXPECT_FALSE(std::filesystem::exists(folder));
}

/// Such a folder stays, and each start finds it again.
TEST(Recovery, OfADamagedCaptureThatStaysIsNotToBeSubmitted) {
  const Folder repository;
  const std::string lines = std::string(kJournal) + "stop R 1\nsubmit R\nrun x\n";
  const auto folder = crashedCapture(repository, lines, 4);
  std::filesystem::resize_file(folder + "/media.mov", std::uintmax_t{20} << 20);
  const auto capture = openAbandonedCapture(folder);
  ASSERT_TRUE(capture);
  const auto recovered = capture->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  EXPECT_FALSE(recovered[0].submit);
}

/// The tool finds a recording by its name.
TEST(Recovery, OfWhatIsToBeSubmittedGetsItsNameEvenIfThatIsTaken) {
  const Folder repository;
  std::ofstream(repository.file("LECTURE.mov")) << "an earlier one";
  const auto capture =
      openAbandonedCapture(crashedCapture(repository, std::string(kJournal) + "stop R 2\nsubmit R\n", 4));
  const auto recovered = capture->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  EXPECT_EQ(recovered[0].path, repository.file("LECTURE.mov"));
  EXPECT_TRUE(readMovieIndex(repository.file("LECTURE.mov")));
  EXPECT_EQ(std::filesystem::file_size(repository.file("LECTURE-replaced.mov")), 14U);
}

TEST(Recovery, OfWhatIsToBeSubmittedGoesToItsChosenFile) {
  for (const bool there : {true, false}) {
    const Folder repository;
    const std::string chosen = repository.file(there ? "chosen.mov" : "no-such-folder/chosen.mov");
    const auto capture = openAbandonedCapture(crashedCapture(
        repository,
        "capture 2 0.033333333333 1000.0\nstart R 0.0 RecordingMetadata_RECORDING_UUID LECTURE "
        "RecordingMetadata_ADHOC_FILE_PATH " +
            chosen + "\nrun 0.0 0\nstop R 2\nsubmit R\n",
        4));
    const auto recovered = capture->recoverPending(repository.path());
    ASSERT_EQ(recovered.size(), 1U);
    EXPECT_EQ(recovered[0].path, there ? chosen : repository.file("LECTURE.mov"));
  }
}

TEST(Recovery, TimesOfARequestThatBeganInALaterRun) {
  const Folder repository;
  const auto capture = openAbandonedCapture(crashedCapture(repository,
                                                           "capture 2 0.033333333333 1000.0\n"
                                                           "start A 0 RecordingMetadata_RECORDING_UUID A\n"
                                                           "run 0 0\nstop A 1\ndone A\n"
                                                           "start B 50 RecordingMetadata_RECORDING_UUID B\n"
                                                           "run 50 30\n",
                                                           4));
  const auto recovered = capture->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  EXPECT_NEAR(recovered[0].startTime, 1050.0, 1e-6);
  EXPECT_NEAR(recovered[0].stopTime, 1051.0, 1e-6);
  EXPECT_NEAR(recovered[0].duration, 1.0, 1e-6);
}

TEST(Recovery, TimesOfARequestThatWasRecordedInTwoRuns) {
  const Folder repository;
  const auto capture = openAbandonedCapture(
      crashedCapture(repository, std::string(kJournal) + "stop R 1\nstart R 50\nrun 50 30\n", 4));
  const auto recovered = capture->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  EXPECT_NEAR(recovered[0].startTime, 1000.0, 1e-6);
  EXPECT_NEAR(recovered[0].stopTime, 1051.0, 1e-6);
  EXPECT_NEAR(recovered[0].duration, 2.0, 1e-6);
}

TEST(Recovery, LengthIsThatOfTheMediaEvenWhereTheJournalTellsOfMore) {
  const Folder repository;
  const auto capture = openAbandonedCapture(
      crashedCapture(repository, std::string(kJournal) + "stop R 30\nstart R 50\nrun 50 900\n", 2));
  const auto recovered = capture->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  EXPECT_NEAR(recovered[0].duration, 1.0, 1e-6);
  EXPECT_NEAR(recovered[0].stopTime, 1001.0, 1e-6);
}

TEST(Recovery, DoesNotOverwriteAMovie) {
  const Folder repository;
  std::ofstream(repository.file("LECTURE.mov")) << "earlier";
  const auto capture = openAbandonedCapture(crashedCapture(repository, kJournal, 1));
  const auto recovered = capture->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  EXPECT_EQ(recovered[0].path, repository.file("LECTURE-recovered.mov"));
}

TEST(Recovery, OfAMovieThatOnlyLacksItsDocument) {
  const Folder repository;
  const std::string journal = std::string(kJournal) + "movie R " + repository.file("LECTURE.mov") + "\n";
  const std::string folder = crashedCapture(repository, journal, 2);
  std::filesystem::rename(folder + "/media.mov", repository.file("LECTURE.mov"));
  const auto recovered = openAbandonedCapture(folder)->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  EXPECT_EQ(recovered[0].path, repository.file("LECTURE.mov"));
  EXPECT_NEAR(recovered[0].duration, 1.0, 1e-6);
  EXPECT_NEAR(recovered[0].startTime, 1000.0, 1e-6);
}

TEST(Recovery, CancelledAndHandedOverRequestsDoNotComeBack) {
  const Folder repository;
  const std::string folder = crashedCapture(repository, std::string(kJournal) + "cancel R\n", 2);
  EXPECT_TRUE(openAbandonedCapture(folder)->recoverPending(repository.path()).empty());
  EXPECT_TRUE(std::filesystem::is_empty(repository.path()));
}

TEST(Recovery, OfANameTooLongForAFile) {
  const Folder repository;
  const std::string uuid = std::string(199, 'a') + "\u00E4" + std::string(200, 'b');
  const auto capture = openAbandonedCapture(crashedCapture(
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
  const auto recovered = openAbandonedCapture(folder)->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  recovered[0].forget();
  EXPECT_FALSE(std::filesystem::exists(folder));
}

TEST(Recovery, NameCannotLeaveTheRepository) {
  const Folder repository;
  const auto capture = openAbandonedCapture(crashedCapture(
      repository, "capture 2 0.0333333 0\nstart R 0.0 RecordingMetadata_RECORDING_UUID ../../evil\nrun 0 0\n",
      1));
  const auto recovered = capture->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  EXPECT_EQ(recovered[0].path, repository.file(".._.._evil.mov"));
}

TEST(Recovery, CaptureOfALivingProcessIsLeftAlone) {
  const Folder repository;
  const std::string folder = crashedCapture(repository, kJournal, 1);
  const auto living = Journal::open(folder + "/journal");
  ASSERT_TRUE(living);
  EXPECT_FALSE(openAbandonedCapture(folder));
}

TEST(Recovery, WithoutMediaLeavesNothing) {
  const Folder repository;
  const std::string folder = captureFolderOf(repository.path()) + "/capture";
  std::filesystem::create_directories(folder);
  std::ofstream(folder + "/journal") << kJournal;
  const std::ofstream empty(folder + "/media.mov");
  EXPECT_TRUE(openAbandonedCapture(folder)->recoverPending(repository.path()).empty());
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
    const auto capture = openAbandonedCapture(folder);
    ASSERT_TRUE(capture);
    const auto recovered = capture->recoverPending(repository.path());
    ASSERT_EQ(recovered.size(), 1U);
    EXPECT_EQ(recovered[0].path, repository.file(c.name));
    EXPECT_NEAR(recovered[0].duration, 2.0, 1e-6);
    EXPECT_EQ(recovered[0].recordingType, kRecordingTypeAudioVideo);
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
  const auto recovered = openAbandonedCapture(folder)->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  EXPECT_EQ(recovered[0].path, repository.file("capture.mov"));
}

TEST(Recovery, WhatCannotBeReadIsLeftAlone) {
  testing::LogCapture log;
  const Folder repository;
  const std::string folder = crashedCapture(repository, kJournal, 2);
  std::ofstream(folder + "/media.mov") << "no movie at all";
  EXPECT_FALSE(openAbandonedCapture(folder));
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
  EXPECT_FALSE(openAbandonedCapture(folder));
  EXPECT_TRUE(log.waitForPart("its fragments are damaged"));
  EXPECT_GT(std::filesystem::file_size(folder + "/media.mov"), 3U << 20);
}

TEST(Recovery, MediaWithABadBlockInTheMiddleStayAsTheyAre) {
  const Folder repository;
  const std::string folder = crashedCapture(repository, kJournal, 4);
  const std::uint64_t third = damageFragment(folder, 2, 20U << 20);
  ASSERT_GT(third, 0U);
  const auto size = std::filesystem::file_size(folder + "/media.mov");
  const auto recovered = openAbandonedCapture(folder)->recoverPending(repository.path());
  ASSERT_EQ(recovered.size(), 1U);
  EXPECT_NEAR(recovered[0].duration, 1.0, 1e-6);
  recovered[0].forget();
  EXPECT_EQ(std::filesystem::file_size(folder + "/media.mov"), size);
  const auto kept = std::filesystem::file_size(repository.file("LECTURE.mov"));
  EXPECT_TRUE(kept > 1000 && kept < third) << kept;
}

}  // namespace
}  // namespace lmx
