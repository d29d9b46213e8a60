// Reads and validates the settings in their order.
#include "prefs/agent_settings.h"

#include <arpa/inet.h>

#include <cstdlib>

#include "platform/log.h"
#include "prefs/continuous_settings.h"
#include "prefs/recording_types.h"
#include "prefs/shared_secret.h"

namespace lmx {
namespace {

constexpr const char* kNotBound = "lmxagentd cannot run in agent mode without being bound to a Lumex server.";

using Text = std::optional<std::string>;

bool empty(const Text& text) { return !text || text->empty(); }

/// Reads all settings once. Each step stores the value before it validates it, so that a field with an
/// invalid value still holds what was found.
class SettingsReader {
 public:
  SettingsReader(AgentPreferences& prefs, AgentContext& context) : prefs_(prefs), context_(context) {}

  bool readIdentity() {
    const std::pair<const char*, SharedValue<Text>*> keys[] = {{"CameraName", &context_.server.machine_name},
                                                               {"CameraUUID", &context_.server.machine_uuid},
                                                               {"ServerUUID", &context_.server.server_uuid}};
    for (const auto& [key, field] : keys) {
      if (!store(key, *field)) return notBound();
    }
    return true;
  }

  bool readServer() {
    struct Tag {
      const char* key;
      const char* nameInMessage;
      SharedValue<Text>* field;
    };
    const Tag tags[] = {{"LumexURL", "ServerURL", &context_.server.lumex_url},
                        {"TunnelHost", "TunnelHost", &context_.server.tunnel_host},
                        {"TunnelPort", "TunnelPort", &context_.server.tunnel_port}};
    for (const Tag& tag : tags) {
      if (empty(store(tag.key, *tag.field))) return requiredTagMissing(tag.nameInMessage);
    }
    if (const Text port = text("TCPListenerPort")) {
      const auto number = static_cast<std::uint16_t>(std::atoi(port->c_str()));
      context_.server.tcp_listener_port.set(htons(number));
      LMPLogMessage(context_.log_context(), kLogNotice, "TCP listener port: %d", number);
    }
    return true;
  }

  bool readSecret() {
    const auto secret = readSharedSecret(context_.server.server_uuid.get().value_or(""));
    if (secret) {
      context_.server.shared_secret.set(*secret);
      return true;
    }
    LMPLogMessage(nullptr, kLogError, "%s", secret.error().message.c_str());
    return secret.error().kind == SecretError::Kind::missing && notBound();
  }

  bool readRepository() {
    return !empty(store("RecordingRepositoryPath", context_.recording.recording_repository_path)) ||
           requiredTagMissing("RecordingRepositoryPath");
  }

  bool readType(RecordingSettings& session) {
    const Text name = store("RecordingType", context_.recording.recording_type);
    if (empty(name)) return requiredTagMissing("RecordingType");
    const RecordingTypeCode code = recTypeToCode(name);
    session.recordingType.set(code);
    if (code == kRecordingTypeFile && empty(store("RecordingPath", context_.recording.input_file))) {
      LMPLogMessage(
          context_.log_context(), kLogCritical,
          "\"RecordingPath\" tag was not found or value is empty, this field is required for the \"File\" "
          "recording type");
      return false;
    }
    if (code != kRecordingTypeNone) return true;
    LMPLogMessage(context_.log_context(), kLogCritical, "\"%s\" tag value is not known", "Type");
    return false;
  }

  bool readLimits(RecordingSettings& session) {
    store("PreviewPath", context_.recording.preview_file);
    const Text cutoff = text("RecordingDiskSpaceCutoffInMB");
    if (empty(cutoff)) return requiredTagMissing("RecordingDiskSpaceCutoffInMB");
    session.diskSpaceCutoffInMB.set(static_cast<std::uint32_t>(std::atoi(cutoff->c_str())));
    const std::int32_t type = session.recordingType.get();
    const bool hasVideo = type == kRecordingTypeAudioVideo || type == kRecordingTypeVideo;
    if (hasVideo && empty(store("RecordingVideoMaximumFrameRate",
                                context_.recording.recording_video_maximum_frame_rate))) {
      return requiredTagMissing("RecordingVideoMaximumFrameRate");
    }
    store("RecordingCapturePreset", context_.recording.capture_preset);
    return true;
  }

  bool readContinuous() {
    const auto value = prefs_.getFromPrefsFile("ContinuousRecording");
    if (!value || value->dictionary() == nullptr) return true;
    const LMRContinuousRecordingInfo info = continuousInfoFrom(*value->dictionary());
    context_.recording.continuous.set(info);
    return continuousInfoValid(info);
  }

 private:
  Text text(const char* key) { return textOf(prefs_.getFromPrefsFile(key)); }
  Text store(const char* key, SharedValue<Text>& field) {
    Text value = text(key);
    field.set(value);
    return value;
  }
  bool notBound() {
    LMPLogMessage(context_.log_context(), kLogError, "%s", kNotBound);
    return false;
  }
  bool requiredTagMissing(const char* name) {
    LMPLogMessage(context_.log_context(), kLogCritical,
                  "\"%s\" tag was not found or value is empty, this field is required", name);
    return false;
  }

  AgentPreferences& prefs_;
  AgentContext& context_;
};

}  // namespace

bool setAgentPreferencesInContext(AgentPreferences& prefs, AgentContext& context) {
  LMPLogMessage(context.log_context(), kLogInfo, "Reading preferences...");
  SettingsReader reader(prefs, context);
  const bool bound = !context.options.adhoc.get();
  if (bound && !(reader.readIdentity() && reader.readServer() && reader.readSecret())) return false;
  const auto session = context.recording_settings();
  if (!session) {
    LMPLogMessage(context.log_context(), kLogCritical, "Internal error occurred creating record context");
    return false;
  }
  if (bound && !reader.readRepository()) return false;
  return reader.readType(*session) && reader.readLimits(*session) && reader.readContinuous();
}

}  // namespace lmx
