// Asks PipeWire for its nodes.
#include "capture/source/pipewire_devices.h"

#include <pipewire/impl.h>
#include <pipewire/pipewire.h>

#include <algorithm>
#include <cerrno>
#include <memory>
#include <optional>
#include <span>
#include <string_view>
#include <utility>

#include "capture/source/pipewire_connection.h"
#include "capture/source/pipewire_format.h"
#include "platform/log.h"

namespace lmx {
namespace {

using Clock = std::chrono::steady_clock;

constexpr std::size_t kMostNodes = 1024;
constexpr unsigned kMostFormats = 512;  // of one node

struct Destroy {
  void operator()(pw_loop* loop) const noexcept { pw_loop_destroy(loop); }
  void operator()(pw_context* context) const noexcept { pw_context_destroy(context); }
  void operator()(pw_core* core) const noexcept { pw_core_disconnect(core); }
  void operator()(pw_proxy* proxy) const noexcept { pw_proxy_destroy(proxy); }
};
template <class T>
using Owned = std::unique_ptr<T, Destroy>;

void addProperties(PipeWireNode& node, const spa_dict* properties) {
  if (properties == nullptr) return;
  for (const spa_dict_item& item : std::span(properties->items, properties->n_items)) {
    if (item.key != nullptr && item.value != nullptr) node.properties[item.key] = item.value;
  }
}

class Listing;

/// A node as far as the server has told about it. Stays where it is: the library holds its address.
struct Announced {
  Listing* listing = nullptr;
  Owned<pw_proxy> proxy;
  spa_hook listener{};
  PipeWireNode node;
  bool asked = false;
  unsigned formats = 0;
};

/// One conversation: the server announces the nodes there are, each is asked what it is, some for their
/// formats. It is complete when the server has come to the end of all that. What comes meanwhile is left out:
/// where nodes come and go all the time there would be no end.
class Listing {
 public:
  explicit Listing(pw_core& core) : core_(core) {
    pw_core_add_listener(&core_, &core_listener_, &kCoreEvents, this);
    auto* registry = pw_core_get_registry(&core_, PW_VERSION_REGISTRY, 0);
    if (registry == nullptr) {
      fail();
      return;
    }
    registry_.reset(reinterpret_cast<pw_proxy*>(registry));
    pw_registry_add_listener(registry, &registry_listener_, &kRegistryEvents, this);
    askForTheEnd();
  }
  Listing(const Listing&) = delete;
  Listing& operator=(const Listing&) = delete;
  ~Listing() { spa_hook_remove(&core_listener_); }

  [[nodiscard]] bool ended() const { return complete_ || failed_; }
  [[nodiscard]] bool complete() const { return complete_; }
  void fail() { failed_ = true; }

  std::vector<PipeWireNode> take() {
    std::vector<PipeWireNode> nodes;
    for (const auto& one : announced_) nodes.push_back(std::move(one->node));
    return nodes;
  }

 private:
  static void onDone(void* data, std::uint32_t id, int number) {
    auto& self = *static_cast<Listing*>(data);
    if (id != PW_ID_CORE) return;
    self.all_announced_ = true;
    if (number == self.last_) self.complete_ = true;
  }

  /// Errors are no end but for a broken connection: most tell that a node has gone meanwhile.
  static void onError(void* data, std::uint32_t id, int, int result, const char*) {
    if (id == PW_ID_CORE && result == -EPIPE) static_cast<Listing*>(data)->fail();
  }

  static void onGlobal(void* data, std::uint32_t id, std::uint32_t, const char* type, std::uint32_t,
                       const spa_dict* properties) {
    if (type != nullptr && std::string_view(type) == PW_TYPE_INTERFACE_Node)
      static_cast<Listing*>(data)->bind(id, properties);
  }

  static void onNode(void* data, const pw_node_info* info) {
    auto& one = *static_cast<Announced*>(data);
    one.node.inputs = info->max_input_ports;
    one.node.outputs = info->max_output_ports;
    if ((info->change_mask & PW_NODE_CHANGE_MASK_PROPS) != 0) addProperties(one.node, info->props);
    if ((info->change_mask & PW_NODE_CHANGE_MASK_PARAMS) != 0)
      one.listing->askForFormats(one, std::span(info->params, info->n_params));
  }

  static void onFormat(void* data, int, std::uint32_t, std::uint32_t, std::uint32_t, const spa_pod* format) {
    auto& one = *static_cast<Announced*>(data);
    if (one.formats++ >= kMostFormats) return;
    CapsHandle caps = capsOfFormat(format);
    if (!caps) return;
    if (!one.node.caps) one.node.caps.reset(gst_caps_new_empty());
    gst_caps_append(one.node.caps.get(), caps.release());
  }

