// The key under which a source is shared.
#include "capture/source/capture_source.h"

#include "support/format.h"

namespace lmx {

std::string CaptureSource::key() const {
  return string_with_format("%s|%s|%d/%d|%d|%d", videoDevice.value_or("-").c_str(),
                            audioDevice.value_or("-").c_str(), frameRate.numerator, frameRate.denominator,
                            sampleRate, channels);
}

}  // namespace lmx
