// Talks to systemd over D-Bus.
#include "platform/service_manager.h"

#include <cstdlib>
#include <exception>

#include "platform/bus.h"
#include "platform/log.h"

namespace lmx {
namespace {

constexpr const char* kService = "org.freedesktop.systemd1";

struct VariantUnref {
  void operator()(GVariant* value) const { g_variant_unref(value); }
};
using Variant = std::unique_ptr<GVariant, VariantUnref>;

/// "com.zandor.lmxagentd" → "lmxagentd.service".
std::string unitOf(const std::string& job) { return job.substr(job.rfind('.') + 1) + ".service"; }

struct Method {
  const char* service;
  const char* path;
  const char* interface;
  const char* name;
};
constexpr Method managerMethod(const char* name) {
  return {kService, "/org/freedesktop/systemd1", "org.freedesktop.systemd1.Manager", name};
}

/// Makes one call on a private connection. Connecting and the reply share the bus's time limit.
Variant call(const Method& method, GVariant* floating_arguments, std::string* problem) try {
  const Variant arguments(floating_arguments == nullptr ? nullptr : g_variant_ref_sink(floating_arguments));
  const BusTimeLimit limit;
  const BusConnection bus = connectToBus(G_BUS_TYPE_SYSTEM, limit, problem);
  if (!bus) return nullptr;
  GError* error = nullptr;
  Variant reply(g_dbus_connection_call_sync(
      bus.get(), method.service, method.path, method.interface, method.name, arguments.get(), nullptr,
      G_DBUS_CALL_FLAGS_NO_AUTO_START, static_cast<int>(kBusLimit.count()), limit.cancellable(), &error));
  if (!reply) *problem = takeMessage(error);
  return reply;
} catch (const std::exception& error) {  // the time-limit thread could not start
  *problem = error.what();
  return nullptr;
}

class SystemdServiceManager : public ServiceManager {
 public:
  bool authorize() override {
    constexpr Method kHasOwner{"org.freedesktop.DBus", "/org/freedesktop/DBus", "org.freedesktop.DBus",
                               "NameHasOwner"};
    std::string problem;
    const Variant reply = call(kHasOwner, g_variant_new("(s)", kService), &problem);
    if (!reply) {
      LMPLogMessage(nullptr, kLogDebug, "The service manager can't be reached: %s", problem.c_str());
      return false;
    }
    gboolean owned = FALSE;
    g_variant_get(reply.get(), "(b)", &owned);
    return owned != FALSE;
  }

  std::optional<std::string> disable(const std::string& job) override {
    const std::string unit = unitOf(job);
    const char* units[] = {unit.c_str(), nullptr};
    std::string problem;
    if (!call(managerMethod("DisableUnitFiles"), g_variant_new("(^asb)", units, FALSE), &problem))
      return problem;
    if (!call(managerMethod("Reload"), nullptr, &problem)) return problem;
    return std::nullopt;
  }

  bool isEnabled(const std::string& job) override {
    std::string problem;
    const Variant reply =
        call(managerMethod("GetUnitFileState"), g_variant_new("(s)", unitOf(job).c_str()), &problem);
    if (!reply || !g_variant_is_of_type(reply.get(), G_VARIANT_TYPE("(s)"))) return false;
    const char* state = nullptr;
    g_variant_get(reply.get(), "(&s)", &state);
    return std::string(state).starts_with("enabled");  // includes "enabled-runtime"
  }

  int runShellCommand(const std::string& command) override {
    return std::system(command.c_str());  // NOLINT: a fixed command without any external input
  }
};

class PrivateServiceManager : public ServiceManager {
 public:
  bool authorize() override { return false; }
  std::optional<std::string> disable(const std::string&) override { return "a trial has no service"; }
  bool isEnabled(const std::string&) override { return false; }
  int runShellCommand(const std::string&) override { return 0; }
};

}  // namespace

std::unique_ptr<ServiceManager> newSystemServiceManager() {
  return std::make_unique<SystemdServiceManager>();
}

std::unique_ptr<ServiceManager> newPrivateServiceManager() {
  return std::make_unique<PrivateServiceManager>();
}

}  // namespace lmx
