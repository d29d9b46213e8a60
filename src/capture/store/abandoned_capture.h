// Opens what an earlier process left of a capture.
#pragma once
#include <memory>
#include <string>

#include "capture/store/finished_capture.h"

namespace lmx {

/// The capture in `folder`, its media made whole where they can be read to their end. A damaged journal makes
/// one recording of all the media.
/// @return null when another process is still recording it, when it holds nothing of ours, or when it can't
/// be read (logged); the folder is then left as it is
std::shared_ptr<FinishedCapture> openAbandonedCapture(const std::string& folder);

}  // namespace lmx
