// What a job gathers for its properties document.
#include <gmock/gmock.h>

#include "postprocess/property_gatherer.h"
#include "tests/unit/postprocess/submit_fixture.h"

namespace lmx {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using testing::shared;
using Entry = testing::LogCapture::Entry;

const Entry kFailed{kLogCritical, "Internal error occurred creating recording properties"};
constexpr TimeValue kStart{1700000000, 999999};
constexpr TimeValue kStop{1700000060, 5};

class Gathering : public testing::SubmitFixture {
 protected:
  Gathering() {
    context_->server.machine_uuid.set("CAMERA-1");
    context_->recording.recording_video_maximum_frame_rate.set("25");
    context_->record_context()->recordingType.set(kRecordingTypeAudioVideo);
  }
  const Dictionary& gather(const SharedDictionary& parameters,
                           const std::optional<std::string>& movie = "/r/ABC.mov", bool canceled = false) {
    job_.setPropertyValuesWithContext(context_, movie, kStart, kStop, 60, parameters, canceled);
    return job_.properties;
  }
  static Dictionary complete() {
    return {{"RecordingMetadata_MACHINE_UUID", "CAMERA-1"},
            {"RecordingMetadata_START_DATE", "1700000000"},
            {"RecordingMetadata_END_DATE", "1700000060"},
            {"RecordingMetadata_DURATION", "60"},
            {"RecordingMetadata_TYPE", "Audio+Video"},
            {"RecordingMetadata_VIDEO_MAXIMUM_FRAME_RATE", "25"},
            {"RecordingMetadata_DATA_MEDIA_EXTENSION", ".mov"}};
  }
  /// `complete` with the values of `more` replaced or added and those of `less` removed.
  static Dictionary completeWith(const Dictionary& more, const std::vector<std::string>& less = {}) {
    Dictionary all = complete();
    for (const auto& [name, value] : more) all[name] = value;
    for (const std::string& name : less) all.erase(name);
    return all;
  }

