// Finds the members of the server's cluster with the server's tool, or else in the tool's cache.
#pragma once
#include <atomic>
#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "model/agent_log.h"
#include "model/agent_settings.h"
#include "platform/child_process.h"
#include "platform/plist/property_list.h"
#include "platform/run_loop.h"
#include "support/shared_value.h"
#include "support/unique_fd.h"

namespace lmx {

/// Keeps the agent's cluster information up to date. Thread-safe.
class ClusterWatch {
 public:
  using SharedPlist = std::shared_ptr<const PlistDictionary>;

  /// All arguments outlive the object.
  /// @param server_info  receives the member dictionary; null when none is known
  ClusterWatch(const AgentLog& log, const ServerSettings& server, SharedValue<SharedPlist>& server_info,
               ChildRunner& children);
  /// Ends a query in progress.
  ~ClusterWatch();
  ClusterWatch(const ClusterWatch&) = delete;
  ClusterWatch& operator=(const ClusterWatch&) = delete;

  /// Makes the first query and stores the answer. Keeps `loop` running meanwhile, so that signals are heard.
  /// The loop's thread only.
  /// @param goOn  asked between turns; once it answers false the query is ended and nothing is stored
  /// @return what `goOn` answered last
  bool learnCluster(RunLoop& loop, const std::function<bool()>& goOn);
  /// Queries again in the background and stores the answer; a failure keeps the old one. Does nothing while
  /// the previous refresh is still waiting for its tool.
  void refreshClusterInformation();
  /// Ends the tool of a query in progress, and makes later queries fail without it. Keeps `loop` running
  /// until the query has ended, two seconds at most. The loop's thread only.
  void stop(RunLoop& loop);

  /// Queries `host`, or else one of the cached members. Blocks while the tool runs, at most half a minute.
  /// @param members  receives the member dictionary; null when there is none
  /// @return 0; -1 when there was no host to query; else the tool's exit status, or that of a killed process
  int clusterInformation(const std::optional<std::string>& host, SharedPlist& members) const;
  /// The member dictionary cached on disk by the tool, or null.
  static SharedPlist clusterInformationFromDisk();

 private:
  /// @param limit  the tool is killed after this time
  int clusterInformationFromSpecificHostOnly(const std::string& host, SharedPlist& members,
                                             std::chrono::milliseconds limit) const;
  /// Tries the entry at `index`. @return as clusterInformation
  int clusterInformationWithMember(std::size_t index, const std::vector<std::string>& hosts,
                                   SharedPlist& members, std::chrono::milliseconds limit) const;

  void storeFirst(int status, const SharedPlist& members);
  /// Runs `query` on a worker. Call it with `busy_` set; it is reset at the end.
  void startQuery(std::function<void()> query);
  void cancel();

  const AgentLog& log_;
  const ServerSettings& server_;
  SharedValue<SharedPlist>& server_info_;
  ChildRunner& children_;
  const UniqueFd cancel_;  ///< readable from cancel() on
  std::atomic<bool> cancelled_{false};
  std::atomic<bool> busy_{false};  ///< a worker is querying
};

}  // namespace lmx
