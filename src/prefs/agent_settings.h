// The settings on their way from the preferences into the context.
#pragma once
#include "model/agent_context.h"
#include "prefs/agent_preferences.h"

namespace lmx {

/// Reads every setting into `context`; false when a required one is missing or wrong (logged). Fields before
/// the failing key are already updated then.
bool setAgentPreferencesInContext(AgentPreferences& prefs, AgentContext& context);

}  // namespace lmx
