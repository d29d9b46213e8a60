// The capture pipeline in GStreamer's launch notation. Pure.
#pragma once
#include <string>

#include "capture/source/device_id.h"

namespace lmx {

/// The camera's branch, ending in the appsink "vsink"; empty for hardware, whose source element is added by
/// hand in front of deviceVideoBranch.
std::string videoBranch(const DeviceID& video, FrameRate rate);
/// The microphone's branch, ending in the appsink "asink"; empty for hardware.
std::string audioBranch(const DeviceID& audio, int sampleRate, int channels, bool sameFileAsVideo);
/// What follows the source element of a real camera or microphone.
std::string deviceVideoBranch(FrameRate rate);
std::string deviceAudioBranch(int sampleRate, int channels);

}  // namespace lmx
