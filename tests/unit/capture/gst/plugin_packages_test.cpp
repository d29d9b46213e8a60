// Which package is named for which missing element.
#include "capture/gst/plugin_packages.h"

#include <gtest/gtest.h>

#include <set>

#include "platform/log.h"
#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

std::vector<MissingPackage> without(const std::set<std::string>& elements) {
  return missingPackages([&](const std::string& element) { return !elements.contains(element); });
}

TEST(PluginPackages, EachElementBelongsToItsPackage) {
  struct Case {
    const char* element;
    const char* package;
    int level;
  };
  constexpr Case kCases[] = {{"decodebin", "gstreamer1.0-plugins-base", kLogError},
                             {"v4l2src", "gstreamer1.0-plugins-good", kLogError},
                             {"rtspsrc", "gstreamer1.0-plugins-good", kLogError},
                             {"x264enc", "gstreamer1.0-plugins-ugly", kLogError},
                             {"avenc_aac", "gstreamer1.0-libav", kLogError},
                             {"h264parse", "gstreamer1.0-plugins-bad", kLogWarning},
                             {"alsasrc", "gstreamer1.0-alsa", kLogWarning},
                             {"pipewiresrc", "gstreamer1.0-pipewire", kLogInfo}};
  for (const Case& c : kCases) {
    const auto missing = without({c.element});
    ASSERT_EQ(missing.size(), 1U) << c.element;
    EXPECT_EQ(missing[0].package, c.package);
    EXPECT_EQ(missing[0].element, c.element);
    EXPECT_EQ(missing[0].level, c.level) << c.element;
    EXPECT_FALSE(missing[0].consequence.empty());
  }
}

TEST(PluginPackages, AMissingPackageIsOneEntry) {
  EXPECT_TRUE(without({}).empty());
  const auto missing = without({"avenc_aac", "avdec_h264", "alsasrc"});
  ASSERT_EQ(missing.size(), 2U);
  EXPECT_EQ(missing[0].package, "gstreamer1.0-libav");
  EXPECT_EQ(missing[0].element, "avenc_aac");
  EXPECT_EQ(missing[1].package, "gstreamer1.0-alsa");
}

TEST(PluginPackages, TheMachineThatRunsTheTestsCanRecord) {
  const testing::LogCapture log;
  loadPlugins();
  for (const auto& entry : log.entries()) EXPECT_GE(entry.level, kLogWarning) << entry.text;
}

}  // namespace
}  // namespace lmx
