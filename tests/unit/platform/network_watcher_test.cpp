// Address messages in the form that the kernel sends.
#include "platform/network_watcher.h"

#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <linux/rtnetlink.h>

#include <cstring>
#include <random>
#include <string>

namespace lmx {
namespace {

std::string message(int type, unsigned interface, const char* address, int family = AF_INET) {
  struct {
    nlmsghdr header;
    ifaddrmsg body;
    rtattr attribute;
    std::uint32_t address;
  } m{};
  m.header.nlmsg_len = sizeof m;
  m.header.nlmsg_type = static_cast<std::uint16_t>(type);
  m.body.ifa_family = static_cast<std::uint8_t>(family);
  m.body.ifa_index = interface;
  m.attribute.rta_len = RTA_LENGTH(4);
  m.attribute.rta_type = IFA_LOCAL;
  inet_pton(AF_INET, address, &m.address);
  return {reinterpret_cast<const char*>(&m), sizeof m};
}

TEST(AddressMessages, AddedAndRemovedAddressesAreChanges) {
  std::set<InterfaceAddress> known;
  EXPECT_TRUE(applyAddressMessages(message(RTM_NEWADDR, 2, "192.0.2.1"), known));
  EXPECT_FALSE(applyAddressMessages(message(RTM_NEWADDR, 2, "192.0.2.1"), known)) << "a renewed lease";
  EXPECT_TRUE(applyAddressMessages(message(RTM_NEWADDR, 3, "192.0.2.1"), known));
  EXPECT_TRUE(applyAddressMessages(message(RTM_DELADDR, 2, "192.0.2.1"), known));
  EXPECT_FALSE(applyAddressMessages(message(RTM_DELADDR, 2, "192.0.2.1"), known));
  EXPECT_EQ(known.size(), 1U);
}

TEST(AddressMessages, OneBufferMayHoldSeveral) {
  std::set<InterfaceAddress> known;
  const std::string both = message(RTM_NEWADDR, 2, "192.0.2.1") + message(RTM_NEWADDR, 2, "192.0.2.2");
  EXPECT_TRUE(applyAddressMessages(both, known));
  EXPECT_EQ(known.size(), 2U);
}

TEST(AddressMessages, OtherMessagesAreNoChange) {
  std::set<InterfaceAddress> known;
  EXPECT_FALSE(applyAddressMessages(message(RTM_NEWADDR, 2, "192.0.2.1", AF_INET6), known));
  EXPECT_FALSE(applyAddressMessages(message(RTM_NEWLINK, 2, "192.0.2.1"), known));
  EXPECT_FALSE(applyAddressMessages("", known));
}

TEST(AddressMessages, SurvivesMalformedMessages) {
  std::mt19937 random(3);  // NOLINT: a fixed seed makes the test repeatable
  std::set<InterfaceAddress> known;
  const std::string good = message(RTM_NEWADDR, 2, "192.0.2.1");
  for (std::size_t cut = 0; cut < good.size(); ++cut) applyAddressMessages(good.substr(0, cut), known);
  for (int round = 0; round < 2000; ++round) {
    std::string bad = good + good;
    for (int i = 0; i < 4; ++i) bad[random() % bad.size()] = static_cast<char>(random());
    applyAddressMessages(bad, known);
  }
}

TEST(NetworkWatcher, Opens) {
  NetworkWatcher watcher;
  EXPECT_EQ(watcher.open(), 0);
  EXPECT_GE(watcher.descriptor(), 0);
  EXPECT_FALSE(watcher.takeChanges());
}

}  // namespace
}  // namespace lmx
