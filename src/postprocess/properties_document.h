// The properties document of a recording. Pure.
#pragma once
#include <string>

#include "platform/log.h"
#include "support/dictionary.h"

namespace lmx {

/// The document's text: XML 1.0, UTF-8, one property an element.
std::string propertiesXml(const Dictionary& properties);

/// Where the document of `movie` goes: every ".mov" becomes ".xml"; a path without one gets ".xml" behind it
/// (logged), since the document must not overwrite the movie.
std::string propertiesPathFor(const std::string& movie, LMPLogContext log);

}  // namespace lmx
