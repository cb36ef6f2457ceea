#include <gtest/gtest.h>

#include <algorithm>
#include <string>

#include "ce/files.h"
#include "ce/kernel.h"
#include "support/device_test.h"

namespace {

/// Small reads one behind the other, while somebody else writes to the same file.
class ReadAheadTest : public DeviceTest {
 protected:
  static constexpr std::size_t kSize = 200'000;

  void SetUp() override {
    for (std::size_t i = 0; i < kSize; ++i) content_ += static_cast<char>(i * 7 + i / 251);
    writer_ = Open(GENERIC_WRITE, CREATE_ALWAYS);
    Write(0, content_);
    reader_ = Open(GENERIC_READ, OPEN_EXISTING);
  }
  void TearDown() override {
    CloseHandle(reader_);
    CloseHandle(writer_);
  }

  static HANDLE Open(DWORD access, DWORD disposition) {
    return CreateFileW(TEXT("\\file.bin"), access, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr,
                       disposition, FILE_ATTRIBUTE_NORMAL, nullptr);
  }
  void Write(std::size_t at, const std::string& text) {
    SetFilePointer(writer_, static_cast<LONG>(at), nullptr, FILE_BEGIN);
    DWORD written = 0;
    ASSERT_TRUE(
        WriteFile(writer_, text.data(), static_cast<DWORD>(text.size()), &written, nullptr));
    content_.replace(at, std::min(text.size(), content_.size() - at), text);
  }
  std::string Read(std::size_t size) {
    std::string text(size, '?');
    DWORD read = 0;
    EXPECT_TRUE(ReadFile(reader_, text.data(), static_cast<DWORD>(size), &read, nullptr));
    return text.substr(0, read);
  }
  [[nodiscard]] std::string ReadAll(std::size_t step) {
    std::string all;
    for (std::string piece = Read(step); !piece.empty(); piece = Read(step)) all += piece;
    return all;
  }

  std::string content_;
  HANDLE reader_ = nullptr;
  HANDLE writer_ = nullptr;
};

TEST_F(ReadAheadTest, GivesTheSameBytesInPiecesOfAnySize) {
  for (const std::size_t step : {1000, 4096, 16384, 16385, 70'000}) {
    SetFilePointer(reader_, 0, nullptr, FILE_BEGIN);
    EXPECT_EQ(ReadAll(step), content_) << step;
  }
}

TEST_F(ReadAheadTest, SeesWhatIsWrittenBehindTheReader) {
  EXPECT_EQ(Read(4096), content_.substr(0, 4096));
  EXPECT_EQ(Read(4096), content_.substr(4096, 4096));
  Write(8192, "new");
  EXPECT_EQ(Read(4096), content_.substr(8192, 4096));
}

TEST_F(ReadAheadTest, EndsWhereTheFileWasCutMeanwhile) {
  EXPECT_EQ(Read(4096), content_.substr(0, 4096));
  EXPECT_EQ(Read(4096), content_.substr(4096, 4096));
  SetFilePointer(writer_, 9000, nullptr, FILE_BEGIN);
  ASSERT_TRUE(SetEndOfFile(writer_));
  EXPECT_EQ(Read(4096), content_.substr(8192, 808));
  EXPECT_EQ(Read(4096), "");
}

TEST_F(ReadAheadTest, SeesWhatIsAppendedAfterTheEndWasReached) {
  SetFilePointer(reader_, 199'000, nullptr, FILE_BEGIN);
  EXPECT_EQ(Read(400).size(), 400U);
  EXPECT_EQ(Read(400).size(), 400U);
  EXPECT_EQ(Read(400).size(), 200U);
  Write(200'000, "more");
  EXPECT_EQ(Read(400), "more");
  EXPECT_EQ(Read(400), "");
  EXPECT_EQ(Read(400), "");
}

TEST_F(ReadAheadTest, GoesBackAndForthAsTheProgramSeeks) {
  for (const LONG at : {0, 100, 50'000, 4096, 199'990, 8192}) {
    SetFilePointer(reader_, at, nullptr, FILE_BEGIN);
    EXPECT_EQ(Read(512), content_.substr(static_cast<std::size_t>(at), 512)) << at;
    EXPECT_EQ(Read(512).size(), at + 1024 <= 200'000 ? 512U : 0U) << at;
  }
}

}  // namespace
