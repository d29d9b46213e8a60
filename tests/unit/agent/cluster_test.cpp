// Cluster information from a scripted tool and from the cache on disk.
#include <gmock/gmock.h>

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <future>

#include "tests/unit/agent/agent_fixture.h"

namespace lmx {
namespace {

using ::testing::ElementsAre;

class Cluster : public AgentTest {
 protected:
  Cluster() {
    for (const auto path : {kServerInformation, kServerInformationOfRoot}) {
      std::filesystem::create_directories(directoryOf(systemPath(path)));
      ::unlink(systemPath(path).c_str());
    }
    context_->server.tunnel_host.set("server");
  }
  ~Cluster() override {
    for (const auto path : {kServerInformation, kServerInformationOfRoot}) ::unlink(systemPath(path).c_str());
  }
  static PlistDictionary members(const std::vector<std::string>& hosts) {
    PlistDictionary all;
    for (const std::string& host : hosts) {
      all.emplace(host, PlistDictionary{{"tunnel_agent_host", PlistValue(host)}, {"tunnel_agent_port", "1"}});
    }
    return {{"cluster_members", all}};
  }
  static void cache(std::string_view path, const PlistDictionary& information) {
    ASSERT_EQ(writePropertyList(systemPath(path), information), 0);
  }
  static ChildResult exited(int status, std::string output = {}) {
    return {ChildResult::End::exited, status, std::move(output)};
  }
  std::vector<std::string> asked() const {
    std::vector<std::string> hosts;
    for (const auto& argv : children_.runs()) hosts.push_back(argv.back());
    return hosts;
  }
  static std::size_t count(const ClusterWatch::SharedPlist& plist) { return plist ? plist->size() : 0; }

  ClusterWatch watch_{*context_, context_->server, context_->server_info, children_};
  ClusterWatch::SharedPlist members_;
};

TEST_F(Cluster, TheToolQueriesTheHost) {
  children_.result = exited(0, propertyListXml(members({"a", "b"})));
  EXPECT_EQ(watch_.clusterInformation("server", members_), 0);
  EXPECT_EQ(count(members_), 2U);
  EXPECT_THAT(children_.runs(),
              ElementsAre(ElementsAre(systemPath(kLumexTool), "--listinfo", "--server", "server")));
  EXPECT_EQ(children_.options().limit, std::chrono::seconds(20));
}

TEST_F(Cluster, InvalidOutputHasNoMembers) {
  for (const char* output :
       {"", "garbage", "<plist version=\"1.0\"><dict/></plist>", "<plist version=\"1.0\"><array/></plist>"}) {
    children_.result = exited(0, output);
    EXPECT_EQ(watch_.clusterInformation("server", members_), 0) << output;
    EXPECT_EQ(members_, nullptr) << output;
  }
}

TEST_F(Cluster, WithoutAHostThereIsNoQuery) {
  EXPECT_EQ(watch_.clusterInformation(std::nullopt, members_), -1);
  EXPECT_TRUE(children_.runs().empty());
}

TEST_F(Cluster, WithoutACacheAFailingToolsStatusIsReturned) {
  children_.result = exited(3);
  EXPECT_EQ(watch_.clusterInformation("server", members_), 3);
  EXPECT_EQ(members_, nullptr);
  EXPECT_TRUE(
      log_.contains(kLogError, "Unable to retrieve cluster information (/usr/bin/lumex exit code = 3)."));
  EXPECT_TRUE(log_.contains(kLogDebug, "Unable to retrieve cluster information from disk."));
}

TEST_F(Cluster, AHangingToolCountsAsFailed) {
  children_.result = {ChildResult::End::timedOut, 9, ""};
  EXPECT_NE(watch_.clusterInformation("server", members_), 0);
  EXPECT_TRUE(
      log_.contains(kLogError, "/usr/bin/lumex --listinfo has not answered for 20 seconds and was ended"));
}

TEST_F(Cluster, TheFirstMemberOfTheCacheIsSkipped) {
  cache(kServerInformation, members({"a", "b", "c"}));
  children_.answer = [](const auto& argv) {
    return argv.back() == "b:1" ? exited(0, propertyListXml(members({"x"}))) : exited(5);
  };
  EXPECT_EQ(watch_.clusterInformation("server", members_), 0);
  EXPECT_THAT(asked(), ElementsAre("server", "b:1"));
  EXPECT_TRUE(members_->contains("x"));
}

TEST_F(Cluster, ACacheOfOneMemberIsReturnedWithoutAnotherQuery) {
  cache(kServerInformation, members({"a"}));
  children_.result = exited(5);
  EXPECT_EQ(watch_.clusterInformation("server", members_), -1);
  EXPECT_THAT(asked(), ElementsAre("server"));
  EXPECT_TRUE(members_->contains("a"));
  EXPECT_TRUE(log_.contains(kLogDebug, "Unable to contact any member of the cluster."));
}

TEST_F(Cluster, AMembersFailureIsReturned) {
  cache(kServerInformation, members({"a", "b", "c"}));
  children_.result = exited(5);
  EXPECT_EQ(watch_.clusterInformation("server", members_), 5);
  EXPECT_THAT(asked(), ElementsAre("server", "b:1")) << "only one entry is tried";
  EXPECT_EQ(count(members_), 3U);
}

TEST_F(Cluster, TheSecondCacheIsReadOnlyWithoutTheFirst) {
  cache(kServerInformationOfRoot, members({"second"}));
  EXPECT_TRUE(ClusterWatch::clusterInformationFromDisk()->contains("second"));
  cache(kServerInformation, members({"first"}));
  EXPECT_TRUE(ClusterWatch::clusterInformationFromDisk()->contains("first"));
  testing::writeFile(systemPath(kServerInformation), "half a file");
  EXPECT_TRUE(ClusterWatch::clusterInformationFromDisk()->contains("second"));
}

TEST_F(Cluster, TheFirstQueryKeepsTheLoopRunning) {
  std::promise<void> turned;
  children_.answer = [&](const auto&) {
    const bool ran = turned.get_future().wait_for(std::chrono::seconds(30)) == std::future_status::ready;
    return ran ? exited(0, propertyListXml(members({"a", "b"}))) : exited(1);
  };
  agent_.mainRunLoop().post([&] { turned.set_value(); }, Wait::no);
  EXPECT_TRUE(watch_.learnCluster(agent_.mainRunLoop(), [] { return true; }));
  EXPECT_TRUE(log_.contains(kLogDebug, "Hosts: a:1, b:1"));
  EXPECT_EQ(count(context_->server_info.get()), 2U);
}

/// With a real tool that hangs.
class HangingTool : public Cluster {
 protected:
  HangingTool() {
    const std::string tool = systemPath(kLumexTool);
    std::filesystem::create_directories(directoryOf(tool));
    testing::writeFile(tool, "#!/bin/sh\necho $$ > '" + pidFile() + "'\nexec sleep 600\n");
    std::filesystem::permissions(tool, std::filesystem::perms{0755});
  }
  ~HangingTool() override { std::filesystem::remove(systemPath(kLumexTool)); }
  [[nodiscard]] std::string pidFile() const { return repository_.file("pid"); }
  [[nodiscard]] pid_t pid() const { return std::atoi(testing::readFile(pidFile()).c_str()); }
  [[nodiscard]] bool toolIsGone() const { return kill(pid(), 0) != 0 && errno == ESRCH; }
  /// Asks the agent to end once the tool runs.
  [[nodiscard]] std::function<bool()> untilTheToolRuns() const {
    return [this] { return pid() == 0; };
  }

