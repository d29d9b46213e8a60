// The system's service manager, as far as an agent must talk to it.
#pragma once
#include <memory>
#include <optional>
#include <string>

namespace lmx {

/// systemd over D-Bus in the real one; scripted in tests. Calls block for at most a few seconds.
class ServiceManager {
 public:
  virtual ~ServiceManager() = default;
  /// Whether we may ask for the unit to be disabled at all (a bus that answers).
  virtual bool authorize() = 0;
  /// Disables the unit of `job` ("com.zandor.lmxagentd" → lmxagentd.service). @return nothing, or the error
  /// in words.
  virtual std::optional<std::string> disable(const std::string& job) = 0;
  virtual bool isEnabled(const std::string& job) = 0;
  /// Runs a shell command, as the fallback removal is documented. @return its wait status.
  virtual int runShellCommand(const std::string& command) = 0;
};

std::unique_ptr<ServiceManager> newSystemServiceManager();

/// For an agent under a private root, a trial: it must not disable the unit of the machine's own agent.
/// Grants nothing and does nothing.
std::unique_ptr<ServiceManager> newPrivateServiceManager();

}  // namespace lmx
