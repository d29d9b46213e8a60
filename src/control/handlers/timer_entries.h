// Timed commands as a property list: the form of the timers file and of the reply to TIMERLIST.
#pragma once
#include <string>
#include <vector>

#include "model/timed_command_list.h"
#include "platform/plist/property_list.h"

namespace lmx {

/// An array of dictionaries of strings.
PlistValue plistFrom(const std::vector<TimedCommandList::Entry>& entries);

struct TimerEntries {
  std::vector<TimedCommandList::Entry> entries;
  std::string problem;  ///< why not all of them could be read; empty: nothing is wrong
};

/// The reverse. What is no dictionary of strings is left out.
TimerEntries timerEntriesFrom(const PlistValue& list);

}  // namespace lmx
