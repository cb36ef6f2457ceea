#include <gtest/gtest.h>

#include <string>

#include "device/file_crc.h"
#include "device/mapped_file.h"
#include "faults/faults.h"
#include "support/device_files.h"
#include "support/device_test.h"

namespace device {
namespace {

class ChecksumTest : public DeviceTest {
 protected:
  std::uint32_t crc_ = 77;
};

TEST_F(ChecksumTest, OfAFileIsTheUsualCrc32) {
  test::PutFile("\\a.txt", "123456789");
  EXPECT_EQ(FILECRC32("\\a.txt", &crc_), 0U);
  EXPECT_EQ(crc_, 0xCBF43926U);
}

TEST_F(ChecksumTest, CoversFilesOfSeveralBlocks) {
  test::PutFile("\\a.bin", std::string(10000, '\0'));
  EXPECT_EQ(FILECRC32("\\a.bin", &crc_), 0U);
  EXPECT_EQ(crc_, 0x4D3BCA2EU) << "of 10,000 zero bytes";
}

TEST_F(ChecksumTest, OfAnEmptyFileIsZero) {
  test::PutFile("\\a.bin", "");
  EXPECT_EQ(FILECRC32("\\a.bin", &crc_), 0U);
  EXPECT_EQ(crc_, 0U);
}

TEST_F(ChecksumTest, OfAMissingFileIsItsErrorAndZero) {
  EXPECT_EQ(FILECRC32("\\none.bin", &crc_), ERROR_FILE_NOT_FOUND);
  EXPECT_EQ(crc_, 0U);
}

TEST_F(ChecksumTest, IsNeverMadeFromPartOfAFile) {
  test::PutFile("\\a.bin", std::string(10000, 'x'));
  device().faults().Add({"ReadFile", 2, 1, ERROR_GEN_FAILURE});
  EXPECT_EQ(FILECRC32("\\a.bin", &crc_), ERROR_GEN_FAILURE);
  EXPECT_EQ(crc_, 0U);
}

TEST_F(ChecksumTest, NeedsMemory) {
  test::PutFile("\\a.bin", "x");
  for (std::uint64_t nth = 1; nth <= 2; ++nth) {
    device().faults().Clear();
    device().faults().Add({"LocalAlloc", nth, 1, ERROR_OUTOFMEMORY});
    EXPECT_NE(FILECRC32("\\a.bin", &crc_), 0U);
    EXPECT_EQ(crc_, 0U);
  }
}

class MappedFileTest : public DeviceTest {};

TEST_F(MappedFileTest, ShowsTheBytesOfTheFile) {
  test::PutFile("\\a.inf", "some text");
  {
    const MappedFile file("\\a.inf");
    EXPECT_EQ(file.bytes(), "some text");
  }
  test::PutFile("\\a.inf", "given back");
}

TEST_F(MappedFileTest, IsEmptyWithoutAFileAndForAnEmptyOne) {
  EXPECT_TRUE(MappedFile("\\none.inf").bytes().empty());
  test::PutFile("\\a.inf", "");
  EXPECT_TRUE(MappedFile("\\a.inf").bytes().empty());
}

TEST_F(MappedFileTest, IsEmptyWhenAnyStepFails) {
  test::PutFile("\\a.inf", "some text");
  for (const char* step :
       {"CreateFileForMappingW", "GetFileSize", "CreateFileMappingW", "MapViewOfFile"}) {
    device().faults().Clear();
    device().faults().Add({step, 1, 1, ERROR_GEN_FAILURE});
    EXPECT_TRUE(MappedFile("\\a.inf").bytes().empty()) << step;
  }
}

}  // namespace
}  // namespace device
