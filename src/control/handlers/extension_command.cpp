// The verbs that begin with "X-".
#include "control/handlers/extension_command.h"

#include "record/agent_record.h"
#include "record/preview_controller.h"
#include "support/scan.h"

namespace lmx {

void ExtensionCommand::handleXCMD(std::string_view verb, const Dictionary* parameters) {
  if (verb != "X-PREVIEW") return;
  const auto interval = lookUp(parameters, "refresh_milliseconds");
  const auto session = context_.session();
  const auto controller = session ? session->previewController.get() : nullptr;
  if (!interval || !controller) return;
  const auto delegate = controller->delegate();
  if (delegate) delegate->setFrameGrabInterval(decimalValue(*interval));
}

}  // namespace lmx
