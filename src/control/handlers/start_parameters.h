// Checks the parameters of a START.
#pragma once
#include <string>

#include "support/dictionary.h"

namespace lmx {

struct StartCheck {
  bool accepted = false;
  std::string problem;  ///< why not, in words for the log; empty where the reply says enough
};

/// Whether a recording can be made with `parameters` (null: none): the three that are required are there, and
/// what names the movie can name a file. A name that no file system bears would only fail at the end of the
/// recording. Pure.
StartCheck checkStart(const Dictionary* parameters);

}  // namespace lmx
