// What the client stands in: RAM stores, windows, other clients.
#include <memory>

#include "device/device.h"
#include "device/flash/ram_file.h"
#include "driver/drivers.h"
#include "driver/flash_driver.h"
#include "faults/faults.h"
#include "mcftp/client/client_test.h"
#include "memory/memory.h"

namespace {

using std::chrono::milliseconds;
using test::Ack;
using test::Announcement;
using test::Data;
using test::Hex;
using test::kOackAck;
using test::kOackPassive;
using test::kWaiting;
using test::Offer;
using test::ToHex;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

// ---- files of a RAM store ----

class RamFileTest : public MulticastTest {
 protected:
  RamFileTest() {
    device().drivers().SetLibrary(u"eflashdrv.dll", [this](sim::Device& on) {
      driver_ = std::make_shared<sim::FlashDriver>(on);
      return driver_;
    });
    device::SetRAMSize(1000);
    offer_.name = "ram:image.bin";
    offer_.size = 600;
  }
  /// What the store holds of the file.
  std::string Content(const std::string& name) {
    const auto files = driver_->Files();
    const auto found = files.find(name);
    if (found == files.end()) return "(none)";
    const auto& content = found->second.content;
    return {content.begin(), content.begin() + found->second.written};
  }

  std::shared_ptr<sim::FlashDriver> driver_;
  Offer offer_;
};

TEST_F(RamFileTest, AreRefusedByADeviceWithoutAStore) {
  device::SetRAMSize(0);
  Start();

  ToPublic(Announcement(offer_));

  EXPECT_THAT(Log(), ElementsAre("Announcement on 239.1.1.1 for:", "ram:image.bin",
                                 "MCT mask(s): ", "Data blocks: 2", "RAM image: ram:image.bin",
                                 "Opening: image.bin (600)", "Error opening: image.bin", kWaiting));
  EXPECT_THAT(Frames(), IsEmpty());
  EXPECT_EQ(End(), 0);
}

TEST_F(RamFileTest, AreReceivedIntoTheStoreUnderTheirNameWithoutPrefix) {
  Start();

  ToPublic(Announcement(offer_));
  EXPECT_THAT(Log(), ElementsAre("Announcement on 239.1.1.1 for:", "ram:image.bin",
                                 "MCT mask(s): ", "Data blocks: 2", "RAM image: ram:image.bin",
                                 "Opening: image.bin (600)", "Establishing session with 10.0.0.2",
                                 "RRQ sent to 10.0.0.2"));
  EXPECT_EQ(driver_->Files().at("image.bin").content.size(), 600U) << "room for all of it";
  EXPECT_THAT(Status(), ElementsAre("01 00 00 00 00 00 00 00 00 00 02 58 ram:image.bin"));
  ToClient(kOackPassive);
  ToPrivate(Data(2, 88));
  ToClient(kOackAck);
  ToPrivate(Data(1, 512));
  EXPECT_EQ(Content("image.bin"), std::string(512, 'A') + std::string(88, 'B'));
  EXPECT_EQ(End(), 0);
}

TEST_F(RamFileTest, AreReceivedIntoTheStoreThatTheJobHasMade) {
  ASSERT_TRUE(device::InitRAMStore());
  const auto made = driver_;
  Start();
  EstablishAsMaster(offer_);
  ToPrivate(Data(1, 512));
  ToPrivate(Data(2, 88));
  EXPECT_EQ(driver_, made);
  EXPECT_EQ(Content("image.bin"), std::string(512, 'A') + std::string(88, 'B'));
  EXPECT_EQ(End(), 0);
}

TEST_F(RamFileTest, AreClosedAndDiscardedBeforeTheNextFile) {
  Start();
  EstablishAsMaster(offer_);
  const std::size_t blocks = device().memory().live_blocks();
  ToPrivate(Data(1, 512));
  ToPrivate(Data(2, 88));
  EXPECT_THAT(
      Log(), ElementsAre("Last block received: 2 (88 bytes)", "File transfer complete (600 bytes).",
                         "1 files received (600 total bytes)", "0 file size mismatches",
                         "Failed to update timestamp", "Failed to update attributes",
                         "File closed: image.bin", "Dallying..."));
  EXPECT_EQ(device().memory().live_blocks(), blocks);

  ToPrivate(Data(2, 88));

  EXPECT_EQ(device().memory().live_blocks(), blocks - 1);
  EXPECT_EQ(End(), 0);
}

TEST_F(RamFileTest, ThatCannotBeOpenedMakeNoFolder) {
  offer_.name = "RAM:\\New\\image.bin";
  offer_.size = 1001;
  Start();

  ToPublic(Announcement(offer_));

  EXPECT_THAT(
      Log(),
      ElementsAre("Announcement on 239.1.1.1 for:", "RAM:\\New\\image.bin",
                  "MCT mask(s): ", "Data blocks: 2", "RAM image: RAM:\\New\\image.bin",
                  "Opening: \\New\\image.bin (1001)", "Error opening: \\New\\image.bin", kWaiting));
  EXPECT_FALSE(test::Exists("\\New"));
  EXPECT_EQ(End(), 0);
}

TEST_F(RamFileTest, ThatTheStoreStopsTakingAreGivenUp) {
  Start();
  EstablishAsMaster(offer_);
  device().faults().Add({"DeviceIoControl", 1, 0, ERROR_GEN_FAILURE});

  ToPrivate(Data(1, 512));

  EXPECT_THAT(Log(), Contains("WriteBlockToFile - SetFilePointer call failed"));
  device().faults().Clear();
  EXPECT_EQ(End(), 0);
}

// ---- windows ----

TEST_F(MulticastTest, PostsProgressToAWindowWhenNoUserInterfaceIsSet) {
  WNDCLASSW window_class = {};
  window_class.lpfnWndProc = &DefWindowProcW;
  window_class.lpszClassName = TEXT("Watcher");
  ASSERT_NE(RegisterClassW(&window_class), 0);
  HWND const window = CreateWindowExW(0, TEXT("Watcher"), TEXT(""), 0, 0, 0, 10, 10, nullptr,
                                      nullptr, nullptr, nullptr);
  ASSERT_NE(window, nullptr);
  owner().window = window;
  owner().message = WM_USER + 7;
  Start("-A=239.1.1.1 -P=7000");
  Offer offer;
  offer.size = 600;
  EstablishAsMaster(offer);
  ToPrivate(Data(1, 512));
  ToPrivate(Data(2, 88));

  std::vector<int> percents;
  MSG message = {};
  while (PeekMessageW(&message, window, WM_USER + 7, WM_USER + 7, PM_REMOVE) != 0) {
    EXPECT_STREQ(reinterpret_cast<const char*>(message.wParam), "\\Temp\\a.bin");
    percents.push_back(static_cast<int>(message.lParam));
  }
  EXPECT_THAT(percents, ElementsAre(85, 100));
  EXPECT_EQ(End(), 0);
  DestroyWindow(window);
}

TEST_F(MulticastTest, PostsNothingWhileAUserInterfaceIsSet) {
  owner().window = reinterpret_cast<HWND>(static_cast<std::uintptr_t>(1));
  owner().message = WM_USER + 7;
  Start();
  Offer offer;
  offer.size = 100;
  EstablishAsMaster(offer);
  ToPrivate(Data(1, 100));

  EXPECT_EQ(Status().size(), 1U);
  EXPECT_EQ(End(), 0);
}

// ---- other clients ----

/// A device besides the fixture's, with a client of its own in the same process.
class Neighbour {
 public:
  Neighbour(sim::World& world, int number)
      : address_(0x0A000100 + static_cast<sim::Address>(number)) {
    sim::Profile profile;
    profile.address = "10.0.1." + std::to_string(number);
    device_ = std::make_unique<sim::Device>(world, profile, folder_.path() / "device");
    const sim::World::Lock lock = world.Acquire();
    thread_ = &world.Spawn(
        *device_, "client",
        [this]() -> std::uint32_t {
          CreateDirectoryW(TEXT("\\Temp"), nullptr);
          const std::int32_t result = mcftp::StartMulticastClient("-A=239.1.1.1 -P=7000");
          content_ = test::GetFile("\\Temp\\a.bin").value_or("none");
          return static_cast<std::uint32_t>(result);
        },
        false);
  }
  ~Neighbour() { AwaitEnd(); }
  Neighbour(const Neighbour&) = delete;
  Neighbour& operator=(const Neighbour&) = delete;

