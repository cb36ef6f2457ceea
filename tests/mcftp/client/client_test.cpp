#include "mcftp/client/client_test.h"

#include <cstdlib>
#include <sstream>
#include <utility>

#include "support/device_files.h"
// The platform's own names come last.
#include "mcftp/registry.h"
#include "mcftp/settings.h"

namespace test {
namespace {

using std::chrono::milliseconds;

sim::Profile ClientProfile() {
  sim::Profile profile;
  profile.address = "10.0.0.1";
  profile.host_name = "mr7";
  return profile;
}

}  // namespace

MulticastTest::MulticastTest() : DeviceTest(ClientProfile()) {
  server_.emplace(world(), kServer,
                  [this](sim::VirtualPort&, const sim::Endpoint&, std::string_view bytes) {
                    frames_.push_back(ToHex(bytes));
                  });
  ui_.emplace(world(), sim::Endpoint{0x7F000001, 5655},
              [this](sim::VirtualPort&, const sim::Endpoint&, std::string_view bytes) {
                const std::string_view name = bytes.substr(12, bytes.size() - 13);
                status_.push_back(ToHex(bytes.substr(0, 12)) + " " + std::string(name));
              });
  owner_.context = this;
  owner_.log = &OnLine;
  owner_.stopped = [](void* context) { ++static_cast<MulticastTest*>(context)->stops_; };
  CreateDirectoryW(TEXT("\\Temp"), nullptr);
}

MulticastTest::~MulticastTest() {
  if (thread_ != nullptr) {
    ADD_FAILURE() << "the client was not ended";
    std::abort();
  }
  ui_.reset();
  server_.reset();
}

void MulticastTest::OnLine(void* context, const WCHAR* line) {
  auto& self = *static_cast<MulticastTest*>(context);
  std::string text;
  for (; *line != 0; ++line) text += static_cast<char>(*line);
  const std::lock_guard<std::mutex> guard(self.mutex_);
  self.lines_.push_back(std::move(text));
}

DWORD WINAPI MulticastTest::RunClient(void* context) {
  auto& self = *static_cast<MulticastTest*>(context);
  self.result_ = mcftp::StartMulticastClient(self.options_.c_str(), &self.owner_);
  return 0;
}

void MulticastTest::Start(const std::string& options, bool keep_lines) {
  options_ = options;
  thread_ = CreateThread(nullptr, 0, &RunClient, this, 0, nullptr);
  ASSERT_NE(thread_, nullptr);
  Wait(milliseconds(1));
  if (!keep_lines) Forget();
}

void MulticastTest::SetSetting(const char* name, std::uint32_t value) {
  mcftp::Settings settings;
  ASSERT_TRUE(mcftp::LoadSettings(settings));
  mcftp::Registry registry;
  ASSERT_TRUE(
      registry.Create("HKEY_LOCAL_MACHINE\\Software\\Corvanta\\Device Management\\MCFTP Client"));
  ASSERT_TRUE(registry.WriteDword(name, value));
}

bool MulticastTest::has_ended() const {
  return WaitForSingleObject(thread_, 0) == WAIT_OBJECT_0;
}

std::int32_t MulticastTest::End() {
  WaitForSingleObject(thread_, INFINITE);
  CloseHandle(thread_);
  thread_ = nullptr;
  return result_;
}

MulticastTest::Lines MulticastTest::Log() {
  const std::lock_guard<std::mutex> guard(mutex_);
  return std::exchange(lines_, {});
}

MulticastTest::Lines MulticastTest::McastLog() {
  const std::string text = GetFile("\\mcast.log").value_or("");
  std::istringstream in(text.substr(mcast_log_read_));
  mcast_log_read_ = text.size();
  Lines lines;
  for (std::string line; std::getline(in, line);) lines.push_back(line);
  return lines;
}

MulticastTest::Lines MulticastTest::Status() {
  const auto lock = network().Enter();
  return std::exchange(status_, {});
}

MulticastTest::Lines MulticastTest::Frames() {
  const auto lock = network().Enter();
  return std::exchange(frames_, {});
}

void MulticastTest::Send(const std::string& frame, const sim::Endpoint& to) {
  server_->Send(to, frame);
  Wait(milliseconds(1));
}

void MulticastTest::Establish(const Offer& offer) {
  Frames();
  ToPublic(Announcement(offer));
  ToClient(kOackPassive);
  EXPECT_EQ(Frames(), Lines{ToHex(Request(offer))});
  Forget();
}

void MulticastTest::EstablishAsMaster(const Offer& offer) {
  Establish(offer);
  ToClient(kOackAck);
  EXPECT_EQ(Frames(), Lines{ToHex(Ack(0))});
  Forget();
}

void MulticastTest::Forget() {
  Log();
  Status();
  Frames();
}

void MulticastTest::Wait(milliseconds time) {
  Sleep(static_cast<DWORD>(time.count()));
}

milliseconds MulticastTest::Now() {
  return std::chrono::duration_cast<milliseconds>(world().now());
}

}  // namespace test
