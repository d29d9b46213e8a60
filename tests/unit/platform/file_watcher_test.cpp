// Watching a file.
#include "platform/file_watcher.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <ostream>

#include "tests/unit/doubles/temporary_directory.h"

namespace lmx {

bool operator==(const FileEvents& a, const FileEvents& b) {
  return a.deleted == b.deleted && a.written == b.written && a.extended == b.extended &&
         a.attributes == b.attributes;
}
void PrintTo(const FileEvents& events, std::ostream* out) {
  *out << (events.deleted ? "deleted " : "") << (events.written ? "written " : "")
       << (events.extended ? "extended " : "") << (events.attributes ? "attributes" : "");
}

namespace {

namespace fs = std::filesystem;
using testing::TemporaryDirectory;
using testing::writeFile;

constexpr FileEvents kNothing{};
constexpr FileEvents kDeleted{.deleted = true};
constexpr FileEvents kWritten{.written = true};
constexpr FileEvents kGrown{.written = true, .extended = true};
constexpr FileEvents kAttributes{.attributes = true};

class FileWatcherTest : public ::testing::Test {
 protected:
  void SetUp() override {
    writeFile(path_, "content");
    ASSERT_TRUE(watcher_.open(path_));
  }
  /// Changes the content in place and keeps its length.
  void overwrite(const std::string& content) const {
    const UniqueFd fd(::open(path_.c_str(), O_WRONLY | O_CLOEXEC));
    EXPECT_EQ(write(fd.get(), content.data(), content.size()), static_cast<ssize_t>(content.size()));
  }

  TemporaryDirectory directory_;
  std::string path_ = directory_.file("watched");
  FileWatcher watcher_;
};

TEST_F(FileWatcherTest, NothingHasHappened) {
  EXPECT_TRUE(watcher_.isOpen());
  EXPECT_EQ(watcher_.poll(), kNothing);
  EXPECT_FALSE(watcher_.poll().any());
}

TEST_F(FileWatcherTest, WriteInPlace) {
  overwrite("CONTENT");
  EXPECT_EQ(watcher_.poll(), kWritten);
  EXPECT_EQ(watcher_.poll(), kNothing);
}

TEST_F(FileWatcherTest, TwoWritesWithinOneTickAreBothSeen) {
  for (int i = 0; i < 50; ++i) {
    overwrite("CONTENT");
    EXPECT_EQ(watcher_.poll(), kWritten) << i;
  }
}

TEST_F(FileWatcherTest, Growth) {
  writeFile(path_, "content and more");
  EXPECT_EQ(watcher_.poll(), kGrown);
}

TEST_F(FileWatcherTest, Shrinkage) {
  ASSERT_EQ(truncate(path_.c_str(), 2), 0);
  EXPECT_EQ(watcher_.poll(), kWritten);
}

TEST_F(FileWatcherTest, ChangeOfMode) {
  ASSERT_EQ(chmod(path_.c_str(), 0400), 0);
  EXPECT_EQ(watcher_.poll(), kAttributes);
  EXPECT_EQ(watcher_.poll(), kNothing);
}

TEST_F(FileWatcherTest, Unlink) {
  fs::remove(path_);
  EXPECT_EQ(watcher_.poll(), kDeleted);
}

TEST_F(FileWatcherTest, UnlinkWhileAnotherNameRemains) {
  fs::create_hard_link(path_, directory_.file("other"));
  EXPECT_EQ(watcher_.poll(), kAttributes);
  fs::remove(path_);
  EXPECT_EQ(watcher_.poll(), kDeleted);
}

TEST_F(FileWatcherTest, ReplacementByRename) {
  writeFile(directory_.file("new"), "content");
  fs::rename(directory_.file("new"), path_);
  EXPECT_EQ(watcher_.poll(), kDeleted);
}

TEST_F(FileWatcherTest, RemovedAndMadeAgain) {
  fs::remove(path_);
  writeFile(path_, "content");  // could get the same inode number if the old one weren't held
  EXPECT_EQ(watcher_.poll(), kDeleted);
}

TEST_F(FileWatcherTest, MovedAway) {
  fs::rename(path_, directory_.file("elsewhere"));
  EXPECT_EQ(watcher_.poll(), kDeleted);
}

TEST_F(FileWatcherTest, OpenedAgainAfterAReplacement) {
  writeFile(directory_.file("new"), "new");
  fs::rename(directory_.file("new"), path_);
  ASSERT_TRUE(watcher_.open(path_));
  EXPECT_EQ(watcher_.poll(), kNothing);
  writeFile(path_, "newer still");
  EXPECT_EQ(watcher_.poll(), kGrown);
}

TEST_F(FileWatcherTest, OtherFilesOfTheDirectoryAreNothing) {
  writeFile(directory_.file("other"), "x");
  fs::remove(directory_.file("other"));
  EXPECT_EQ(watcher_.poll(), kNothing);
}

TEST_F(FileWatcherTest, LinkThatIsTurnedToAnotherFile) {
  writeFile(directory_.file("second"), "second");
  fs::create_symlink("watched", directory_.file("link"));
  FileWatcher watcher;
  ASSERT_TRUE(watcher.open(directory_.file("link")));
  fs::create_symlink("second", directory_.file("turned"));
  fs::rename(directory_.file("turned"), directory_.file("link"));
  EXPECT_EQ(watcher.poll(), kDeleted);
}

TEST_F(FileWatcherTest, FileThatIsNotThereIsNotWatched) {
  EXPECT_FALSE(watcher_.open(directory_.file("none")));
  EXPECT_FALSE(watcher_.isOpen());
  EXPECT_EQ(watcher_.poll(), kNothing);
}

TEST_F(FileWatcherTest, ClosedWatcherSeesNothing) {
  watcher_.close();
  fs::remove(path_);
  EXPECT_FALSE(watcher_.isOpen());
  EXPECT_EQ(watcher_.poll(), kNothing);
}

TEST_F(FileWatcherTest, PipeDoesNotBlock) {
  ASSERT_EQ(mkfifo(directory_.file("fifo").c_str(), 0600), 0);
  watcher_.open(directory_.file("fifo"));
  watcher_.poll();
}

TEST(FileWatcher, RelativePathsWork) {
  const TemporaryDirectory directory;
  const fs::path before = fs::current_path();
  fs::current_path(directory.path());
  writeFile("relative", "x");
  FileWatcher watcher;
  EXPECT_TRUE(watcher.open("relative"));
  fs::remove("relative");
  EXPECT_EQ(watcher.poll(), kDeleted);
  fs::current_path(before);
}

}  // namespace
}  // namespace lmx
