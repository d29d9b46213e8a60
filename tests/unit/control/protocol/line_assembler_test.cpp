// How received bytes become lines.
#include "control/protocol/line_assembler.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <random>
#include <vector>

namespace lmx {
namespace {

using Result = LineAssembler::Result;

TEST(LineAssembler, LineInOneChunkKeepsItsLineFeed) {
  LineAssembler assembler;
  EXPECT_EQ(assembler.feed("STATUS\n"), (Result{"STATUS\n"}));
  EXPECT_EQ(assembler.partialCommand(), std::nullopt);
}

TEST(LineAssembler, ChunkWithoutLineFeedWaits) {
  LineAssembler assembler;
  EXPECT_EQ(assembler.feed("STA"), Result{});
  EXPECT_EQ(assembler.partialCommand(), "STA");
}

TEST(LineAssembler, LineOverTwoChunksLosesItsLineFeed) {
  LineAssembler assembler;
  assembler.feed("STA");
  EXPECT_EQ(assembler.feed("TUS\n"), (Result{"STATUS"}));
  EXPECT_EQ(assembler.partialCommand(), std::nullopt);
}

TEST(LineAssembler, SecondLineOfAChunkWaits) {
  LineAssembler assembler;
  EXPECT_EQ(assembler.feed("STOP\nSTATUS\n"), (Result{"STOP\n"}));
  EXPECT_EQ(assembler.partialCommand(), "STATUS\n");
}

TEST(LineAssembler, WaitingLineIsJoinedInFrontOfTheNextChunksFirstLine) {
  LineAssembler assembler;
  assembler.feed("STOP\nSTATUS\n");
  EXPECT_EQ(assembler.feed("PAUSE\nRESUME"), (Result{"STATUS\nPAUSE"}));
  EXPECT_EQ(assembler.partialCommand(), "RESUME");
}

TEST(LineAssembler, SecondAppendIsReported) {
  LineAssembler assembler;
  EXPECT_FALSE(assembler.feed("a").appended);
  EXPECT_TRUE(assembler.feed("b").appended);
  EXPECT_EQ(assembler.partialCommand(), "ab");
}

TEST(LineAssembler, BytesBehindANulAreIgnored) {
  LineAssembler assembler;
  EXPECT_EQ(assembler.feed(std::string_view("STA\0junk\n", 9)), Result{});
  EXPECT_EQ(assembler.feed(std::string_view("TUS\nrest\0more", 13)), (Result{"STATUS"}));
  EXPECT_EQ(assembler.partialCommand(), "rest");
}

TEST(LineAssembler, ChunkOfANulAloneLeavesAnEmptyPartialCommand) {
  LineAssembler assembler;
  assembler.feed(std::string_view("\0", 1));
  EXPECT_EQ(assembler.partialCommand(), "");
  EXPECT_EQ(assembler.feed("STATUS\n"), (Result{"STATUS"}));
}

TEST(LineAssembler, CommandOfExactlyTheLimitIsKept) {
  LineAssembler assembler(8);
  assembler.feed("1234");
  EXPECT_EQ(assembler.feed("5678\n"), (Result{"12345678"}));
}

TEST(LineAssembler, CommandBeyondTheLimitIsDroppedAndTheNextOneAssembled) {
  LineAssembler assembler(8);
  assembler.feed("1234");
  EXPECT_EQ(assembler.feed("56789"), (Result{std::nullopt, false, true}));
  EXPECT_EQ(assembler.partialCommand(), std::nullopt);
  EXPECT_EQ(assembler.feed("STOP\n"), (Result{"STOP\n"}));
}

TEST(LineAssembler, LineFeedOfADroppedCommandIsDroppedWithIt) {
  LineAssembler assembler(8);
  assembler.feed("1234");
  EXPECT_EQ(assembler.feed("56789\nSTOP"), (Result{std::nullopt, false, true}));
  EXPECT_EQ(assembler.feed("\n"), (Result{"STOP"}));
}

TEST(LineAssembler, TenMegabytesWithoutALineFeedStayBounded) {
  LineAssembler assembler;
  const std::string chunk(1024, 'x');
  int dropped = 0;
  for (int i = 0; i < 10 * 1024; ++i) {
    dropped += assembler.feed(chunk).dropped ? 1 : 0;
    ASSERT_LE(assembler.partialCommand().value_or("").size(), kPartialCommandLimit);
  }
  EXPECT_EQ(dropped, 9);  // each time 1024 chunks fit, and the one that doesn't goes too
}

/// The assembly once more in the plainest way, to compare with: C strings and an owned partial command.
struct PlainAssembly {
  char* partial = nullptr;
  std::vector<std::string> lines;

