// What the preferences say as long as nobody has said anything.
#pragma once
#include "platform/plist/property_list.h"

namespace lmx {

/// The registered defaults: the last layer of the preferences domain, and the beginning of a new file.
PlistDictionary adHocDefaults();

}  // namespace lmx
