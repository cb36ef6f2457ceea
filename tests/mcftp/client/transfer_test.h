// The fixture of the tests that look at one file's way.
#pragma once

#include "faults/faults.h"
#include "mcftp/client/client_test.h"
#include "net/network.h"

namespace test {

inline const std::string kUnknownFrame = Hex("00 90 00 00");
inline const std::string kErrorFrame = Hex("00 60 00 00 00 00 58 00");

class TransferTest : public MulticastTest {
 protected:
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
