// The properties document.
#include <cstring>
#include <pugixml.hpp>
#include <sstream>
#include <string_view>

#include "platform/log.h"
#include "postprocess/agent_submit.h"
#include "support/directories.h"

namespace lmx {
namespace {

/// Bytes of the UTF-8 sequence that a first byte announces; 0 for one that can't be first.
std::size_t announcedLength(unsigned char first) {
  if (first < 0x80) return 1;
  if (first >= 0xC2 && first <= 0xDF) return 2;
  if (first >= 0xE0 && first <= 0xEF) return 3;
  return first >= 0xF0 && first <= 0xF4 ? 4 : 0;
}

/// Whether XML 1.0 can hold the character, escaped or not.
bool xmlHolds(char32_t c) {
  if (c < 0x20) return c == '\t' || c == '\n' || c == '\r';
  return c < 0xD800 || (c > 0xDFFF && c < 0xFFFE) || (c > 0xFFFF && c <= 0x10FFFF);
}

/// Bytes of the character that `text` begins with; 0 when it is not well-formed UTF-8 (RFC 3629) or XML can't
/// hold it.
std::size_t characterLength(std::string_view text) {
  const auto first = static_cast<unsigned char>(text.front());
  const std::size_t length = announcedLength(first);
  if (length == 0 || length > text.size()) return 0;
  char32_t c = length == 1 ? first : first & (0x7FU >> length);
  for (std::size_t i = 1; i < length; ++i) {
    const auto next = static_cast<unsigned char>(text[i]);
    if ((next & 0xC0U) != 0x80U) return 0;
    c = c << 6U | (next & 0x3FU);
  }
  constexpr char32_t kLeast[] = {0, 0, 0x80, 0x800, 0x10000};  // below: an overlong form
  return c >= kLeast[length] && xmlHolds(c) ? length : 0;
}

/// `text` with a question mark for each byte that the document can't hold: one stray byte in a title must not
/// make the whole document unreadable.
std::string xmlText(std::string_view text) {
  std::string out;
  while (!text.empty()) {
    const std::size_t length = characterLength(text);
    if (length == 0) {
      out += '?';
    } else {
      out += text.substr(0, length);
    }
    text.remove_prefix(length == 0 ? 1 : length);
  }
  return out;
}

/// One "RecordingProperty" element: the key first, the value second.
void elementWithKey(pugi::xml_node parent, const std::string& key, const std::string& value) {
  pugi::xml_node element = parent.append_child("RecordingProperty");
  element.append_attribute("key").set_value(xmlText(key).c_str());
  element.append_attribute("value").set_value(xmlText(value).c_str());
}

}  // namespace

std::string AgentSubmit::propertiesXml() const {
  pugi::xml_document document;
  pugi::xml_node declaration = document.append_child(pugi::node_declaration);
  declaration.append_attribute("version") = "1.0";
  declaration.append_attribute("encoding") = "UTF-8";
  pugi::xml_node list =
      document.append_child("LumexServerAgentRecordingProperties").append_child("RecordingProperties");
  for (const auto& [key, value] : properties_) elementWithKey(list, key, value);
  std::ostringstream out;
  document.save(out, "    ", pugi::format_default, pugi::encoding_utf8);
  return out.str();
}

bool AgentSubmit::tryWriteProperties() const {
  if (!properties_file_path_) return true;
  if (const int error = writeFileAtomically(*properties_file_path_, propertiesXml(), 0644)) {
    LMPLogMessage(agentContext_ ? agentContext_->log_context() : nullptr, kLogWarning,
                  "The properties document \"%s\" could not be written: %s", properties_file_path_->c_str(),
                  std::strerror(error));
    return false;
  }
  return true;
}

int AgentSubmit::writeProperties() const {
  static_cast<void>(tryWriteProperties());
  return 0;
}

}  // namespace lmx
