// Atomic writes leave the process's umask alone and flush the directory after renaming.
// Both are seen through calls this file interposes for the library: the executable's
// definitions win over the C library's, and forward to the system calls.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <mutex>
#include <set>
#include <utility>

#include "Corvelbase/platform/FileWrapper.h"
#include "Corvelbase/platform/Files.h"
#include "support/TestSupport.h"

namespace {

std::atomic<int> gUmaskCalls{0};
std::mutex gSyncedMutex;
std::set<std::pair<dev_t, ino_t>> gSyncedDirectories;

std::pair<dev_t, ino_t> identity(const struct stat& st) { return {st.st_dev, st.st_ino}; }

bool wasSynced(const std::string& directory) {
  struct stat st;
  if (stat(directory.c_str(), &st) != 0) return false;
  std::lock_guard lock(gSyncedMutex);
  return gSyncedDirectories.count(identity(st)) > 0;
}

}  // namespace

extern "C" mode_t umask(mode_t mask) {
  ++gUmaskCalls;
  return static_cast<mode_t>(syscall(SYS_umask, mask));
}

extern "C" int fsync(int fd) {
  struct stat st;
  if (fstat(fd, &st) == 0 && S_ISDIR(st.st_mode)) {
    std::lock_guard lock(gSyncedMutex);
    gSyncedDirectories.insert(identity(st));
  }
  return static_cast<int>(syscall(SYS_fsync, fd));
}

namespace corvel {
namespace {

// Regression: the mask was found with umask(0) then umask(mask), so a file another thread
// created in between got mode 0666.
TEST(DurableWrite, PermissionsFollowTheUmaskWithoutChangingIt) {
  testing::TempDir dir;
  mode_t old = static_cast<mode_t>(syscall(SYS_umask, 027));
  gUmaskCalls = 0;
  ASSERT_TRUE(writeFileAtomically(dir.file("file"), Data{1}));
  auto bundle = FileWrapper::initDirectoryWithFileWrappers(
      {{"inner", FileWrapper::initRegularFileWithContents(Data{2})}});
  ASSERT_TRUE(bundle->writeToPath(dir.file("bundle")));
  EXPECT_EQ(gUmaskCalls, 0);
  syscall(SYS_umask, old);
  auto mode = [&](const char* name) {
    struct stat st;
    return stat(dir.file(name).c_str(), &st) == 0 ? st.st_mode & 0777 : ~0u;
  };
  EXPECT_EQ(std::pair(mode("file"), mode("bundle")), std::pair(0640u, 0750u));
}

// Regression: the rename was not followed by a flush of the directory, so after a power cut
// the new name could be gone.
TEST(DurableWrite, TheDirectoryIsFlushedAfterTheRename) {
  testing::TempDir dir;
  std::string parent = dir.file("p");
  ASSERT_EQ(mkdir(parent.c_str(), 0777), 0);
  ASSERT_TRUE(writeFileAtomically(parent + "/file", Data{1}));
  EXPECT_TRUE(wasSynced(parent));

  std::string other = dir.file("q");
  ASSERT_EQ(mkdir(other.c_str(), 0777), 0);
  auto bundle = FileWrapper::initDirectoryWithFileWrappers(
      {{"sub", FileWrapper::initDirectoryWithFileWrappers({})}});
  ASSERT_TRUE(bundle->writeToPath(other + "/bundle"));
  EXPECT_TRUE(wasSynced(other));
  EXPECT_TRUE(wasSynced(other + "/bundle"));
}

}  // namespace
}  // namespace corvel
