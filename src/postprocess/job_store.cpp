// Writes, reads and removes the files of jobs.
#include "postprocess/job_store.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <utility>

#include "model/metadata_keys.h"
#include "platform/directories.h"
#include "platform/paths.h"
#include "platform/plist/property_list.h"
#include "postprocess/agent_submit.h"
#include "record/agent_record.h"
#include "support/format.h"
#include "support/scan.h"

namespace lmx {
namespace {

constexpr const char* kWaiting = ".job";
constexpr const char* kBegun = ".begun";
constexpr const char* kNamed = ".named";  ///< begun, and named in the log

bool exists(const std::string& path) { return access(path.c_str(), F_OK) == 0; }

std::uint64_t numberOf(const std::string& path) {
  return std::strtoull(path.c_str() + path.rfind('/') + 1, nullptr, 10);
}

/// The first free name with `number`; its jobs are in the order in which they were kept.
std::string freeName(const std::string& folder, std::uint64_t number) {
  for (unsigned i = 0;; ++i) {
    std::string name =
        folder + "/" + string_with_format("%010llu-%04u", static_cast<unsigned long long>(number), i);
    const auto taken = [&name](const char* ending) { return exists(name + ending); };
    if (!taken(kWaiting) && !taken(kBegun) && !taken(kNamed)) return name + kWaiting;
  }
}

/// Files with that ending, oldest first.
std::vector<std::string> filesEndingIn(const char* ending, const std::string& folder) {
  std::vector<std::string> files;
  std::error_code error;
  for (const auto& entry : std::filesystem::directory_iterator(folder, error)) {
    if (entry.path().extension() == ending) files.push_back(entry.path());
  }
  std::sort(files.begin(), files.end());
  return files;
}

/// A process that was killed while it wrote a job has left its temporary file. Nobody writes there now.
void removeTemporaries(const std::string& folder) {
  std::error_code error;
  std::vector<std::string> left;
  for (const auto& entry : std::filesystem::directory_iterator(folder, error)) {
    if (entry.path().filename().string().starts_with(".lmx-")) left.push_back(entry.path());
  }
  for (const std::string& path : left) unlink(path.c_str());
}

int makeFolder(const std::string& folder) {
  if (exists(folder)) return 0;
  if (const int error = mkdir_p(folder.c_str(), 0700)) return error;
  return syncDirectory(directoryOf(folder));
}

void addIfSet(PlistDictionary& to, const char* key, const std::optional<std::string>& value) {
  if (value) to.emplace(key, *value);
}

PlistDictionary written(const AgentSubmit& job) {
  PlistDictionary file;
  file.emplace("Request", job.request);
  file.emplace("Type", std::to_string(job.recorded ? job.recorded->recordedType() : kRecordingTypeNone));
  addIfSet(file, "Recording", lookUp(&job.properties, metadata_key::kRecordingUUID));
  addIfSet(file, "Movie", job.recording_file_path);
  addIfSet(file, "Document", job.properties_file_path);
  addIfSet(file, "Workflow", job.adhoc_workflow_uuid);
  addIfSet(file, "User", job.user);
  addIfSet(file, "Password", job.password);
  return file;
}

std::optional<std::string> textIn(const PlistResult& file, const char* key) {
  const std::string* text = file->textUnder(key);
  return text == nullptr ? std::nullopt : std::optional(*text);
}

/// Null when the file can't be read (logged); it stays then.
std::shared_ptr<AgentSubmit> readJob(const std::string& path, const std::shared_ptr<AgentContext>& context) {
  const PlistResult file = readPropertyList(path);
  if (!file || !textIn(file, "Movie")) {
    LMPLogMessage(context->log_context(), kLogError, "A job that waits can't be read and is left alone: %s",
                  (path + ": " + (file ? "it names no movie" : file.error().message)).c_str());
    return nullptr;
  }
  auto job = std::make_shared<AgentSubmit>();
  job->agentContext = context;
  job->request = textIn(file, "Request").value_or("");
  if (const auto uuid = textIn(file, "Recording")) job->properties[metadata_key::kRecordingUUID] = *uuid;
  job->recording_file_path = textIn(file, "Movie");
  job->properties_file_path = textIn(file, "Document");
  job->adhoc_workflow_uuid = textIn(file, "Workflow");
  job->user = textIn(file, "User");
  job->password = textIn(file, "Password");
  job->recorded = std::make_shared<AgentRecord>();
  job->recorded->setRecordedType(scanInteger(textIn(file, "Type").value_or("")).value_or(kRecordingTypeNone));
  job->stored = std::make_shared<StoredJob>(path);
  return job;
}

}  // namespace

void StoredJob::begin() {
  const std::string begun = path_.substr(0, path_.size() - std::strlen(kWaiting)) + kBegun;
  int error = rename(path_.c_str(), begun.c_str()) == 0 ? 0 : errno;
  if (error == 0) {
    path_ = begun;
    error = syncDirectory(directoryOf(path_));
  }
  if (error == 0) return;
  LMPLogMessage(nullptr, kLogError,
                "The job %s could not be marked as begun: %s; after a crash it would be submitted twice",
                path_.c_str(), std::strerror(error));
}

void StoredJob::remove() const { unlink(path_.c_str()); }

void JobStore::keep(AgentSubmit& job, std::uint64_t place) {
  const std::lock_guard lock(mutex_);
  const std::string path = freeName(folder_, taken_numbers_ + place);
  int error = makeFolder(folder_);
  if (error == 0) error = writePropertyList(path, written(job), 0600);
  // It may be there although it could not be made to survive a power cut.
  if (exists(path)) job.stored = std::make_shared<StoredJob>(path);
  if (error == 0) return;
  LMPLogMessage(nullptr, kLogError,
                "The submission of \"%s\" could not be stored: %s; a crash now would lose it",
                job.recording_file_path.value_or("").c_str(), std::strerror(error));
}

/// @return 0 or the errno; EWOULDBLOCK when another process has it
int JobStore::lockFolder() {
  if (const int error = makeFolder(folder_)) return error;
  lock_.reset(open(folder_.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  return lock_.valid() && flock(lock_.get(), LOCK_EX | LOCK_NB) == 0 ? 0 : errno;
}

JobStore::Left JobStore::takeUp(const std::shared_ptr<AgentContext>& context) {
  const std::lock_guard lock(mutex_);
  Left left;
  if (const int error = lockFolder()) {
    LMPLogMessage(context->log_context(), kLogError, "The jobs in %s can't be taken up: %s", folder_.c_str(),
                  error == EWOULDBLOCK ? "another process uses them" : std::strerror(error));
    return left;
  }
  removeTemporaries(folder_);
  for (const char* ending : {kBegun, kNamed}) {
    for (const std::string& path : filesEndingIn(ending, folder_)) {
      const PlistResult file = readPropertyList(path);
      taken_numbers_ = std::max(taken_numbers_, numberOf(path));
      taken_up_.push_back(file ? textIn(file, "Request").value_or("") : "");
      if (ending == kBegun) left.begun.push_back(file ? textIn(file, "Movie").value_or(path) : path);
      rename(path.c_str(), (path.substr(0, path.rfind('.')) + kNamed).c_str());
    }
  }
  for (const std::string& path : filesEndingIn(kWaiting, folder_)) {
    taken_numbers_ = std::max(taken_numbers_, numberOf(path));
    auto job = readJob(path, context);
    if (!job) continue;
    taken_up_.push_back(job->request);
    left.waiting.push_back(std::move(job));
  }
  return left;
}

void JobStore::forgetBegun() {
  const std::lock_guard lock(mutex_);
  if (!lock_.valid()) return;
  for (const std::string& path : filesEndingIn(kNamed, folder_)) unlink(path.c_str());
}

bool JobStore::tookUp(const std::string& request) const {
  const std::lock_guard lock(mutex_);
  return !request.empty() && std::find(taken_up_.begin(), taken_up_.end(), request) != taken_up_.end();
}

}  // namespace lmx
