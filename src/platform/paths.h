// The system's fixed paths, which a private root directory can prefix for trials and tests.
#pragma once
#include <cstddef>
#include <string>
#include <string_view>

namespace lmx {

inline constexpr std::string_view kPreferencesFile = "/Library/Preferences/com.zandor.lmxagentd.plist";
inline constexpr std::string_view kStateDirectory = "/var/lmx/agent";
inline constexpr std::string_view kSecretsDirectory = "/var/lmx/agent/secrets";
inline constexpr std::string_view kPreviewImage = "/var/lmx/agent/preview.jpg";
inline constexpr std::string_view kServerInformation = "/var/lmx/agent/com.zandor.lmxserverinfo.plist";
inline constexpr std::string_view kServerInformationOfRoot =
    "/var/root/Library/Caches/com.zandor.lmxserverinfo.plist";
inline constexpr std::string_view kTimersFile = "/var/lmx/agent/timers";
inline constexpr std::string_view kJobsDirectory = "/var/lmx/agent/jobs";
inline constexpr std::string_view kTimeShiftFile = "/var/lmx/agent/timeshift";
inline constexpr std::string_view kPidFile = "/var/run/lmxagentd.pid";
inline constexpr std::string_view kLocalSocket = "/var/run/lmxagentd.comm";
inline constexpr std::string_view kLumexTool = "/usr/bin/lumex";
inline constexpr std::string_view kLogSocket = "/dev/log";

/// `fixedPath` below the directory named by LMXAGENTD_ROOT (read once); unchanged when that is unset or
/// empty. Only for the system's own paths: paths from the user (-f, preference values) are never prefixed.
std::string systemPath(std::string_view fixedPath);

/// Longest name of a recording in bytes: file systems take 255 with what the agent adds to it (an ending, a
/// number, the parts of a temporary name).
inline constexpr std::size_t kLongestRecordingName = 200;

/// The properties document of `movie`: every ".mov" in the path becomes ".xml"; a path without any gets
/// ".xml" appended.
std::string documentPathOf(const std::string& movie);

/// The directory part of `path`: everything before its last "/"; "/" for a file in the root, "." without any
/// "/".
std::string directoryOf(std::string_view path);

}  // namespace lmx
