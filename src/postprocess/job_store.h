// Keeps the jobs that wait for the tool over a restart.
#pragma once
#include <cstdint>
#include <memory>
#include <mutex>
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

/// A folder with a file for each job, for its owner alone: they may hold a password. Not in the repository: a
/// job must be kept when the movies have filled their disk.
class JobStore {
 public:
  explicit JobStore(std::string folder) : folder_(std::move(folder)) {}

  /// Keeps `job`; survives a power cut when this returns. A job that can't be kept is only in memory
  /// (logged).
  /// @param place  where it stands among the jobs of this process: the lower, the older
  void keep(AgentSubmit& job, std::uint64_t place);

  /// What an earlier process left.
  struct Left {
    std::vector<std::shared_ptr<AgentSubmit>> waiting;  ///< oldest first
    std::vector<std::string> begun;                     ///< movies whose tool had been started
  };
  /// Takes over the jobs in the folder. Another process that uses it keeps its own (logged). Call it once,
  /// before keep(). A job that had begun is named once, however often the agent is started.
  Left takeUp(const std::shared_ptr<AgentContext>& context);
  /// Whether there was a job of that request when the others were taken up, begun or not.
  [[nodiscard]] bool tookUp(const std::string& request) const;
  /// Forgets the jobs that had begun: no capture holds a request any more that one of them was made for.
  void forgetBegun();

 private:
  int lockFolder();

  const std::string folder_;
  UniqueFd lock_;  // on the folder, for as long as the store lives
  mutable std::mutex mutex_;
  std::uint64_t taken_numbers_ = 0;    // guarded by mutex_: up to this one, files of an earlier process
  std::vector<std::string> taken_up_;  // guarded by mutex_: requests
};

}  // namespace lmx
