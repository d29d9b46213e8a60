// Options from the command line.
#pragma once
#include <cstdint>
#include <optional>
#include <string>

#include "model/codes.h"
#include "support/shared_value.h"

namespace lmx {

/// Fields are thread-safe. A text that was never set is absent, which differs from empty.
struct RunOptions {
  using Text = std::optional<std::string>;

  SharedValue<bool> adhoc;  ///< ad-hoc mode: a client of the running daemon
  SharedValue<Text> adhoc_output_file;
  SharedValue<std::int32_t> duration{240};   ///< passed on as the maximum recording length, minutes
  SharedValue<std::int32_t> unattended{60};  ///< minutes
  SharedValue<std::int32_t> adhoc_request_type{kAdHocRecording};  ///< an AdHocRequest
  SharedValue<Text> start_timer;                                  ///< start time of an ad-hoc recording
  SharedValue<Text> timer_id;                                     ///< identifier of the timer to revoke
  SharedValue<Text> user;      ///< for ad-hoc submission; a START may override it
  SharedValue<Text> password;  ///< likewise
  SharedValue<bool> submit_disabled;
};

}  // namespace lmx
