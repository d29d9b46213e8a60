// What the control channels share: one thread, one connection at a time, the command protocol and its
// handlers.
#pragma once
#include <atomic>
#include <cstdint>
#include <ctime>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <thread>
#include <utility>

#include "control/channel/channel_clock.h"
#include "control/protocol/line_assembler.h"
#include "model/agent_actions.h"
#include "model/agent_context.h"
#include "support/dictionary.h"
#include "support/shared_value.h"
#include "support/unique_fd.h"

namespace lmx {

/// Whether `lastContact` lies more than ten minutes before `now`.
bool contactIsLost(const TimeValue& now, const TimeValue& lastContact);

/// A channel owns its thread and its sockets. Everything about commands happens on that thread; the public
/// operations are thread-safe. Whoever destroys a channel is not its thread, and the most derived destructor
/// calls stop() first, so that the thread never sees half an object.
class AgentControlBase {
 public:
  using Handler = void (AgentControlBase::*)(const Dictionary* parameters);
  using Text = std::optional<std::string>;

  /// @param context  shared with the whole agent; released by a stop() on the channel's own thread
  /// @param actions  outlives the channel; null: what is asked of the main thread is not done
  /// @param clock    outlives the channel
  AgentControlBase(std::shared_ptr<AgentContext> context, AgentActions* actions,
                   ChannelClock& clock = systemChannelClock());
  /// Ends the thread, for the case that the most derived destructor has not.
  virtual ~AgentControlBase();
  AgentControlBase(const AgentControlBase&) = delete;
  AgentControlBase& operator=(const AgentControlBase&) = delete;

  /// Starts the channel's thread. Call it once, right after construction. @return false when there is no
  /// channel (logged).
  [[nodiscard]] bool initWithAgentContext();

  /// Ends the channel and returns when its thread has ended. An idle thread wakes at once; one that executes
  /// a command finishes it first. Such a command may wait for the main thread: a caller on the main thread
  /// uses askToStop() and keeps its loop turning until threadHasEnded(), or both wait for ever.
  void stop();
  /// The part of stop() that never waits.
  void askToStop();
  [[nodiscard]] bool threadHasEnded() const { return thread_ended_; }

  /// Takes over the recording properties that came with a command. @return 0, or 1 when given none.
  int configure(const Dictionary* parameters);
  /// Numeric address of the first address of `host`; empty when it doesn't resolve. Blocks on the resolver.
  [[nodiscard]] static std::string dnsResolveName(const std::string& host);
  /// Asks to be told when the network changes: the connection is then made anew a second later. Main thread.
  /// @return 0, or -1 when it can't be watched (logged)
  [[nodiscard]] int registerForNetworkChange();

  /// Whether the current connection's peer is still there.
  [[nodiscard]] bool connected() const;
  /// Close the current, respectively the previous, connection. Of two callers one wins and closes.
  void disconnect();
  void disconnectOld();

  /// One chunk from the peer: executes the line that it ends, if any. Channel thread.
  void packetReceived(const char* bytes, std::uint32_t size);
  /// The handler of `verb`, null when there is none. Case counts.
  [[nodiscard]] static Handler handlerForVerb(std::string_view verb);

  // Handlers. Each replies at most once; `parameters` is null when the command had none. Channel thread, but
  // for commands that a timer runs on the main thread: what they ask of it is then done in place.

  /// START RecordingMetadata_RECORDING_UUID=…,RecordingMetadata_MAX_RECORDING_MINUTES=50,…  →  cmdStatus=0
  void handleSTART(const Dictionary* parameters);
  /// STOP  →  cmdStatus=0
  void handleSTOP(const Dictionary* parameters);
  /// PAUSE  →  cmdStatus=0
  void handlePAUSE(const Dictionary* parameters);
  /// RESUME  →  cmdStatus=0
  void handleRESUME(const Dictionary* parameters);
  /// CANCEL  →  cmdStatus=0
  void handleCANCEL(const Dictionary* parameters);
  /// SERVER version=2,server_uuid=6F1C…  →  (no reply)
  void handleSERVER(const Dictionary* parameters);
  /// STATUS include_profile=true  →  cmdStatus=0,recordStatus=2,…,CameraName=Hall 3,…
  void handleSTATUS(const Dictionary* parameters);
  /// TIMEDCMD command=START,time=2030-01-01 10:00:00 +0000,…  →  cmdStatus=0
  void handleTIMEDCMD(const Dictionary* parameters);
  /// X-PREVIEW refresh_milliseconds=500  →  (no reply)
  void handleXCMD(std::string_view verb, const Dictionary* parameters);

  // Timed commands.

  /// Runs a command whose time has come. Its reply comes unasked. Main thread.
  void completeTimedCommand(const SharedDictionary& entry);
  /// The list into its file, whole. Any thread.
  void writeTimerListToDisk();
  /// Schedules what the timers file holds. A file that can't be read is kept under another name. Main thread.
  void loadTimedCommands();
  [[nodiscard]] virtual ChannelKind kind() const { return ChannelKind::detached; }

