// The line by which the agent introduces itself to the server.
#include "control/tunnel/hello.h"

#include "support/format.h"

namespace lmx {
namespace {

constexpr int kProtocolVersion = 100;

}  // namespace

std::string helloLine(const std::optional<std::string>& agent_uuid, const std::string& vector,
                      bool can_record) {
  return "AGENT protocol=1,agent_uuid=" + textOrNull(agent_uuid) + ",iv=" + vector +
         ",version=" + std::to_string(kProtocolVersion) +
         (can_record ? "" : ",agent_recording_status=offline") + "\n";
}

}  // namespace lmx
