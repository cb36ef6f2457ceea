// Which images of the program loader a device keeps before its flash.
#include "upgrade/loader_images.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <cstdint>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "ce/errors.h"
#include "ce/files.h"
#include "device/flash/flash_chip.h"
#include "driver/drivers.h"
#include "faults/faults.h"
#include "kernel/kernel.h"
#include "product_support/host.h"
#include "product_support/jobs.h"
#include "product_support/status_lines.h"
#include "support/device_files.h"
#include "support/device_test.h"

namespace upgrade {
namespace {

using test::Exists;
using test::PutFile;
using test::StatusLines;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

TEST(LoaderModelTest, IsTheLongestNameThatTheManufacturerStringBeginsWith) {
  const std::vector<std::pair<std::string, std::string>> models = {
      {"MR41-X", "MR41"},  {"MR42", "MR4"},  {"MR4", "MR4"}, {"MV41", "MV41"}, {"MV4", ""},
      {"TQ52-A1", "TQ52"}, {"TQ53", "TQ53"}, {"TQ2", "TQ2"}, {"TQ21", "TQ2"},  {"TQ54", ""},
      {"MR", ""},          {"", ""},         {"mr41", ""},   {" MR41", ""}};
  for (const auto& [manufacturer, model] : models) {
    EXPECT_EQ(LoaderModel(manufacturer), model) << manufacturer;
  }
}

TEST(ChipGenerationTest, HasATextForFourCodesOnly) {
  for (int code = 0; code <= 255; ++code) {
    const std::string_view expected = code == 7 || code == 9 ? "G3"
                                      : code == 13           ? "G4"
                                      : code == 15           ? "H3"
                                                             : "";
    EXPECT_EQ(ChipGeneration(static_cast<std::uint8_t>(code)), expected) << code;
  }
}

/// Notes what a disk is asked, and answers what a test wants.
class RecordingDisk final : public sim::StreamDriver {
 public:
  DWORD Control(sim::DriverRequest& request) override {
    asked.push_back(request);
    std::fill_n(static_cast<std::uint8_t*>(request.output), request.output_size, 0xEE);
    static_cast<std::uint8_t*>(request.output)[24] = code;
    request.returned = returned;
    return error;
  }

  std::vector<sim::DriverRequest> asked;
  std::uint8_t code = 13;
  DWORD returned = 64;
  DWORD error = ERROR_SUCCESS;
};

class LoaderImagesTest : public DeviceTest {
 protected:
  LoaderImagesTest() {
    test::ClearStatusLines();
    test::SetMfgString(job_, "TQ52-A1");
    PutImages();
  }
  ~LoaderImagesTest() override { test::ClearStatusLines(); }

  static void PutImages() {
    for (const char* name : kNames) PutFile(name, "loader");
  }
  /// Gives the device a disk whose chip has this code.
  RecordingDisk& AddDisk(std::uint8_t code) {
    auto disk = std::make_shared<RecordingDisk>();
    disk->code = code;
    device().drivers().AddBuiltIn(u"DSK0:", disk);
    return *disk;
  }

  /// One letter an image: which are there of G3, G4, H3 and of another model's G3.
  static std::string Left() {
    std::string left;
    for (const char* name : kNames) left += Exists(name) ? 'x' : '-';
    return left;
  }

  std::size_t Pauses() {
    std::size_t count = 0;
    for (const auto& sleep : device().kernel().Sleeps()) count += sleep.length_ms == 2000;
    return count;
  }

  UpgradeConfig& job() { return job_; }

 private:
  static constexpr const char* kNames[] = {"\\TQ52.IPL.G3.nb0", "\\TQ52.IPL.G4.nb0",
                                           "\\TQ52.IPL.H3.nb0", "\\MR41.IPL.G3.nb0"};

