// Turns received chunks into lines, at most one line a chunk.
#include "control/protocol/line_assembler.h"

#include <utility>

namespace lmx {

LineAssembler::Result LineAssembler::feed(std::string_view received) {
  const std::string_view chunk = received.substr(0, received.find('\0'));
  const std::size_t line_feed = chunk.find('\n');
  const bool ends = line_feed != std::string_view::npos;
  const std::string_view head = chunk.substr(0, line_feed);
  const std::string_view rest = ends ? chunk.substr(line_feed + 1) : std::string_view();

  Result result;
  std::optional<std::string> before = std::exchange(partial_, std::nullopt);
  if ((before ? before->size() : 0) + head.size() > limit_) {
    result.dropped = true;
  } else if (!ends) {
    result.appended = before.has_value();
    partial_ = before ? std::move(before) : std::string();
    partial_->append(head);
    return result;
  } else if (before) {
    result.line = std::move(before);
    result.line->append(head);
  } else {
    result.line = std::string(chunk.substr(0, line_feed + 1));
  }
  if (rest.size() > limit_) {
    result.dropped = true;
  } else if (!rest.empty()) {
    partial_ = std::string(rest);
  }
  return result;
}

}  // namespace lmx
