// TIMEDCMD: commands that run later.
#include "control/handlers/timed_commands.h"

#include <ctime>
#include <memory>
#include <utility>

#include "control/handlers/timers_file.h"
#include "control/protocol/reply.h"
#include "platform/directories.h"
#include "platform/identifiers.h"
#include "platform/paths.h"
#include "support/date_text.h"
#include "support/format.h"

namespace lmx {
namespace {

constexpr std::string_view kManagement = "TIMER";

TimersFile timersFile() { return TimersFile(systemPath(kTimersFile)); }

SharedDictionary withIdentity(Dictionary entry) {
  if (!entry.contains("TimerID")) entry.emplace("TimerID", newUUIDString());
  return std::make_shared<const Dictionary>(std::move(entry));
}

}  // namespace

void TimedCommands::handleTIMEDCMD(const Dictionary* parameters) {
  if (!context_.get()) return reply(CommandError::missingParameter);
  const std::string command = lookUp(parameters, "command").value_or("");
  if (!command.starts_with(kManagement)) {
    scheduleCommand(parameters, Origin::peer);
  } else if (command == "TIMERLIST") {
    replies_.sendReply(timerListReply());
  } else if (command == "TIMERREVOKE") {
    revoke(parameters);
  } else {
    reply(CommandError::none);
  }
}

void TimedCommands::revoke(const Dictionary* parameters) {
  const auto context = context_.get();
  const auto timerID = lookUp(parameters, "TimerID");
  if (!context || !timerID || !context->timedCmdList.removeTimer(*timerID))
    return reply(CommandError::noSuchTimer);
  writeTimerListToDisk();
  reply(CommandError::none);
}

std::string TimedCommands::timerListReply() const {
  const auto context = context_.get();
  const std::string list = context ? propertyListXml(plistFrom(context->timedCmdList.entries())) : "";
  const std::string done = replyText(CommandError::none);
  return list.empty() ? done : done + ",timerlist=" + list;
}

/// @return whether it was added to the list
bool TimedCommands::scheduleCommand(const Dictionary* parameters, Origin origin) {
  const auto date = dateFromText(lookUp(parameters, "time").value_or(""));
  const std::string command = textOrNull(lookUp(parameters, "command"));
  const std::time_t now = std::time(nullptr);
  const std::string when = textOrNull(dateText(date.value_or(now)));
  if (date && *date <= now) {
    context_.logInfo("Not scheduling " + command + " command. The timer has expired: " + when);
    reply(CommandError::missingParameter);
    return false;
  }
  // A TIMEDCMD within a TIMEDCMD would schedule itself again and again.
  if (verbs_.handlerForVerb(command) == nullptr || command == "TIMEDCMD") {
    context_.logInfo("Not scheduling unknown command: " + command);
    reply(CommandError::missingParameter);
    return false;
  }
  const SharedDictionary entry = withIdentity(*parameters);
  if (!append(entry, origin)) return false;
  context_.logInfo("Scheduling " + command + " command to run at: " + when);
  if (origin == Origin::peer) writeTimerListToDisk();
  // What an earlier process has left is the server's: it answers on the tunnel, when that is there by then.
  const ChannelKind channel = origin == Origin::file ? ChannelKind::tunnel : channel_;
  if (actions_ != nullptr) actions_->scheduleTimedCommand(entry, date.value_or(now), channel);
  reply(CommandError::none);
  return true;
}

/// An entry of the file that is waiting already stays alone, since twice in the list it would run twice.
bool TimedCommands::append(const SharedDictionary& entry, Origin origin) {
  const auto context = context_.get();
  return context && context->timedCmdList.append(entry, origin == Origin::file);
}

void TimedCommands::completeTimedCommand(const SharedDictionary& entry) {
  const auto context = context_.get();
  if (!context) return;
  if (!context->timedCmdList.takeIfListed(entry)) {
    context_.logInfo("Not running deferred command");
    return reply(CommandError::timerRevoked);
  }
  const std::string command = textOrNull(lookUp(entry, "command"));
  context_.logInfo("Running deferred command: " + command);
  writeTimerListToDisk();
  if (const auto* handler = verbs_.handlerForVerb(command)) (*handler)(entry.get());
}

void TimedCommands::writeTimerListToDisk() {
  const auto context = context_.get();
  if (!context) return;
  const bool written =
      context->timedCmdList.persist([](const auto& entries) { return timersFile().write(entries); });
  if (!written) context->logWarn("Unable to write timer file.");
}

void TimedCommands::loadTimedCommands() {
  const TimersFile file = timersFile();
  const TimerEntries read = file.read();
  bool kept = false;
  if (!read.problem.empty()) {
    const std::string copy = keepUnderAnotherName(file.path());
    kept = !copy.empty();
    LMPLogMessage(context_.log(), kLogError, "The timers file %s can't be used: %s. It is kept as %s.",
                  file.path().c_str(), read.problem.c_str(), kept ? copy.c_str() : "it is");
  }
  // Once its content is safe under another name, the file is made readable again. It is written only when all
  // of it has been read: a crash before that must not lose the last entries.
  bool changed = kept;
  for (const auto& entry : read.entries) changed |= scheduleCommand(entry.get(), Origin::file);
  if (changed) writeTimerListToDisk();
}

void TimedCommands::reply(CommandError error) { replies_.sendReply(replyText(error)); }

}  // namespace lmx
