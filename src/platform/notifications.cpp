// Sends notifications as D-Bus signals.
#include "platform/notifications.h"

#include <cctype>
#include <exception>
#include <optional>

#include "platform/bus.h"
#include "platform/log.h"

namespace lmx {
namespace {

constexpr const char* kObjectPath = "/com/zandor/lmxagentd";
constexpr const char* kInterface = "com.zandor.lmxagentd";

std::string memberName(const std::string& name) {
  std::string member = name.substr(name.rfind('.') + 1);
  if (!member.empty()) member[0] = static_cast<char>(std::toupper(static_cast<unsigned char>(member[0])));
  return member;
}

/// @return why the signal was not sent, or nothing on success
std::optional<std::string> emitSignal(GBusType type, const std::string& name) {
  const std::string member = memberName(name);
  if (g_dbus_is_member_name(member.c_str()) == FALSE) return "not a name for a signal";
  const BusTimeLimit limit;
  const auto bus = connectToBus(type, limit);
  if (!bus) return bus.error().message;
  GError* error = nullptr;
  const bool sent = g_dbus_connection_emit_signal(bus->get(), nullptr, kObjectPath, kInterface,
                                                  member.c_str(), nullptr, &error) != FALSE &&
                    g_dbus_connection_flush_sync(bus->get(), limit.cancellable(), &error) != FALSE;
  if (!sent) return takeMessage(error);
  return std::nullopt;
}

void emitOrExplain(GBusType type, const char* bus_name, const std::string& name) {
  std::optional<std::string> problem;
  try {
    problem = emitSignal(type, name);
  } catch (const std::exception& error) {  // the time-limit thread could not start
    problem = error.what();
  }
  if (!problem) return;
  LMPLogMessage(nullptr, kLogDebug, "Notification %s was not sent on the %s bus: %s", name.c_str(), bus_name,
                problem->c_str());
}

}  // namespace

void notify_post(const std::string& name) { emitOrExplain(G_BUS_TYPE_SYSTEM, "system", name); }

void postDistributedNotification(const std::string& name) {
  emitOrExplain(G_BUS_TYPE_SESSION, "session", name);
}

}  // namespace lmx
