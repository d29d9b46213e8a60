// Owners of GStreamer's reference-counted objects.
#pragma once
#include <gst/gst.h>

#include <memory>
#include <string>

#include "support/result.h"

namespace lmx {

struct GstObjectUnref {
  void operator()(void* object) const noexcept { gst_object_unref(object); }
};
template <class T>
using GstHandle = std::unique_ptr<T, GstObjectUnref>;

struct GstMiniUnref {
  void operator()(GstBuffer* buffer) const noexcept { gst_buffer_unref(buffer); }
  void operator()(GstSample* sample) const noexcept { gst_sample_unref(sample); }
  void operator()(GstMessage* message) const noexcept { gst_message_unref(message); }
  void operator()(GstCaps* caps) const noexcept { gst_caps_unref(caps); }
  void operator()(GError* error) const noexcept { g_error_free(error); }
};
using BufferHandle = std::unique_ptr<GstBuffer, GstMiniUnref>;
using SampleHandle = std::unique_ptr<GstSample, GstMiniUnref>;
using MessageHandle = std::unique_ptr<GstMessage, GstMiniUnref>;
using CapsHandle = std::unique_ptr<GstCaps, GstMiniUnref>;
using ErrorHandle = std::unique_ptr<GError, GstMiniUnref>;

struct GFree {
  void operator()(void* block) const noexcept { g_free(block); }
};
using GText = std::unique_ptr<char, GFree>;

/// Initialises GStreamer once in the process; cheap afterwards. Thread-safe.
void ensureGStreamer();

/// Builds a pipeline from its description. The error is GStreamer's message.
Result<GstHandle<GstElement>> newPipeline(const std::string& description);

/// An element of `pipeline` by name; null when there is none.
GstHandle<GstElement> elementNamed(GstElement* pipeline, const char* name);

}  // namespace lmx
