// Timed commands as a property list.
#include "control/handlers/timer_entries.h"

#include <memory>
#include <utility>

namespace lmx {
namespace {

/// Null when `value` is no dictionary of strings.
TimedCommandList::Entry entryFrom(const PlistValue& value) {
  const PlistDictionary* item = value.dictionary();
  if (item == nullptr) return nullptr;
  Dictionary entry;
  for (const auto& [key, text] : *item) {
    if (text.string() == nullptr) return nullptr;
    entry.emplace(key, *text.string());
  }
  return std::make_shared<const Dictionary>(std::move(entry));
}

}  // namespace

PlistValue plistFrom(const std::vector<TimedCommandList::Entry>& entries) {
  PlistArray array;
  for (const auto& entry : entries) {
    PlistDictionary item;
    for (const auto& [key, value] : *entry) item.emplace(key, value);
    array.emplace_back(std::move(item));
  }
  return array;
}

TimerEntries timerEntriesFrom(const PlistValue& list) {
  TimerEntries result;
  const auto* array = std::get_if<PlistArray>(&list.value);
  if (array == nullptr) {
    result.problem = "its top level is not an array";
    return result;
  }
  for (const PlistValue& value : *array) {
    if (auto entry = entryFrom(value)) {
      result.entries.push_back(std::move(entry));
    } else {
      result.problem = "not all of its elements are dictionaries of strings";
    }
  }
  return result;
}

}  // namespace lmx
