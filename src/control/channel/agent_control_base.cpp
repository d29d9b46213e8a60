// A channel's beginning and end: its thread, its sockets, its fields.
#include "control/channel/agent_control_base.h"

#include <netdb.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <exception>
#include <system_error>
#include <utility>

#include "platform/net/socket_io.h"
#include "record/agent_record.h"

namespace lmx {

AgentControlBase::AgentControlBase(std::shared_ptr<AgentContext> context, AgentActions* actions,
                                   ChannelClock& clock)
    : clock_(clock),
      actions_(actions),
      agentContext_(std::move(context)),
      wake_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
  properties.set(std::make_shared<const Dictionary>());
}

AgentControlBase::~AgentControlBase() {
  askToStop();
  waitForThread();
  closeSockets();
}

bool AgentControlBase::initWithAgentContext() {
  LMPLogMessage(logContext(), kLogNotice, "Control module is starting...");
  if (registerForNetworkChange() == -1) return false;
  if (!wake_.valid()) {  // nothing could stop its thread
    LMPLogMessage(logContext(), kLogError, "Control module cannot be started");
    return false;
  }
  if (!clock_.now()) {  // without the time a lost server would never be noticed
    LMPLogMessage(logContext(), kLogCritical, "Internal error occurred");
    return false;
  }
  const std::scoped_lock gate(start_mutex_, thread_mutex_);
  // Set before the thread exists: a stop that comes before its first instruction must not be undone by it.
  running_ = true;
  thread_ended_ = false;
  try {
    thread_context_ = std::thread(&AgentControlBase::threadBody, this);
  } catch (const std::system_error&) {
    running_ = false;
    thread_ended_ = true;
    LMPLogMessage(logContext(), kLogError, "Control module cannot be started");
    return false;
  }
  thread_started_ = true;
  LMPLogMessage(logContext(), kLogNotice, "Control module started with success");
  return true;
}

void AgentControlBase::threadBody() noexcept {
  { const std::lock_guard gate(start_mutex_); }  // its own messages come after those of the start
  thread_id_ = std::this_thread::get_id();
  try {
    run();
  } catch (const std::exception& problem) {
    LMPLogMessage(logContext(), kLogCritical, "Control channel has ended: %s", problem.what());
    closeSockets();  // a peer must not wait for answers that nobody gives
  }
  thread_id_ = std::thread::id();  // the system may give it to another thread from now on
  thread_ended_ = true;
}

int AgentControlBase::registerForNetworkChange() {
  if (actions_ == nullptr) return 0;
  network_watch_ = actions_->watchNetwork([this] { networkChanged(); });
  if (network_watch_) return 0;
  LMPLogMessage(logContext(), kLogError,
                "Unable to create dynamic store for Netvane registration for Network Notification");
  LMPLogMessage(logContext(), kLogError, "Unable to register for network notifications");
  return -1;
}

void AgentControlBase::networkChanged() {
  logInfo("A network transition was received.");
  if (const auto now = clock_.now()) setNetTransitionTime(now->tv_sec);
}

void AgentControlBase::askToStop() {
  running_ = false;
  const std::uint64_t one = 1;
  // Can only fail when it is readable already.
  [[maybe_unused]] const auto written = ::write(wake_.get(), &one, sizeof one);
}

void AgentControlBase::stop() {
  askToStop();
  const auto context = agentContext();
  if (!context) {  // the channel has stopped itself before
    if (!onOwnThread()) waitForThread();
    return;
  }
  LMPLogMessage(context->log_context(), kLogNotice, "Control module is stopping...");
  if (!onOwnThread() && waitForThread()) {
    closeSockets();  // a peer that still saw the old connection open would count two channels after a restart
    return;
  }
  disconnect();
  properties.set(nullptr);
  agentContext_.set(nullptr);
}

/// @return false when there never was a thread.
bool AgentControlBase::waitForThread() {
  const std::lock_guard lock(thread_mutex_);
  if (thread_context_.joinable()) thread_context_.join();
  return thread_started_;
}

void AgentControlBase::closeSockets() {
  const std::lock_guard lock(send_mutex_);
  for (auto* socket : {&serverSocket_, &serverSocketDumped_}) UniqueFd closing(socket->exchange(-1));
}

bool AgentControlBase::connected() const {
  const int socket = serverSocket_;
  return socket != -1 && peerIsConnected(socket);
}

void AgentControlBase::closeOnce(std::atomic<int>& socket) {
  const std::lock_guard lock(send_mutex_);
  const int current = socket.exchange(-1);
  logInfo("Disconnecting from tunnel...");
  const UniqueFd closing(current);
}

void AgentControlBase::disconnect() { closeOnce(serverSocket_); }
void AgentControlBase::disconnectOld() { closeOnce(serverSocketDumped_); }

namespace {

struct AddressListDeleter {
  void operator()(addrinfo* list) const noexcept { ::freeaddrinfo(list); }
};

}  // namespace

std::string AgentControlBase::dnsResolveName(const std::string& host) {
  addrinfo hints{};
  hints.ai_flags = AI_CANONNAME;
  addrinfo* found = nullptr;
  if (::getaddrinfo(host.c_str(), nullptr, &hints, &found) != 0) return {};
  const std::unique_ptr<addrinfo, AddressListDeleter> list(found);
  std::array<char, 255> text{};
  if (list->ai_canonname == nullptr || ::getnameinfo(list->ai_addr, list->ai_addrlen, text.data(),
                                                     text.size(), nullptr, 0, NI_NUMERICHOST) != 0) {
    return {};
  }
  return text.data();
}

LMPLogContext AgentControlBase::logContext() const {
  const auto context = agentContext();
  return context ? context->log_context() : nullptr;
}
void AgentControlBase::logDebug(const std::string& message) const {
  if (const auto context = agentContext()) context->logDebug(message);
}
void AgentControlBase::logInfo(const std::string& message) const {
  if (const auto context = agentContext()) context->logInfo(message);
}

std::shared_ptr<AgentRecord> AgentControlBase::session() const {
  const auto context = agentContext();
  return context ? context->record_context() : nullptr;
}

}  // namespace lmx
