// Which mode a camera is opened with.
#include "capture/source/camera_mode.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

std::vector<CameraMode> modesFrom(const std::string& caps) {
  ensureGStreamer();
  const CapsHandle parsed(gst_caps_from_string(caps.c_str()));
  EXPECT_TRUE(parsed) << caps;
  return offeredModes(parsed.get());
}

std::string rates(const std::string& list) { return ",framerate=(fraction){" + list + "};"; }

std::string raw(const std::string& format, const std::string& size, const std::string& list) {
  const std::size_t x = size.find('x');
  return "video/x-raw,format=" + format + ",width=" + size.substr(0, x) + ",height=" + size.substr(x + 1) +
         rates(list);
}

std::string coded(const std::string& name, const std::string& size, const std::string& list) {
  const std::size_t x = size.find('x');
  return name + ",width=" + size.substr(0, x) + ",height=" + size.substr(x + 1) + rates(list);
}
std::string jpeg(const std::string& size, const std::string& list) { return coded("image/jpeg", size, list); }
std::string h264(const std::string& size, const std::string& list) {
  return coded("video/x-h264", size, list);
}

struct Camera {
  const char* name;
  std::string caps;
  CameraDemand demand;
  const char* chosen;
  const char* reason;
};

const CameraDemand kUsual;
const CameraDemand kHD{.size = {1280, 720}};
const CameraDemand kSlow{.maximumRate = 15};
const CameraDemand kPAL{.maximumRate = 25};

const std::string kFullHDWebcam =
    raw("YUY2", "640x480", "30/1,24/1,15/1") + raw("YUY2", "1280x720", "10/1,5/1") +
    raw("YUY2", "1920x1080", "5/1") + raw("YUY2", "2304x1536", "2/1") + jpeg("640x480", "30/1,24/1,15/1") +
    jpeg("1280x720", "30/1,24/1,15/1") + jpeg("1920x1080", "30/1,24/1,20/1,15/1,5/1") +
    h264("1920x1080", "30/1,24/1,15/1");
const std::string kWebcam4K = raw("YUY2", "640x480", "30/1") + raw("YUY2", "1920x1080", "5/1") +
                              raw("NV12", "1920x1080", "30/1,24/1") + jpeg("1920x1080", "60/1,30/1,24/1") +
                              jpeg("3840x2160", "30/1,24/1") + h264("3840x2160", "30/1");
const std::string kRawWebcam4K = jpeg("4096x2160", "30/1") + jpeg("3840x2160", "30/1") +
                                 jpeg("1920x1080", "60/1,30/1") + jpeg("1280x720", "60/1,30/1") +
                                 raw("YUY2", "640x360", "30/1") + h264("3840x2160", "30/1") +
                                 h264("1920x1080", "30/1");
const std::string kFastGrabber = raw("YUY2", "1920x1080", "60/1,50/1,30/1,25/1,24/1") +
                                 raw("NV12", "1920x1080", "60/1,50/1,30/1,25/1,24/1") +
                                 raw("NV12", "1280x720", "60/1,50/1,30/1") +
                                 raw("YUY2", "720x576", "50/1,25/1");
const std::string kCheapGrabber = jpeg("1920x1080", "60/1,50/1,30/1,25/1,20/1,10/1") +
                                  jpeg("1600x1200", "60/1,30/1") + jpeg("1280x720", "60/1,30/1") +
                                  raw("YUY2", "1920x1080", "5/1") + raw("YUY2", "1280x720", "10/1") +
                                  raw("YUY2", "640x480", "30/1,20/1");
const std::string kDocumentCamera = jpeg("3264x2448", "15/1") + jpeg("2592x1944", "15/1") +
                                    jpeg("2048x1536", "30/1") + jpeg("1920x1080", "30/1,15/1") +
                                    jpeg("1600x1200", "30/1") + raw("YUY2", "1600x1200", "5/1") +
                                    raw("YUY2", "800x600", "20/1");
const std::string kPTZ = raw("YUY2", "1920x1080", "30/1,25/1") + raw("YUY2", "960x540", "30/1") +
                         jpeg("1920x1080", "60/1,30/1,25/1") + h264("1920x1080", "60/1,30/1,25/1");
const std::string kAnySize =
    "video/x-raw,format={YUY2,NV12,BGRx},width=[1,2147483647],height=[1,2147483647],framerate=[0/1,1000/1]";
