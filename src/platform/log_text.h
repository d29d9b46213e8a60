// The text of log messages: made safe for one line, and addressed to a log daemon. Pure.
#pragma once
#include <cstddef>
#include <ctime>
#include <string>
#include <string_view>

namespace lmx {

/// Longest text of a message, bytes.
inline constexpr std::size_t kMessageLimit = 8U << 10;

/// The syslog facility of a name: "com.zandor.lumex" is LOG_DAEMON, names of syslog facilities stand for
/// themselves, anything else is LOG_USER.
int facilityNamed(std::string_view name);

/// Makes the text safe for one line: a peer's bytes must forge neither log lines nor terminal commands
/// (the C1 controls, encoded as C2 80 … C2 9F, are such commands too). One newline at the end stays.
std::string escapeControls(std::string_view text);

/// The datagram of a message as log daemons take it (RFC 3164): "<PRI>time program[pid]: text".
/// @param priority  facility and level; @param now  seconds since 1970
std::string logDatagram(int priority, std::time_t now, const std::string& program, int pid,
                        std::string_view text);

}  // namespace lmx