  ClusterWatch hanging_{*context_, context_->server, context_->server_info, systemChildRunner()};
};

TEST_F(HangingTool, IsEndedWhenTheAgentIsAskedToEnd) {
  cache(kServerInformation, members({"a", "b"}));
  const auto begin = std::chrono::steady_clock::now();
  EXPECT_FALSE(hanging_.learnCluster(agent_.mainRunLoop(), untilTheToolRuns()));
  EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(15));
  EXPECT_TRUE(toolIsGone());
  EXPECT_EQ(context_->server_info.get(), nullptr);
  EXPECT_FALSE(log_.mentions("cluster")) << "an end that was asked for is no failure";
}

TEST_F(HangingTool, OfARefreshIsEndedWithTheAgent) {
  hanging_.refreshClusterInformation();
  ASSERT_TRUE(testing::waitUntil([this] { return pid() != 0; }));
  hanging_.stop(agent_.mainRunLoop());
  EXPECT_TRUE(toolIsGone());
  EXPECT_FALSE(log_.mentions("cluster"));
}

TEST_F(Cluster, ARefreshThatFailsKeepsTheOldInformation) {
  context_->server_info.set(std::make_shared<const PlistDictionary>(PlistDictionary{{"old", "x"}}));
  children_.result = exited(3);
  watch_.refreshClusterInformation();
  EXPECT_TRUE(log_.waitFor(kLogError, "Unable to update cluster information."));
  EXPECT_TRUE(context_->server_info.get()->contains("old"));
}

TEST_F(Cluster, ARefreshStoresTheAnswer) {
  children_.result = exited(0, propertyListXml(members({"a"})));
  watch_.refreshClusterInformation();
  EXPECT_TRUE(testing::waitUntil([&] {
    const auto now = context_->server_info.get();
    return now && now->contains("a");
  }));
}

}  // namespace
}  // namespace lmx
