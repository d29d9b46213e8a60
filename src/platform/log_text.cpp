// Escaping and addressing.
#include "platform/log_text.h"

#include <syslog.h>

#include <cstdio>

namespace lmx {
namespace {

void appendEscaped(std::string& out, unsigned char byte) {
  switch (byte) {
    case '\n':
      out += "\\n";
      return;
    case '\r':
      out += "\\r";
      return;
    case '\t':
      out += "\\t";
      return;
    default:
      break;
  }
  char text[5];
  snprintf(text, sizeof text, "\\x%02X", static_cast<unsigned>(byte));
  out += text;
}

}  // namespace

int facilityNamed(std::string_view name) {
  struct Entry {
    std::string_view name;
    int facility;
  };
  static constexpr Entry kFacilities[] = {
      {"com.zandor.lumex", LOG_DAEMON},
      {"auth", LOG_AUTH},
      {"authpriv", LOG_AUTHPRIV},
      {"cron", LOG_CRON},
      {"daemon", LOG_DAEMON},
      {"ftp", LOG_FTP},
      {"kern", LOG_KERN},
      {"lpr", LOG_LPR},
      {"mail", LOG_MAIL},
      {"news", LOG_NEWS},
      {"syslog", LOG_SYSLOG},
      {"user", LOG_USER},
      {"uucp", LOG_UUCP},
      {"local0", LOG_LOCAL0},
      {"local1", LOG_LOCAL1},
      {"local2", LOG_LOCAL2},
      {"local3", LOG_LOCAL3},
      {"local4", LOG_LOCAL4},
      {"local5", LOG_LOCAL5},
      {"local6", LOG_LOCAL6},
      {"local7", LOG_LOCAL7},
  };
  for (const Entry& entry : kFacilities) {
    if (entry.name == name) return entry.facility;
  }
  return LOG_USER;
}

std::string escapeControls(std::string_view text) {
  const bool newline = !text.empty() && text.back() == '\n';
  if (newline) text.remove_suffix(1);
  std::string out;
  out.reserve(text.size() + 1);
  for (std::size_t i = 0; i < text.size() && out.size() < kMessageLimit; ++i) {
    const auto byte = static_cast<unsigned char>(text[i]);
    const auto next = static_cast<unsigned char>(i + 1 < text.size() ? text[i + 1] : 0);
    if (byte == 0xC2 && next >= 0x80 && next < 0xA0) {
      appendEscaped(out, byte);
      appendEscaped(out, next);
      ++i;
    } else if (byte < 0x20 || byte == 0x7F) {
      appendEscaped(out, byte);
    } else {
      out += text[i];
    }
  }
  const std::size_t limit = kMessageLimit - (newline ? 1 : 0);
  if (out.size() > limit) {
    std::size_t end = limit;
    while (end > 0 && (static_cast<unsigned char>(out[end]) & 0xC0) == 0x80) --end;  // whole characters only
    out.resize(end);
  }
  if (newline) out += '\n';
  return out;
}

std::string logDatagram(int priority, std::time_t now, const std::string& program, int pid,
                        std::string_view text) {
  static constexpr const char* kMonths[] = {"Jan", "Feb", "Mar", "Apr", "May", "Jun",
                                            "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};
  std::tm local{};
  localtime_r(&now, &local);
  char head[64];
  snprintf(head, sizeof head, "<%d>%s %2d %02d:%02d:%02d ", priority, kMonths[local.tm_mon], local.tm_mday,
           local.tm_hour, local.tm_min, local.tm_sec);
  std::string datagram = head;
  datagram += program;
  datagram += '[' + std::to_string(pid) + "]: ";
  datagram += text;
  return datagram;
}

}  // namespace lmx
