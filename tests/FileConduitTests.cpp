#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <string>

#include "device/files/FileTree.h"
#include "platform/DevicePaths.h"
#include "tsd/CommandError.h"
#include "tsd/conduit/FileConduit.h"

namespace tests {
namespace {

namespace fs = std::filesystem;

/// A host with a todo list, below a folder of its own.
class FileConduits : public testing::Test {
 protected:
  void SetUp() override {
    std::string pattern = testing::TempDir() + "file-conduit-XXXXXX";
    ASSERT_NE(::mkdtemp(pattern.data()), nullptr);
    _host = pattern;
    std::ofstream(_host / platform::todoListName) << "a list";
  }
  void TearDown() override { fs::remove_all(_host); }

  /// What the push of no more than so many entries is refused with; empty when it is not.
  std::string push(std::size_t entries) {
    tsd::Console console;
    _files = device::makeMemoryFileTree();
    try {
      tsd::FileConduit(*_files, console, tsd::FileConduit::Limits{.entries = entries}).pushStaging(_host);
      return "";
    } catch (const tsd::CommandError& error) {
      return error.what();
    }
  }

  fs::path _host;
  std::unique_ptr<device::FileTree> _files;
};

TEST_F(FileConduits, countFilesFoldersAndWhatIsRefused) {
  // Seven below the host's folder, with the todo list: nobody may make folders without end where files are bounded.
  for (const char* folder : {"a", "a/b", "a/b/c"}) fs::create_directory(_host / folder);
  std::ofstream(_host / "a/file") << "content";
  fs::create_symlink("nowhere", _host / "a/link");
  fs::create_directory(_host / "d");
  testing::internal::CaptureStderr();
  EXPECT_EQ(push(7), "");
  EXPECT_TRUE(_files->fileExists(std::string(platform::stagingDirectory) + "/a/b/c"));
  EXPECT_NE(push(6).find(": more than 6 files and folders are not taken"), std::string::npos);
  EXPECT_FALSE(_files->fileExists(platform::stagingDirectory)) << "a host that was refused leaves nothing";
  EXPECT_NE(testing::internal::GetCapturedStderr().find("a/link: not pushed: a symbolic link"), std::string::npos);
}

}  // namespace
}  // namespace tests
