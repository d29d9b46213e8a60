// Which Debian package each GStreamer element that we need comes from.
#pragma once
#include <functional>
#include <string>
#include <vector>

namespace lmx {

/// A package that is not installed, or not completely.
struct MissingPackage {
  std::string package;
  std::string element;      ///< the first one that is missing
  std::string consequence;  ///< in words
  int level = 0;            ///< of its log line
};

/// One entry for each package of which an element is missing, those without which nothing can be recorded
/// first.
/// @param isThere  whether the element of that name can be made
std::vector<MissingPackage> missingPackages(const std::function<bool(const std::string& element)>& isThere);

/// Uses the elements of every recording once, so that the first START need not wait until their libraries are
/// loaded, and logs one line for each missing package. Any thread, blocks for some 100 ms.
void loadPlugins();

}  // namespace lmx
