// STATUS: what the recorder does, with the camera's profile and a preview image when asked for.
#include "control/handlers/status_command.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "control/handlers/status_reply.h"
#include "control/protocol/audio_levels.h"
#include "control/protocol/command_parser.h"
#include "record/agent_record.h"
#include "record/recording_status.h"
#include "support/base64.h"
#include "support/unique_fd.h"

namespace lmx {
namespace {

/// A preview is a still image: more than this is another file by mistake, and would fill the memory and the
/// line.
constexpr off_t kLargestPreview = 16 << 20;

/// The file's bytes in Base64; nothing when there are none to be had.
std::optional<std::string> base64OfFile(const std::string& path) {
  struct stat file {};
  if (::stat(path.c_str(), &file) != 0 || file.st_size < 1 || file.st_size > kLargestPreview)
    return std::nullopt;
  const UniqueFd descriptor(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  if (!descriptor.valid()) return std::nullopt;
  std::string bytes(static_cast<std::size_t>(file.st_size), '\0');
  const ssize_t length = ::read(descriptor.get(), bytes.data(), bytes.size());
  if (length < 1) return std::nullopt;
  return lmp_encode_base64(std::string_view(bytes).substr(0, static_cast<std::size_t>(length)));
}

std::optional<std::string> previewImage(const RecordingDefaults& recording) {
  const auto file = recording.preview_file.get();
  return file ? base64OfFile(*file) : std::nullopt;
}

/// Levels of the running recording; an idle recorder listens to nothing.
std::vector<double> powerLevels(const AgentRecord* session, int recordStatus) {
  const auto capture =
      session != nullptr && recordStatus != kRecorderIdle ? session->captureController.get() : nullptr;
  return capture ? capture->audioAveragePowerLevels() : std::vector<double>();
}

bool recordingTypeSupportsVideoPreview(const AgentRecord* session) {
  return session != nullptr && (session->recordingType.get() == kRecordingTypeAudioVideo ||
                                session->recordingType.get() == kRecordingTypeVideo);
}

}  // namespace

void StatusCommand::handleSTATUS(const Dictionary* parameters) {
  const auto context = context_.get();
  if (!context) {
    LMPLogMessage(nullptr, kLogError, "No agent context");
    return;
  }
  const bool include_preview = isTrue(parameters, "include_preview");
  const auto session = context->record_context();
  const auto preview = include_preview ? previewImage(context->recording) : std::nullopt;

  RecordStatus status;
  const int cmdStatus = LXAgentRecordGetStatus(session, &status);
  std::string reply = statusFields(cmdStatus, status);
  if (reply.empty()) {
    LMPLogMessage(context->log_context(), kLogError, "Could not build a response string");
    return;
  }
  if (isTrue(parameters, "include_profile")) {
    reply.append(",").append(profileFields(context->server.machine_name.get(),
                                           context->server.tunnel_host.get(),
                                           context->recording.capture_preset.get()));
  }
  if (preview) {
    const auto levels = audioLevels(powerLevels(session.get(), status.recordStatus));
    reply.append(",").append(previewFields(levels, *preview));
  } else if (include_preview && recordingTypeSupportsVideoPreview(session.get())) {
    LMPLogMessage(context->log_context(), kLogDebug, "preview buffer is NULL");
  }
  replies_.sendReply(reply);
}

}  // namespace lmx
