// Watches addresses through rtnetlink messages.
#include "platform/network_watcher.h"

#include <ifaddrs.h>
#include <linux/netlink.h>
#include <linux/rtnetlink.h>
#include <net/if.h>
#include <netinet/in.h>
#include <sys/socket.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <memory>
#include <optional>

namespace lmx {
namespace {

struct InterfacesDeleter {
  void operator()(ifaddrs* list) const { freeifaddrs(list); }
};

std::set<InterfaceAddress> currentAddresses() {
  std::set<InterfaceAddress> known;
  ifaddrs* first = nullptr;
  if (getifaddrs(&first) != 0) return known;
  const std::unique_ptr<ifaddrs, InterfacesDeleter> list(first);
  for (const ifaddrs* one = first; one != nullptr; one = one->ifa_next) {
    if (one->ifa_addr == nullptr || one->ifa_addr->sa_family != AF_INET) continue;
    sockaddr_in address{};
    std::memcpy(&address, one->ifa_addr, sizeof address);
    known.emplace(if_nametoindex(one->ifa_name), address.sin_addr.s_addr);
  }
  return known;
}

/// The address in a message with a payload of `size` bytes.
std::optional<InterfaceAddress> addressOf(const char* data, std::size_t size) {
  ifaddrmsg message{};
  if (size < sizeof message) return std::nullopt;
  std::memcpy(&message, data, sizeof message);
  if (message.ifa_family != AF_INET) return std::nullopt;
  std::optional<std::uint32_t> found;
  for (std::size_t at = NLMSG_ALIGN(sizeof message); at + sizeof(rtattr) <= size;) {
    rtattr attribute{};
    std::memcpy(&attribute, data + at, sizeof attribute);
    if (attribute.rta_len < sizeof attribute || at + attribute.rta_len > size) break;
    // Use the local address: on a point-to-point link the other one is the peer's.
    const bool wanted = attribute.rta_type == IFA_LOCAL || (attribute.rta_type == IFA_ADDRESS && !found);
    if (wanted && attribute.rta_len >= RTA_LENGTH(sizeof(std::uint32_t))) {
      std::uint32_t address = 0;
      std::memcpy(&address, data + at + RTA_LENGTH(0), sizeof address);
      found = address;
    }
    at += RTA_ALIGN(attribute.rta_len);
  }
  if (!found) return std::nullopt;
  return InterfaceAddress{message.ifa_index, *found};
}

}  // namespace

bool applyAddressMessages(std::string_view bytes, std::set<InterfaceAddress>& known) {
  bool changed = false;
  while (bytes.size() >= sizeof(nlmsghdr)) {
    nlmsghdr header{};
    std::memcpy(&header, bytes.data(), sizeof header);
    if (header.nlmsg_len < sizeof header || header.nlmsg_len > bytes.size()) break;
    const auto address = addressOf(bytes.data() + NLMSG_HDRLEN, header.nlmsg_len - NLMSG_HDRLEN);
    if (address && header.nlmsg_type == RTM_NEWADDR) changed |= known.insert(*address).second;
    if (address && header.nlmsg_type == RTM_DELADDR) changed |= known.erase(*address) > 0;
    bytes.remove_prefix(std::min<std::size_t>(NLMSG_ALIGN(header.nlmsg_len), bytes.size()));
  }
  return changed;
}

int NetworkWatcher::open() {
  socket_.reset(::socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC | SOCK_NONBLOCK, NETLINK_ROUTE));
  if (!socket_.valid()) return errno;
  sockaddr_nl address{};
  address.nl_family = AF_NETLINK;
  address.nl_groups = RTMGRP_IPV4_IFADDR;
  if (::bind(socket_.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
    const int error = errno;
    socket_.reset();
    return error;
  }
  known_ = currentAddresses();
  return 0;
}

bool NetworkWatcher::takeChanges() {
  bool changed = false;
  alignas(nlmsghdr) char buffer[16384];
  for (;;) {
    const ssize_t size = ::recv(socket_.get(), buffer, sizeof buffer, 0);
    if (size > 0) {
      changed |= applyAddressMessages({buffer, static_cast<std::size_t>(size)}, known_);
    } else if (size < 0 && errno == ENOBUFS) {  // messages were lost: read all addresses again
      auto now = currentAddresses();
      changed |= now != known_;
      known_ = std::move(now);
    } else if (size == 0 || errno != EINTR) {
      return changed;
    }
  }
}

namespace {

struct NetworkWatch final : RunLoop::Source {
  NetworkWatcher watcher;
  std::unique_ptr<RunLoop::Source> source;  // last, so that it is destroyed before the descriptor
};

}  // namespace

std::unique_ptr<RunLoop::Source> watchNetwork(RunLoop& loop, std::function<void()> changed) {
  auto watch = std::make_unique<NetworkWatch>();
  if (watch->watcher.open() != 0) return nullptr;
  watch->source = loop.watchReadable(watch->watcher.descriptor(),
                                     [&watcher = watch->watcher, changed = std::move(changed)] {
                                       if (watcher.takeChanges()) changed();
                                     });
  return watch;
}

}  // namespace lmx
