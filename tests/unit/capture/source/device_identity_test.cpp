// Which listed devices are the same, and what they are called.
#include "capture/source/device_identity.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

using Properties = std::map<std::string, std::string>;

ListedDevice camera(DeviceInterface interface, Properties properties) {
  return {.interface = interface, .isVideo = true, .name = "Camera", .properties = std::move(properties)};
}
ListedDevice microphone(DeviceInterface interface, Properties properties) {
  return {
      .interface = interface, .isVideo = false, .name = "Microphone", .properties = std::move(properties)};
}

/// Identifiers in order, "-" for what the list leaves out.
std::vector<std::string> identifiers(const std::vector<ListedDevice>& devices) {
  std::vector<std::string> ids;
  for (const DeviceIdentity& identity : identitiesOf(devices))
    ids.push_back(identity.hidden ? "-" : identity.uniqueID);
  return ids;
}

using Texts = std::vector<std::string>;
constexpr auto kV4L2 = DeviceInterface::v4l2;
constexpr auto kPipeWire = DeviceInterface::pipewire;
constexpr auto kPulse = DeviceInterface::pulse;
constexpr auto kAlsa = DeviceInterface::alsa;

TEST(DeviceIdentity, ACameraIsNamedAfterThePlaceWhereItIsPluggedIn) {
  EXPECT_EQ(identifiers({camera(kV4L2, {{"device.path", "/dev/video0"},
                                        {"device.bus_path", "pci-0000:00:14.0-usb-0:1:1.0"},
                                        {"v4l2.device.bus_info", "usb-0000:00:14.0-1"},
                                        {"device.serial", "046d_C920_1234"}})}),
            Texts{"v4l2:pci-0000:00:14.0-usb-0:1:1.0"});
  // Where udev doesn't run.
  EXPECT_EQ(identifiers({camera(
                kV4L2, {{"device.path", "/dev/video0"}, {"v4l2.device.bus_info", "usb-0000:00:14.0-1"}})}),
            Texts{"v4l2:usb-0000:00:14.0-1"});
  EXPECT_EQ(identifiers({camera(kV4L2, {{"device.path", "/dev/video0"}})}), Texts{"v4l2:/dev/video0"});
}

ListedDevice input(const char* path, const char* index) {
  return camera(kV4L2,
                {{"device.path", path}, {"device.bus_path", "pci-0000:03:00.0"}, {kInputIndex, index}});
}

TEST(DeviceIdentity, InputsOfOneCardAreToldApartByTheirIndex) {
  EXPECT_EQ(identifiers({input("/dev/video0", "0"), input("/dev/video1", "1"), input("/dev/video2", "2")}),
            (Texts{"v4l2:pci-0000:03:00.0", "v4l2:pci-0000:03:00.0-video-index1",
                   "v4l2:pci-0000:03:00.0-video-index2"}));
  // The index belongs to the input, whatever its /dev name is today.
  EXPECT_EQ(identifiers({input("/dev/video5", "1"), input("/dev/video7", "0")}),
            (Texts{"v4l2:pci-0000:03:00.0-video-index1", "v4l2:pci-0000:03:00.0"}));
}

TEST(DeviceIdentity, InputsWithoutAnIndexAreToldApartByTheirNames) {
  EXPECT_EQ(identifiers({input("/dev/video1", ""), input("/dev/video0", "")}),
            (Texts{"v4l2:pci-0000:03:00.0-input1", "v4l2:pci-0000:03:00.0"}));
}

TEST(DeviceIdentity, MetadataOfACameraIsNoCamera) {
  ListedDevice metadata = input("/dev/video1", "1");
  metadata.properties["v4l2.device.device_caps"] = "77594624";  // metadata capture, streaming
  ListedDevice picture = input("/dev/video0", "0");
  picture.properties["v4l2.device.device_caps"] = "69206017";  // video capture, streaming
  EXPECT_EQ(identifiers({metadata, picture}), (Texts{"-", "v4l2:pci-0000:03:00.0"}));
}

TEST(DeviceIdentity, ACameraThatPipeWireHasTooIsListedOnce) {
  EXPECT_EQ(
      identifiers({camera(kPipeWire, {{"node.name", "v4l2_input.usb"}, {"api.v4l2.path", "/dev/video0"}}),
                   camera(kPipeWire, {{"node.name", "obs"}}),
                   camera(kV4L2, {{"device.path", "/dev/video0"}, {"device.bus_path", "pci-1"}})}),
      (Texts{"-", "pipewire:obs", "v4l2:pci-1"}));
}

TEST(DeviceIdentity, CamerasOfOneNameAreTwo) {
  EXPECT_EQ(identifiers({camera(kPipeWire, {{"node.name", "podium"}}),
                         camera(kPipeWire, {{"node.name", "podium2"}})}),
            (Texts{"pipewire:podium", "pipewire:podium2"}));
}

