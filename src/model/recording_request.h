// What one START asked for.
#pragma once
#include <optional>
#include <string>

#include "support/dictionary.h"

namespace lmx {

/// Copied as a whole, so that no thread sees the identifier of one START with the parameters of another.
struct RecordingRequest {
  std::string uuid = {};             ///< made by the agent; names the request among the marks of its capture
  SharedDictionary properties = {};  ///< the parameters of the START; null: no START yet
  // Who submits the recording to a workflow; absent: nobody was named.
  std::optional<std::string> user = {};
  std::optional<std::string> password = {};
};

}  // namespace lmx
