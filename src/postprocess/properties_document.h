// The properties document of a recording. Pure.
#pragma once
#include <string>

#include "platform/log.h"
#include "support/dictionary.h"

namespace lmx {

/// The document's text: XML 1.0 in UTF-8, one element per property.
std::string propertiesXml(const Dictionary& properties);

/// The document's path for `movie`: every ".mov" becomes ".xml". A path without ".mov" gets ".xml" appended
/// (logged), since the document must not overwrite the movie.
std::string propertiesPathFor(const std::string& movie, LMPLogContext log);

}  // namespace lmx
