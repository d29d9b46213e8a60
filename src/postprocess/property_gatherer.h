// Gathers the properties of a document that its START did not give.
#pragma once
#include <cstdint>
#include <optional>
#include <string>

#include "model/agent_settings.h"
#include "record/agent_record.h"
#include "support/dictionary.h"
#include "support/time_value.h"

namespace lmx {

/// The value for `name`; absent when the name or the property is absent.
std::optional<std::string> getProperty(const Dictionary& properties, const std::optional<std::string>& name);
/// @return false when either is absent or the name already exists; existing values are never replaced
bool addValue(Dictionary& properties, const std::optional<std::string>& value,
              const std::optional<std::string>& name);

/// The steps that add properties. Each returns false when an add fails, which skips the rest.
class PropertyGatherer {
 public:
  using Text = std::optional<std::string>;
  using Time = std::optional<TimeValue>;

  /// Both arguments outlive the object. @param properties  receives the properties
  PropertyGatherer(Dictionary& properties, const RecordingDefaults& defaults)
      : properties_(properties), defaults_(defaults) {}

  bool addIfMissing(const char* name, const Text& value);
  bool addDates(const Time& started, const Time& stopped);
  /// @param record  the session that recorded; may be null
  /// @param duration  whole seconds of media
  bool addRecording(const AgentRecord* record, std::int64_t duration);
  bool addAudio();
  bool addExtension(const std::string& movie);

 private:
  [[nodiscard]] bool missing(const char* name) const;
  bool addType(std::int32_t code);
  bool addImageSide(const char* name, std::uint32_t pixels);

  Dictionary& properties_;
  const RecordingDefaults& defaults_;
};

}  // namespace lmx