  AgentSubmit job_;
};

TEST_F(Gathering, TakesEverythingFromTheAgent) {
  EXPECT_EQ(gather(nullptr), complete());
  EXPECT_EQ(job_.recording_file_path, "/r/ABC.mov");
  EXPECT_EQ(job_.properties_file_path, "/r/ABC.xml");
  EXPECT_EQ(job_.agentContext, context_);
  EXPECT_FALSE(job_.canceled);
  EXPECT_THAT(log_.entries(), IsEmpty());
}

TEST_F(Gathering, CarriesTheMetadataOfTheRecording) {
  EXPECT_EQ(
      gather(shared({{"RecordingMetadata_TITLE", "Optics"}, {"RecordingMetadata_RECORDING_UUID", "ABC"}})),
      completeWith({{"RecordingMetadata_TITLE", "Optics"}, {"RecordingMetadata_RECORDING_UUID", "ABC"}}));
}

TEST_F(Gathering, ADurationOfTheStartIsKept) {
  EXPECT_EQ(gather(shared({{"RecordingMetadata_DURATION", "99"}})),
            completeWith({{"RecordingMetadata_DURATION", "99"}}));
  EXPECT_THAT(log_.entries(), IsEmpty());
}

TEST_F(Gathering, EveryOtherValueOfTheStartIsKeptToo) {
  const Dictionary own{{"RecordingMetadata_MACHINE_UUID", "x"},
                       {"RecordingMetadata_TYPE", "x"},
                       {"RecordingMetadata_VIDEO_MAXIMUM_FRAME_RATE", "x"},
                       {"RecordingMetadata_AUDIO_CHANNEL", "x"},
                       {"RecordingMetadata_AUDIO_SAMPLE_RATE", "x"},
                       {"RecordingMetadata_AUDIO_INPUT", "x"},
                       {"RecordingMetadata_DATA_MEDIA_EXTENSION", ".x"}};
  context_->recording.recording_audio_channel.set("Stereo");
  context_->recording.recording_audio_sample_rate.set("44");
  context_->recording.recording_audio_input.set("Automatic");
  EXPECT_EQ(gather(shared(own)), completeWith(own));
  EXPECT_THAT(log_.entries(), IsEmpty());
}

TEST_F(Gathering, AStartDateOfTheStartEndsTheGathering) {
  EXPECT_EQ(
      gather(shared({{"RecordingMetadata_START_DATE", "1"}}), "/r/ABC.mov", true),
      (Dictionary{{"RecordingMetadata_START_DATE", "1"}, {"RecordingMetadata_MACHINE_UUID", "CAMERA-1"}}));
  EXPECT_THAT(log_.entries(), ElementsAre(kFailed));
  EXPECT_FALSE(job_.canceled);
}

TEST_F(Gathering, AnEndDateOfTheStartEndsTheGathering) {
  EXPECT_EQ(gather(shared({{"RecordingMetadata_END_DATE", "1"}})),
            (Dictionary{{"RecordingMetadata_END_DATE", "1"},
                        {"RecordingMetadata_START_DATE", "1700000000"},
                        {"RecordingMetadata_MACHINE_UUID", "CAMERA-1"}}));
  EXPECT_THAT(log_.entries(), ElementsAre(kFailed));
}

TEST_F(Gathering, AnImageWidthOfTheStartEndsTheGatheringWhenTheRecordersIsKnown) {
  context_->record_context()->videoWidth.set(1280);
  EXPECT_EQ(gather(shared({{"RecordingMetadata_VIDEO_IMAGE_WIDTH", "640"}})),
            completeWith({{"RecordingMetadata_VIDEO_IMAGE_WIDTH", "640"}},
                         {"RecordingMetadata_DATA_MEDIA_EXTENSION"}));
  EXPECT_THAT(log_.entries(), ElementsAre(kFailed));
}

TEST_F(Gathering, AnImageHeightOfTheStartEndsTheGatheringWhenTheRecordersIsKnown) {
  context_->record_context()->videoHeight.set(720);
  EXPECT_EQ(gather(shared({{"RecordingMetadata_VIDEO_IMAGE_HEIGHT", "360"}})),
            completeWith({{"RecordingMetadata_VIDEO_IMAGE_HEIGHT", "360"}},
                         {"RecordingMetadata_DATA_MEDIA_EXTENSION"}));
  EXPECT_THAT(log_.entries(), ElementsAre(kFailed));
}

TEST_F(Gathering, TheAgentWritesNoImageSizeOfItsOwn) {
  context_->record_context()->videoWidth.set(1280);
  context_->record_context()->videoHeight.set(720);
  EXPECT_EQ(gather(nullptr), complete());
}

TEST_F(Gathering, AnImageSizeOfTheStartIsKeptWhenTheRecordersIsUnknown) {
  const Dictionary size{{"RecordingMetadata_VIDEO_IMAGE_WIDTH", "640"},
                        {"RecordingMetadata_VIDEO_IMAGE_HEIGHT", "360"}};
  EXPECT_EQ(gather(shared(size)), completeWith(size));
  EXPECT_THAT(log_.entries(), IsEmpty());
}

TEST_F(Gathering, AnEmptyImageSizeOfTheStartIsNoSize) {
  context_->record_context()->videoWidth.set(1280);
  EXPECT_EQ(gather(shared({{"RecordingMetadata_VIDEO_IMAGE_WIDTH", ""}})),
            completeWith({{"RecordingMetadata_VIDEO_IMAGE_WIDTH", ""}}));
}

TEST_F(Gathering, AnEmptyMachineUuidOfTheStartEndsTheGathering) {
  EXPECT_EQ(gather(shared({{"RecordingMetadata_MACHINE_UUID", ""}})),
            (Dictionary{{"RecordingMetadata_MACHINE_UUID", ""}}));
  EXPECT_THAT(log_.entries(), ElementsAre(kFailed));
}

TEST_F(Gathering, AnEmptyExtensionOfTheStartEndsTheGathering) {
  EXPECT_EQ(gather(shared({{"RecordingMetadata_DATA_MEDIA_EXTENSION", ""}})),
            completeWith({{"RecordingMetadata_DATA_MEDIA_EXTENSION", ""}}));
  EXPECT_THAT(log_.entries(), ElementsAre(kFailed));
}

TEST_F(Gathering, WhatTheAgentDoesNotKnowIsLeftOut) {
  context_->server.machine_uuid.set("");
  context_->recording.recording_video_maximum_frame_rate.set(std::nullopt);
  context_->record_context()->recordingType.set(kRecordingTypeNone);
  EXPECT_EQ(gather(nullptr),
            completeWith({}, {"RecordingMetadata_MACHINE_UUID", "RecordingMetadata_VIDEO_MAXIMUM_FRAME_RATE",
                              "RecordingMetadata_TYPE"}));
}

TEST_F(Gathering, WithoutASessionThereIsNoType) {
  context_->releaseRecord();
  EXPECT_EQ(gather(nullptr), completeWith({}, {"RecordingMetadata_TYPE"}));
}

TEST_F(Gathering, ATypeWithoutANameEndsTheGathering) {
  context_->record_context()->recordingType.set(9);
  gather(nullptr);
  EXPECT_THAT(log_.entries(), ElementsAre(kFailed));
}

TEST_F(Gathering, TheJobsOwnSessionDecidesTheType) {
  auto own = std::make_shared<AgentRecord>();
  own->recordingType.set(kRecordingTypeAudio);
  job_.recorded = own;
  EXPECT_EQ(gather(nullptr), completeWith({{"RecordingMetadata_TYPE", "Audio"}}));
}

TEST_F(Gathering, TheSoundSettingsAreAdded) {
  context_->recording.recording_audio_channel.set("Stereo");
  context_->recording.recording_audio_sample_rate.set("44");
  context_->recording.recording_audio_input.set("Automatic");
  EXPECT_EQ(gather(nullptr), completeWith({{"RecordingMetadata_AUDIO_CHANNEL", "Stereo"},
                                           {"RecordingMetadata_AUDIO_SAMPLE_RATE", "44"},
                                           {"RecordingMetadata_AUDIO_INPUT", "Automatic"}}));
}

TEST_F(Gathering, ADirectoryNamedMovIsReplacedToo) {
  gather(nullptr, "/a.mov/b.movie/ABC.mov");
  EXPECT_EQ(job_.properties_file_path, "/a.xml/b.xmlie/ABC.xml");
}

TEST_F(Gathering, AMovieNotNamedMovGetsItsDocumentBesideItWithAWarning) {
  EXPECT_EQ(gather(nullptr, "/r/ABC.mp4"),
            completeWith({{"RecordingMetadata_DATA_MEDIA_EXTENSION", ".mp4"}}));
  EXPECT_EQ(job_.properties_file_path, "/r/ABC.mp4.xml");
  EXPECT_THAT(log_.entries(),
              ElementsAre(Entry{kLogWarning,
                                "The movie \"/r/ABC.mp4\" is not named .mov: its properties go to "
                                "\"/r/ABC.mp4.xml\""}));
}

TEST_F(Gathering, TheExtensionBeginsAtTheLastDot) {
  EXPECT_EQ(gather(nullptr, "/r.1/A.B.mov"), complete());
  EXPECT_EQ(job_.properties_file_path, "/r.1/A.B.xml");
}

TEST_F(Gathering, AMovieWithoutAnyDotEndsTheGathering) {
  EXPECT_EQ(gather(nullptr, "/r/ABC"), completeWith({}, {"RecordingMetadata_DATA_MEDIA_EXTENSION"}));
  EXPECT_TRUE(log_.contains(kFailed.level, kFailed.text));
}

TEST_F(Gathering, WithoutAMovieOnlyTheMetadataIsThere) {
  EXPECT_EQ(gather(shared({{"RecordingMetadata_TITLE", "Optics"}}), std::nullopt),
            (Dictionary{{"RecordingMetadata_TITLE", "Optics"}}));
  EXPECT_THAT(log_.entries(), ElementsAre(kFailed));
  EXPECT_EQ(job_.recording_file_path, std::nullopt);
}

TEST_F(Gathering, ACanceledRecordingIsMarked) {
  gather(nullptr, "/r/ABC.mov", true);
  EXPECT_TRUE(job_.canceled);
}

TEST_F(Gathering, AnUnsetTimeIsZero) {
  job_.setPropertyValuesWithContext(context_, "/r/ABC.mov", std::nullopt, kStop, 60, nullptr, false);
  EXPECT_EQ(job_.properties, completeWith({{"RecordingMetadata_START_DATE", "0"}}));
  EXPECT_THAT(log_.entries(), IsEmpty());
}

TEST_F(Gathering, SecondsAreThirtyTwoBitNumbers) {
  job_.setPropertyValuesWithContext(context_, "/r/ABC.mov", TimeValue{4294967296 + 5, 0}, kStop,
                                    4294967296 + 7, nullptr, false);
  EXPECT_EQ(getProperty(job_.properties, "RecordingMetadata_START_DATE"), "5");
  EXPECT_EQ(getProperty(job_.properties, "RecordingMetadata_DURATION"), "7");
}

TEST(AgentSubmitProperties, AnExistingValueIsNeverReplaced) {
  Dictionary properties;
  EXPECT_TRUE(addValue(properties, "1", "name"));
  EXPECT_FALSE(addValue(properties, "2", "name"));
  EXPECT_EQ(getProperty(properties, "name"), "1");
}

TEST(AgentSubmitProperties, AnAbsentNameOrValueIsRefused) {
  Dictionary properties;
  EXPECT_FALSE(addValue(properties, std::nullopt, "name"));
  EXPECT_FALSE(addValue(properties, "1", std::nullopt));
  EXPECT_TRUE(addValue(properties, "", "name"));
  EXPECT_EQ(getProperty(properties, std::nullopt), std::nullopt);
  EXPECT_EQ(getProperty(properties, "other"), std::nullopt);
}

}  // namespace
}  // namespace lmx
