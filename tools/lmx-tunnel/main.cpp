// Acts as the server for one agent at a time: prints its replies and sends typed or scripted commands.
#include <editline/readline.h>
#include <getopt.h>
#include <netdb.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <memory>
#include <thread>

#include "support/scan.h"
#include "support/unique_fd.h"
#include "tools/lmx-tunnel/server_side.h"

namespace lmx {
namespace {

constexpr int kExitUsage = 64;
constexpr int kExitFailed = 1;
constexpr std::chrono::milliseconds kReplyPatience{10000};
constexpr const char* kUsage =
    "usage: lmx-tunnel --secret FILE [--listen ADDRESS:PORT] [--script FILE] [--preview FILE.jpg]\n"
    "\n"
    "Waits for an agent as its server does, shows what it answers, and sends it what is typed.\n"
    "  --secret FILE    the agent's own secrets file (a property list with lmx_secret)\n"
    "  --listen A:P     where to listen; 127.0.0.1:8175 when not given; IPv6 as [::1]:8175\n"
    "  --script FILE    send the lines of FILE, one after another; \"sleep SECONDS\" waits, \"#\" begins a "
    "comment\n"
    "  --preview FILE   save the picture of a STATUS reply there\n";

struct Options {
  std::string secret;
  std::string address = "127.0.0.1";
  int port = 8175;
  std::string script;
  std::string preview;
};

bool readListen(const std::string& text, Options& options) {
  const auto colon = text.rfind(':');
  const auto port = colon == std::string::npos ? std::nullopt : scanInteger(text.substr(colon + 1));
  if (!port || *port < 1 || *port > 65535) return false;
  options.address = text.substr(0, colon);
  if (options.address.starts_with('[') && options.address.ends_with(']'))
    options.address = options.address.substr(1, options.address.size() - 2);
  options.port = *port;
  return true;
}

bool readOptions(int argc, char** argv, Options& options) {
  constexpr option kOptions[] = {{"secret", required_argument, nullptr, 's'},
                                 {"listen", required_argument, nullptr, 'l'},
                                 {"script", required_argument, nullptr, 'f'},
                                 {"preview", required_argument, nullptr, 'p'},
                                 {nullptr, 0, nullptr, 0}};
  for (int option = 0; (option = getopt_long(argc, argv, "", kOptions, nullptr)) != -1;) {
    if (option == 's') options.secret = optarg;
    if (option == 'f') options.script = optarg;
    if (option == 'p') options.preview = optarg;
    if (option == '?' || (option == 'l' && !readListen(optarg, options))) return false;
  }
  return optind == argc && !options.secret.empty();
}

struct AddressListDeleter {
  void operator()(addrinfo* list) const noexcept { ::freeaddrinfo(list); }
};

/// @param problem  receives the reason for an invalid result
UniqueFd listenOn(const Options& options, std::string& problem) {
  addrinfo hints{};
  hints.ai_flags = AI_NUMERICHOST | AI_PASSIVE;
  hints.ai_socktype = SOCK_STREAM;
  addrinfo* found = nullptr;
  const int error =
      ::getaddrinfo(options.address.c_str(), std::to_string(options.port).c_str(), &hints, &found);
  if (error != 0) {
    problem = ::gai_strerror(error);
    return {};
  }
  const std::unique_ptr<addrinfo, AddressListDeleter> address(found);
  UniqueFd socket(::socket(address->ai_family, SOCK_STREAM | SOCK_CLOEXEC, 0));
  const int on = 1;
  ::setsockopt(socket.get(), SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
  if (::bind(socket.get(), address->ai_addr, address->ai_addrlen) != 0 || ::listen(socket.get(), 1) != 0) {
    problem = std::strerror(errno);
    return {};
  }
  return socket;
}

/// One agent's connection.
class Connection {
 public:
  Connection(UniqueFd socket, const Options& options) : socket_(std::move(socket)), options_(options) {}
  [[nodiscard]] int descriptor() const { return socket_.get(); }

  /// Reads the agent's hello. @return false when there is none
  bool begin(const CipherBlock& secret) {
    const auto line = readLine(kReplyPatience);
    const auto hello = line ? parseHello(*line) : std::nullopt;
    if (!hello) {
      std::printf("a peer without a proper hello: %s\n", line ? line->c_str() : "(nothing)");
      return false;
    }
    std::printf("agent %s, version %s%s\n", hello->agentUUID.c_str(), hello->version.c_str(),
                hello->offline ? ", going offline" : "");
    std::fflush(stdout);
    cipher_.emplace(secret, hello->vector);
    return true;
  }

  bool send(const std::string& command) {
    const auto line = cipher_->encrypted(command);
    if (!line) return false;
    if (getsReply(command)) ++awaited_;
    return ::send(socket_.get(), line->data(), line->size(), MSG_NOSIGNAL) ==
           static_cast<ssize_t>(line->size());
  }

  /// Prints the next line. @return false when none arrived in time or the agent has disconnected
  bool show(std::chrono::milliseconds patience) {
    const auto line = readLine(patience);
    if (!line) return false;
    const auto reply = cipher_->decrypted(*line);
    std::printf("< %s\n",
                reply ? shortened(*reply).c_str() : "(a line that does not decrypt: is the secret right?)");
    if (const auto picture = reply ? previewIn(*reply) : std::nullopt; picture && !options_.preview.empty()) {
      savePreview(*picture);
    }
    std::fflush(stdout);
    if (awaited_ > 0) --awaited_;
    return true;
  }
  /// Whether a command is still unanswered.
  [[nodiscard]] bool awaitsReply() const { return awaited_ > 0; }
  [[nodiscard]] bool hasLine() const { return buffer_.find('\n') != std::string::npos; }

 private:
  void savePreview(const std::string& picture) const {
    std::ofstream file(options_.preview, std::ios::binary);
    if (file << picture << std::flush) {
      std::printf("preview of %zu bytes saved to %s\n", picture.size(), options_.preview.c_str());
    } else {
      std::fprintf(stderr, "lmx-tunnel: %s: %s\n", options_.preview.c_str(), std::strerror(errno));
    }
  }

  std::optional<std::string> readLine(std::chrono::milliseconds patience) {
    const auto deadline = std::chrono::steady_clock::now() + patience;
    while (!hasLine()) {
      const auto left =
          std::chrono::ceil<std::chrono::milliseconds>(deadline - std::chrono::steady_clock::now());
      pollfd polled{socket_.get(), POLLIN, 0};
      char bytes[65536];
      if (left.count() < 0 || ::poll(&polled, 1, static_cast<int>(left.count())) <= 0) return std::nullopt;
      const ssize_t size = ::recv(socket_.get(), bytes, sizeof bytes, 0);
      if (size <= 0) return std::nullopt;
      buffer_.append(bytes, static_cast<std::size_t>(size));
    }
    std::string line = buffer_.substr(0, buffer_.find('\n'));
    buffer_.erase(0, line.size() + 1);
    return line;
  }

  UniqueFd socket_;
  const Options& options_;
  std::optional<TunnelCipher> cipher_;
  std::string buffer_;
  int awaited_ = 0;
};

/// @return the exit status
int runScript(Connection& agent, const std::string& path) {
  std::ifstream script(path);
  if (!script) {
    std::fprintf(stderr, "lmx-tunnel: %s: %s\n", path.c_str(), std::strerror(errno));
    return kExitFailed;
  }
  for (std::string line; std::getline(script, line);) {
    if (line.empty() || line.starts_with('#')) continue;
    if (line.starts_with("sleep ")) {
      std::this_thread::sleep_for(std::chrono::duration<double>(scanReal(line.substr(6)).value_or(0)));
      continue;
    }
    std::printf("> %s\n", line.c_str());
    if (!agent.send(line) || (getsReply(line) && !agent.show(kReplyPatience))) {
      std::fprintf(stderr, "lmx-tunnel: no answer to \"%s\"\n", line.c_str());
      return kExitFailed;
    }
    // The agent takes one line per packet. A command without a reply must not share a packet with the next.
    if (!getsReply(line)) std::this_thread::sleep_for(std::chrono::milliseconds(100));
  }
  return 0;
}

/// Reads typed commands: through the line editor on a terminal, else line by line.
class Typist {
 public:
  explicit Typist(Connection& agent) : terminal_(isatty(STDIN_FILENO) == 1) {
    agent_ = &agent;
    ended_ = false;
    if (terminal_) rl_callback_handler_install("", take);
  }
  ~Typist() {
    if (terminal_) rl_callback_handler_remove();
  }
  Typist(const Typist&) = delete;
  Typist& operator=(const Typist&) = delete;

  /// Call when standard input is readable.
  void read() {
    if (terminal_) return rl_callback_read_char();
    char bytes[4096];
    const ssize_t size = ::read(STDIN_FILENO, bytes, sizeof bytes);
    if (size <= 0) {
      ended_ = true;
      return;
    }
    pending_.append(bytes, static_cast<std::size_t>(size));
    for (auto end = pending_.find('\n'); end != std::string::npos; end = pending_.find('\n')) {
      send(pending_.substr(0, end));
      pending_.erase(0, end + 1);
    }
  }
  [[nodiscard]] static bool ended() { return ended_; }

 private:
  static void send(const std::string& line) {
    if (!line.empty() && !agent_->send(line)) std::printf("not sent: %s\n", line.c_str());
  }
  static void take(char* line) {
    if (line == nullptr) {
      ended_ = true;
      return;
    }
    if (*line != '\0') add_history(line);
    send(line);
    std::free(line);  // NOLINT: the line editor allocates with malloc
  }

  static inline Connection* agent_ = nullptr;  // the line editor's callback takes no user argument
  static inline bool ended_ = false;
  bool terminal_;
  std::string pending_;
};

/// Sends typed commands and prints replies until either side ends. @return whether the person ended it
bool converse(Connection& agent) {
  Typist typist(agent);
  while (!Typist::ended()) {
    pollfd polled[2] = {{agent.descriptor(), POLLIN, 0}, {STDIN_FILENO, POLLIN, 0}};
    if (::poll(polled, 2, -1) < 0) break;
    if (polled[0].revents != 0 && !agent.show(kReplyPatience)) break;
    while (agent.hasLine()) agent.show(kReplyPatience);
    if (polled[1].revents != 0) typist.read();
  }
  while (Typist::ended() && agent.awaitsReply() && agent.show(kReplyPatience)) {
  }
  return Typist::ended();
}

int serve(const Options& options) {
  const auto secret = readSecret(options.secret);
  if (!secret) {
    std::fprintf(stderr, "lmx-tunnel: %s: %s\n", options.secret.c_str(), secret.error().message.c_str());
    return kExitFailed;
  }
  std::string problem;
  const UniqueFd listener = listenOn(options, problem);
  if (!listener.valid()) {
    std::fprintf(stderr, "lmx-tunnel: can't listen on %s:%d: %s\n", options.address.c_str(), options.port,
                 problem.c_str());
    return kExitFailed;
  }
  std::printf("listening on %s:%d\n", options.address.c_str(), options.port);
  std::fflush(stdout);
  for (;;) {
    UniqueFd socket(::accept4(listener.get(), nullptr, nullptr, SOCK_CLOEXEC));
    if (!socket.valid()) return kExitFailed;
    Connection agent(std::move(socket), options);
    if (!agent.begin(*secret)) continue;
    if (!options.script.empty()) return runScript(agent, options.script);
    if (converse(agent)) return 0;
    std::printf("the agent has gone\n");
    std::fflush(stdout);
  }
}

}  // namespace
}  // namespace lmx

int main(int argc, char** argv) {
  lmx::Options options;
  if (!lmx::readOptions(argc, argv, options)) {
    std::fputs(lmx::kUsage, stderr);
    return lmx::kExitUsage;
  }
  return lmx::serve(options);
}