  [[nodiscard]] std::shared_ptr<AgentContext> agentContext() const { return agentContext_.get(); }
  [[nodiscard]] bool running() const { return running_; }
  /// Protocol version that the server announced; 0 before.
  [[nodiscard]] std::int32_t server_protocol_version() const { return server_protocol_version_; }
  [[nodiscard]] std::int32_t serverProtocolVersion() const { return server_protocol_version_; }
  void setServer_protocol_version(std::int32_t v) { server_protocol_version_ = v; }
  /// Seconds since 1970 of the last network change; 0 when none is pending. Whoever sees a change sets it,
  /// and the channel makes a new connection a second later.
  [[nodiscard]] std::int64_t netTransitionTime() const { return netTransitionTime_; }
  void setNetTransitionTime(std::int64_t v) { netTransitionTime_ = v; }

  /// Recording properties that came with the last START; null once the channel has stopped itself.
  SharedValue<SharedDictionary> properties;

 public:
  /// Whether every command but USERAUTH is to be refused.
  [[nodiscard]] virtual bool requiresAuthentication() const = 0;
  virtual void setAuthenticated(bool authenticated) = 0;

 protected:
  /// Makes a connection and stores it (setServerSocket). May block, but not past wakeDescriptor().
  /// @return 0 connected; 1 failed, wait before the next attempt; anything else: try again at once.
  virtual int connect() = 0;
  /// Turns one raw line into command text; nothing: the line is ignored.
  virtual std::optional<std::string> commandFromReceivedData(const std::string& line) = 0;
  /// The connection before has its place again. Channel thread.
  virtual void previousPeerSpeaks() {}
  /// Sends one reply. A reply that can't be sent is lost (logged).
  virtual void sendReply(const std::string& reply) = 0;
  /// The thread's body: connect, receive, reconnect. @return 0, or -1 when the channel could not be set up.
  virtual int run();

  /// Waits for a peer on `listening` and makes it the connection. The previous peer becomes it again when it
  /// speaks before another one comes.
  /// @return 0; -1 when none was accepted, or when the listening socket refused the keep-alive option.
  int acceptPeer(int listening);
  /// Whether it was the peer that ended the last connection. Channel thread.
  [[nodiscard]] bool peerHasGone() const { return peer_has_gone_; }
  [[nodiscard]] int serverSocket() const { return serverSocket_; }
  void setServerSocket(int socket) { serverSocket_ = socket; }
  /// Readable once the channel is to stop: to be polled beside whatever the thread waits for.
  [[nodiscard]] int wakeDescriptor() const { return wake_.get(); }
  /// Held while a reply is sent: timed commands answer from the main thread, and the socket must not be
  /// closed under them.
  [[nodiscard]] std::mutex& sendMutex() { return send_mutex_; }
  /// Null once the context is gone: the default log.
  [[nodiscard]] LMPLogContext logContext() const;
  void logDebug(const std::string& message) const;
  void logInfo(const std::string& message) const;
  [[nodiscard]] AgentActions* actions() const { return actions_; }

 private:
  void networkChanged();
  void threadBody() noexcept;
  bool onOwnThread() const { return thread_id_.load() == std::this_thread::get_id(); }
  bool waitForThread();
  void closeSockets();

  bool connectWithBackOff();
  void receiveUntilGone();
  bool networkHasChanged();
  bool lastContactTimedOut();
  bool waitForPacket();
  bool receivePacket(int socket);

  std::string timerListReply();
  enum class TimerOrigin { peer, file };
  bool scheduleCommand(const Dictionary* parameters, TimerOrigin origin);
  void executeCommand(const std::string& text);
  void dispatch(const std::string& verb, const Dictionary* parameters, const std::string& text);
  bool performOnMain(AgentActions::Action action, Wait wait);
  [[nodiscard]] std::shared_ptr<AgentRecord> session() const;
  [[nodiscard]] bool continuous() const;
  [[nodiscard]] double shiftedReferenceTime() const;

  void closeOnce(std::atomic<int>& socket);
  bool takeBackPreviousPeer();
  [[nodiscard]] int previousPeerIfAlive() const;

  std::mutex send_mutex_;
  ChannelClock& clock_;
  AgentActions* const actions_;
  SharedValue<std::shared_ptr<AgentContext>> agentContext_;
  std::atomic<int> serverSocket_{-1};
  std::atomic<int> serverSocketDumped_{-1};  // kept open until the next connection is made
  std::atomic<bool> running_{false};
  std::atomic<std::int32_t> server_protocol_version_{0};
  std::atomic<std::int64_t> netTransitionTime_{0};
  LineAssembler partial_command_;  // channel thread only, as the next
  bool peer_has_gone_ = false;
  UniqueFd wake_;                                   // eventfd, written once by stop
  std::unique_ptr<RunLoop::Source> network_watch_;  // main thread only

  std::atomic<bool> thread_ended_{true};
  std::atomic<std::thread::id> thread_id_{};
  std::mutex start_mutex_;   // held during the start; the thread begins by passing through it
  std::mutex thread_mutex_;  // guards thread_context_ and thread_started_
  bool thread_started_ = false;
  std::thread thread_context_;  // last: everything it reaches outlives it
};

/// A started channel, or null when it can't be started (logged).
template <class Channel, class... Arguments>
std::unique_ptr<Channel> newControlChannel(Arguments&&... arguments) {
  auto channel = std::make_unique<Channel>(std::forward<Arguments>(arguments)...);
  if (!channel->initWithAgentContext()) return nullptr;
  return channel;
}

}  // namespace lmx
