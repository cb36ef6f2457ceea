// Files whose content is that of many other devices.
#include "storage/shared_parts.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <random>
#include <string>

#include "ce/files.h"
#include "ce/kernel.h"
#include "storage/storage.h"
#include "support/device_files.h"
#include "support/device_test.h"

namespace {

using sim::SharedParts;

std::string Content(std::size_t size) {
  std::mt19937 random(static_cast<unsigned>(size));
  std::string content(size, '\0');
  for (char& byte : content) byte = static_cast<char>(random());
  return content;
}

TEST(SharedPartsTest, HoldWhatAFileWouldHold) {
  const std::string content = Content(1000);
  for (unsigned seed = 0; seed < 200; ++seed) {
    std::mt19937 random(seed);
    SharedParts parts(std::make_shared<const std::string>(content));
    std::string expected(1000, '\0');
    std::string on_host(1000, '\0');
    for (int step = 0; step < 60; ++step) {
      const std::size_t at = random() % 1000;
      const std::size_t size = random() % std::min<std::size_t>(1000 - at, 120) + 1;
      std::string bytes = content.substr(at, size);
      if (random() % 4 == 0) bytes[random() % size] ^= 1;
      const bool taken = parts.Take(at, bytes.data(), size);
      EXPECT_EQ(taken, bytes == content.substr(at, size));
      if (!taken) on_host.replace(at, size, bytes);
      expected.replace(at, size, bytes);
      std::string read = on_host.substr(at, size);
      parts.Fill(at, read.data(), size);
      ASSERT_EQ(read, bytes);
    }
    std::string read = on_host;
    parts.Fill(0, read.data(), read.size());
    ASSERT_EQ(read, expected) << seed;
    parts.ForEach([&](std::uint64_t at, const char* bytes, std::size_t size) {
      on_host.replace(at, size, bytes, size);
    });
    EXPECT_EQ(on_host, expected) << seed;
  }
}

TEST(SharedPartsTest, AreForgottenBehindTheEnd) {
  const std::string content = Content(100);
  SharedParts parts(std::make_shared<const std::string>(content));
  EXPECT_TRUE(parts.Take(10, content.data() + 10, 80));
  parts.Cut(50);
  std::string read(100, '\0');
  parts.Fill(0, read.data(), read.size());
  EXPECT_EQ(read, std::string(10, '\0') + content.substr(10, 40) + std::string(50, '\0'));
  parts.Cut(0);
  EXPECT_TRUE(parts.empty());
}

TEST(SharedPartsTest, NeverReachBeyondTheSharedContent) {
  const std::string content = Content(100);
  SharedParts parts(std::make_shared<const std::string>(content));
  EXPECT_FALSE(parts.Take(50, (content + "x").data() + 50, 51));
  EXPECT_FALSE(parts.Take(100, "x", 1));
  EXPECT_FALSE(parts.Take(1000, "x", 1));
  EXPECT_TRUE(parts.empty());
}

/// A device that is about to receive `content_`.
class SharedFilesTest : public DeviceTest {
 protected:
  SharedFilesTest() : content_(Content(300000)) {
    device().storage().ShareContent(std::make_shared<const std::string>(content_));
  }

  /// Bytes that the file takes on the host.
  std::uint64_t HostBytes(const std::string& name) const {
    struct stat status {};
    EXPECT_EQ(::stat((folder() / "device/storage" / name).c_str(), &status), 0);
    return static_cast<std::uint64_t>(status.st_blocks) * 512;
  }
  static std::string HostContent(const std::filesystem::path& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
  }

  const std::string content_;
};

TEST_F(SharedFilesTest, TakeNoRoomOnTheHost) {
  test::PutFile("\\a.bin", content_);
  EXPECT_EQ(test::GetFile("\\a.bin"), content_);
  EXPECT_EQ(HostBytes("a.bin"), 0U);
}

TEST_F(SharedFilesTest, KeepOnTheHostWhatDiffers) {
  std::string other = content_;
  other[123456] ^= 1;
  test::PutFile("\\a.bin", other);
  EXPECT_EQ(test::GetFile("\\a.bin"), other);
  EXPECT_GT(HostBytes("a.bin"), 0U);
}

TEST_F(SharedFilesTest, AreWholeOnTheHostForWhoeverAsksForThePath) {
  test::PutFile("\\a.bin", content_);
  const auto path = device().storage().HostPath(TEXT("\\a.bin"));
  ASSERT_TRUE(path);
  EXPECT_EQ(HostContent(*path), content_);
  EXPECT_EQ(test::GetFile("\\a.bin"), content_);
}

TEST_F(SharedFilesTest, AreCopiedAndMovedWhole) {
  test::PutFile("\\a.bin", content_);
  test::PutFile("\\b.bin", content_);
  EXPECT_TRUE(CopyFileW(TEXT("\\a.bin"), TEXT("\\copy.bin"), FALSE));
  EXPECT_TRUE(MoveFileW(TEXT("\\b.bin"), TEXT("\\moved.bin")));
  EXPECT_EQ(test::GetFile("\\copy.bin"), content_);
  EXPECT_EQ(test::GetFile("\\moved.bin"), content_);
}

TEST_F(SharedFilesTest, BeginAnewWhenTheyAreReplaced) {
  test::PutFile("\\a.bin", content_);
  test::PutFile("\\a.bin", std::string(1000, '\0'));
  EXPECT_EQ(test::GetFile("\\a.bin"), std::string(1000, '\0'));
  EXPECT_TRUE(DeleteFileW(TEXT("\\a.bin")));
  test::PutFile("\\a.bin", std::string(500, '\0'));
  EXPECT_EQ(test::GetFile("\\a.bin"), std::string(500, '\0'));
}

TEST_F(SharedFilesTest, MayBeWrittenInAnyOrderAndInParts) {
  HANDLE file = CreateFileW(TEXT("\\a.bin"), GENERIC_READ | GENERIC_WRITE, 0, nullptr,
                            CREATE_ALWAYS, 0, nullptr);
  ASSERT_NE(file, INVALID_HANDLE_VALUE);
  std::vector<std::size_t> blocks(215);
  for (std::size_t i = 0; i < blocks.size(); ++i) blocks[i] = i;
  std::mt19937 random(5);
  std::shuffle(blocks.begin(), blocks.end(), random);
  for (const std::size_t block : blocks) {
    const std::size_t at = block * 1400;
    const auto size = static_cast<DWORD>(std::min<std::size_t>(1400, content_.size() - at));
    DWORD written = 0;
    SetFilePointer(file, static_cast<LONG>(at), nullptr, FILE_BEGIN);
    EXPECT_TRUE(WriteFile(file, content_.data() + at, size, &written, nullptr));
    EXPECT_EQ(written, size);
  }
  CloseHandle(file);
  EXPECT_EQ(test::GetFile("\\a.bin"), content_);
  EXPECT_EQ(HostBytes("a.bin"), 0U);
}

}  // namespace
