// Creating directories and replacing files.
#include "platform/directories.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cerrno>

#include "support/unique_fd.h"
#include "tests/unit/doubles/temporary_directory.h"

namespace lmx {
namespace {

namespace fs = std::filesystem;
using testing::readFile;
using testing::TemporaryDirectory;
using testing::writeFile;

mode_t modeOf(const std::string& path) {
  struct stat status {};
  return stat(path.c_str(), &status) == 0 ? status.st_mode & 07777 : 0;
}

std::size_t entriesIn(const std::string& directory) {
  return static_cast<std::size_t>(std::distance(fs::directory_iterator(directory), fs::directory_iterator()));
}

TEST(MkdirP, CreatesAllMissingParents) {
  const TemporaryDirectory root;
  EXPECT_EQ(mkdir_p(root.file("a/b/c").c_str(), 0750), 0);
  for (const char* name : {"a", "a/b", "a/b/c"}) EXPECT_EQ(modeOf(root.file(name)), 0750U) << name;
}

TEST(MkdirP, ExistingDirectoryIsSuccess) {
  const TemporaryDirectory root;
  EXPECT_EQ(mkdir_p(root.path().c_str(), 0755), 0);
  EXPECT_EQ(mkdir_p("/", 0755), 0);
}

TEST(MkdirP, AcceptsRepeatedAndTrailingSlashes) {
  const TemporaryDirectory root;
  EXPECT_EQ(mkdir_p((root.path() + "//x///y/").c_str(), 0755), 0);
  EXPECT_TRUE(fs::is_directory(root.file("x/y")));
}

TEST(MkdirP, LinkToADirectoryIsADirectory) {
  const TemporaryDirectory root;
  fs::create_directory(root.file("real"));
  fs::create_directory_symlink("real", root.file("link"));
  EXPECT_EQ(mkdir_p(root.file("link/below").c_str(), 0755), 0);
  EXPECT_TRUE(fs::is_directory(root.file("real/below")));
}

TEST(MkdirP, FileInTheWayIsAnError) {
  const TemporaryDirectory root;
  writeFile(root.file("file"), "");
  EXPECT_EQ(mkdir_p(root.file("file").c_str(), 0755), ENOTDIR);
  EXPECT_EQ(mkdir_p(root.file("file/below").c_str(), 0755), ENOTDIR);
}

TEST(MkdirP, EmptyPathIsAnError) {
  EXPECT_EQ(mkdir_p("", 0755), ENOENT);
  EXPECT_EQ(mkdir_p(nullptr, 0755), ENOENT);
}

TEST(SyncDirectory, ReturnsTheErrnoOfAFailure) {
  const TemporaryDirectory root;
  EXPECT_EQ(syncDirectory(root.path()), 0);
  EXPECT_EQ(syncDirectory(root.file("none")), ENOENT);
}

TEST(WriteFileAtomically, NewFileHasTheModeGiven) {
  const TemporaryDirectory root;
  EXPECT_EQ(writeFileAtomically(root.file("new"), "text", 0640), 0);
  EXPECT_EQ(readFile(root.file("new")), "text");
  EXPECT_EQ(modeOf(root.file("new")), 0640U);
  EXPECT_EQ(entriesIn(root.path()), 1U);
}

TEST(WriteFileAtomically, ReplacedFileKeepsItsMode) {
  const TemporaryDirectory root;
  writeFile(root.file("old"), "before");
  fs::permissions(root.file("old"), fs::perms::owner_read | fs::perms::owner_write);
  EXPECT_EQ(writeFileAtomically(root.file("old"), "after", 0644), 0);
  EXPECT_EQ(readFile(root.file("old")), "after");
  EXPECT_EQ(modeOf(root.file("old")), 0600U);
}

TEST(WriteFileAtomically, AReplacedFilesAccessCanBeDiscarded) {
  const TemporaryDirectory root;
  writeFile(root.file("old"), "before");
  fs::permissions(root.file("old"), fs::perms{0644});
  EXPECT_EQ(writeFileAtomically(root.file("old"), "after", 0600, OldAccess::discard), 0);
  EXPECT_EQ(readFile(root.file("old")), "after");
  EXPECT_EQ(modeOf(root.file("old")), 0600U);
}

TEST(WriteFileAtomically, ReaderOfTheOldFileKeepsTheOldContent) {
  const TemporaryDirectory root;
  writeFile(root.file("f"), "old");
  const UniqueFd reader(open(root.file("f").c_str(), O_RDONLY | O_CLOEXEC));
  EXPECT_EQ(writeFileAtomically(root.file("f"), "new and longer", 0644), 0);
  char buffer[32];
  EXPECT_EQ(read(reader.get(), buffer, sizeof buffer), 3);
}

TEST(WriteFileAtomically, FailureLeavesNothingBehind) {
  const TemporaryDirectory root;
  fs::create_directory(root.file("directory"));
  EXPECT_EQ(writeFileAtomically(root.file("directory"), "text", 0644), EISDIR);
  EXPECT_EQ(entriesIn(root.path()), 1U);
  EXPECT_EQ(writeFileAtomically(root.file("none/file"), "text", 0644), ENOENT);
}

}  // namespace
}  // namespace lmx
