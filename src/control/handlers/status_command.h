// STATUS: what the recorder does, with the camera's profile and a preview image when asked for.
#pragma once
#include "control/handlers/channel_context.h"
#include "control/handlers/reply_sink.h"
#include "support/dictionary.h"

namespace lmx {

class StatusCommand {
 public:
  /// Both outlive this object.
  StatusCommand(const ChannelContext& context, ReplySink& replies) : context_(context), replies_(replies) {}

  /// STATUS include_profile=true  →  cmdStatus=0,recordStatus=2,…,CameraName=Hall 3,…
  void handleSTATUS(const Dictionary* parameters);

 private:
  const ChannelContext& context_;
  ReplySink& replies_;
};

}  // namespace lmx
