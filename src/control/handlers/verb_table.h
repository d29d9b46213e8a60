// Which handler belongs to which verb.
#pragma once
#include <functional>
#include <map>
#include <string_view>
#include <utility>

#include "support/dictionary.h"

namespace lmx {

/// Never changes once it is made, so any thread may read it.
class VerbTable {
 public:
  /// @param parameters  null when the command had none
  using Handler = std::function<void(const Dictionary* parameters)>;
  using Entries = std::map<std::string_view, Handler>;

  /// The verbs are literals: they outlive the table.
  explicit VerbTable(Entries entries) : entries_(std::move(entries)) {}

  /// Null when there is none. Case counts.
  [[nodiscard]] const Handler* handlerForVerb(std::string_view verb) const {
    const auto found = entries_.find(verb);
    return found == entries_.end() ? nullptr : &found->second;
  }

 private:
  const Entries entries_;
};

}  // namespace lmx
