// The daemon's synthetic camera as an element for gst-launch-1.0, so that the peer encodes the same pictures
// at the same cost: videotestsrc with the daemon's own drawing into its frames.
#include <gst/gst.h>

#include <string>

#include "capture/source/device_id.h"
#include "capture/source/test_source.h"

namespace {

struct TestCamera {
  GstBin bin;
};
struct TestCameraClass {
  GstBinClass parent;
};

G_DEFINE_TYPE(TestCamera, test_camera, GST_TYPE_BIN)

enum Property { kNoProperty, kSize };

void setProperty(GObject* object, guint property, const GValue* value, GParamSpec*) {
  const char* size = g_value_get_string(value);
  if (property != kSize || size == nullptr) return;
  lmx::attachTestPicture(GST_ELEMENT(object), lmx::parseDeviceID(std::string("test://video?size=") + size));
}

static void test_camera_init(TestCamera* self) {
  GstElement* source = gst_element_factory_make("videotestsrc", "vsource");
  if (source == nullptr) return;  // without a pad nothing can be linked to it, which gst-launch reports
  gst_util_set_object_arg(G_OBJECT(source), "pattern", "smpte");
  g_object_set(source, "is-live", TRUE, "horizontal-speed", 4, nullptr);
  gst_bin_add(GST_BIN(self), source);
  GstPad* pad = gst_element_get_static_pad(source, "src");
  gst_element_add_pad(GST_ELEMENT(self), gst_ghost_pad_new("src", pad));
  gst_object_unref(pad);
}

static void test_camera_class_init(TestCameraClass* type) {
  GObjectClass* object = G_OBJECT_CLASS(type);
  object->set_property = setProperty;
  g_object_class_install_property(
      object, kSize,
      g_param_spec_string("size", "Size", "WIDTHxHEIGHT of the frames that are drawn into", nullptr,
                          static_cast<GParamFlags>(G_PARAM_WRITABLE | G_PARAM_STATIC_STRINGS)));
  GstElementClass* element = GST_ELEMENT_CLASS(type);
  gst_element_class_set_static_metadata(element, "Synthetic camera", "Source/Video", "Frame number and clock",
                                        "lmxagentd");
  static GstStaticPadTemplate source =
      GST_STATIC_PAD_TEMPLATE("src", GST_PAD_SRC, GST_PAD_ALWAYS, GST_STATIC_CAPS("video/x-raw"));
  gst_element_class_add_static_pad_template(element, &source);
}

gboolean registerElements(GstPlugin* plugin) {
  return gst_element_register(plugin, "lmxtestcamera", GST_RANK_NONE, test_camera_get_type());
}

}  // namespace

#define PACKAGE "lmxbench"
GST_PLUGIN_DEFINE(GST_VERSION_MAJOR, GST_VERSION_MINOR, lmxbench, "Peers of the benchmarks", registerElements,
                  "1", "Proprietary", "lmxagentd", "https://lumex.example.test")
