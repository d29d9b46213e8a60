// Starts and stops the plug-in's provider.
#include "capture/source/pipewire_provider.h"

#include <poll.h>

#include <utility>

#include "capture/source/pipewire_connection.h"

namespace lmx {

void PipeWireProvider::keepUp() {
  const GstHandle<GstDeviceProviderFactory> factory(
      gst_device_provider_factory_find("pipewiredeviceprovider"));
  if (!factory) return;
  auto* feature = GST_PLUGIN_FEATURE(factory.get());
  if (!rank_) rank_ = gst_plugin_feature_get_rank(feature);
  if (started_ && serverHasGone()) {
    gst_device_provider_stop(started_.get());
    started_ = nullptr;
  }
  if (!started_) {
    server_ = connectToPipeWire();  // before the provider does: what ends in between has gone
    GstHandle<GstDeviceProvider> provider(gst_device_provider_factory_get(factory.get()));
    if (server_.valid() && provider && gst_device_provider_start(provider.get()) != FALSE)
      started_ = std::move(provider);
  }
  gst_plugin_feature_set_rank(feature, started_ ? *rank_ : static_cast<guint>(GST_RANK_NONE));
}

bool PipeWireProvider::serverHasGone() const {
  pollfd connection{.fd = server_.get(), .events = POLLIN, .revents = 0};
  return poll(&connection, 1, 0) > 0 && (connection.revents & (POLLHUP | POLLERR | POLLNVAL)) != 0;
}

}  // namespace lmx
