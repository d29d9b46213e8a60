// TIMEDCMD: commands that run later, their list and its file.
#include <sys/stat.h>

#include <cerrno>
#include <cstring>

#include "control/channel/agent_control_base.h"
#include "platform/directories.h"
#include "platform/identifiers.h"
#include "platform/paths.h"
#include "platform/plist/property_list.h"
#include "support/date_text.h"

namespace lmx {
namespace {

constexpr std::string_view kManagement = "TIMER";
constexpr const char* kDone = "cmdStatus=0";
constexpr const char* kNotScheduled = "cmdStatus=31";
constexpr const char* kNoSuchTimer = "cmdStatus=37";
constexpr const char* kRevoked = "cmdStatus=38";

/// Our own file, however long the list has grown: only what no schedule can be is refused.
constexpr PlistLimits kTimersLimits{.bytes = 64U << 20, .values = 1'000'000};

PlistValue plistFrom(const std::vector<TimedCommandList::Entry>& entries) {
  PlistArray array;
  for (const auto& entry : entries) {
    PlistDictionary item;
    for (const auto& [key, value] : *entry) item.emplace(key, value);
    array.emplace_back(std::move(item));
  }
  return array;
}

/// An element of the file; null when it is no dictionary of texts.
SharedDictionary entryFrom(const PlistValue& value) {
  const PlistDictionary* item = value.dictionary();
  if (item == nullptr) return nullptr;
  Dictionary entry;
  for (const auto& [key, text] : *item) {
    if (text.string() == nullptr) return nullptr;
    entry.emplace(key, *text.string());
  }
  return std::make_shared<const Dictionary>(std::move(entry));
}

struct TimersFile {
  std::vector<SharedDictionary> entries;
  std::string problem;  ///< why not all of it could be read; empty: nothing is wrong
};

TimersFile readTimers(const std::string& path) {
  TimersFile result;
  const PlistResult file = readPropertyList(path, kTimersLimits);
  if (!file) {
    if (file.error().systemError != ENOENT) result.problem = file.error().message;
    return result;
  }
  const auto* array = std::get_if<PlistArray>(&file->value);
  if (array == nullptr) {
    result.problem = "its top level is not an array";
    return result;
  }
  for (const PlistValue& value : *array) {
    if (auto entry = entryFrom(value)) {
      result.entries.push_back(std::move(entry));
    } else {
      result.problem = "not all of its elements are dictionaries of strings";
    }
  }
  return result;
}

}  // namespace

void AgentControlBase::handleTIMEDCMD(const Dictionary* parameters) {
  const auto context = agentContext();
  if (!context) return sendReply(kNotScheduled);
  const std::string command = lookUp(parameters, "command").value_or("");
  if (!command.starts_with(kManagement)) {
    scheduleCommand(parameters, TimerOrigin::peer);
    return;
  }
  if (command == "TIMERLIST") return sendReply(timerListReply());
  if (command == "TIMERREVOKE") {
    const auto timerID = lookUp(parameters, "TimerID");
    if (!timerID || !context->timedCmdList.removeTimer(*timerID)) return sendReply(kNoSuchTimer);
    writeTimerListToDisk();
  }
  sendReply(kDone);
}

std::string AgentControlBase::timerListReply() {
  const auto context = agentContext();
  const std::string list = propertyListXml(plistFrom(context->timedCmdList.entries()));
  return list.empty() ? std::string(kDone) : std::string(kDone) + ",timerlist=" + list;
}

/// @param origin  of the file: an entry that is waiting already stays alone, since twice in the list it would
/// run twice; and the file is not written here, since a crash before its last entry is read must not lose
/// that
/// @return whether it was added to the list
bool AgentControlBase::scheduleCommand(const Dictionary* parameters, TimerOrigin origin) {
  const auto context = agentContext();
  const auto date = dateFromText(lookUp(parameters, "time").value_or(""));
  const std::string command = lookUp(parameters, "command").value_or("(null)");
  const std::time_t now = std::time(nullptr);
  const std::string when = dateText(date.value_or(now)).value_or("?");
  if (date && *date <= now) {
    logInfo("Not scheduling " + command + " command. The timer has expired: " + when);
    sendReply(kNotScheduled);
    return false;
  }
  // A TIMEDCMD within a TIMEDCMD would schedule itself again and again.
  if (handlerForVerb(command) == nullptr || command == "TIMEDCMD") {
    logInfo("Not scheduling unknown command: " + command);
    sendReply(kNotScheduled);
    return false;
  }
  Dictionary entry = *parameters;
  if (!entry.contains("TimerID")) entry.emplace("TimerID", newUUIDString());
  const auto shared = std::make_shared<const Dictionary>(std::move(entry));
  if (!context->timedCmdList.append(shared, origin == TimerOrigin::file)) return false;
  logInfo("Scheduling " + command + " command to run at: " + when);
  if (origin == TimerOrigin::peer) writeTimerListToDisk();
  if (actions_ != nullptr) actions_->scheduleTimedCommand(shared, date.value_or(now), kind());
  sendReply(kDone);
  return true;
}

void AgentControlBase::completeTimedCommand(const SharedDictionary& entry) {
  const auto context = agentContext();
  if (!context) return;
  if (!context->timedCmdList.takeIfListed(entry)) {
    logInfo("Not running deferred command");
    return sendReply(kRevoked);
  }
  const std::string command = lookUp(entry, "command").value_or("");
  logInfo("Running deferred command: " + command);
  writeTimerListToDisk();
  if (const Handler handler = handlerForVerb(command)) (this->*handler)(entry.get());
}

void AgentControlBase::writeTimerListToDisk() {
  const auto context = agentContext();
  if (!context) return;
  const bool written = context->timedCmdList.persist([](const auto& entries) {
    const std::string path = systemPath(kTimersFile);
    ::chmod(path.c_str(), 0600);  // the new file takes over the mode of the old one, and passwords are in it
    return writePropertyList(path, plistFrom(entries), 0600) == 0;
  });
  if (!written) context->logWarn("Unable to write timer file.");
}

void AgentControlBase::loadTimedCommands() {
  const std::string path = systemPath(kTimersFile);
  const TimersFile file = readTimers(path);
  bool kept = false;
  if (!file.problem.empty()) {
    const std::string copy = keepUnderAnotherName(path);
    kept = !copy.empty();
    LMPLogMessage(logContext(), kLogError, "The timers file %s can't be used: %s. It is kept as %s.",
                  path.c_str(), file.problem.c_str(), copy.empty() ? "it is" : copy.c_str());
  }
  // Once its content is safe under another name, the file is made readable again.
  bool added = kept;
  for (const SharedDictionary& entry : file.entries) added |= scheduleCommand(entry.get(), TimerOrigin::file);
  if (added) writeTimerListToDisk();
}

}  // namespace lmx
