// The handlers of one channel, and the table that finds them by verb.
#include "control/handlers/command_handlers.h"

namespace lmx {

CommandHandlers::CommandHandlers(const ChannelContext& context, AgentActions* actions, ReplySink& replies,
                                 ChannelKind channel)
    : recording_(context, actions, replies),
      status_(context, replies),
      server_(context, replies),
      extension_(context),
      timed_(context, actions, replies, verbs_, channel),
      verbs_({
          {"CANCEL", [this](const Dictionary* parameters) { recording_.handleCANCEL(parameters); }},
          {"PAUSE", [this](const Dictionary* parameters) { recording_.handlePAUSE(parameters); }},
          {"RESUME", [this](const Dictionary* parameters) { recording_.handleRESUME(parameters); }},
          {"SERVER", [this](const Dictionary* parameters) { server_.handleSERVER(parameters); }},
          {"START", [this](const Dictionary* parameters) { recording_.handleSTART(parameters); }},
          {"STATUS", [this](const Dictionary* parameters) { status_.handleSTATUS(parameters); }},
          {"STOP", [this](const Dictionary* parameters) { recording_.handleSTOP(parameters); }},
          {"TIMEDCMD", [this](const Dictionary* parameters) { timed_.handleTIMEDCMD(parameters); }},
      }) {}

}  // namespace lmx
