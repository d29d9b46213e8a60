// Device identifiers.
#include "capture/source/device_id.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

TEST(DeviceID, KindsAndOptions) {
  EXPECT_EQ(parseDeviceID("v4l2:usb-1").kind, DeviceKind::hardware);
  EXPECT_EQ(parseDeviceID("file:///a/b.mov").name, "/a/b.mov");
  EXPECT_EQ(parseDeviceID("rtsp://host/x").kind, DeviceKind::network);
  EXPECT_EQ(parseDeviceID("/dev/video0").kind, DeviceKind::unknown);
  const DeviceID id = parseDeviceID("test://video?size=321x180&lost-after=2.5&speed=max");
  EXPECT_EQ(id.name, "video");
  EXPECT_EQ(pictureSize(id).width, 320);
  EXPECT_EQ(pictureSize(id).height, 180);
  EXPECT_EQ(id.seconds("lost-after"), 2.5);
  EXPECT_FALSE(id.seconds("eos-after"));
  EXPECT_TRUE(id.asFastAsPossible());
  EXPECT_EQ(pictureSize(parseDeviceID("test://video?size=nonsense")).width, 1280);
}

}  // namespace
}  // namespace lmx
