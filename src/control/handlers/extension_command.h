// The verbs that begin with "X-": only X-PREVIEW means something.
#pragma once
#include <string_view>

#include "control/handlers/channel_context.h"
#include "support/dictionary.h"

namespace lmx {

class ExtensionCommand {
 public:
  /// `context` outlives this object.
  explicit ExtensionCommand(const ChannelContext& context) : context_(context) {}

  /// X-PREVIEW refresh_milliseconds=500  →  (no reply)
  void handleXCMD(std::string_view verb, const Dictionary* parameters);

 private:
  const ChannelContext& context_;
};

}  // namespace lmx
