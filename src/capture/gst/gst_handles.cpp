// Starts GStreamer and builds pipelines.
#include "capture/gst/gst_handles.h"

#include <mutex>

namespace lmx {

void ensureGStreamer() {
  static std::once_flag once;
  std::call_once(once, [] {
    // Plug-ins are scanned in this process: a helper process beside a daemon is one more thing that can hang.
    gst_registry_fork_set_enabled(FALSE);
    gst_init(nullptr, nullptr);
  });
}

Result<GstHandle<GstElement>> newPipeline(const std::string& description) {
  ensureGStreamer();
  GError* raw = nullptr;
  GstElement* element =
      gst_parse_launch_full(description.c_str(), nullptr, GST_PARSE_FLAG_FATAL_ERRORS, &raw);
  const ErrorHandle error(raw);
  if (element == nullptr) return Error{error ? error->message : "the pipeline could not be built"};
  gst_object_ref_sink(element);
  return GstHandle<GstElement>(element);
}

GstHandle<GstElement> elementNamed(GstElement* pipeline, const char* name) {
  return GstHandle<GstElement>(gst_bin_get_by_name(GST_BIN(pipeline), name));
}

}  // namespace lmx
