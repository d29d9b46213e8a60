// Listing the machine's devices, whatever they are.
#include "capture/source/devices.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <iterator>

namespace lmx {
namespace {

auto openFiles() {
  return std::distance(std::filesystem::directory_iterator("/proc/self/fd"),
                       std::filesystem::directory_iterator());
}

// A microphone that is away is looked for every few seconds, for days.
TEST(Devices, ListingThemKeepsNoFilesOpen) {
  listHardware();  // what a plug-in opens once and for all
  const auto before = openFiles();
  for (int i = 0; i < 5; ++i) listHardware();
  EXPECT_LT(openFiles() - before, 5);
}

}  // namespace
}  // namespace lmx
