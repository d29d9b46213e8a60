// Copies the settings from the preferences into the context.
#pragma once
#include "model/agent_context.h"
#include "prefs/agent_preferences.h"

namespace lmx {

/// Reads every setting into `context`. @return false when a required one is missing or invalid (logged);
/// fields before the failing key have been updated then
bool setAgentPreferencesInContext(AgentPreferences& prefs, AgentContext& context);

}  // namespace lmx
