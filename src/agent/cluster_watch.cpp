// Queries the server's tool for cluster members, one host after another.
#include "agent/cluster_watch.h"

#include <sys/eventfd.h>
#include <unistd.h>

#include <csignal>
#include <cstdint>
#include <thread>
#include <utility>

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
/// A killed tool is gone at once, unless it waits for a device or a file system.
constexpr auto kKillPatience = 2s;
constexpr const char* kMembers = "cluster_members";

ClusterWatch::SharedPlist membersOf(const PlistResult& information) {
  const PlistValue* members = information ? information->under(kMembers) : nullptr;
  if (members == nullptr || members->dictionary() == nullptr) return nullptr;
  return std::make_shared<const PlistDictionary>(*members->dictionary());
}

/// The tool's status; never 0 for a tool that did not exit normally.
int statusOf(const ChildResult& result) {
  if (result.end == ChildResult::End::exited) return result.status;
  if (result.end == ChildResult::End::cancelled) return 128 + SIGKILL;
  return result.end == ChildResult::End::notStarted ? 127 : 128 + result.status;
}

}  // namespace

ClusterWatch::ClusterWatch(const AgentLog& log, const ServerSettings& server,
                           SharedValue<SharedPlist>& server_info, ChildRunner& children)
    : log_(log),
      server_(server),
      server_info_(server_info),
      children_(children),
      cancel_(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {}

ClusterWatch::~ClusterWatch() {
  cancel();
  while (busy_) std::this_thread::sleep_for(1ms);
}

void ClusterWatch::cancel() {
  cancelled_ = true;
  const std::uint64_t one = 1;
  [[maybe_unused]] const auto written = write(cancel_.get(), &one, sizeof one);
}

void ClusterWatch::stop(RunLoop& loop) {
  cancel();
  const auto deadline = std::chrono::steady_clock::now() + kKillPatience;
  while (busy_ && std::chrono::steady_clock::now() < deadline) loop.run(10ms);
}

void ClusterWatch::startQuery(std::function<void()> query) {
  dispatchAsync([this, query = std::move(query)] {
    const auto ended = [](std::atomic<bool>* busy) { *busy = false; };
    const std::unique_ptr<std::atomic<bool>, decltype(ended)> end_of_query(&busy_, ended);
    query();
  });
}

int ClusterWatch::clusterInformationFromSpecificHostOnly(const std::string& host, SharedPlist& members,
                                                         std::chrono::milliseconds limit) const {
  ChildOptions options;
  options.captureOutput = true;
  options.limit = limit;
  options.cancel = cancel_.get();
  const ChildResult result = children_.run({systemPath(kLumexTool), "--listinfo", "--server", host}, options);
  if (result.end == ChildResult::End::timedOut) {
    LMPLogMessage(log_.log_context(), kLogError,
                  "/usr/bin/lumex --listinfo has not answered for %d seconds and was ended",
                  static_cast<int>(limit / 1s));
  }
  const int status = statusOf(result);
  if (result.end == ChildResult::End::cancelled) return status;
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
  if (status == 0 || cancelled_) return status;
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

bool ClusterWatch::learnCluster(RunLoop& loop, const std::function<bool()>& goOn) {
  struct Answer {
    int status = -1;
    SharedPlist members;
  };
  const auto answer = std::make_shared<Answer>();
  busy_ = true;
  startQuery(
      [this, answer] { answer->status = clusterInformation(server_.tunnel_host.get(), answer->members); });
  while (busy_ && goOn()) loop.run(20ms);
  if (!goOn()) {
    stop(loop);
    return false;
  }
  storeFirst(answer->status, answer->members);
  return true;
}

void ClusterWatch::storeFirst(int status, const SharedPlist& members) {
  if (status == -1) {
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
  if (busy_.exchange(true)) return;  // the previous query is still waiting for its tool
  startQuery([this] {
    SharedPlist members;
    const int status = clusterInformation(server_.tunnel_host.get(), members);
    if (cancelled_) return;
    if (status != 0) {
      LMPLogMessage(log_.log_context(), kLogError, "Unable to update cluster information.");
    } else {
      server_info_.set(members);
    }
  });
}

}  // namespace lmx
