// The properties document.
#include <pugixml.hpp>

#include <cstring>
#include <sstream>
#include <string_view>

#include "platform/directories.h"
#include "platform/log.h"
#include "postprocess/agent_submit.h"
#include "support/utf8.h"

namespace lmx {
namespace {

constexpr std::string_view kSubstitute = "?";

/// One "RecordingProperty" element: the key first, the value second.
void elementWithKey(pugi::xml_node parent, const std::string& key, const std::string& value) {
  pugi::xml_node element = parent.append_child("RecordingProperty");
  element.append_attribute("key").set_value(xmlText(key, kSubstitute).c_str());
  element.append_attribute("value").set_value(xmlText(value, kSubstitute).c_str());
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

int AgentSubmit::writeProperties() {
  documented_ = tryWriteProperties();
  return 0;
}

}  // namespace lmx
