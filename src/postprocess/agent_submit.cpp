// Describes a recording and submits it.
#include "postprocess/agent_submit.h"

#include <unistd.h>

#include <algorithm>
#include <cstring>

#include "model/codes.h"
#include "model/metadata_keys.h"
#include "platform/directories.h"
#include "platform/file_copy.h"
#include "platform/log.h"
#include "postprocess/properties_document.h"
#include "postprocess/property_gatherer.h"
#include "postprocess/submission.h"
#include "support/format.h"

namespace lmx {
namespace {

constexpr mode_t kMovieMode = 0644;
/// Documents hold the user's password.
constexpr mode_t kDocumentMode = 0600;

void copyIntoRepository(const std::string& from, const std::string& to, mode_t mode) {
  if (const int error = copyFileToNewName(from, to, mode)) {
    LMPLogMessage(nullptr, kLogDebug, "\"%s\" was not copied to \"%s\": %s", from.c_str(), to.c_str(),
                  std::strerror(error));
  }
}

void removeFile(LMPLogContext log, const std::optional<std::string>& path) {
  if (path && unlink(path->c_str()) == 0) {
    LMPLogMessage(log, kLogInfo, "File \"%s\" was removed", path->c_str());
  } else {
    LMPLogMessage(log, kLogError, "An error occurred removing file \"%s\"", textOrNull(path).c_str());
  }
}

}  // namespace

std::shared_ptr<AgentRecord> AgentSubmit::session() const {
  if (recorded || !agentContext) return recorded;
  return agentContext->record_context();
}

void AgentSubmit::setPropertyValuesWithContext(std::shared_ptr<AgentContext> context, const Text& movie,
                                               std::optional<TimeValue> started_date,
                                               std::optional<TimeValue> stopped_date, std::int64_t duration,
                                               const SharedDictionary& user_properties, bool was_canceled) {
  agentContext = std::move(context);
  if (user_properties) {
    for (const auto& [name, value] : *user_properties) properties.insert_or_assign(name, value);
  }
  if (!gather(movie, started_date, stopped_date, duration)) {
    LMPLogMessage(log(), kLogCritical, "Internal error occurred creating recording properties");
    return;
  }
  canceled = was_canceled;
}

bool AgentSubmit::gather(const Text& movie, std::optional<TimeValue> started_date,
                         std::optional<TimeValue> stopped_date, std::int64_t duration) {
  if (!movie) return false;
  recording_file_path = movie;
  properties_file_path = propertiesPathFor(*movie, log());
  PropertyGatherer gatherer(properties, agentContext->recording);
  return gatherer.addIfMissing(metadata_key::kMachineUUID, agentContext->server.machine_uuid.get()) &&
         gatherer.addDates(started_date, stopped_date) && gatherer.addRecording(session().get(), duration) &&
         gatherer.addAudio() && gatherer.addExtension(*movie);
}

bool AgentSubmit::tryWriteProperties() const {
  if (!properties_file_path) return true;
  const int error = writeFileAtomically(*properties_file_path, propertiesXml(properties), kDocumentMode,
                                        OldAccess::discard);
  if (error == 0) return true;
  LMPLogMessage(log(), kLogWarning, "The properties document \"%s\" could not be written: %s",
                properties_file_path->c_str(), std::strerror(error));
  return false;
}

int AgentSubmit::writeProperties() {
  documented_ = tryWriteProperties();
  return 0;
}

int AgentSubmit::addRecordingWithCommentary(ChildRunner& children) {
  const int result = submitOrCleanUp(children);
  if (stored) stored->remove();
  return result;
}

int AgentSubmit::submitOrCleanUp(ChildRunner& children) {
  const bool disabled = agentContext && agentContext->options.submit_disabled.get();
  LMPLogMessage(log(), kLogInfo, "Post-process mechanism is starting...");
  if (!disabled && !canceled) {
    LMPLogMessage(log(), kLogInfo, "Completion in progress...");
    if (addRecording(children) != 0) {
      const Text server = agentContext ? agentContext->server.lumex_url.get() : std::nullopt;
      LMPLogMessage(log(), kLogError, "An error occurred completing recording \"%s\"",
                    textOrNull(server).c_str());
      LMPLogMessage(log(), kLogCritical, "An internal error occurred during agent post-processing");
      return -1;
    }
    LMPLogMessage(log(), kLogInfo, "Recording completed with success");
  } else if (canceled) {
    LMPLogMessage(log(), kLogInfo, "Submission not launched because the recording was canceled");
    removeFiles();
  }
  LMPLogMessage(log(), kLogInfo, "Post-process mechanism completed with success");
  return 0;
}

void AgentSubmit::removeFiles() const {
  removeFile(log(), recording_file_path);
  removeFile(log(), properties_file_path);
}

int AgentSubmit::addRecording(ChildRunner& children) {
  const Text uuid = getProperty(properties, metadata_key::kRecordingUUID);
  if (!agentContext || !uuid) return failedBeforeTheTool();
  const auto record = session();
  if (record && record->recordedType() == kRecordingTypeFile) copyInputFile(*uuid);
  SubmissionRequest submission{.server = agentContext->server.lumex_url.get().value_or(""),
                               .recordingUUID = *uuid};
  if (adhoc_workflow_uuid) {
    const Text submitter = user ? user : agentContext->options.user.get();
    const Text secret = password ? password : agentContext->options.password.get();
    if (!submitter || !secret) return failedBeforeTheTool();
    submission.workflow = *adhoc_workflow_uuid;
    submission.file = recording_file_path.value_or("");
    submission.user = *submitter;
    submission.password = *secret;
  }
  if (stored) stored->begin();
  const int result = submitWithTool(children, submissionArguments(submission));
  if (stored) stored->remove();  // before anybody is told: a crash now must not name it as interrupted
  return result;
}

/// The tool looks for a recording in the repository, so the input file of a "File" recording and its document
/// are copied there.
void AgentSubmit::copyInputFile(const std::string& uuid) const {
  const std::string movie = recording_file_path.value_or("");
  const std::string copy = agentContext->recording.recording_repository_path.get().value_or("") + "/" + uuid;
  copyIntoRepository(movie, copy + ".mov", kMovieMode);
  copyIntoRepository(movie.substr(0, movie.size() - std::min<std::size_t>(3, movie.size())) + "xml",
                     copy + ".xml", kDocumentMode);
}

}  // namespace lmx
