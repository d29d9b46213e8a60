// Thresholds of signal trouble.
#include "prefs/signal_settings.h"

#include <gtest/gtest.h>

#include <map>

#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

SignalThresholds thresholdsFrom(const std::map<std::string, std::string>& texts) {
  return signalThresholds([&texts](const char* key) {
    const auto found = texts.find(key);
    return found == texts.end() ? std::nullopt : std::optional(found->second);
  });
}

TEST(SignalSettings, NothingSaidIsTheDefaults) { EXPECT_EQ(thresholdsFrom({}), SignalThresholds{}); }

TEST(SignalSettings, EachHasItsKey) {
  const SignalThresholds expected{.seconds = 30,
                                  .silenceDecibels = -60.5,
                                  .clippingDecibels = -1,
                                  .blackLevel = 40,
                                  .frozenDifference = 2};
  EXPECT_EQ(thresholdsFrom({{"SignalWarningSeconds", "30"},
                            {"SignalSilenceDecibels", "-60.5"},
                            {"SignalClippingDecibels", "-1"},
                            {"SignalBlackLevel", "40"},
                            {"SignalFrozenDifference", "2"}}),
            expected);
}

TEST(SignalSettings, EachCanBeSwitchedOff) {
  EXPECT_EQ(thresholdsFrom({{"SignalWarningSeconds", "off"}}).seconds, 0);
  EXPECT_EQ(thresholdsFrom({{"SignalWarningSeconds", "0"}}).seconds, 0);
  EXPECT_EQ(thresholdsFrom({{"SignalSilenceDecibels", "off"}}).silenceDecibels, std::nullopt);
  EXPECT_EQ(thresholdsFrom({{"SignalClippingDecibels", "off"}}).clippingDecibels, std::nullopt);
  EXPECT_EQ(thresholdsFrom({{"SignalBlackLevel", "off"}}).blackLevel, std::nullopt);
  EXPECT_EQ(thresholdsFrom({{"SignalFrozenDifference", "off"}}).frozenDifference, std::nullopt);
}

TEST(SignalSettings, NonsenseCountsAsMissing) {
  using Bad = std::pair<const char*, const char*>;
  for (const auto& [key, text] :
       {Bad{"SignalWarningSeconds", "ten"}, Bad{"SignalWarningSeconds", "-1"},
        Bad{"SignalWarningSeconds", ""}, Bad{"SignalSilenceDecibels", "80"},
        Bad{"SignalSilenceDecibels", "nan"}, Bad{"SignalClippingDecibels", "-0.1 dB"},
        Bad{"SignalClippingDecibels", "1"}, Bad{"SignalBlackLevel", "256"},
        Bad{"SignalFrozenDifference", "-1"}}) {
    testing::LogCapture log;
    EXPECT_EQ(thresholdsFrom({{key, text}}), SignalThresholds{}) << key << " " << text;
    ASSERT_EQ(log.entries().size(), 1U) << key << " " << text;
    EXPECT_EQ(log.entries()[0].level, kLogWarning);
  }
  testing::LogCapture log;
  thresholdsFrom({{"SignalBlackLevel", "dark"}});
  EXPECT_TRUE(log.contains(kLogWarning, "The preference \"SignalBlackLevel\" can't be \"dark\"; 24 is used"));
}

}  // namespace
}  // namespace lmx
