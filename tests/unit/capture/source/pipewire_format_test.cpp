// PipeWire's descriptions of formats, those that make sense and those that don't.
#include "capture/source/pipewire_format.h"

#include <gtest/gtest.h>
#include <spa/param/audio/raw.h>
#include <spa/param/format.h>
#include <spa/param/param.h>
#include <spa/param/video/raw.h>
#include <spa/pod/builder.h>

#include <cstring>
#include <initializer_list>
#include <memory>
#include <string>

#include "capture/source/camera_mode.h"

namespace lmx {
namespace {

/// A description as a program makes it. With a choice the first value is the default. Copies are the same
/// one.
class Format {
 public:
  Format(std::uint32_t type, std::uint32_t subtype) {
    spa_pod_builder_init(&state_->builder, state_->space, sizeof state_->space);
    spa_pod_builder_push_object(&state_->builder, &state_->frame, SPA_TYPE_OBJECT_Format,
                                SPA_PARAM_EnumFormat);
    ids(SPA_FORMAT_mediaType, {type}).ids(SPA_FORMAT_mediaSubtype, {subtype});
  }

  Format& ids(std::uint32_t key, std::initializer_list<std::uint32_t> values,
              std::uint32_t choice = SPA_CHOICE_None) {
    return add(key, choice, values, [this](std::uint32_t id) { spa_pod_builder_id(&state_->builder, id); });
  }
  Format& numbers(std::uint32_t key, std::initializer_list<int> values,
                  std::uint32_t choice = SPA_CHOICE_None) {
    return add(key, choice, values, [this](int number) { spa_pod_builder_int(&state_->builder, number); });
  }
  Format& sizes(std::initializer_list<spa_rectangle> values, std::uint32_t choice = SPA_CHOICE_None) {
    return add(SPA_FORMAT_VIDEO_size, choice, values, [this](spa_rectangle size) {
      spa_pod_builder_rectangle(&state_->builder, size.width, size.height);
    });
  }
  Format& rates(std::initializer_list<spa_fraction> values, std::uint32_t choice = SPA_CHOICE_None) {
    return add(SPA_FORMAT_VIDEO_framerate, choice, values, [this](spa_fraction rate) {
      spa_pod_builder_fraction(&state_->builder, rate.num, rate.denom);
    });
  }
  Format& modifier() {
    spa_pod_builder_prop(&state_->builder, SPA_FORMAT_VIDEO_modifier, SPA_POD_PROP_FLAG_MANDATORY);
    spa_pod_builder_long(&state_->builder, 0);
    return *this;
  }

  /// In memory of exactly its size. Ends the description.
  std::unique_ptr<std::byte[]> bytes(std::size_t& size) {
    const auto* pod = static_cast<const spa_pod*>(spa_pod_builder_pop(&state_->builder, &state_->frame));
    size = sizeof *pod + pod->size;
    auto copy = std::make_unique<std::byte[]>(size);
    std::memcpy(copy.get(), pod, size);
    return copy;
  }

 private:
  template <class Values, class One>
  Format& add(std::uint32_t key, std::uint32_t choice, const Values& values, const One& one) {
    spa_pod_builder_prop(&state_->builder, key, 0);
    spa_pod_frame frame;
    if (choice != SPA_CHOICE_None) spa_pod_builder_push_choice(&state_->builder, &frame, choice, 0);
    for (const auto& value : values) one(value);
    if (choice != SPA_CHOICE_None) spa_pod_builder_pop(&state_->builder, &frame);
    return *this;
  }

