// What the properties of PipeWire's nodes mean.
#include "capture/source/pipewire_node.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

PipeWireNode node(std::map<std::string, std::string> properties) {
  PipeWireNode one;
  one.properties = std::move(properties);
  return one;
}

TEST(PipeWireNode, CamerasAndMicrophonesAreToldByTheirClass) {
  const struct {
    const char* kind;
    bool camera, microphone;
  } cases[] = {{"Video/Source", true, false},
               {"Video/Source/Virtual", true, false},
               {"Audio/Source", false, true},
               {"Audio/Source/Virtual", false, true},
               {"Stream/Output/Audio", false, false},
               {"Audio/Sink", false, false},
               {"Audio/Duplex", false, false},
               {"Video/Sources", false, false},
               {"", false, false},
               {"/", false, false}};
  for (const auto& one : cases) {
    const PipeWireNode it = node({{"media.class", one.kind}});
    EXPECT_EQ(isCapture(it, true), one.camera) << one.kind;
    EXPECT_EQ(isCapture(it, false), one.microphone) << one.kind;
  }
  EXPECT_FALSE(isCapture(node({}), true));
}

TEST(PipeWireNode, OneThatTakesAndGivesIsNoDevice) {
  const struct {
    unsigned inputs, outputs;
    bool oneWay;
  } cases[] = {{0, 1, true}, {1, 0, true}, {0, 64, true}, {1, 1, false}, {0, 0, false}};
  for (const auto& one : cases) {
    PipeWireNode it;
    it.inputs = one.inputs;
    it.outputs = one.outputs;
    EXPECT_EQ(goesOneWay(it), one.oneWay) << one.inputs << " to " << one.outputs;
  }
}

TEST(PipeWireNode, HasANameForPeopleAndOneForTheElement) {
  const PipeWireNode it = node(
      {{"node.name", "alsa_input.usb-1"}, {"node.description", "Desk microphone"}, {"object.serial", "71"}});
  EXPECT_EQ(nameOf(it), "Desk microphone");
  EXPECT_EQ(targetOf(it), "71");
  EXPECT_EQ(nameOf(node({})), "unknown");
  EXPECT_EQ(targetOf(node({{"node.name", "mic"}})), "mic");
  EXPECT_EQ(targetOf(node({})), "");
}

TEST(PipeWireNode, HardwareThatTheServerDrivesIsNotListedByItsPlugInToo) {
  EXPECT_EQ(providerReplacedBy(node({{"object.path", "v4l2:/dev/video0"}})), "v4l2deviceprovider");
  EXPECT_EQ(providerReplacedBy(node({{"object.path", "alsa:pcm:0:front:0:capture"}})), "pulsedeviceprovider");
  EXPECT_EQ(providerReplacedBy(node({{"object.path", "libcamera:1"}})), "libcameraprovider");
  EXPECT_EQ(providerReplacedBy(node({{"object.path", "other:v4l2:"}})), "");
  EXPECT_EQ(providerReplacedBy(node({})), "");
}

}  // namespace
}  // namespace lmx
