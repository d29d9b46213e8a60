// What the command line asks for.
#pragma once
#include <cstdint>
#include <optional>
#include <string>

#include "model/codes.h"
#include "support/shared_value.h"

namespace lmx {

/// Fields are thread-safe. A text that nobody has set is absent, which is not the same as empty.
struct RunOptions {
  using Text = std::optional<std::string>;

  SharedValue<bool> adhoc;  ///< ad-hoc mode: a client of the running daemon
  SharedValue<Text> adhoc_output_file;
  SharedValue<std::int32_t> duration{240};   ///< passed on as the greatest length of a recording, minutes
  SharedValue<std::int32_t> unattended{60};  ///< minutes
  SharedValue<std::int32_t> adhoc_request_type{kAdHocRecording};  ///< an AdHocRequest
  SharedValue<Text> start_timer;                                  ///< when an ad-hoc recording is to begin
  SharedValue<Text> timer_id;                                     ///< the timer to revoke
  SharedValue<Text> user;      ///< of an ad-hoc submission; a START may name another
  SharedValue<Text> password;  ///< the same
  SharedValue<bool> submit_disabled;
};

}  // namespace lmx
