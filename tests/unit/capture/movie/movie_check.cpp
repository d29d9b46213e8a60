// Decoding through uridecodebin.
#include "tests/unit/capture/movie/movie_check.h"

#include <gst/app/gstappsink.h>
#include <gst/video/video.h>

#include <cmath>

#include "capture/gst/gst_handles.h"
#include "capture/source/test_picture.h"

namespace lmx::testing {
namespace {

double secondsOf(GstSample* sample) {
  GstBuffer* buffer = gst_sample_get_buffer(sample);
  return static_cast<double>(gst_segment_to_running_time(gst_sample_get_segment(sample), GST_FORMAT_TIME,
                                                         GST_BUFFER_PTS(buffer))) /
         1e9;
}

void takeFrame(GstSample* sample, DecodedMovie& movie) {
  GstVideoInfo info;
  GstVideoFrame frame;
  gst_video_info_from_caps(&info, gst_sample_get_caps(sample));
  if (gst_video_frame_map(&frame, &info, gst_sample_get_buffer(sample), GST_MAP_READ) == FALSE) return;
  const int stride = GST_VIDEO_FRAME_PLANE_STRIDE(&frame, 0);
  movie.width = info.width;
  movie.height = info.height;
  movie.frameNumbers.push_back(
      readFrameNumber({{static_cast<std::uint8_t*>(GST_VIDEO_FRAME_PLANE_DATA(&frame, 0)),
                        static_cast<std::size_t>(stride) * static_cast<std::size_t>(info.height)},
                       info.width,
                       info.height,
                       stride}));
  movie.frameTimes.push_back(secondsOf(sample));
  gst_video_frame_unmap(&frame);
}

void takeSound(GstSample* sample, DecodedMovie& movie) {
  const GstStructure* structure = gst_caps_get_structure(gst_sample_get_caps(sample), 0);
  int channels = 1;
  gst_structure_get_int(structure, "rate", &movie.sampleRate);
  gst_structure_get_int(structure, "channels", &channels);
  if (movie.sound.empty()) movie.soundStart = secondsOf(sample);
  GstMapInfo map;
  gst_buffer_map(gst_sample_get_buffer(sample), &map, GST_MAP_READ);
  const auto* samples = reinterpret_cast<const float*>(map.data);
  for (std::size_t i = 0; i < map.size / sizeof(float); i += static_cast<std::size_t>(channels)) {
    movie.sound.push_back(samples[i]);
  }
  gst_buffer_unmap(gst_sample_get_buffer(sample), &map);
}

std::string launchLine(const std::string& path, Streams streams) {
  const std::string queue = " d. ! queue max-size-buffers=0 max-size-time=0 max-size-bytes=0 ! ";
  std::string line = "uridecodebin name=d uri=file://" + path;
  if (streams != Streams::sound) {
    line += queue + "videoconvert ! video/x-raw,format=I420 ! appsink name=v sync=false max-buffers=20";
  }
  if (streams != Streams::picture) {
    line += queue + "audioconvert ! audio/x-raw,format=F32LE,layout=interleaved ! appsink name=a sync=false";
  }
  return line;
}

/// Takes what is there. @return whether the stream has ended.
template <class Take>
bool drain(GstElement* sink, Take take) {
  if (sink == nullptr) return true;
  for (;;) {
    const SampleHandle sample(gst_app_sink_try_pull_sample(GST_APP_SINK(sink), GST_MSECOND));
    if (!sample) return gst_app_sink_is_eos(GST_APP_SINK(sink)) != FALSE;
    take(sample.get());
  }
}

}  // namespace

DecodedMovie decodeMovie(const std::string& path, Streams streams) {
  DecodedMovie movie;
  const auto launched = newPipeline(launchLine(path, streams));
  if (!launched) {
    movie.problem = launched.error().message;
    return movie;
  }
  const auto& pipeline = *launched;
  const auto video = elementNamed(pipeline.get(), "v");
  const auto audio = elementNamed(pipeline.get(), "a");
  gst_element_set_state(pipeline.get(), GST_STATE_PLAYING);
  const GstHandle<GstBus> bus(gst_element_get_bus(pipeline.get()));
  for (bool ended = false; !ended;) {
    const MessageHandle message(gst_bus_pop_filtered(bus.get(), GST_MESSAGE_ERROR));
    if (message) {
      GError* raw = nullptr;
      gst_message_parse_error(message.get(), &raw, nullptr);
      const ErrorHandle error(raw);
      movie.problem = error->message;
      break;
    }
    const bool pictureEnded = drain(video.get(), [&](GstSample* sample) { takeFrame(sample, movie); });
    const bool soundEnded = drain(audio.get(), [&](GstSample* sample) { takeSound(sample, movie); });
    ended = pictureEnded && soundEnded;
  }
  gint64 duration = 0;
  gst_element_query_duration(pipeline.get(), GST_FORMAT_TIME, &duration);
  movie.duration = static_cast<double>(duration) / 1e9;
  gst_element_set_state(pipeline.get(), GST_STATE_NULL);
  return movie;
}

std::vector<double> tickTimes(const DecodedMovie& movie) {
  std::vector<double> times;
  std::size_t quietUntil = 0;
  for (std::size_t i = 0; i < movie.sound.size(); ++i) {
    if (std::abs(movie.sound[i]) < 0.2F || i < quietUntil) continue;
    times.push_back(movie.soundStart + static_cast<double>(i) / movie.sampleRate);
    quietUntil = i + static_cast<std::size_t>(movie.sampleRate) / 5;
  }
  return times;
}

std::vector<NumberRun> numberRuns(const std::vector<std::uint32_t>& numbers) {
  std::vector<NumberRun> runs;
  for (const std::uint32_t number : numbers) {
    if (!runs.empty() && runs.back().last + 1 == number) {
      runs.back().last = number;
    } else {
      runs.push_back({number, number});
    }
  }
  return runs;
}

}  // namespace lmx::testing
