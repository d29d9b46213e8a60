// Queries the server's tool for cluster members, one host after another.
#include "agent/cluster_watch.h"

#include <thread>

#include "control/tunnel/cluster_hosts.h"
#include "platform/paths.h"
#include "platform/work_queue.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;

/// A tool that has not answered by then is killed, since start-up waits for it. The second query gets the
/// time that the first one left.
constexpr auto kQueryLimit = 30s;
constexpr auto kFirstToolLimit = 20s;
constexpr const char* kMembers = "cluster_members";

ClusterWatch::SharedPlist membersOf(const PlistResult& information) {
  const PlistValue* members = information ? information->under(kMembers) : nullptr;
  if (members == nullptr || members->dictionary() == nullptr) return nullptr;
  return std::make_shared<const PlistDictionary>(*members->dictionary());
}

/// The tool's status; never 0 for a tool that did not exit normally.
int statusOf(const ChildResult& result) {
  if (result.end == ChildResult::End::exited) return result.status;
  return result.end == ChildResult::End::notStarted ? 127 : 128 + result.status;
}

}  // namespace

ClusterWatch::~ClusterWatch() {
  while (refreshing_) std::this_thread::sleep_for(1ms);
}

int ClusterWatch::clusterInformationFromSpecificHostOnly(const std::string& host, SharedPlist& members,
                                                         std::chrono::milliseconds limit) const {
  ChildOptions options;
  options.captureOutput = true;
  options.limit = limit;
  const ChildResult result = children_.run({systemPath(kLumexTool), "--listinfo", "--server", host}, options);
  if (result.end == ChildResult::End::timedOut) {
    LMPLogMessage(log_.log_context(), kLogError,
                  "/usr/bin/lumex --listinfo has not answered for %d seconds and was ended",
                  static_cast<int>(limit / 1s));
  }
  const int status = statusOf(result);
  if (status != 0) {
    LMPLogMessage(log_.log_context(), kLogError,
                  "Unable to retrieve cluster information (/usr/bin/lumex exit code = %d).", status);
    return status;
  }
  const PlistResult answer = parsePropertyList(result.output);
  if (!answer) {
    LMPLogMessage(log_.log_context(), kLogError, "The answer of /usr/bin/lumex --listinfo can't be used: %s",
                  answer.error().message.c_str());
  }
  members = membersOf(answer);
  return 0;
}

int ClusterWatch::clusterInformationWithMember(std::size_t index, const std::vector<std::string>& hosts,
                                               SharedPlist& members, std::chrono::milliseconds limit) const {
  for (; index < hosts.size(); ++index) {
    const int status = clusterInformationFromSpecificHostOnly(hosts[index], members, limit);
    if (status != -1) return status;
  }
  return -1;
}

ClusterWatch::SharedPlist ClusterWatch::clusterInformationFromDisk() {
  for (const std::string_view path : {kServerInformation, kServerInformationOfRoot}) {
    const PlistResult file = readPropertyList(systemPath(path));
    if (file && file->dictionary() != nullptr) return membersOf(file);
  }
  return nullptr;
}

int ClusterWatch::clusterInformation(const std::optional<std::string>& host, SharedPlist& members) const {
  members = nullptr;
  if (!host) return -1;
  const auto deadline = std::chrono::steady_clock::now() + kQueryLimit;
  const int status = clusterInformationFromSpecificHostOnly(*host, members, kFirstToolLimit);
  if (status == 0) return 0;
  const SharedPlist cached = clusterInformationFromDisk();
  if (!cached) {
    log_.logDebug("Unable to retrieve cluster information from disk.");
    return status;
  }
  const auto left =
      std::chrono::duration_cast<std::chrono::milliseconds>(deadline - std::chrono::steady_clock::now());
  // Skip the first member: it is the server that has just failed.
  const int result = clusterInformationWithMember(1, clusterHostArray(cached.get()), members, left);
  if (result != 0) {
    log_.logDebug("Unable to contact any member of the cluster.");
    members = cached;
  }
  return result;
}

void ClusterWatch::learnCluster() {
  SharedPlist members;
  if (clusterInformation(server_.tunnel_host.get(), members) == -1) {
    LMPLogMessage(log_.log_context(), kLogCritical, "Unable to retrieve cluster information");
  }
  server_info_.set(members);
  std::string joined;
  const auto hosts = clusterHostArray(members.get());
  for (const std::string& host : hosts) joined += (joined.empty() ? "" : ", ") + host;
  log_.logDebug("Hosts: " + (joined.empty() ? "(none)" : joined));
  if (hosts.empty()) LMPLogMessage(log_.log_context(), kLogError, "No cluster members known");
}

void ClusterWatch::refreshClusterInformation() {
  if (refreshing_.exchange(true)) return;  // the previous refresh is still waiting for its tool
  dispatchAsync([this] {
    const auto ended = [](std::atomic<bool>* refresh) { *refresh = false; };
    const std::unique_ptr<std::atomic<bool>, decltype(ended)> end_of_refresh(&refreshing_, ended);
    SharedPlist members;
    if (clusterInformation(server_.tunnel_host.get(), members) != 0) {
      LMPLogMessage(log_.log_context(), kLogError, "Unable to update cluster information.");
    } else {
      server_info_.set(members);
    }
  });
}

}  // namespace lmx
