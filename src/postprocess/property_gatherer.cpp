// Adds the recording's properties one after another.
#include "postprocess/property_gatherer.h"

#include "model/codes.h"
#include "model/metadata_keys.h"
#include "prefs/recording_types.h"
#include "support/format.h"

namespace lmx {

std::optional<std::string> getProperty(const Dictionary& properties, const std::optional<std::string>& name) {
  return name ? lookUp(&properties, *name) : std::nullopt;
}

bool addValue(Dictionary& properties, const std::optional<std::string>& value,
              const std::optional<std::string>& name) {
  if (!value || !name) return false;
  return properties.try_emplace(*name, *value).second;
}

bool PropertyGatherer::missing(const char* name) const {
  return lookUp(&properties_, name).value_or("").empty();
}

bool PropertyGatherer::addIfMissing(const char* name, const Text& value) {
  if (!missing(name) || !value || value->empty()) return true;
  return addValue(properties_, value, name);
}

bool PropertyGatherer::addDates(const Time& started, const Time& stopped) {
  // A time that was never set is written as 0. Losing the rest of the document would be worse.
  const auto seconds = [](const Time& time) {
    return string_with_format("%d", static_cast<std::int32_t>(time ? time->tv_sec : 0));
  };
  return addValue(properties_, seconds(started), metadata_key::kStartDate) &&
         addValue(properties_, seconds(stopped), metadata_key::kEndDate);
}

bool PropertyGatherer::addRecording(const AgentRecord* record, std::int64_t duration) {
  return addIfMissing(metadata_key::kDuration,
                      string_with_format("%d", static_cast<std::int32_t>(duration))) &&
         addType(record == nullptr ? kRecordingTypeNone : record->recordedType()) &&
         addIfMissing(metadata_key::kVideoMaximumFrameRate,
                      defaults_.recording_video_maximum_frame_rate.get()) &&
         addImageSide(metadata_key::kVideoImageHeight, record == nullptr ? 0 : record->videoHeight.get()) &&
         addImageSide(metadata_key::kVideoImageWidth, record == nullptr ? 0 : record->videoWidth.get());
}

bool PropertyGatherer::addAudio() {
  return addIfMissing(metadata_key::kAudioChannel, defaults_.recording_audio_channel.get()) &&
         addIfMissing(metadata_key::kAudioSampleRate, defaults_.recording_audio_sample_rate.get()) &&
         addIfMissing(metadata_key::kAudioInput, defaults_.recording_audio_input.get());
}

bool PropertyGatherer::addExtension(const std::string& movie) {
  if (!missing(metadata_key::kMediaExtension)) return true;
  const std::size_t dot = movie.rfind('.');
  return addValue(properties_, dot == std::string::npos ? Text() : Text(movie.substr(dot)),
                  metadata_key::kMediaExtension);
}

bool PropertyGatherer::addType(std::int32_t code) {
  if (code == kRecordingTypeNone || !missing(metadata_key::kType)) return true;
  const char* name = recTypeToString(code);
  return addValue(properties_, name == nullptr ? Text() : Text(name), metadata_key::kType);
}

/// Does nothing unless the property is already there; then the add fails. This is intended: the agent never
/// writes an image size itself, and a START that gives one for a picture of known size is in error.
bool PropertyGatherer::addImageSide(const char* name, std::uint32_t pixels) {
  if (missing(name) || pixels == 0) return true;
  return addValue(properties_, string_with_format("%d", static_cast<int>(pixels)), name);
}

}  // namespace lmx