const std::string kSteps =
    "video/x-raw,format=NV12,width=[160,2592,2],height=[120,1944,2],framerate=[1/1,60/1]";

class CameraModes : public ::testing::TestWithParam<Camera> {};

TEST_P(CameraModes, TheChoice) {
  const Camera& camera = GetParam();
  const auto modes = modesFrom(camera.caps);
  const auto chosen = chooseMode(modes, camera.demand);
  ASSERT_TRUE(chosen);
  EXPECT_EQ(describe(*chosen), camera.chosen);
  EXPECT_EQ(reasonFor(*chosen, modes, camera.demand), camera.reason);
  // The filter lets the camera through.
  const CapsHandle offered(gst_caps_from_string(camera.caps.c_str()));
  EXPECT_TRUE(gst_caps_can_intersect(offered.get(), capsOf(*chosen).get()));
}

INSTANTIATE_TEST_SUITE_P(
    Table, CameraModes,
    ::testing::Values(
        Camera{"FullHDWebcam", kFullHDWebcam, kUsual, "1920x1080 at 30 fps, JPEG",
               "the smallest that gives 1920x1080; raw gives 5 fps at that size"},
        Camera{"FullHDWebcamAt720p", kFullHDWebcam, kHD, "1280x720 at 30 fps, JPEG",
               "the smallest that gives 1280x720; raw gives 10 fps at that size"},
        Camera{"FullHDWebcamFor640x480",
               kFullHDWebcam,
               {.size = {640, 480}},
               "640x480 at 30 fps, raw YUY2",
               "the smallest that gives 640x480"},
        Camera{"FullHDWebcamAt25", kFullHDWebcam, kPAL, "1920x1080 at 24 fps, JPEG",
               "the smallest that gives 1920x1080; raw gives 5 fps at that size"},
        Camera{"FullHDWebcamWithoutJPEGDecoder",
               kFullHDWebcam,
               {.decodesJPEG = false},
               "1920x1080 at 30 fps, H.264",
               "the smallest that gives 1920x1080; raw gives 5 fps at that size; JPEG can't be decoded here"},
        Camera{"HDWebcam",
               raw("YUY2", "640x480", "30/1") + raw("YUY2", "1280x720", "10/1") +
                   raw("YUY2", "1280x1024", "7/1") + jpeg("640x480", "30/1") + jpeg("1280x720", "30/1") +
                   jpeg("1280x1024", "30/1"),
               kUsual, "1280x720 at 30 fps, JPEG",
               "the most the camera gives; raw gives 10 fps at that size"},
        Camera{"OldWebcam", raw("YUY2", "640x480", "30/1,15/1") + raw("YUY2", "352x288", "30/1"), kUsual,
               "640x480 at 30 fps, raw YUY2", "the most the camera gives"},
        Camera{"SlowRawWebcam",
               raw("YUY2", "640x480", "30/1") + raw("YUY2", "1280x720", "10/1") +
                   raw("YUY2", "1600x1200", "5/1"),
               kUsual, "1280x720 at 10 fps, raw YUY2", "the most the camera gives"},
        Camera{"Webcam4K", kWebcam4K, kUsual, "1920x1080 at 30 fps, raw NV12",
               "the smallest that gives 1920x1080"},
        Camera{"Webcam4KWithLittleRaw", kRawWebcam4K, kUsual, "1920x1080 at 30 fps, JPEG",
               "the smallest that gives 1920x1080; raw gives 640x360 at most"},
        Camera{"Webcam4KWith15fps", kWebcam4K, kSlow, "1920x1080 at 24 fps, raw NV12",
               "the smallest that gives 1920x1080; no rate at or below 15 fps"},
        Camera{"USB3Grabber", kFastGrabber, kUsual, "1920x1080 at 30 fps, raw NV12",
               "the smallest that gives 1920x1080"},
        Camera{"USB3GrabberAt25", kFastGrabber, kPAL, "1920x1080 at 25 fps, raw NV12",
               "the smallest that gives 1920x1080"},
        Camera{"USB2Grabber", kCheapGrabber, kUsual, "1920x1080 at 30 fps, JPEG",
               "the smallest that gives 1920x1080; raw gives 5 fps at that size"},
        Camera{"GrabberThatFollowsItsSignal", raw("UYVY", "1920x1080", "60/1"), kUsual,
               "1920x1080 at 60 fps, raw UYVY",
               "the smallest that gives 1920x1080; no rate at or below 30 fps"},
        Camera{
            "PALGrabber",
            "video/x-raw,format={YUY2,UYVY},width=720,height=576,interlace-mode=interleaved,framerate=25/1",
            kUsual, "720x576 at 25 fps, raw YUY2, interlaced", "the most the camera gives"},
        Camera{"DocumentCamera", kDocumentCamera, kUsual, "1920x1080 at 30 fps, JPEG",
               "the smallest that gives 1920x1080; raw gives 1600x1200 at most"},
        Camera{"PTZ", kPTZ, kUsual, "1920x1080 at 30 fps, raw YUY2", "the smallest that gives 1920x1080"},
        Camera{"InfraredCamera", raw("GRAY8", "640x400", "30/1,15/1"), kUsual, "640x400 at 30 fps, raw GRAY8",
               "the most the camera gives"},
        Camera{"CameraWithInfraredMode", raw("GRAY8", "1920x1080", "30/1") + jpeg("1280x720", "30/1"), kUsual,
               "1280x720 at 30 fps, JPEG", "the most the camera gives; raw is grey"},
        Camera{"NodeOfAnySize", kAnySize, kUsual, "1920x1080 at 30 fps, raw NV12",
               "the smallest that gives 1920x1080"},
        Camera{"NodeWithSteps", kSteps, kUsual, "1920x1080 at 30 fps, raw NV12",
               "the smallest that gives 1920x1080"},
        Camera{"NodeWithoutRate", "video/x-raw,format=BGRx,width=1280,height=720", kUsual,
               "1280x720, raw BGRx", "the most the camera gives"},
        Camera{"NodeWithSeveralMemories",
               "video/x-raw(memory:DMABuf),format=NV12,width=1920,height=1080,framerate=30/1;" +
                   raw("YUY2", "1280x720", "30/1"),
               kUsual, "1280x720 at 30 fps, raw YUY2", "the most the camera gives"},
        Camera{"Loopback", raw("YUY2", "1280x720", "10000000/333333"), kUsual, "1280x720 at 30 fps, raw YUY2",
               "the most the camera gives"}),
    [](const auto& camera) { return std::string(camera.param.name); });

