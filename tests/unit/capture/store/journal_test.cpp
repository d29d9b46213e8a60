// Writing and locking a journal.
#include "capture/store/journal.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <fstream>
#include <iterator>

#include "tests/unit/capture/capture_harness.h"

namespace lmx {
namespace {

using testing::Folder;

TEST(Journal, WritesALineForEachEvent) {
  const Folder folder;
  const auto journal = Journal::create(folder.file("journal"));
  ASSERT_TRUE(journal);
  (*journal)->capture(2, 0.04, 1000.5);
  (*journal)->run({.sessionTime = 1.5, .firstFrame = 30});
  const Dictionary parameters{
      {"RecordingMetadata_AGENT_PASSWORD", "secret"}, {"TITLE", "My Talk, 100%"}, {"x", ""}};
  (*journal)->start("R", 1.4, std::make_shared<const Dictionary>(parameters));
  (*journal)->stop("R", 3);
  (*journal)->submit("R");
  (*journal)->movie("R", "/r/My Talk.mov");
  EXPECT_TRUE((*journal)->queued("R"));
  std::ifstream file(folder.file("journal"));
  EXPECT_EQ(std::string((std::istreambuf_iterator<char>(file)), {}),
            "capture 2 0.040000000000 1000.5000000\n"
            "run 1.5000000 30\n"
            "start R 1.4000000 RecordingMetadata_AGENT_PASSWORD secret TITLE My%20Talk,%20100%25 x %\n"
            "stop R 3.0000000\n"
            "submit R\n"
            "movie R /r/My%20Talk.mov\n"
            "queued R\n");
}

TEST(Journal, IsLockedWhileItIsOpen) {
  const Folder folder;
  {
    const auto journal = Journal::create(folder.file("journal"));
    ASSERT_TRUE(journal);
    EXPECT_EQ(Journal::open(folder.file("journal")).error().systemError, EWOULDBLOCK);
  }
  EXPECT_TRUE(Journal::open(folder.file("journal")));
}

TEST(Journal, ThatIsNotThereIsNamed) {
  const Folder folder;
  const auto journal = Journal::open(folder.file("journal"));
  ASSERT_FALSE(journal);
  EXPECT_EQ(journal.error().systemError, ENOENT);
  EXPECT_EQ(journal.error().message, folder.file("journal") + ": No such file or directory");
}

TEST(JournalLine, AnyWordsSurvive) {
  const JournalWords words{"", "%", "a b", "50%", "%41", "line\nbreak", "\x7F\x01", "ü"};
  EXPECT_EQ(journalWords(journalLine(words)), words);
}

}  // namespace
}  // namespace lmx
