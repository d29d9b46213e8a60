// Feeds arbitrary bytes to the property list reader; what it accepts must survive being written and read
// again.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>

#include "platform/plist/property_list.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const lmx::PlistResult result = lmx::parsePropertyList({reinterpret_cast<const char*>(data), size});
  if (!result && result.error().message.empty()) std::abort();
  if (!result) return 0;
  const std::string text = lmx::propertyListXml(*result);
  if (text.size() < lmx::kPlistFileLimit && !lmx::parsePropertyList(text)) std::abort();
  return 0;
}
