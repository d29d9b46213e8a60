// Choosing among the machine's devices, and the list that people copy identifiers from.
#include "capture/source/device_list.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

std::string formats(const char* caps, bool video) {
  ensureGStreamer();
  return formatsText(CapsHandle(gst_caps_from_string(caps)).get(), video);
}

HardwareDevice device(bool video, const std::string& id, const std::string& parent = "") {
  HardwareDevice made;
  made.uniqueID = id;
  made.name = "Name of " + id;
  made.parent = parent;
  made.isVideo = video;
  return made;
}

TEST(DeviceFormats, PictureSizesWithTheirRatesLargestFirst) {
  EXPECT_EQ(formats("video/x-raw,width=640,height=480,framerate=30/1;"
                    "video/x-raw,width=1280,height=720,framerate={(fraction)30/1,(fraction)15/1};"
                    "image/jpeg,width=1280,height=720,framerate=(fraction)60/1",
                    true),
            "1280x720 at 60/30/15 fps, 640x480 at 30 fps");
  EXPECT_EQ(formats("video/x-raw,width=[16,1920],height=[16,1080],framerate=[0/1,30000/1001]", true),
            "1920x1080 at 29.97 fps");
  EXPECT_EQ(formats("video/x-raw,width=640,height=480", true), "640x480");
}

TEST(DeviceFormats, SampleRatesWithTheirChannels) {
  EXPECT_EQ(formats("audio/x-raw,rate=48000,channels=2;audio/x-raw,rate=44100,channels={1,2}", false),
            "48000 Hz with 2 channels, 44100 Hz with 2/1 channels");
  EXPECT_EQ(formats("audio/x-raw,rate=[8000,48000],channels=[1,2]", false), "48000 Hz with 2/1 channels");
}

TEST(DeviceFormats, NothingToTell) {
  EXPECT_EQ(formats("ANY", true), "");
  EXPECT_EQ(formatsText(nullptr, true), "");
}

TEST(DeviceChoice, AutomaticIsTheFirstOfItsKind) {
  std::vector<HardwareDevice> devices;
  EXPECT_EQ(firstDevice(devices, true), nullptr);
  devices.push_back(device(true, "v4l2:a"));
  devices.push_back(device(true, "v4l2:b"));
  devices.push_back(device(false, "alsa:c"));
  EXPECT_EQ(firstDevice(devices, true)->uniqueID, "v4l2:a");
  EXPECT_EQ(firstDevice(devices, false)->uniqueID, "alsa:c");
}

TEST(DeviceChoice, ACamerasOwnMicrophoneGoesBeforeTheFirst) {
  std::vector<HardwareDevice> devices;
  devices.push_back(device(true, "v4l2:a", "usb-1"));
  devices.push_back(device(true, "v4l2:b"));
  devices.push_back(device(false, "alsa:other"));
  devices.push_back(device(false, "alsa:own", "usb-1"));
  EXPECT_EQ(microphoneFor(devices, "v4l2:a").uniqueID, "alsa:own");
  EXPECT_TRUE(microphoneFor(devices, "v4l2:a").isMuxedAudioOfVideoDevice);
  EXPECT_EQ(microphoneFor(devices, "v4l2:b").uniqueID, "alsa:other");
  EXPECT_FALSE(microphoneFor(devices, "v4l2:b").isMuxedAudioOfVideoDevice);
  EXPECT_EQ(microphoneFor({}, "v4l2:a").uniqueID, std::nullopt);
}

TEST(DeviceChoice, WhatAProgramMakesUpIsNeverAutomatic) {
  std::vector<HardwareDevice> devices;
  devices.push_back(device(true, "pipewire:obs"));
  devices.back().isReal = false;
  EXPECT_EQ(firstDevice(devices, true), nullptr);
  devices.push_back(device(true, "v4l2:b"));
  EXPECT_EQ(firstDevice(devices, true)->uniqueID, "v4l2:b");
}

const char* const kWithoutHardware =
    "  test://video             synthetic, never Automatic; test://video?size=640x360 for another size\n"
    "  file:///PATH/MOVIE       a movie played in real time, with its sound, over and over\n"
    "  rtsp://HOST/PATH         a network camera, with its sound\n"
    "  pipewire:NODE            any output of PipeWire, by its node.name\n"
    "\n"
    "Microphones (audio; for RecordingAudioInput)\n";
const char* const kUnlistedMicrophones =
    "  test://audio             synthetic, never Automatic\n"
    "  alsa:device=NAME         a PCM of ALSA's own configuration\n"
    "  pipewire:NODE            any output of PipeWire, by its node.name\n";

TEST(DeviceList, TellsWhatGoesIntoThePreferences) {
  std::vector<HardwareDevice> devices;
  devices.push_back(device(true, "v4l2:a", "usb-1"));
  devices.back().formats = "640x480 at 30 fps";
  const CapsHandle caps(gst_caps_from_string("video/x-raw,format=YUY2,width=640,height=480,framerate=30/1"));
  devices.back().modes = offeredModes(caps.get());
  devices.push_back(device(true, "v4l2:b"));
  const CapsHandle encoded(gst_caps_from_string("video/x-h264,width=640,height=480,framerate=30/1"));
  devices.back().modes = offeredModes(encoded.get());
  devices.push_back(device(true, "pipewire:obs"));
  devices.back().isReal = false;
  devices.push_back(device(false, "alsa:own", "usb-1"));
  EXPECT_EQ(deviceListText(devices, {.decodesH264 = false}),
            std::string("Cameras (video; for RecordingVideoInput)\n"
                        "  v4l2:a   <- Automatic\n"
                        "    name:       Name of v4l2:a\n"
                        "    formats:    640x480 at 30 fps\n"
                        "    mode:       640x480 at 30 fps, raw YUY2 (the most the camera gives)\n"
                        "    microphone: alsa:own (its own)\n"
                        "  v4l2:b\n"
                        "    name:       Name of v4l2:b\n"
                        "    mode:       none that this machine can decode\n"
                        "    microphone: alsa:own\n"
                        "  pipewire:obs\n"
                        "    name:       Name of pipewire:obs (made up by a program, never Automatic)\n"
                        "    mode:       left to the camera, which tells none\n"
                        "    microphone: alsa:own\n"
                        "  Automatic takes v4l2:a: the first that is hardware\n") +
                kWithoutHardware +
                "  alsa:own   <- Automatic\n"
                "    name:       Name of alsa:own\n"
                "  Automatic takes alsa:own: the only one that is hardware\n" +
                kUnlistedMicrophones);
}

TEST(DeviceList, NamesTheDefaultMicrophone) {
  std::vector<HardwareDevice> devices;
  devices.push_back(device(false, "pipewire:one"));
  devices.back().isDefault = true;
  devices.push_back(device(false, "pipewire:two"));
  EXPECT_NE(deviceListText(devices, {}).find("  Automatic takes pipewire:one: the sound server's default\n"),
            std::string::npos);
}

TEST(DeviceList, OfAMachineWithoutAnySaysSo) {
  EXPECT_EQ(deviceListText({}, {}), std::string("Cameras (video; for RecordingVideoInput)\n"
                                                "  Automatic finds no hardware to choose\n") +
                                        kWithoutHardware + "  Automatic finds no hardware to choose\n" +
                                        kUnlistedMicrophones);
}

}  // namespace
}  // namespace lmx
