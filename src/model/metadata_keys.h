// Keys of recording parameters and of the properties document that the agent itself reads or writes.
#pragma once

#include "model/codes.h"

namespace lmx::metadata_key {

inline constexpr const char* kRecordingUUID = "RecordingMetadata_RECORDING_UUID";
inline constexpr const char* kMaxRecordingMinutes = "RecordingMetadata_MAX_RECORDING_MINUTES";
inline constexpr const char* kUnattendedMinutes = "RecordingMetadata_UNATTENDED_RECORDING_MINUTES";
inline constexpr const char* kAudioOnly = "RecordingMetadata_AUDIO_ONLY";
inline constexpr const char* kAgentUsername = "RecordingMetadata_AGENT_USERNAME";
inline constexpr const char* kAgentPassword = "RecordingMetadata_AGENT_PASSWORD";

inline constexpr const char* kAdHocFilePath = "RecordingMetadata_ADHOC_FILE_PATH";
inline constexpr const char* kAdHocWorkflowUUID = "RecordingMetadata_ADHOC_WORKFLOW_UUID";
inline constexpr const char* kAdHocSubmitDisabled = "RecordingMetadata_ADHOC_SUBMIT_DISABLED";

// Not from START: who submits the recording, kept with its parameters in the journal of the capture.
inline constexpr const char* kJobUser = "lmxagentd.user";
inline constexpr const char* kJobPassword = "lmxagentd.password";

inline constexpr const char* kMachineUUID = "RecordingMetadata_MACHINE_UUID";
inline constexpr const char* kStartDate = "RecordingMetadata_START_DATE";
inline constexpr const char* kEndDate = "RecordingMetadata_END_DATE";
inline constexpr const char* kDuration = "RecordingMetadata_DURATION";
inline constexpr const char* kType = "RecordingMetadata_TYPE";
inline constexpr const char* kVideoMaximumFrameRate = "RecordingMetadata_VIDEO_MAXIMUM_FRAME_RATE";
inline constexpr const char* kVideoImageHeight = "RecordingMetadata_VIDEO_IMAGE_HEIGHT";
inline constexpr const char* kVideoImageWidth = "RecordingMetadata_VIDEO_IMAGE_WIDTH";
inline constexpr const char* kAudioChannel = "RecordingMetadata_AUDIO_CHANNEL";
inline constexpr const char* kAudioSampleRate = "RecordingMetadata_AUDIO_SAMPLE_RATE";
inline constexpr const char* kAudioInput = "RecordingMetadata_AUDIO_INPUT";
inline constexpr const char* kMediaExtension = "RecordingMetadata_DATA_MEDIA_EXTENSION";

}  // namespace lmx::metadata_key
