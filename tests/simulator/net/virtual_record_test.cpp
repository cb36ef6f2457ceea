// What the network of a virtual world records, and that a seed repeats it byte for byte.
#include "simulator/net/virtual_network_fixture.h"
#include "trace/trace.h"

namespace test {
namespace {

using namespace std::chrono_literals;  // NOLINT(google-build-using-namespace)
using sim::Endpoint;
using sim::LinkProfile;
using sim::StreamEnd;

using VirtualRecordTest = VirtualNetworkTest;

TEST_F(VirtualRecordTest, RecordsWhatWasSentByWhomAndWhen) {
  LinkProfile link;
  link.delay = 5ms;
  network_.SetDefaultLink(link);
  script_.bytes = [](StreamEnd& end, std::string_view /*bytes*/) {
    end.Send("response");
    end.Close();
  };
  Serve();
  network_.StartCapture();
  const SOCKET socket = ConnectedSocket();
  const Endpoint local = LocalName(socket);
  SendText(socket, "request");
  ReceiveAll(socket);
  SendTo(Udp(), {kOther, 9}, "lost");
  network_.StopCapture();
  SendTo(Udp(), {kOther, 9}, "not recorded");

  EXPECT_EQ(network_.StreamBytes(local, kPort80), "request");
  EXPECT_EQ(network_.StreamBytes({kServer, 0}, {kDevice, 0}), "response");
  EXPECT_EQ(network_.FramesText(),
            "0.000000 connect 127.0.0.1:1025 > 127.0.0.2:80 at 127.0.0.2 0.005000\n"
            "0.005000 accept 127.0.0.2:80 > 127.0.0.1:1025 at 127.0.0.1 0.010000\n"
            "0.010000 tcp 127.0.0.1:1025 > 127.0.0.2:80 7 bytes at 127.0.0.2 0.015000\n"
            "0.015000 tcp 127.0.0.2:80 > 127.0.0.1:1025 8 bytes at 127.0.0.1 0.020000\n"
            "0.015000 end 127.0.0.2:80 > 127.0.0.1:1025 at 127.0.0.1 0.020000\n"
            "0.020000 udp 127.0.0.1:1026 > 127.0.0.3:9 4 bytes lost\n");
}

/// One busy quarter of a minute on a bad network, as everything that was sent and called.
std::string BusyRun(std::uint64_t seed) {
  const TemporaryFolder folder;
  const auto world = sim::World::MakeVirtual(seed);
  sim::Device device(*world, sim::Profile{}, folder.path() / "device");
  std::string record;
  device.trace().SetSink([&](std::string_view line) { record.append(line).append("\n"); });
  sim::VirtualNetwork network(*world);
  LinkProfile bad;
  bad.delay = 2ms;
  bad.jitter = 7ms;
  bad.loss = 0.1;
  bad.burst_begin = 0.02;
  bad.burst_end = 0.3;
  bad.duplicate = 0.05;
  bad.reorder = 0.05;
  bad.bytes_per_second = 500000;
  network.SetDefaultLink(bad);
  network.StartCapture();
  Script script;
  script.bytes = [](StreamEnd& end, std::string_view bytes) { end.Send(bytes); };
  sim::VirtualServer server(*world, kPort80,
                            [&](const Endpoint&) { return std::make_unique<Scripted>(script); });
  sim::VirtualPort port(*world, {kServer, 9},
                        [](sim::VirtualPort& at, const Endpoint& from, std::string_view bytes) {
                          at.Send(from, bytes);
                        });
  const auto stream = [] {
    const SOCKET socket = Tcp();
    Connect(socket, kServer, 80);
    for (int i = 0; i < 20; ++i) {
      SendText(socket, std::string(3000, 'a'));
      ReceiveText(socket);
    }
    return 0U;
  };
  const auto datagrams = [] {
    const SOCKET socket = Udp();
    for (int i = 0; i < 100; ++i) {
      SendTo(socket, {kServer, 9}, std::to_string(i));
      if (Select(socket, For::kRead, 5) == 1) ReceiveText(socket);
    }
    return 0U;
  };
  {
    const sim::AttachedThread host(device);
    StartWinsock();
    auto lock = world->Acquire();
    sim::SimThread& first = world->Spawn(device, "stream", stream, /*suspended=*/false);
    sim::SimThread& second = world->Spawn(device, "datagrams", datagrams, /*suspended=*/false);
    const auto finished = sim::SimThread::State::kFinished;
    world->WaitUntil(lock, {&first.finished, &second.finished}, std::nullopt,
                     [&] { return first.state == finished && second.state == finished; });
  }
  device.trace().SetSink({});
  return record + network.FramesText();
}

TEST(VirtualNetworkSeedTest, RepeatsARunByteForByteWithTheSameSeed) {
  const std::string record = BusyRun(11);

  EXPECT_GT(record.size(), 10000U);
  EXPECT_TRUE(BusyRun(11) == record);
  EXPECT_FALSE(BusyRun(12) == record);
}

}  // namespace
}  // namespace test
