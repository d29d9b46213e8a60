// Launch lines of the capture pipeline.
#include "capture/source/pipeline_description.h"

#include "support/format.h"

namespace lmx {
namespace {

// A live source sets its own pace; a file is paced by its sinks.
std::string sink(const std::string& name, bool paced) {
  return "appsink name=" + name + (paced ? " sync=true" : " sync=false") +
         " max-buffers=0 enable-last-sample=false qos=false ";
}

std::string rateText(FrameRate rate) { return string_with_format("%d/%d", rate.numerator, rate.denominator); }

std::string videoConversion(FrameRate rate) {
  // Up to full HD and even sizes: what every encoder and player takes.
  return "videoconvert ! videoscale ! videorate ! video/x-raw,format=I420,pixel-aspect-ratio=1/1,"
         "width=[16,1920,2],height=[16,1080,2],framerate=" +
         rateText(rate) + " ! ";
}

std::string audioConversion(int sampleRate, int channels) {
  return string_with_format(
      "audioconvert ! audioresample ! audio/x-raw,format=F32LE,layout=interleaved,rate=%d,channels=%d ! ",
      sampleRate, channels);
}

std::string quoted(const std::string& uri) {
  std::string out = "\"";
  for (const char c : uri) {
    if (c == '"' || c == '\\') out += '\\';
    out += c;
  }
  return out + "\"";
}

std::string testVideo(const DeviceID& id, FrameRate rate) {
  const PictureSize size = pictureSize(id);
  return string_with_format(
             "videotestsrc name=vsource is-live=%s pattern=smpte horizontal-speed=4 ! "
             "video/x-raw,format=I420,width=%d,height=%d,framerate=%s,pixel-aspect-ratio=1/1 ! ",
             id.asFastAsPossible() ? "false" : "true", size.width, size.height, rateText(rate).c_str()) +
         sink("vsink", false);
}

std::string testAudio(const DeviceID& id, int sampleRate, int channels) {
  // A tick at every second of running time: compared with the frame numbers it shows whether picture and
  // sound are in sync.
  return string_with_format(
             "audiotestsrc name=asource is-live=%s wave=ticks freq=1000 samplesperbuffer=%d ! "
             "audio/x-raw,format=F32LE,layout=interleaved,rate=%d,channels=%d ! ",
             id.asFastAsPossible() ? "false" : "true", sampleRate / 100, sampleRate, channels) +
         sink("asink", false);
}

}  // namespace

std::string videoBranch(const DeviceID& video, FrameRate rate) {
  if (video.kind == DeviceKind::test) return testVideo(video, rate);
  if (video.kind == DeviceKind::hardware) return {};
  return "uridecodebin name=vfile uri=" + quoted(video.text) + " vfile. ! queue ! " + videoConversion(rate) +
         sink("vsink", video.kind == DeviceKind::file);
}

std::string audioBranch(const DeviceID& audio, int sampleRate, int channels, bool sameFileAsVideo) {
  if (audio.kind == DeviceKind::test) return testAudio(audio, sampleRate, channels);
  if (audio.kind == DeviceKind::hardware) return {};
  const std::string decoder =
      sameFileAsVideo ? "" : "uridecodebin name=afile uri=" + quoted(audio.text) + " ";
  // Not part of the preroll: a file without sound must still play.
  return decoder + (sameFileAsVideo ? "vfile." : "afile.") + " ! queue ! " +
         audioConversion(sampleRate, channels) + sink("asink", audio.kind == DeviceKind::file) +
         (sameFileAsVideo ? "async=false" : "");
}

std::string deviceVideoBranch(FrameRate rate) {
  return "decodebin ! " + videoConversion(rate) + sink("vsink", false);
}

std::string deviceAudioBranch(int sampleRate, int channels) {
  return "queue ! " + audioConversion(sampleRate, channels) + sink("asink", false);
}

}  // namespace lmx
