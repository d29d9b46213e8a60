// Keeps GStreamer from asking a PulseAudio that is not there.
#pragma once

namespace lmx {

/// Lets the next listing of devices ask PulseAudio only if its server may be there. GStreamer's plug-in keeps
/// a shared memory of 64 MB and three file descriptors of each attempt that fails: a microphone that is away,
/// and is looked for every few seconds, would use up the descriptors of the process within the hour.
/// GStreamer is initialised; not to be called while devices are listed.
void askPulseOnlyIfThere();

}  // namespace lmx
