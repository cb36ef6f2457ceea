// The fixture of the tests that look at one file's way.
#pragma once

#include "faults/faults.h"
#include "mcftp/client/client_test.h"
#include "net/network.h"
// The platform's own names come last.
#include "mcftp/registry.h"
#include "mcftp/settings.h"

namespace test {

inline constexpr char kWaiting[] = "Waiting for a Multicast MCFTP Server to announce a file...";

inline const std::string kUnknownFrame = Hex("00 90 00 00");
inline const std::string kErrorFrame = Hex("00 60 00 00 00 00 58 00");

class TransferTest : public MulticastTest {
 protected:
  static void SetSetting(const char* name, std::uint32_t value) {
    mcftp::Settings settings;
    ASSERT_TRUE(mcftp::LoadSettings(settings));
    mcftp::Registry registry;
    ASSERT_TRUE(
        registry.Create("HKEY_LOCAL_MACHINE\\Software\\Corvanta\\Device Management\\MCFTP Client"));
    ASSERT_TRUE(registry.WriteDword(name, value));
  }
  /// A file of two blocks, all but its last, from an ACKing master.
  void ReceiveAllButTheLast(Offer offer = {}) {
    offer.size = 600;
    EstablishAsMaster(offer);
    ToPrivate(Data(1, 512));
    Forget();
  }
  /// Ends a client that waits for announcements.
  void EndWaiting() { EXPECT_EQ(End(), 0); }
};

}  // namespace test
