// systemd over D-Bus.
#include "platform/service_manager.h"

#include <gio/gio.h>

#include <cstdlib>

namespace lmx {
namespace {

constexpr int kCallMilliseconds = 5000;

struct Unref {
  void operator()(GDBusConnection* bus) const { g_object_unref(bus); }
};
struct VariantUnref {
  void operator()(GVariant* value) const { g_variant_unref(value); }
};
using Bus = std::unique_ptr<GDBusConnection, Unref>;
using Variant = std::unique_ptr<GVariant, VariantUnref>;

/// "com.zandor.lmxagentd" → "lmxagentd.service".
std::string unitOf(const std::string& job) { return job.substr(job.rfind('.') + 1) + ".service"; }

std::string takeMessage(GError* error) {
  std::string message = error != nullptr ? error->message : "unknown error";
  if (error != nullptr) g_error_free(error);
  return message;
}

class SystemdServiceManager : public ServiceManager {
 public:
  bool authorize() override { return connection() != nullptr; }

  std::optional<std::string> disable(const std::string& job) override {
    const char* units[] = {nullptr, nullptr};
    const std::string unit = unitOf(job);
    units[0] = unit.c_str();
    std::string problem;
    if (!call("DisableUnitFiles", g_variant_new("(^asb)", units, FALSE), &problem)) return problem;
    if (!call("Reload", nullptr, &problem)) return problem;
    return std::nullopt;
  }

  bool isEnabled(const std::string& job) override {
    std::string problem;
    const Variant reply = call("GetUnitFileState", g_variant_new("(s)", unitOf(job).c_str()), &problem);
    if (!reply) return false;
    const char* state = nullptr;
    g_variant_get(reply.get(), "(&s)", &state);
    return state != nullptr && std::string(state).rfind("enabled", 0) == 0;
  }

  int runShellCommand(const std::string& command) override {
    return std::system(
        command.c_str());  // NOLINT: documented as a shell command, with no text from outside in it
  }

 private:
  GDBusConnection* connection() {
    if (bus_) return bus_.get();
    GError* error = nullptr;
    bus_.reset(g_bus_get_sync(G_BUS_TYPE_SYSTEM, nullptr, &error));
    if (!bus_) {
      takeMessage(error);
      return nullptr;
    }
    g_dbus_connection_set_exit_on_close(bus_.get(), FALSE);
    return bus_.get();
  }

  Variant call(const char* method, GVariant* arguments, std::string* problem) {
    GDBusConnection* bus = connection();
    if (bus == nullptr) {
      if (arguments != nullptr) g_variant_unref(g_variant_ref_sink(arguments));
      *problem = "no system bus";
      return nullptr;
    }
    GError* error = nullptr;
    GVariant* reply = g_dbus_connection_call_sync(
        bus, "org.freedesktop.systemd1", "/org/freedesktop/systemd1", "org.freedesktop.systemd1.Manager",
        method, arguments, nullptr, G_DBUS_CALL_FLAGS_NONE, kCallMilliseconds, nullptr, &error);
    if (reply == nullptr) *problem = takeMessage(error);
    return Variant(reply);
  }

  Bus bus_;
};

}  // namespace

std::unique_ptr<ServiceManager> newSystemServiceManager() {
  return std::make_unique<SystemdServiceManager>();
}

}  // namespace lmx