  PlainAssembly() = default;
  PlainAssembly(const PlainAssembly&) = delete;
  PlainAssembly& operator=(const PlainAssembly&) = delete;
  ~PlainAssembly() { std::free(partial); }

  void received(const char* bytes, std::size_t size) {
    char* chunk = static_cast<char*>(std::calloc(size + 1, 1));
    std::memcpy(chunk, bytes, size);
    char* line_feed = std::strchr(chunk, '\n');
    if (line_feed == nullptr) {
      if (partial == nullptr) {
        partial = strdup(chunk);
      } else {
        const std::size_t before = std::strlen(partial);
        partial = static_cast<char*>(std::realloc(partial, before + std::strlen(chunk) + 1));
        std::memcpy(partial + before, chunk, std::strlen(chunk) + 1);
      }
    } else {
      const auto index = static_cast<std::size_t>(line_feed - chunk);
      if (partial != nullptr) {
        lines.push_back(std::string(partial) + std::string(chunk, index));
        std::free(partial);
        partial = nullptr;
      } else {
        lines.emplace_back(chunk, index + 1);
      }
      if (std::strlen(line_feed + 1) > 0) partial = strdup(line_feed + 1);
    }
    std::free(chunk);
  }
};

TEST(LineAssembler, AnySplitOfAnyBytesGivesTheDescribedLines) {
  std::mt19937 random(20240117);
  const std::string alphabet("ab =,\r\n\n\n\0", 10);
  for (int round = 0; round < 3000; ++round) {
    std::string stream(random() % 200, ' ');
    for (char& byte : stream) byte = alphabet[random() % alphabet.size()];
    LineAssembler assembler;
    PlainAssembly model;
    std::vector<std::string> lines;
    for (std::size_t at = 0; at < stream.size();) {
      const std::size_t size = std::min<std::size_t>(1 + random() % 17, stream.size() - at);
      if (const auto line = assembler.feed(std::string_view(stream).substr(at, size)).line)
        lines.push_back(*line);
      model.received(stream.data() + at, size);
      at += size;
    }
    ASSERT_EQ(lines, model.lines) << "round " << round;
    ASSERT_EQ(assembler.partialCommand().has_value(), model.partial != nullptr) << "round " << round;
    if (model.partial != nullptr) {
      ASSERT_EQ(*assembler.partialCommand(), model.partial);
    }
  }
}

TEST(LineAssembler, OneLineAChunkComesOutWhateverTheSplitWithinIt) {
  std::mt19937 random(7);
  for (int round = 0; round < 500; ++round) {
    LineAssembler assembler(64);
    for (int command = 0; command < 5; ++command) {
      const std::string text = "COMMAND" + std::to_string(random() % 1000000);
      std::string sent = text + "\n";
      std::optional<std::string> line;
      while (!sent.empty()) {
        const std::size_t size = 1 + random() % sent.size();
        line = assembler.feed(sent.substr(0, size)).line;
        sent.erase(0, size);
      }
      ASSERT_TRUE(line == text || line == text + "\n");
    }
  }
}

}  // namespace
}  // namespace lmx
