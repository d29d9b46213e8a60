// Access to the system's service manager.
#pragma once
#include <memory>
#include <optional>
#include <string>

namespace lmx {

/// Talks to systemd over D-Bus; scripted in tests. Calls block for at most a few seconds.
class ServiceManager {
 public:
  virtual ~ServiceManager() = default;
  /// Whether the agent can ask for its unit to be disabled (the bus answers).
  virtual bool authorize() = 0;
  /// Disables the unit of `job` ("com.zandor.lmxagentd" → lmxagentd.service).
  /// @return nothing, or the error message
  virtual std::optional<std::string> disable(const std::string& job) = 0;
  virtual bool isEnabled(const std::string& job) = 0;
  /// Runs a shell command, which the fallback removal needs. @return its wait status
  virtual int runShellCommand(const std::string& command) = 0;
};

std::unique_ptr<ServiceManager> newSystemServiceManager();

/// For an agent under a private root, which must not disable the unit of the machine's real agent. Refuses
/// authorization and does nothing.
std::unique_ptr<ServiceManager> newPrivateServiceManager();

}  // namespace lmx