  UpgradeConfig job_;
};

TEST_F(LoaderImagesTest, OfOtherGenerationsAreDeleted) {
  const std::vector<std::pair<std::uint8_t, std::string>> chips = {
      {7, "x--x"}, {9, "x--x"}, {13, "-x-x"}, {15, "--xx"}};
  RecordingDisk& disk = AddDisk(0);
  for (const auto& [code, left] : chips) {
    PutImages();
    disk.code = code;
    KeepMatchingLoaderImage(job());
    EXPECT_EQ(Left(), left) << int{code};
  }
}

TEST_F(LoaderImagesTest, AreShownInTheOrderOfTheirDeletion) {
  AddDisk(13);
  KeepMatchingLoaderImage(job());
  EXPECT_THAT(StatusLines(), ElementsAre("DOC is !G4!", "Deleting !TQ52.IPL.G3.nb0!",
                                         "Deleting !TQ52.IPL.H3.nb0!"));
  EXPECT_EQ(Pauses(), 1U);
}

TEST_F(LoaderImagesTest, AllStayWhenTheChipIsUnknown) {
  AddDisk(11);
  KeepMatchingLoaderImage(job());
  EXPECT_EQ(Left(), "xxxx");
  EXPECT_THAT(StatusLines(), ElementsAre("DOC is !!"));
  EXPECT_EQ(Pauses(), 1U);
}

TEST_F(LoaderImagesTest, AllStayWithoutADisk) {
  KeepMatchingLoaderImage(job());
  EXPECT_EQ(Left(), "xxxx");
  EXPECT_THAT(StatusLines(), IsEmpty());
  EXPECT_EQ(Pauses(), 0U);
}

TEST_F(LoaderImagesTest, AllStayWhenTheDiskDoesNotAnswerOrTooShortly) {
  RecordingDisk& disk = AddDisk(13);
  disk.error = ERROR_NOT_SUPPORTED;
  KeepMatchingLoaderImage(job());
  disk.error = ERROR_SUCCESS;
  disk.returned = 24;
  KeepMatchingLoaderImage(job());
  EXPECT_EQ(Left(), "xxxx");
  EXPECT_THAT(StatusLines(), IsEmpty());
  EXPECT_EQ(Pauses(), 0U);

  disk.returned = 25;
  KeepMatchingLoaderImage(job());
  EXPECT_EQ(Left(), "-x-x");
}

TEST_F(LoaderImagesTest, AreDeletedThoughTheyAreReadOnly) {
  test::SetAttributesOf("\\TQ52.IPL.G3.nb0", FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_SYSTEM);
  AddDisk(13);
  KeepMatchingLoaderImage(job());
  EXPECT_EQ(Left(), "-x-x");
}

TEST_F(LoaderImagesTest, AreShownOnlyWhenTheyAreGone) {
  AddDisk(13);
  device().faults().Add({"DeleteFileW", 1, 1, ERROR_SHARING_VIOLATION});
  KeepMatchingLoaderImage(job());
  EXPECT_EQ(Left(), "xx-x");
  EXPECT_THAT(StatusLines(), ElementsAre("DOC is !G4!", "Deleting !TQ52.IPL.H3.nb0!"));
  KeepMatchingLoaderImage(job());
  EXPECT_EQ(Left(), "-x-x");
}

TEST_F(LoaderImagesTest, OfADeviceOfAnotherModelHaveNamesWithoutOne) {
  test::SetMfgString(job(), "ZZ99");
  PutFile("\\.IPL.H3.nb0", "loader");
  AddDisk(13);
  KeepMatchingLoaderImage(job());
  EXPECT_EQ(Left(), "xxxx");
  EXPECT_FALSE(Exists("\\.IPL.H3.nb0"));
  EXPECT_THAT(StatusLines(), ElementsAre("DOC is !G4!", "Deleting !.IPL.H3.nb0!"));
}

TEST_F(LoaderImagesTest, DiskIsAskedOnceAndClosed) {
  const RecordingDisk& disk = AddDisk(13);
  const std::size_t before = test::HoldingsOf(device()).handles;
  std::uint8_t code = 0;

  EXPECT_TRUE(device::GetFlashChipGeneration(&code));

  EXPECT_EQ(code, 13);
  ASSERT_EQ(disk.asked.size(), 1U);
  EXPECT_EQ(disk.asked[0].code, 3000U);
  EXPECT_EQ(disk.asked[0].input_size, 0U);
  EXPECT_EQ(disk.asked[0].output_size, 64U);
  EXPECT_EQ(test::HoldingsOf(device()).handles, before);
}

}  // namespace
}  // namespace upgrade
