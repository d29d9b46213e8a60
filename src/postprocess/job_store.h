// Keeps the jobs that wait for the tool over a restart.
#pragma once
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "model/agent_context.h"
#include "support/unique_fd.h"

namespace lmx {

class AgentSubmit;

/// A job's file. A job whose tool has been started is never started again: whether the server has got the
/// recording can't be known. Thread-safe.
class StoredJob {
 public:
  explicit StoredJob(std::string path) : path_(std::move(path)) {}
  /// The tool is about to be started. Survives a power cut when this returns.
  void begin();
  /// The job has ended in some way: nothing of it is kept.
  void remove() const;

 private:
  std::string path_;
};

/// The files are in "<repository>/.lmxagentd/jobs", for their owner alone: they may hold a password.
class JobStore {
 public:
  /// Keeps `job`; survives a power cut when this returns. A job that can't be kept is only in memory
  /// (logged).
  /// @param place  where it stands among the jobs of this process: the lower, the older
  void keep(const std::string& repository, AgentSubmit& job, std::uint64_t place);

  /// What an earlier process left.
  struct Left {
    std::vector<std::shared_ptr<AgentSubmit>> waiting;  ///< oldest first
    std::vector<std::string> begun;                     ///< movies whose tool had been started
  };
  /// Takes over the jobs in `repository`; those that had begun are forgotten. Another process that uses the
  /// repository keeps its own (logged). Call it once, before keep().
  Left takeUp(const std::string& repository, const std::shared_ptr<AgentContext>& context);
  /// Whether a job of that request was taken up.
  [[nodiscard]] bool tookUp(const std::string& request) const;

 private:
  UniqueFd lock_;
  std::uint64_t taken_numbers_ = 0;    // up to this one, files of an earlier process; as the next
  std::vector<std::string> taken_up_;  // requests; not changed after takeUp()
};

}  // namespace lmx
