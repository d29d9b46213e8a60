// The members of the server's cluster as addresses to connect to. Pure.
#pragma once
#include <string>
#include <vector>

#include "platform/plist/property_list.h"

namespace lmx {

/// "host:port" of each member that names both, in the dictionary's order, none twice; empty for null. A v6
/// address comes in brackets.
std::vector<std::string> clusterHostArray(const PlistDictionary* members);

}  // namespace lmx
