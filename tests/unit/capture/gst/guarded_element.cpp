// Feeds an element and collects what it gives.
#include "tests/unit/capture/gst/guarded_element.h"

#include <gst/app/gstappsink.h>
#include <gst/app/gstappsrc.h>
#include <gtest/gtest.h>

namespace lmx::testing {

GuardedElement::GuardedElement(const std::function<void(GstElement*)>& guard, const std::string& name,
                               const std::string& caps, const char* wanted) {
  ensureGStreamer();
  pipeline_.reset(GST_ELEMENT(gst_object_ref_sink(gst_pipeline_new(nullptr))));
  guard(pipeline_.get());
  source_ = add("appsrc");
  GstElement* element = add(name);
  sink_ = add("appsink");
  const CapsHandle format(gst_caps_from_string(caps.c_str()));
  g_object_set(source_, "caps", format.get(), "format", GST_FORMAT_TIME, nullptr);
  const CapsHandle result(gst_caps_from_string(wanted));
  g_object_set(sink_, "sync", FALSE, "caps", result.get(), nullptr);
  EXPECT_TRUE(gst_element_link_many(source_, element, sink_, nullptr));
  gst_element_set_state(pipeline_.get(), GST_STATE_PLAYING);
}

GuardedElement::~GuardedElement() { gst_element_set_state(pipeline_.get(), GST_STATE_NULL); }

void GuardedElement::push(GstBuffer* buffer) { gst_app_src_push_buffer(GST_APP_SRC(source_), buffer); }

void GuardedElement::pushList(GstBufferList* buffers) {
  gst_app_src_push_buffer_list(GST_APP_SRC(source_), buffers);
}

std::vector<SampleHandle> GuardedElement::result() {
  gst_app_src_end_of_stream(GST_APP_SRC(source_));
  std::vector<SampleHandle> all;
  while (SampleHandle sample{gst_app_sink_pull_sample(GST_APP_SINK(sink_))}) all.push_back(std::move(sample));
  return all;
}

GstElement* GuardedElement::add(const std::string& name) {
  GstElement* element = gst_element_factory_make(name.c_str(), nullptr);
  gst_bin_add(GST_BIN(pipeline_.get()), element);
  return element;
}

std::vector<std::uint8_t> bytesOf(const SampleHandle& sample) {
  GstBuffer* buffer = gst_sample_get_buffer(sample.get());
  std::vector<std::uint8_t> bytes(gst_buffer_get_size(buffer));
  gst_buffer_extract(buffer, 0, bytes.data(), bytes.size());
  return bytes;
}

}  // namespace lmx::testing