  void AwaitEnd() {
    sim::World& world = device_->world();
    sim::World::Lock lock = world.Acquire();
    world.WaitUntil(lock, {&thread_->finished}, std::nullopt,
                    [&] { return thread_->state == sim::SimThread::State::kFinished; });
  }
  [[nodiscard]] sim::Endpoint endpoint() const { return {address_, 7000}; }
  [[nodiscard]] const std::string& content() const { return content_; }

 private:
  test::TemporaryFolder folder_;
  sim::Address address_;
  std::unique_ptr<sim::Device> device_;
  sim::SimThread* thread_ = nullptr;
  std::string content_;
};

TEST_F(MulticastTest, SeveralClientsInOneProcessKnowNothingOfEachOther) {
  Neighbour one(world(), 1);
  Neighbour two(world(), 2);
  Start();
  Offer offer;
  offer.header = "00 21";

  ToPublic(Announcement(offer));
  EXPECT_THAT(Frames(), ElementsAre(ToHex(test::Request(offer)), ToHex(test::Request(offer)),
                                    ToHex(test::Request(offer))));
  for (const sim::Endpoint& client : {test::kClient, one.endpoint(), two.endpoint()}) {
    Send(kOackPassive, client);
  }
  Send(kOackAck, one.endpoint());
  EXPECT_THAT(Frames(), ElementsAre(ToHex(Ack(0))));
  for (unsigned block = 1; block <= 3; ++block) {
    ToPrivate(Data(block, block < 3 ? 512 : 276));
    EXPECT_THAT(Frames(), ElementsAre(ToHex(Ack(block)))) << "one of them is the master";
  }
  Send(test::kOackNak, two.endpoint());
  EXPECT_THAT(Frames(), ElementsAre(ToHex(test::Nak(3))));
  ToClient(test::kOackNak);
  EXPECT_THAT(Frames(), ElementsAre(ToHex(test::Nak(3))));

  EXPECT_EQ(End(), 0);
  one.AwaitEnd();
  two.AwaitEnd();
  const std::string content = std::string(512, 'A') + std::string(512, 'B') + std::string(276, 'C');
  EXPECT_EQ(test::GetFile("\\Temp\\a.bin"), content);
  EXPECT_EQ(one.content(), content);
  EXPECT_EQ(two.content(), content);
}

}  // namespace
