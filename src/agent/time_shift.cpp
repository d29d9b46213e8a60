// Reads the time-shift file.
#include "agent/time_shift.h"

#include <unistd.h>

#include "platform/paths.h"
#include "platform/plist/property_list.h"

namespace lmx {

void readTimeShift(AgentState& state) {
  const std::string path = systemPath(kTimeShiftFile);
  std::int32_t seconds = 0;
  if (access(path.c_str(), R_OK) == 0) {
    const PlistResult file = readPropertyList(path);
    const PlistValue* shift = file ? file->under("TimeShiftSeconds") : nullptr;
    if (shift != nullptr) seconds = static_cast<std::int32_t>(shift->asInteger());
  }
  state.timeshift_seconds.set(seconds);
}

}  // namespace lmx