  void bind(std::uint32_t id, const spa_dict* properties) {
    if (all_announced_ || announced_.size() >= kMostNodes) return;
    auto* node = static_cast<pw_node*>(pw_registry_bind(reinterpret_cast<pw_registry*>(registry_.get()), id,
                                                        PW_TYPE_INTERFACE_Node, PW_VERSION_NODE, 0));
    if (node == nullptr) return;
    auto one = std::make_unique<Announced>();
    one->listing = this;
    one->proxy.reset(reinterpret_cast<pw_proxy*>(node));
    addProperties(one->node, properties);
    pw_node_add_listener(node, &one->listener, &kNodeEvents, one.get());
    announced_.push_back(std::move(one));
    askForTheEnd();
  }

  void askForFormats(Announced& one, std::span<const spa_param_info> parameters) {
    const bool known = std::any_of(parameters.begin(), parameters.end(), [](const spa_param_info& info) {
      return info.id == SPA_PARAM_EnumFormat && (info.flags & SPA_PARAM_INFO_READ) != 0;
    });
    if (one.asked || !known || !(isCapture(one.node, true) || isCapture(one.node, false))) return;
    one.asked = true;
    pw_node_enum_params(reinterpret_cast<pw_node*>(one.proxy.get()), 0, SPA_PARAM_EnumFormat, 0, kMostFormats,
                        nullptr);
    askForTheEnd();
  }

  /// Once the answer to the last of these has come, all that was asked before it has been answered.
  void askForTheEnd() { last_ = pw_core_sync(&core_, PW_ID_CORE, last_); }

  static constexpr pw_core_events kCoreEvents{
      .version = PW_VERSION_CORE_EVENTS, .done = onDone, .error = onError};
  static constexpr pw_registry_events kRegistryEvents{.version = PW_VERSION_REGISTRY_EVENTS,
                                                      .global = onGlobal};
  static constexpr pw_node_events kNodeEvents{
      .version = PW_VERSION_NODE_EVENTS, .info = onNode, .param = onFormat};

  pw_core& core_;
  spa_hook core_listener_{};
  spa_hook registry_listener_{};
  Owned<pw_proxy> registry_;
  std::vector<std::unique_ptr<Announced>> announced_;
  int last_ = 0;
  bool all_announced_ = false;
  bool complete_ = false;
  bool failed_ = false;
};

/// Without a configuration: only the protocol is needed, none of what makes streams and real-time threads. As
/// in the configuration of other clients, the library prints nothing.
Owned<pw_context> newContext(pw_loop* loop) {
  Owned<pw_context> context(
      pw_context_new(loop, pw_properties_new(PW_KEY_CONFIG_NAME, "null", "log.level", "0", nullptr), 0));
  if (context) pw_context_load_module(context.get(), "libpipewire-module-protocol-native", nullptr, nullptr);
  return context;
}

/// What the server tells within that time. @return nothing when it doesn't
std::optional<std::vector<PipeWireNode>> ask(UniqueFd server, Clock::time_point deadline) {
  const Owned<pw_loop> loop(pw_loop_new(nullptr));
  if (!loop) return std::nullopt;
  const Owned<pw_context> context = newContext(loop.get());
  if (!context) return std::nullopt;
  const Owned<pw_core> core(pw_context_connect_fd(context.get(), server.release(), nullptr, 0));
  if (!core) return std::nullopt;
  Listing listing(*core);
  pw_loop_enter(loop.get());
  while (!listing.ended()) {
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now());
    if (left.count() <= 0) break;
    const int result = pw_loop_iterate(loop.get(), static_cast<int>(left.count()));
    if (result < 0 && result != -EINTR) listing.fail();
  }
  pw_loop_leave(loop.get());
  if (!listing.complete()) return std::nullopt;
  return listing.take();
}

}  // namespace

std::vector<PipeWireNode> PipeWireDevices::list() {
  UniqueFd server = connectToPipeWire();
  if (!server.valid()) return {};
  [[maybe_unused]] static const bool ready = (pw_init(nullptr, nullptr), true);
  auto nodes = ask(std::move(server), Clock::now() + kPatience);
  if (!nodes && !silent_)
    LMPLogMessage(nullptr, kLogWarning, "PipeWire does not answer: its devices are left out");
  silent_ = !nodes;
  return nodes ? std::move(*nodes) : std::vector<PipeWireNode>();
}

}  // namespace lmx
