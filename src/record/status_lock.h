// Holds the session's status-and-timing mutex for a scope.
#pragma once
#include "record/agent_record.h"

namespace lmx {

class StatusAndTimingLock {
 public:
  explicit StatusAndTimingLock(AgentRecord& session)
      : session_(session), locked_(session.lockStatusAndTimingMutex() == 0) {}
  ~StatusAndTimingLock() {
    if (locked_) session_.unlockStatusAndTimingMutex();
  }
  StatusAndTimingLock(const StatusAndTimingLock&) = delete;
  StatusAndTimingLock& operator=(const StatusAndTimingLock&) = delete;
  [[nodiscard]] bool locked() const { return locked_; }

 private:
  AgentRecord& session_;
  bool locked_;
};

}  // namespace lmx