  struct State {
    alignas(8) std::byte space[4096]{};
    spa_pod_builder builder{};
    spa_pod_frame frame{};
  };
  std::shared_ptr<State> state_ = std::make_shared<State>();  // the builder holds addresses
};

std::string textOf(const GstCaps* caps) {
  return caps == nullptr ? "none" : GText(gst_caps_to_string(caps)).get();
}

std::string capsText(Format format) {
  std::size_t size = 0;
  const auto bytes = format.bytes(size);
  return textOf(capsOfFormat(reinterpret_cast<const spa_pod*>(bytes.get())).get());
}

Format raw(std::initializer_list<std::uint32_t> formats, std::uint32_t choice = SPA_CHOICE_None) {
  Format format(SPA_MEDIA_TYPE_video, SPA_MEDIA_SUBTYPE_raw);
  format.ids(SPA_FORMAT_VIDEO_format, formats, choice);
  return format;
}
Format yuy2() { return raw({SPA_VIDEO_FORMAT_YUY2}); }
Format coded(std::uint32_t subtype) { return {SPA_MEDIA_TYPE_video, subtype}; }
Format sound() { return {SPA_MEDIA_TYPE_audio, SPA_MEDIA_SUBTYPE_raw}; }

struct Case {
  Format format;
  const char* caps;
};

class PipeWireFormat : public ::testing::Test {
 protected:
  PipeWireFormat() {
    ensureGStreamer();
    g_log_set_default_handler([](const char*, GLogLevelFlags, const char* message,
                                 gpointer) { ADD_FAILURE() << "GStreamer complains: " << message; },
                              nullptr);
  }
  ~PipeWireFormat() override { g_log_set_default_handler(g_log_default_handler, nullptr); }
};

TEST_F(PipeWireFormat, OfCameras) {
  const Case cases[] = {
      {yuy2().sizes({{320, 180}}).rates({{30, 1}}),
       "video/x-raw, format=(string)YUY2, framerate=(fraction)30/1, width=(int)320, height=(int)180"},
      {coded(SPA_MEDIA_SUBTYPE_mjpg)
           .sizes({{640, 480}})
           .rates({{30, 1}, {30, 1}, {15, 1}, {30000, 1001}}, SPA_CHOICE_Enum),
       "image/jpeg, framerate=(fraction){ 30/1, 15/1, 30000/1001 }, width=(int)640, height=(int)480"},
      {coded(SPA_MEDIA_SUBTYPE_h264).sizes({{1920, 1080}}),
       "video/x-h264, width=(int)1920, height=(int)1080"},
      // Each size for itself: not each width with each height.
      {yuy2().sizes({{640, 480}, {640, 480}, {320, 180}}, SPA_CHOICE_Enum),
       "video/x-raw, format=(string)YUY2, width=(int)640, height=(int)480; "
       "video/x-raw, format=(string)YUY2, width=(int)320, height=(int)180"},
      {yuy2()
           .sizes({{640, 480}, {1, 1}, {4096, 2160}}, SPA_CHOICE_Range)
           .rates({{25, 1}, {0, 1}, {60, 1}}, SPA_CHOICE_Range),
       "video/x-raw, format=(string)YUY2, framerate=(fraction)[ 0/1, 60/1 ], width=(int)[ 1, 4096 ], "
       "height=(int)[ 1, 2160 ]"},
      {yuy2().sizes({{640, 480}, {160, 120}, {640, 480}, {16, 8}}, SPA_CHOICE_Step),
       "video/x-raw, format=(string)YUY2, width=(int)[ 160, 640, 16 ], height=(int)[ 120, 480, 8 ]"},
      {raw({SPA_VIDEO_FORMAT_NV12, SPA_VIDEO_FORMAT_NV12, SPA_VIDEO_FORMAT_GRAY8}, SPA_CHOICE_Enum)
           .sizes({{640, 480}})
           .ids(SPA_FORMAT_VIDEO_interlaceMode, {SPA_VIDEO_INTERLACE_MODE_INTERLEAVED}),
       "video/x-raw, format=(string){ NV12, GRAY8 }, interlace-mode=(string)interleaved, width=(int)640, "
       "height=(int)480"},
      {yuy2().sizes({{640, 480}}).modifier(),
       "video/x-raw(memory:DMABuf), format=(string)YUY2, width=(int)640, height=(int)480"},
  };
  for (const Case& one : cases) EXPECT_EQ(capsText(one.format), one.caps);
}

TEST_F(PipeWireFormat, OfMicrophones) {
  const Case cases[] = {
      {sound()
           .ids(SPA_FORMAT_AUDIO_format, {SPA_AUDIO_FORMAT_F32})
           .numbers(SPA_FORMAT_AUDIO_rate, {48000})
           .numbers(SPA_FORMAT_AUDIO_channels, {2}),
       "audio/x-raw, rate=(int)48000, channels=(int)2"},
      {sound()
           .numbers(SPA_FORMAT_AUDIO_rate, {48000, 44100, 96000}, SPA_CHOICE_Range)
           .numbers(SPA_FORMAT_AUDIO_channels, {2, 1, 2, 6}, SPA_CHOICE_Enum),
       "audio/x-raw, rate=(int)[ 44100, 96000 ], channels=(int){ 1, 2, 6 }"},
  };
  for (const Case& one : cases) EXPECT_EQ(capsText(one.format), one.caps);
}

TEST_F(PipeWireFormat, WhatMakesNoSenseIsLeftOut) {
  const Case cases[] = {
      {{SPA_MEDIA_TYPE_audio, SPA_MEDIA_SUBTYPE_dsp}, "none"},
      {{SPA_MEDIA_TYPE_application, SPA_MEDIA_SUBTYPE_control}, "none"},
      {raw({0xFFFF}).sizes({{640, 480}}), "none"},
      {yuy2(), "none"},  // no size
      {yuy2().sizes({{0, 480}}), "video/x-raw, format=(string)YUY2, height=(int)480"},
      {yuy2().sizes({{0xFFFFFFFF, 0xFFFFFFFF}}), "video/x-raw, format=(string)YUY2"},
      {yuy2().sizes({{9, 9}, {0, 0}, {0xFFFFFFFF, 0}}, SPA_CHOICE_Range),
       "video/x-raw, format=(string)YUY2, width=(int)[ 1, 2147483647 ], height=(int)1"},
      {yuy2().sizes({{9, 9}, {8, 8}, {2, 2}}, SPA_CHOICE_Range), "video/x-raw, format=(string)YUY2"},
      {yuy2().sizes({{9, 9}, {1, 1}}, SPA_CHOICE_Range), "none"},  // a range with one end
      {yuy2().sizes({{8, 8}}).rates({{30, 0}}),
       "video/x-raw, format=(string)YUY2, width=(int)8, height=(int)8"},
      {yuy2().sizes({{8, 8}}).rates({{5, 1}, {30, 1}, {10, 1}}, SPA_CHOICE_Range),
       "video/x-raw, format=(string)YUY2, framerate=(fraction)30/1, width=(int)8, height=(int)8"},
      {sound().numbers(SPA_FORMAT_AUDIO_rate, {-1}).numbers(SPA_FORMAT_AUDIO_channels, {0}), "audio/x-raw"},
      {sound().numbers(SPA_FORMAT_AUDIO_rate, {}, SPA_CHOICE_Enum), "audio/x-raw"},
      {sound().ids(SPA_FORMAT_AUDIO_rate, {48000}), "audio/x-raw"},  // not a number
  };
  for (const Case& one : cases) EXPECT_EQ(capsText(one.format), one.caps);
  EXPECT_EQ(capsOfFormat(nullptr), nullptr);
  const spa_pod empty{};
  EXPECT_EQ(capsOfFormat(&empty), nullptr);
}

// The server hands on what any program has made up. Memory behind the description is not read: the address
// sanitizer sees to it.
TEST_F(PipeWireFormat, NoDamageDoesHarm) {
  std::size_t size = 0;
  const auto sane =
      raw({SPA_VIDEO_FORMAT_NV12, SPA_VIDEO_FORMAT_NV12, SPA_VIDEO_FORMAT_YUY2}, SPA_CHOICE_Enum)
          .sizes({{640, 480}, {160, 120}, {640, 480}, {16, 8}}, SPA_CHOICE_Step)
          .rates({{25, 1}, {5, 1}, {60, 1}}, SPA_CHOICE_Range)
          .bytes(size);
  const std::string untouched = textOf(capsOfFormat(reinterpret_cast<const spa_pod*>(sane.get())).get());
  int different = 0;
  for (std::size_t place = sizeof(std::uint32_t); place < size; ++place) {  // behind the size, which is true
    for (const int value : {0x00, 0x01, 0x03, 0x10, 0x7F, 0xFF}) {
      auto damaged = std::make_unique<std::byte[]>(size);
      std::memcpy(damaged.get(), sane.get(), size);
      damaged[place] = static_cast<std::byte>(value);
      const CapsHandle caps = capsOfFormat(reinterpret_cast<const spa_pod*>(damaged.get()));
      offeredModes(caps.get());
      if (textOf(caps.get()) != untouched) ++different;
    }
  }
  EXPECT_GT(different, 100);
}

}  // namespace
}  // namespace lmx
