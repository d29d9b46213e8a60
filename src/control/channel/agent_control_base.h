// What the control channels share: one connection at a time, and the commands that come over it.
#pragma once
#include <atomic>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <utility>

#include "control/channel/channel_clock.h"
#include "control/channel/channel_thread.h"
#include "control/channel/command_dispatcher.h"
#include "control/channel/outbox.h"
#include "control/channel/peer_acceptor.h"
#include "control/channel/peer_sockets.h"
#include "control/channel/reconnect_reasons.h"
#include "control/handlers/channel_context.h"
#include "control/handlers/command_handlers.h"
#include "control/handlers/reply_sink.h"
#include "control/protocol/line_assembler.h"
#include "model/agent_actions.h"

namespace lmx {

/// A channel owns its thread and its sockets. Everything about commands happens on that thread; the public
/// operations are thread-safe. Whoever destroys a channel is not its thread, and the most derived destructor
/// calls stop() first, so that the thread never sees half an object.
class AgentControlBase : private ReplySink {
 public:
  /// @param context  shared with the whole agent; released by a stop() on the channel's own thread
  /// @param actions  outlives the channel; null: what is asked of the main thread is not done
  /// @param clock    outlives the channel
  AgentControlBase(ChannelKind kind, std::shared_ptr<AgentContext> context, AgentActions* actions,
                   ChannelClock& clock);
  virtual ~AgentControlBase() = default;
  AgentControlBase(const AgentControlBase&) = delete;
  AgentControlBase& operator=(const AgentControlBase&) = delete;

  /// Starts the channel's thread. Call it once, right after construction. @return false when there is no
  /// channel (logged).
  [[nodiscard]] bool initWithAgentContext();

  /// Ends the channel and returns when its thread has ended. An idle thread wakes at once; one that executes
  /// a command finishes it first. Such a command may wait for the main thread: a caller on the main thread
  /// uses askToStop() and keeps its loop turning until threadHasEnded(), or both wait for ever.
  void stop();
  /// The part of stop() that never waits. Logged, once.
  void askToStop();
  [[nodiscard]] bool threadHasEnded() const { return thread_.hasEnded(); }

  /// Asks to be told when the network changes: the connection is then made anew a second later. Main thread.
  /// @return 0, or -1 when it can't be watched (logged)
  [[nodiscard]] int registerForNetworkChange();

  /// Whether the current connection's peer is still there.
  [[nodiscard]] bool connected() const { return sockets_.connected(); }
  /// One chunk from the peer: executes the line that it ends, if any. Channel thread.
  void packetReceived(const char* bytes, std::uint32_t size);

  /// Runs a command whose time has come. Its reply comes unasked. Main thread.
  void completeTimedCommand(const SharedDictionary& entry) { handlers_.timed().completeTimedCommand(entry); }
  /// Schedules what the timers file holds. Main thread.
  void loadTimedCommands() { handlers_.timed().loadTimedCommands(); }
  /// Protocol version that the server announced; 0 before.
  [[nodiscard]] std::int32_t server_protocol_version() const {
    return handlers_.server().server_protocol_version();
  }

 protected:
  /// Makes a connection and stores it (PeerSockets::setCurrent). May block, but not past wakeDescriptor().
  /// @return 0 connected; 1 failed, wait before the next attempt; anything else: try again at once.
  virtual int connect() = 0;
  /// Turns one raw line into command text; nothing: the line is ignored.
  virtual std::optional<std::string> commandFromReceivedData(const std::string& line) = 0;
  /// Sends `reply` to the present peer, which is greeted. Channel thread.
  /// @return false when the peer takes no more (logged)
  virtual bool deliver(const std::string& reply) = 0;
  /// A reply was given while there was no peer to send it to: logs that. Any thread.
  virtual void logNobodyToReplyTo(const std::string& reply) const;
  /// On the channel's own thread: delivers `reply` at once. On any other: leaves it to that thread, for the
  /// connection that is the present one now, and never waits.
  void sendReply(const std::string& reply) override;
  /// Whether every command but USERAUTH is to be refused.
  [[nodiscard]] virtual bool requiresAuthentication() const { return false; }
  /// A listening channel's, else null. Channel thread.
  virtual PeerAcceptor* peerAcceptor() { return nullptr; }
  /// The thread's body: connect, receive, reconnect. @return 0, or -1 when the channel could not be set up.
  virtual int run();

  /// Close the current, respectively the previous, connection (logged even when there is none). Channel
  /// thread, or when there is none.
  void disconnect();
  void disconnectOld();
  /// Ends the channel's thread behind the command that it executes. Channel thread.
  void endAfterThisCommand() { thread_.askToStop(); }

  [[nodiscard]] const ChannelContext& context() const { return context_; }
  [[nodiscard]] PeerSockets& sockets() { return sockets_; }
  [[nodiscard]] ChannelClock& clock() const { return clock_; }
  /// What the present peer has left unfinished. Channel thread.
  [[nodiscard]] LineAssembler& partialCommand() { return partial_command_; }
  /// Whether it was the peer that ended the last connection. Channel thread.
  [[nodiscard]] bool peerHasGone() const { return peer_has_gone_; }
  [[nodiscard]] bool running() const { return thread_.running(); }
  /// Readable once the channel is to stop: to be polled beside whatever the thread waits for.
  [[nodiscard]] int wakeDescriptor() const { return thread_.wakeDescriptor(); }

 private:
  void runSafely() noexcept;
  bool connectWithBackOff();
  void takeBackPreviousPeer();
  void receiveUntilGone();
  bool waitForPacket();
  bool somebodySpeaks();
  void flushReplies();
  bool receivePacket(int socket);

  ChannelContext context_;
  AgentActions* const actions_;
  ChannelClock& clock_;
  PeerSockets sockets_;
  CommandHandlers handlers_;
  CommandDispatcher dispatcher_;
  ReconnectReasons reconnect_reasons_;
  Outbox outbox_;
  std::atomic<bool> stop_announced_{false};
  LineAssembler partial_command_;  // channel thread only, as the next
  bool peer_has_gone_ = false;
  std::unique_ptr<RunLoop::Source> network_watch_;  // main thread only
  ChannelThread thread_;                            // last: everything that it reaches outlives it
};

/// A started channel, or null when it can't be started (logged).
template <class Channel, class... Arguments>
std::unique_ptr<Channel> newControlChannel(Arguments&&... arguments) {
  auto channel = std::make_unique<Channel>(std::forward<Arguments>(arguments)...);
  if (!channel->initWithAgentContext()) return nullptr;
  return channel;
}

}  // namespace lmx
