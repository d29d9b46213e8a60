// The settings on their way into the context.
#include <arpa/inet.h>

#include <array>
#include <cstdlib>
#include <cstring>
#include <mutex>

#include "platform/log.h"
#include "platform/paths.h"
#include "prefs/agent_preferences.h"
#include "prefs/continuous_settings.h"
#include "support/base64.h"
#include "support/format.h"
#include "support/heap_ptr.h"

namespace lmx {
namespace {

constexpr const char* kNotBound = "lmxagentd cannot run in agent mode without being bound to a Lumex server.";

using Text = AgentContext::Text;
using Setter = void (AgentContext::*)(Text);

Text textOf(const std::optional<PlistValue>& value) {
  if (!value || value->string() == nullptr) return std::nullopt;
  return *value->string();
}

bool empty(const Text& text) { return !text || text->empty(); }

bool requiredTagMissing(const AgentContext& context, const char* name) {
  LMPLogMessage(context.log_context(), kLogCritical,
                "\"%s\" tag was not found or value is empty, this field is required", name);
  return false;
}

/// Stores the value first and judges it afterwards, so that a failing key leaves its field holding what was
/// found.
Text store(AgentPreferences& prefs, AgentContext& context, const char* key, Setter setter) {
  Text value = textOf(prefs.getFromPrefsFile(key));
  (context.*setter)(value);
  return value;
}

bool readIdentity(AgentPreferences& prefs, AgentContext& context) {
  static constexpr std::pair<const char*, Setter> kKeys[] = {{"CameraName", &AgentContext::setMachine_name},
                                                             {"CameraUUID", &AgentContext::setMachine_uuid},
                                                             {"ServerUUID", &AgentContext::setServer_uuid}};
  for (const auto& [key, setter] : kKeys) {
    if (store(prefs, context, key, setter)) continue;
    LMPLogMessage(context.log_context(), kLogError, "%s", kNotBound);
    return false;
  }
  return true;
}

bool readServer(AgentPreferences& prefs, AgentContext& context) {
  struct Tag {
    const char* key;
    const char* nameInMessage;
    Setter setter;
  };
  static constexpr Tag kTags[] = {{"LumexURL", "ServerURL", &AgentContext::setLumex_url},
                                  {"TunnelHost", "TunnelHost", &AgentContext::setTunnel_host},
                                  {"TunnelPort", "TunnelPort", &AgentContext::setTunnel_port}};
  for (const Tag& tag : kTags) {
    if (empty(store(prefs, context, tag.key, tag.setter)))
      return requiredTagMissing(context, tag.nameInMessage);
  }
  if (const Text port = textOf(prefs.getFromPrefsFile("TCPListenerPort"))) {
    const auto number = static_cast<std::uint16_t>(std::atoi(port->c_str()));
    context.setTcp_listener_port(htons(number));
    LMPLogMessage(context.log_context(), kLogNotice, "TCP listener port: %d", number);
  }
  return true;
}

bool readSecret(AgentContext& context) {
  const std::string path =
      systemPath(kSecretsDirectory) + "/" + context.server_uuid().value_or("") + ".plist";
  const PlistResult file = readPropertyList(path);
  const PlistDictionary* dictionary = file.value ? file.value->dictionary() : nullptr;
  const auto found =
      dictionary == nullptr ? PlistDictionary::const_iterator{} : dictionary->find("lmx_secret");
  if (dictionary == nullptr || found == dictionary->end() || found->second.string() == nullptr) {
    LMPLogMessage(nullptr, kLogError, "Failed to read shared secret from plist: %s", path.c_str());
    LMPLogMessage(context.log_context(), kLogError, "%s", kNotBound);
    return false;
  }
  std::size_t length = 0;
  const heap_ptr<unsigned char> bytes(lmp_decode_base64(found->second.string()->c_str(), &length));
  std::array<unsigned char, 16> secret{};
  if (!bytes || length != secret.size()) return false;
  std::memcpy(secret.data(), bytes.get(), secret.size());
  context.setShared_secret(secret);
  return true;
}

bool readType(AgentPreferences& prefs, AgentContext& context, RecordingSettings& session) {
  const Text name = store(prefs, context, "RecordingType", &AgentContext::setRecording_type);
  if (empty(name)) return requiredTagMissing(context, "RecordingType");
  const int code = AgentPreferences::recTypeToCode(name->c_str());
  session.setRecordingType(code);
  if (code == 4 && empty(store(prefs, context, "RecordingPath", &AgentContext::setInput_file))) {
    LMPLogMessage(
        context.log_context(), kLogCritical,
        "\"RecordingPath\" tag was not found or value is empty, this field is required for the \"File\" "
        "recording type");
    return false;
  }
  if (code != 0) return true;
  LMPLogMessage(context.log_context(), kLogCritical, "\"%s\" tag value is not known", "Type");
  return false;
}

bool readLimits(AgentPreferences& prefs, AgentContext& context, RecordingSettings& session) {
  store(prefs, context, "PreviewPath", &AgentContext::setPreview_file);
  const Text cutoff = textOf(prefs.getFromPrefsFile("RecordingDiskSpaceCutoffInMB"));
  if (empty(cutoff)) return requiredTagMissing(context, "RecordingDiskSpaceCutoffInMB");
  session.setDiskSpaceCutoffInMB(static_cast<std::uint32_t>(std::atoi(cutoff->c_str())));
  const std::int32_t type = session.recordingType();
  if ((type == 2 || type == 3) && empty(store(prefs, context, "RecordingVideoMaximumFrameRate",
                                              &AgentContext::setRecording_video_maximum_frame_rate))) {
    return requiredTagMissing(context, "RecordingVideoMaximumFrameRate");
  }
  store(prefs, context, "RecordingCapturePreset", &AgentContext::setCapture_preset);
  return true;
}

bool readContinuous(AgentPreferences& prefs, AgentContext& context) {
  const auto value = prefs.getFromPrefsFile("ContinuousRecording");
  if (!value || value->dictionary() == nullptr) return true;
  const LMRContinuousRecordingInfo info = continuousInfoFrom(*value->dictionary());
  context.setContinuous(info);
  return continuousInfoValid(info);
}

}  // namespace

bool AgentPreferences::setAgentPreferencesInContext(AgentContext& context) {
  LMPLogMessage(context.log_context(), kLogInfo, "Reading preferences...");
  const bool bound = !context.adhoc();
  if (bound && !(readIdentity(*this, context) && readServer(*this, context) && readSecret(context)))
    return false;
  const auto session = context.recording_settings();
  if (!session) {
    LMPLogMessage(context.log_context(), kLogCritical, "Internal error occurred creating record context");
    return false;
  }
  if (bound &&
      empty(store(*this, context, "RecordingRepositoryPath", &AgentContext::setRecording_repository_path))) {
    return requiredTagMissing(context, "RecordingRepositoryPath");
  }
  return readType(*this, context, *session) && readLimits(*this, context, *session) &&
         readContinuous(*this, context);
}

void AgentPreferences::migrateOldKeys() {
  const std::lock_guard lock(prefsCacheMutex_);  // recursive: the read below locks it again
  const auto old = textOf(getFromPrefsFile("RecordingPreviewIntervalInSeconds"));
  if (!old || !prefsDict_) return;
  const auto seconds = static_cast<std::uint32_t>(std::atoi(old->c_str()));
  // The old default of 3 s becomes the new default, not its equivalent.
  const std::string milliseconds =
      seconds == 3 ? "400"
                   : formatted("%lld", static_cast<long long>(static_cast<std::int32_t>(seconds * 1000U)));
  prefsDict_->insert_or_assign("PreviewIntervalInMilliseconds", PlistValue(milliseconds));
  prefsDict_->erase("RecordingPreviewIntervalInSeconds");
  const std::string path = systemPath(kPreferencesFile);
  if (const int error = writePropertyList(path, *prefsDict_)) {
    LMPLogMessage(nullptr, kLogWarning, "The obsolete preview interval could not be replaced in %s: %s",
                  path.c_str(), std::strerror(error));
  }
}

}  // namespace lmx
