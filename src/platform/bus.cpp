// Connects to a message bus.
#include "platform/bus.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <cstdlib>
#include <optional>

namespace lmx {
namespace {

/// Finds the session bus's address without GIO, which would start a bus if there is none.
std::optional<std::string> sessionBusAddress() {
  if (const char* address = std::getenv("DBUS_SESSION_BUS_ADDRESS")) return address;
  const char* directory = std::getenv("XDG_RUNTIME_DIR");
  const std::string socket = directory != nullptr ? std::string(directory) + "/bus" : "";
  if (socket.empty() || access(socket.c_str(), F_OK) != 0) return std::nullopt;
  return "unix:path=" + socket;
}

std::string systemBusAddress() {
  const char* address = std::getenv("DBUS_SYSTEM_BUS_ADDRESS");
  return address != nullptr ? address : "unix:path=/var/run/dbus/system_bus_socket";
}

}  // namespace

BusTimeLimit::BusTimeLimit()
    : cancellable_(g_cancellable_new()), finished_(eventfd(0, EFD_CLOEXEC)), watcher_([this] { watch(); }) {}

BusTimeLimit::~BusTimeLimit() {
  eventfd_write(finished_.get(), 1);
  watcher_.join();
  g_object_unref(cancellable_);
}

void BusTimeLimit::watch() {
  pollfd polled{finished_.get(), POLLIN, 0};
  const auto deadline = std::chrono::steady_clock::now() + kBusLimit;
  for (;;) {
    const auto left =
        std::chrono::ceil<std::chrono::milliseconds>(deadline - std::chrono::steady_clock::now()).count();
    const int ready = left <= 0 ? 0 : poll(&polled, 1, static_cast<int>(left));
    if (ready > 0) return;
    if (ready == 0) return g_cancellable_cancel(cancellable_);
  }
}

void BusClose::operator()(GDBusConnection* bus) const {
  g_dbus_connection_close_sync(bus, nullptr, nullptr);
  g_object_unref(bus);
}

Result<BusConnection> connectToBus(GBusType type, const BusTimeLimit& limit) {
  const auto address = type == G_BUS_TYPE_SYSTEM ? systemBusAddress() : sessionBusAddress();
  if (!address) return Error{"there is none"};
  constexpr auto kFlags = static_cast<GDBusConnectionFlags>(G_DBUS_CONNECTION_FLAGS_AUTHENTICATION_CLIENT |
                                                            G_DBUS_CONNECTION_FLAGS_MESSAGE_BUS_CONNECTION);
  GError* error = nullptr;
  BusConnection bus(
      g_dbus_connection_new_for_address_sync(address->c_str(), kFlags, nullptr, limit.cancellable(), &error));
  if (!bus) return Error{takeMessage(error)};
  // The end of the bus must not be the end of the agent.
  g_dbus_connection_set_exit_on_close(bus.get(), FALSE);
  return bus;
}

std::string takeMessage(GError* error) {
  if (error == nullptr) return "unknown error";
  std::string message = error->message;
  g_error_free(error);
  return message;
}

}  // namespace lmx
