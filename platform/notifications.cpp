// D-Bus signals.
#include "platform/notifications.h"

#include <gio/gio.h>

#include <cctype>
#include <cstdlib>
#include <memory>

#include "platform/log.h"

namespace lmx {
namespace {

struct Unref {
  void operator()(void* object) const { g_object_unref(object); }
};

std::string memberName(const std::string& name) {
  const std::size_t dot = name.rfind('.');
  std::string member = dot == std::string::npos ? name : name.substr(dot + 1);
  if (!member.empty()) member[0] = static_cast<char>(std::toupper(static_cast<unsigned char>(member[0])));
  return member;
}

bool emit(GBusType type, const std::string& name, std::string* problem) {
  GError* error = nullptr;
  const std::unique_ptr<char, decltype(&g_free)> address(
      g_dbus_address_get_for_bus_sync(type, nullptr, &error), &g_free);
  std::unique_ptr<GDBusConnection, Unref> bus;
  if (address) {
    bus.reset(g_dbus_connection_new_for_address_sync(
        address.get(),
        static_cast<GDBusConnectionFlags>(G_DBUS_CONNECTION_FLAGS_AUTHENTICATION_CLIENT |
                                          G_DBUS_CONNECTION_FLAGS_MESSAGE_BUS_CONNECTION),
        nullptr, nullptr, &error));
  }
  bool sent = false;
  if (bus) {
    g_dbus_connection_set_exit_on_close(bus.get(), FALSE);
    sent = g_dbus_connection_emit_signal(bus.get(), nullptr, "/com/zandor/lmxagentd", "com.zandor.lmxagentd",
                                         memberName(name).c_str(), nullptr, &error) != FALSE &&
           g_dbus_connection_flush_sync(bus.get(), nullptr, &error) != FALSE;
  }
  if (error != nullptr) {
    *problem = error->message;
    g_error_free(error);
  }
  return sent;
}

}  // namespace

void notify_post(const std::string& name) {
  std::string problem;
  if (!emit(G_BUS_TYPE_SYSTEM, name, &problem)) {
    LMPLogMessage(nullptr, kLogDebug, "Notification %s was not sent on the system bus: %s", name.c_str(),
                  problem.c_str());
  }
}

void postDistributedNotification(const std::string& name) {
  std::string problem = "there is none";
  // Asked for without an address, the library would start a session bus of its own.
  if (std::getenv("DBUS_SESSION_BUS_ADDRESS") == nullptr || !emit(G_BUS_TYPE_SESSION, name, &problem)) {
    LMPLogMessage(nullptr, kLogDebug, "Notification %s was not sent on the session bus: %s", name.c_str(),
                  problem.c_str());
  }
}

}  // namespace lmx
