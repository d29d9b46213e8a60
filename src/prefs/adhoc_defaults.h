// Default preferences.
#pragma once
#include "platform/plist/property_list.h"

namespace lmx {

/// The registered defaults: the last layer of the preferences domain, and the initial contents of a new file.
PlistDictionary adHocDefaults();

}  // namespace lmx
