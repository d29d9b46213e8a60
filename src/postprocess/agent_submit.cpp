// Gathering what goes into the properties document.
#include "postprocess/agent_submit.h"

#include "platform/log.h"
#include "prefs/agent_preferences.h"
#include "prefs/recording_types.h"
#include "support/format.h"

namespace lmx {
namespace {

/// Every ".mov" becomes ".xml"; a path without one gets ".xml" behind it: the document must not overwrite the
/// movie.
std::string propertiesPathFor(const std::string& movie, LMPLogContext log) {
  std::string path = movie;
  bool replaced = false;
  for (std::size_t at = path.find(".mov"); at != std::string::npos; at = path.find(".mov", at + 4)) {
    path.replace(at, 4, ".xml");
    replaced = true;
  }
  if (replaced) return path;
  LMPLogMessage(log, kLogWarning, "The movie \"%s\" is not named .mov: its properties go to \"%s.xml\"",
                movie.c_str(), movie.c_str());
  return movie + ".xml";
}

/// The steps that add properties; the first add that fails ends the rest.
class Gatherer {
 public:
  Gatherer(AgentSubmit& job, const AgentContext& context) : job_(job), context_(context) {}

  using Text = AgentSubmit::Text;

  [[nodiscard]] bool missing(const char* name) const {
    return job_.getProperty(std::string(name)).value_or("").empty();
  }

  bool addIfMissing(const char* name, const Text& value) {
    if (!missing(name) || !value || value->empty()) return true;
    return job_.addValue(value, std::string(name));
  }

  bool addDates(std::optional<TimeValue> started, std::optional<TimeValue> stopped) {
    // A time that nobody has set counts as 0: losing the rest of the document over it would be worse.
    const auto seconds = [](std::optional<TimeValue> time) {
      return string_with_format("%d", static_cast<std::int32_t>(time ? time->tv_sec : 0));
    };
    return job_.addValue(seconds(started), "RecordingMetadata_START_DATE") &&
           job_.addValue(seconds(stopped), "RecordingMetadata_END_DATE");
  }

  bool addRecording(const AgentRecord* record, std::int64_t duration) {
    if (!addIfMissing("RecordingMetadata_DURATION",
                      string_with_format("%d", static_cast<std::int32_t>(duration))))
      return false;
    return addType(record == nullptr ? 0 : record->recordedType()) &&
           addIfMissing("RecordingMetadata_VIDEO_MAXIMUM_FRAME_RATE",
                        context_.recording.recording_video_maximum_frame_rate.get()) &&
           addImageSide("RecordingMetadata_VIDEO_IMAGE_HEIGHT",
                        record == nullptr ? 0 : record->videoHeight.get()) &&
           addImageSide("RecordingMetadata_VIDEO_IMAGE_WIDTH",
                        record == nullptr ? 0 : record->videoWidth.get());
  }

  bool addAudio() {
    return addIfMissing("RecordingMetadata_AUDIO_CHANNEL",
                        context_.recording.recording_audio_channel.get()) &&
           addIfMissing("RecordingMetadata_AUDIO_SAMPLE_RATE",
                        context_.recording.recording_audio_sample_rate.get()) &&
           addIfMissing("RecordingMetadata_AUDIO_INPUT", context_.recording.recording_audio_input.get());
  }

  bool addExtension(const std::string& movie) {
    if (!missing("RecordingMetadata_DATA_MEDIA_EXTENSION")) return true;
    const std::size_t dot = movie.rfind('.');
    return job_.addValue(dot == std::string::npos ? Text() : Text(movie.substr(dot)),
                         "RecordingMetadata_DATA_MEDIA_EXTENSION");
  }

 private:
  bool addType(std::int32_t code) {
    if (code == 0 || !missing("RecordingMetadata_TYPE")) return true;
    const char* name = recTypeToString(code);
    return job_.addValue(name == nullptr ? Text() : Text(name), "RecordingMetadata_TYPE");
  }

  /// Only where the property is there already, and then the add must fail: the agent never writes an image
  /// size itself, and a START that claims one for a picture whose size is known is in error.
  bool addImageSide(const char* name, std::uint32_t pixels) {
    if (missing(name) || pixels == 0) return true;
    return job_.addValue(string_with_format("%d", static_cast<int>(pixels)), std::string(name));
  }

  AgentSubmit& job_;
  const AgentContext& context_;
};

}  // namespace

AgentSubmit::Text AgentSubmit::getProperty(const Text& name) const {
  return name ? lookUp(&properties_, *name) : std::nullopt;
}

bool AgentSubmit::addValue(const Text& value, const Text& name) {
  if (!value || !name) return false;
  return properties_.try_emplace(*name, *value).second;
}

std::shared_ptr<AgentRecord> AgentSubmit::record() const {
  if (record_ || !agentContext_) return record_;
  return agentContext_->record_context();
}

void AgentSubmit::setPropertyValuesWithContext(std::shared_ptr<AgentContext> context,
                                               const Text& recording_file_path,
                                               std::optional<TimeValue> started_date,
                                               std::optional<TimeValue> stopped_date, std::int64_t duration,
                                               const SharedDictionary& user_properties, bool canceled) {
  agentContext_ = std::move(context);
  const auto session = record();
  if (user_properties) {
    for (const auto& [name, value] : *user_properties) properties_.insert_or_assign(name, value);
  }
  bool good = recording_file_path.has_value();
  if (good) {
    recording_file_path_ = recording_file_path;
    properties_file_path_ = propertiesPathFor(*recording_file_path, agentContext_->log_context());
    Gatherer gather(*this, *agentContext_);
    good = gather.addIfMissing("RecordingMetadata_MACHINE_UUID", agentContext_->server.machine_uuid.get()) &&
           gather.addDates(started_date, stopped_date) && gather.addRecording(session.get(), duration) &&
           gather.addAudio() && gather.addExtension(*recording_file_path);
  }
  if (!good) {
    LMPLogMessage(agentContext_->log_context(), kLogCritical,
                  "Internal error occurred creating recording properties");
    return;
  }
  canceled_ = canceled;
}

void AgentSubmit::cleanup() {
  properties_.clear();
  agentContext_ = nullptr;
  record_ = nullptr;
}

}  // namespace lmx
