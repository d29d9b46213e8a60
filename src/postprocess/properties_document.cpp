// Writes properties as XML.
#include "postprocess/properties_document.h"

#include <pugixml.hpp>

#include <sstream>
#include <string_view>

#include "platform/paths.h"
#include "support/utf8.h"

namespace lmx {
namespace {

constexpr std::string_view kSubstitute = "?";

/// Appends one "RecordingProperty" element with the key first and the value second.
void elementWithKey(pugi::xml_node parent, const std::string& key, const std::string& value) {
  pugi::xml_node element = parent.append_child("RecordingProperty");
  element.append_attribute("key").set_value(xmlText(key, kSubstitute).c_str());
  element.append_attribute("value").set_value(xmlText(value, kSubstitute).c_str());
}

}  // namespace

std::string propertiesXml(const Dictionary& properties) {
  pugi::xml_document document;
  pugi::xml_node declaration = document.append_child(pugi::node_declaration);
  declaration.append_attribute("version") = "1.0";
  declaration.append_attribute("encoding") = "UTF-8";
  pugi::xml_node list =
      document.append_child("LumexServerAgentRecordingProperties").append_child("RecordingProperties");
  for (const auto& [key, value] : properties) elementWithKey(list, key, value);
  std::ostringstream out;
  document.save(out, "    ", pugi::format_default, pugi::encoding_utf8);
  return out.str();
}

std::string propertiesPathFor(const std::string& movie, LMPLogContext log) {
  if (movie.find(".mov") == std::string::npos) {
    LMPLogMessage(log, kLogWarning, "The movie \"%s\" is not named .mov: its properties go to \"%s.xml\"",
                  movie.c_str(), movie.c_str());
  }
  return documentPathOf(movie);
}

}  // namespace lmx