TEST(DeviceIdentity, AMicrophoneIsListedOnceAsTheSoundServerHasIt) {
  const Properties node{{"node.name", "alsa_input.usb-1"}, {"device.api", "alsa"}, {"alsa.card", "1"}};
  EXPECT_EQ(identifiers({microphone(kAlsa, {{"alsa.card", "1"}, {"alsa.name", "USB"}}),
                         microphone(kPulse, node), microphone(kPipeWire, node),
                         microphone(kAlsa, {{"alsa.card", "2"}, {"alsa.name", "PCH"}})}),
            (Texts{"-", "-", "pipewire:alsa_input.usb-1", "alsa:PCH"}));
  // Nodes that are no card's.
  EXPECT_EQ(identifiers(
                {microphone(kPipeWire, {{"node.name", "mic"}}), microphone(kPulse, {{"node.name", "mic"}})}),
            (Texts{"pipewire:mic", "-"}));
}

TEST(DeviceIdentity, SeveralMicrophonesOfACardAreSeveral) {
  EXPECT_EQ(identifiers({microphone(kPipeWire, {{"node.name", "analog"}, {"alsa.card", "0"}}),
                         microphone(kPipeWire, {{"node.name", "digital"}, {"alsa.card", "0"}})}),
            (Texts{"pipewire:analog", "pipewire:digital"}));
  EXPECT_EQ(
      identifiers(
          {microphone(kPulse, {{"device.bus_path", "pci-1"}, {"alsa.card", "0"}, {"alsa.device", "0"}}),
           microphone(kPulse, {{"device.bus_path", "pci-1"}, {"alsa.card", "0"}, {"alsa.device", "2"}})}),
      (Texts{"alsa:pci-1", "alsa:pci-1-2"}));
}

TEST(DeviceIdentity, AMonitorOfASpeakerIsNoMicrophone) {
  EXPECT_EQ(identifiers({microphone(kPulse, {{"node.name", "speaker"}, {"device.class", "monitor"}})}),
            Texts{"-"});
}

TEST(DeviceIdentity, WhatHasNoNameIsLeftOut) {
  EXPECT_EQ(identifiers({camera(DeviceInterface::other, {}), microphone(kAlsa, {})}), (Texts{"-", "-"}));
}

TEST(DeviceIdentity, ACameraAndItsMicrophoneShareTheirDevice) {
  const auto identities = identitiesOf(
      {camera(kV4L2, {{"device.bus_path", "pci-0000:00:14.0-usb-0:1:1.0"}}),
       microphone(kPulse, {{"device.bus_path", "pci-0000:00:14.0-usb-0:1:1.2"}, {"alsa.card", "1"}}),
       microphone(kPulse, {{"device.bus_path", "pci-0000:00:1f.3"}, {"alsa.card", "0"}}),
       microphone(kPipeWire, {{"node.name", "a"}, {"alsa.card", "2"}, {kPhysicalDevice, "/sys/1-1"}})});
  EXPECT_EQ(identities[0].parent, "pci-0000:00:14.0-usb-0:1");
  EXPECT_EQ(identities[1].parent, identities[0].parent);
  EXPECT_EQ(identities[2].parent, "pci-0000:00:1f.3");
  EXPECT_EQ(identities[3].parent, "/sys/1-1");
}

TEST(DeviceIdentity, OnlyHardwareIsReal) {
  const auto identities = identitiesOf({
      camera(kV4L2, {{"device.path", "/dev/video0"}, {"v4l2.device.driver", "uvcvideo"}}),
      camera(kV4L2, {{"device.path", "/dev/video9"}, {"v4l2.device.driver", "v4l2 loopback"}}),
      camera(kPipeWire, {{"node.name", "obs"}}),
      camera(kPipeWire, {{"node.name", "libcamera"}, {"device.api", "libcamera"}}),
      microphone(kPipeWire, {{"node.name", "usb"}, {"device.api", "alsa"}}),
      microphone(kPipeWire, {{"node.name", "echo-cancel"}, {"device.api", "alsa"}, {"node.virtual", "true"}}),
      microphone(kAlsa, {{"alsa.card", "3"}, {"alsa.name", "Loopback"}, {"alsa.driver_name", "snd_aloop"}}),
  });
  std::vector<bool> real;
  for (const auto& identity : identities) real.push_back(identity.isReal);
  EXPECT_EQ(real, (std::vector<bool>{true, false, false, true, true, false, false}));
}

TEST(DeviceIdentity, TheDefaultIsKnownFromAnyOfItsEntries) {
  const auto identities = identitiesOf({microphone(kPipeWire, {{"node.name", "a"}}),
                                        microphone(kPulse, {{"node.name", "a"}, {"is-default", "true"}})});
  EXPECT_TRUE(identities[0].isDefault);
}

}  // namespace
}  // namespace lmx
