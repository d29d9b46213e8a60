// Which of GStreamer's plug-ins are asked for devices.
#include "capture/source/device_providers.h"

#include <gtest/gtest.h>

#include <cstdlib>

#include "capture/gst/gst_handles.h"

namespace lmx {
namespace {

/// Not where the plug-in is not installed.
bool isAsked(const char* provider) {
  const GstHandle<GstDeviceProviderFactory> factory(gst_device_provider_factory_find(provider));
  return factory && gst_plugin_feature_get_rank(GST_PLUGIN_FEATURE(factory.get())) > GST_RANK_NONE;
}

TEST(DeviceProviders, PipeWiresIsNeverAsked) {
  ensureGStreamer();
  chooseProviders({});
  EXPECT_FALSE(isAsked("pipewiredeviceprovider"));
}

TEST(DeviceProviders, OneThatPipeWireReplacesIsAskedAgainAfterwards) {
  ensureGStreamer();
  setenv("PULSE_SERVER", "unix:/nowhere", 1);
  chooseProviders({});
  EXPECT_TRUE(isAsked("v4l2deviceprovider"));
  EXPECT_TRUE(isAsked("pulsedeviceprovider"));
  chooseProviders({"v4l2deviceprovider"});
  EXPECT_FALSE(isAsked("v4l2deviceprovider"));
  EXPECT_TRUE(isAsked("pulsedeviceprovider"));
  chooseProviders({"pulsedeviceprovider"});
  EXPECT_TRUE(isAsked("v4l2deviceprovider"));
  EXPECT_FALSE(isAsked("pulsedeviceprovider"));
  unsetenv("PULSE_SERVER");
  chooseProviders({});
}

}  // namespace
}  // namespace lmx