TEST(CameraMode, SizesOutsideARangeAreTheNearest) {
  const auto modes = modesFrom(kSteps);
  EXPECT_EQ(describe(*chooseMode(modes, {.size = {641, 361}})), "640x360 at 30 fps, raw NV12");
  EXPECT_EQ(describe(*chooseMode(modes, {.size = {8000, 4000}})), "2592x1944 at 30 fps, raw NV12");
  EXPECT_EQ(describe(*chooseMode(modes, {.size = {64, 36}})), "160x120 at 30 fps, raw NV12");
}

TEST(CameraMode, NothingThatCanBeUsed) {
  EXPECT_EQ(chooseMode({}, kUsual), std::nullopt);
  EXPECT_TRUE(modesFrom("ANY").empty());
  EXPECT_TRUE(offeredModes(nullptr).empty());
  EXPECT_TRUE(modesFrom("audio/x-raw,rate=48000;video/x-bayer,width=640,height=480;video/x-raw").empty());
  EXPECT_EQ(chooseMode(modesFrom(h264("1920x1080", "30/1")), {.decodesH264 = false}), std::nullopt);
}

TEST(CameraMode, TheFilterNamesWhatIsKnown) {
  const auto chosen = chooseMode(modesFrom(raw("YUY2", "1280x720", "10000000/333333")), kUsual);
  const GText text(gst_caps_to_string(capsOf(*chosen).get()));
  EXPECT_STREQ(text.get(),
               "video/x-raw, width=(int)1280, height=(int)720, format=(string)YUY2, "
               "framerate=(fraction)10000000/333333");
  const auto bare = chooseMode(modesFrom("image/jpeg,width=640,height=480"), kUsual);
  EXPECT_STREQ(GText(gst_caps_to_string(capsOf(*bare).get())).get(),
               "image/jpeg, width=(int)640, height=(int)480");
}

}  // namespace
}  // namespace lmx
