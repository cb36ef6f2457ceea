// A whole file, with one call of the platform after the other made to fail.
#include "faults/faults.h"
#include "kernel/kernel.h"
#include "mcftp/client/client_test.h"
#include "memory/memory.h"
#include "net/network.h"

namespace {

using std::chrono::milliseconds;
using test::Data;
using test::Offer;

/// A server that does what is asked of it, one block after the other.
class LockStepServer {
 public:
  explicit LockStepServer(sim::World& world)
      : network_(world),
        port_(world, {0x0A000003, 7001},
              [this](sim::VirtualPort&, const sim::Endpoint& from, std::string_view bytes) {
                Answer(from, bytes);
              }) {}

  /// Announces a file of 600 bytes, the last, five times.
  void Announce(const std::string& name) {
    Offer offer;
    offer.name = name;
    offer.header = "00 21";
    offer.size = 600;
    for (int copy = 0; copy < 5; ++copy) {
      network_.At(network_.now() + milliseconds(10 + 2000 * copy),
                  [this, offer] { port_.Send(test::kPublicGroup, test::Announcement(offer)); });
    }
  }

 private:
  void Answer(const sim::Endpoint& from, std::string_view bytes) {
    const auto opcode = static_cast<unsigned char>(bytes[1]) >> 4U;
    if (opcode == 1) {
      port_.Send(from, test::kOackPassive);
      network_.At(network_.now() + milliseconds(10),
                  [this, from] { port_.Send(from, test::kOackAck); });
    } else if (opcode == 4 && bytes[5] < 2) {
      const unsigned block = static_cast<unsigned char>(bytes[5]) + 1U;
      port_.Send(test::kPrivateGroup, Data(block, block == 1 ? 512 : 88));
    }
  }

  sim::VirtualNetwork network_;
  sim::VirtualPort port_;
};

class FailingCallsTest : public MulticastTest {};

TEST_F(FailingCallsTest, EndTheClientOrTheFileButNothingElse) {
  LockStepServer server(world());
  server.Announce("\\Temp\\a.bin");
  ASSERT_EQ(mcftp::StartMulticastClient(test::kOptions), 0);
  const std::string content = std::string(512, 'A') + std::string(88, 'B');
  ASSERT_EQ(test::GetFile("\\Temp\\a.bin"), content);
  const std::size_t blocks = device().memory().live_blocks();
  std::size_t handles = device().kernel().OpenHandles();
  int whole = 0;
  std::uint64_t nth = 1;
  for (bool failed = true; failed; ++nth) {
    Sleep(20000);  // the last copies of the run before
    const std::string name = "\\Temp\\" + std::to_string(nth) + ".bin";
    const std::uint64_t fired = device().faults().fired();
    device().faults().Add({"*", nth});
    server.Announce(name);
    const std::int32_t result = mcftp::StartMulticastClient(test::kOptions);
    device().faults().Clear();
    failed = device().faults().fired() > fired;
    const std::string call = std::to_string(nth) + " " + device().faults().last_fired();

    EXPECT_TRUE(result == 0 || result == -1) << call;
    // A handle that does not close is lost for good.
    if (failed && device().faults().last_fired() == "CloseHandle") ++handles;
    EXPECT_EQ(device().memory().live_blocks(), blocks) << call;
    EXPECT_EQ(device().memory().bad_frees(), 0U) << call;
    EXPECT_EQ(device().kernel().OpenHandles(), handles) << call;
    EXPECT_EQ(device().kernel().CriticalSections(), 0U) << call;
    EXPECT_EQ(device().network().open_sockets(), 0U) << call;
    if (test::GetFile(name) == content) ++whole;
  }
  EXPECT_GT(nth, 120U);
  EXPECT_GT(whole, static_cast<int>(nth / 2)) << "most failures harm nothing";
  Sleep(20000);
}

}  // namespace
