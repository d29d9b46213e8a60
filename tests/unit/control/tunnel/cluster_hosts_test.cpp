// Member records to addresses.
#include "control/tunnel/cluster_hosts.h"

#include <gmock/gmock.h>

namespace lmx {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

PlistDictionary member(PlistValue host, PlistValue port) {
  return {{"tunnel_agent_host", std::move(host)}, {"tunnel_agent_port", std::move(port)}};
}

TEST(ClusterHosts, AreHostAndPortInTheDictionarysOrderOnceEach) {
  const PlistDictionary members{{"b", member("two", "8175")},
                                {"a", member("one", std::int64_t{8175})},
                                {"c", member("one", "8175")},
                                {"d", member("one", "8176")}};
  EXPECT_THAT(clusterHostArray(&members), ElementsAre("one:8175", "two:8175", "one:8176"));
}

TEST(ClusterHosts, V6AddressesComeInBrackets) {
  const PlistDictionary members{{"a", member("2001:db8::1", "8175")}, {"b", member("[::1]", "8175")}};
  EXPECT_THAT(clusterHostArray(&members), ElementsAre("[2001:db8::1]:8175", "[::1]:8175"));
}

TEST(ClusterHosts, RecordsThatSayNothingAreSkipped) {
  const PlistDictionary members{{"a", PlistValue("text")},
                                {"b", PlistDictionary{{"tunnel_agent_host", "one"}}},
                                {"c", member(PlistArray(), "8175")}};
  EXPECT_THAT(clusterHostArray(&members), IsEmpty());
  EXPECT_THAT(clusterHostArray(nullptr), IsEmpty());
}

}  // namespace
}  // namespace lmx
