// Prints the keys that control recordings, with their values.
#include "prefs/preference_dump.h"

#include <cstdio>

#include "prefs/agent_preferences.h"
#include "support/redacted.h"

namespace lmx {
namespace {

void dumpWithSelector(AgentPreferences::Selector read) {
  AgentPreferences prefs;
  static constexpr const char* kKeys[] = {"RecordingType",
                                          "RecordingVideoInput",
                                          "RecordingVideoMaximumFrameRate",
                                          "RecordingAudioChannel",
                                          "RecordingAudioInput",
                                          "RecordingAudioSampleRate",
                                          "CameraName",
                                          "CameraUUID",
                                          "RecordingRepositoryPath",
                                          "RecordingDiskSpaceCutoffInMB",
                                          "PreviewIntervalInMilliseconds",
                                          "ServerUUID",
                                          "TunnelHost",
                                          "TunnelPort",
                                          "LumexURL"};
  for (const char* key : kKeys) {
    if (const auto value = textOf((prefs.*read)(key))) {
      // What -i prints ends up in tickets and mails.
      std::printf("'%s' == '%s'\n", key, redacted(*value).c_str());
    }
  }
}

}  // namespace

void dumpDaemon() { dumpWithSelector(&AgentPreferences::getFromPrefsFile); }
void dumpAdHoc() { dumpWithSelector(&AgentPreferences::get); }

}  // namespace lmx
