// Finds PipeWire's socket as its library does, and connects.
#include "capture/source/pipewire_connection.h"

#include <sys/socket.h>
#include <sys/un.h>

#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>
#include <string_view>
#include <utility>

namespace lmx {
namespace {

std::string environment(const char* name) {
  const char* value = std::getenv(name);
  return value == nullptr ? "" : value;
}

void closeConnection(gpointer connection) noexcept { delete static_cast<UniqueFd*>(connection); }

std::string socketPath() {
  std::string remote = environment("PIPEWIRE_REMOTE");
  if (remote.empty()) remote = "pipewire-0";
  if (remote[0] == '/') return remote;
  std::string directory = environment("PIPEWIRE_RUNTIME_DIR");
  if (directory.empty()) directory = environment("XDG_RUNTIME_DIR");
  if (directory.empty()) directory = "/run/pipewire";
  return directory + "/" + remote;
}

}  // namespace

UniqueFd connectToPipeWire() {
  const std::string path = socketPath();
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  if (path.size() >= sizeof address.sun_path) return {};
  std::memcpy(address.sun_path, path.c_str(), path.size());
  UniqueFd fd(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  if (!fd.valid()) return {};
  if (connect(fd.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) return {};
  return fd;
}

void connectApart(GstElement* source) {
  const GstElementFactory* factory = gst_element_get_factory(source);
  if (factory == nullptr || std::string_view(GST_OBJECT_NAME(factory)) != "pipewiresrc") return;
  UniqueFd fd = connectToPipeWire();
  if (!fd.valid()) return;
  g_object_set(source, "fd", fd.get(), nullptr);
  // The element works with a copy but names the connection by this number: it stays taken as long as the
  // element is there.
  auto owner = std::make_unique<UniqueFd>(std::move(fd));
  g_object_set_data_full(G_OBJECT(source), "lmx-connection", owner.release(), closeConnection);
}

}  // namespace lmx
