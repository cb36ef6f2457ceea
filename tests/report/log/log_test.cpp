#include "report/log/log.h"

#include <gmock/gmock.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "faults/faults.h"
#include "net/network.h"
#include "net/virtual/virtual_server.h"
#include "support/device_test.h"

// The platform's own names come last.
#include <coredll.h>

namespace {

using report::CloseLogFile;
using report::Log;
using report::SetSyslogTarget;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr sim::Address kServer = 0x0A000005;  // 10.0.0.5

sim::Profile DeviceProfile() {
  sim::Profile profile;
  profile.address = "10.0.0.1";
  profile.start_time = "2006-03-01 14:05:09";
  return profile;
}

/// The content of the device's log, "<none>" when there is no file.
std::string LogOf(const std::filesystem::path& folder) {
  std::ifstream stream(folder / "storage" / "FileXfer.log", std::ios::binary);
  if (!stream) return "<none>";
  return {std::istreambuf_iterator<char>(stream), {}};
}

class LogTest : public DeviceTest {
 protected:
  LogTest()
      : DeviceTest(DeviceProfile()),
        server_(world(), {kServer, 514},
                [this](sim::VirtualPort&, const sim::Endpoint&, std::string_view bytes) {
                  datagrams_.emplace_back(bytes);
                }) {}
  ~LogTest() override {
    SetSyslogTarget(0, "");
    CloseLogFile();
  }

  std::string File() { return LogOf(device().folder()); }
  std::vector<std::string> Datagrams() {
    Sleep(10);
    return datagrams_;
  }
  /// Whether somebody could write the log file now, sharing it with nobody.
  static bool IsClosed() {
    HANDLE file =
        CreateFileW(TEXT("\\FileXfer.log"), GENERIC_WRITE, 0, nullptr, OPEN_EXISTING, 0, nullptr);
    if (file == INVALID_HANDLE_VALUE) return false;
    CloseHandle(file);
    return true;
  }

 private:
  std::vector<std::string> datagrams_;
  sim::VirtualPort server_;
};

// ---- to the file ----

TEST_F(LogTest, AppendsEveryLineAndLeavesTheFileClosed) {
  Log("Orvenix thread - Started\r\n");
  EXPECT_TRUE(IsClosed());
  Log("Multicast Fallback Mode...");
  Log("Setting file attributes, %s, %d, %d\r\n", "\\a.bin", 32, 1);

  EXPECT_TRUE(IsClosed());
  EXPECT_EQ(File(),
            "Orvenix thread - Started\r\n"
            "Multicast Fallback Mode...Setting file attributes, \\a.bin, 32, 1\r\n");
}

TEST_F(LogTest, AppendsToWhatAnEarlierRunLeft) {
  std::ofstream(device().folder() / "storage" / "FileXfer.log", std::ios::binary) << "earlier\r\n";

  Log("later\r\n");

  EXPECT_EQ(File(), "earlier\r\nlater\r\n");
}

TEST_F(LogTest, CutsAMessageAt1024Characters) {
  const std::string text(2000, 'x');

  Log("%s\r\n", text.c_str());

  EXPECT_EQ(File(), text.substr(0, 1024));
}

TEST_F(LogTest, PrintsTextFromOutsideAsItIs) {
  Log("%s", "100%s%n%d\r\n");

  EXPECT_EQ(File(), "100%s%n%d\r\n");
}

TEST_F(LogTest, DropsALineSilentlyWhenTheFileCannotBeOpened) {
  SetFileAttributesW(TEXT("\\FileXfer.log"), FILE_ATTRIBUTE_NORMAL);
  Log("one\r\n");
  SetFileAttributesW(TEXT("\\FileXfer.log"), FILE_ATTRIBUTE_READONLY);

  Log("two\r\n");
  SetFileAttributesW(TEXT("\\FileXfer.log"), FILE_ATTRIBUTE_NORMAL);
  Log("three\r\n");

  EXPECT_EQ(File(), "one\r\nthree\r\n");
}

TEST_F(LogTest, DropsALineSilentlyWhenACallFails) {
  for (const char* call : {"fopen", "fwrite"}) {
    device().faults().Add({call});
    Log("lost\r\n");
    EXPECT_EQ(device().faults().last_fired(), call);
    device().faults().Clear();
  }
  Log("kept\r\n");

  EXPECT_EQ(File(), "kept\r\n");
}

TEST_F(LogTest, KeepsTheLastErrorOfItsCaller) {
  SetLastError(ERROR_PATH_NOT_FOUND);

  Log("line\r\n");

  EXPECT_EQ(GetLastError(), ERROR_PATH_NOT_FOUND);
}

TEST_F(LogTest, ClosingTheFileWhenNoneIsOpenDoesNothing) {
  CloseLogFile();

  EXPECT_EQ(File(), "<none>");
}

// ---- to syslog ----

TEST_F(LogTest, SendsEachLineAsOneDatagram) {
  SetSyslogTarget(514, "10.0.0.5");

  Log("Orvenix thread - Started\r\n");
  Sleep(61000);
  Log("Orvenix - %s", "x");

  EXPECT_THAT(Datagrams(), ElementsAre("< 14>2006-03-01 14:05:09 Orvenix thread - Started\r\n",
                                       "< 14>2006-03-01 14:06:10 Orvenix - x"));
}

TEST_F(LogTest, OpensTheFileForASyslogLineAndWritesNothingIntoIt) {
  SetSyslogTarget(514, "10.0.0.5");

  Log("line\r\n");

  EXPECT_EQ(File(), "");
  EXPECT_FALSE(IsClosed()) << "it stays open";
  CloseLogFile();
  EXPECT_TRUE(IsClosed());
  Log("line\r\n");
  EXPECT_FALSE(IsClosed()) << "the next line opens it again";
}

TEST_F(LogTest, StartsWindowsSocketsForTheSocketAndNoLonger) {
  SetSyslogTarget(514, "10.0.0.5");
  EXPECT_EQ(device().network().started(), 1U);
  EXPECT_EQ(device().network().open_sockets(), 1U);

  SetSyslogTarget(0, "10.0.0.5");

  EXPECT_EQ(device().network().started(), 0U);
  EXPECT_EQ(device().network().open_sockets(), 0U);
}

TEST_F(LogTest, ASecondSetUpClosesTheFirstSocket) {
  SetSyslogTarget(514, "10.0.0.5");
  SetSyslogTarget(514, "10.0.0.5");

  EXPECT_EQ(device().network().open_sockets(), 1U);
  EXPECT_EQ(device().network().started(), 1U);
  Log("line\r\n");
  EXPECT_EQ(Datagrams().size(), 1U);
}

TEST_F(LogTest, LosesLinesWhenTheAddressDoesNotParse) {
  for (const char* address :
       {"", "syslog.example", static_cast<const char*>(nullptr), "255.255.255.255", "10.0.0.256"}) {
    SetSyslogTarget(514, "10.0.0.5");
    SetSyslogTarget(514, address);

    Log("lost\r\n");
  }

  EXPECT_THAT(Datagrams(), IsEmpty());
  EXPECT_EQ(device().network().open_sockets(), 0U);
  EXPECT_EQ(File(), "");
}

TEST_F(LogTest, WritesToTheFileWhenThereIsNoSocketToBeHad) {
  for (const char* call : {"WSAStartup", "socket", "LocalAlloc"}) {
    device().faults().Add({call});
    SetSyslogTarget(514, "10.0.0.5");
    device().faults().Clear();

    Log("%s\r\n", call);
  }

  EXPECT_EQ(File(), "WSAStartup\r\nsocket\r\nLocalAlloc\r\n");
  EXPECT_EQ(device().network().started(), 0U);
}

TEST_F(LogTest, KeepsSixteenBitsOfThePort) {
  SetSyslogTarget(65536 + 514, "10.0.0.5");
  Log("sent\r\n");
  EXPECT_EQ(Datagrams().size(), 1U);

  SetSyslogTarget(65536, "10.0.0.5");
  Log("written\r\n");
  EXPECT_EQ(File(), "written\r\n");
}

TEST_F(LogTest, IgnoresASendThatFails) {
  SetSyslogTarget(514, "10.0.0.5");
  device().faults().Add({"sendto", 1, 1, WSAENETDOWN});

  Log("lost\r\n");
  Log("sent\r\n");

  EXPECT_THAT(Datagrams(), ElementsAre("< 14>2006-03-01 14:05:09 sent\r\n"));
}

TEST_F(LogTest, SendsALongMessageCutAt1024Characters) {
  SetSyslogTarget(514, "10.0.0.5");
  const std::string text(5000, 'x');

  Log("%s", text.c_str());

  EXPECT_THAT(Datagrams(), ElementsAre("< 14>2006-03-01 14:05:09 " + text.substr(0, 1024)));
}

TEST_F(LogTest, ReturnsToTheFileWithTheNextTarget) {
  SetSyslogTarget(514, "10.0.0.5");
  Log("sent\r\n");
  SetSyslogTarget(0, "");

  Log("written\r\n");

  EXPECT_EQ(File(), "written\r\n");
  EXPECT_TRUE(IsClosed());
  EXPECT_EQ(Datagrams().size(), 1U);
}

// ---- from several threads ----

class LogThreadsTest : public RealDeviceTest {};

TEST_F(LogThreadsTest, KeepsEveryLineWholeWhileTheTargetChanges) {
  constexpr int kThreads = 4;
  constexpr int kLines = 50;
  HANDLE threads[kThreads];
  for (HANDLE& thread : threads) {
    thread = CreateThread(
        nullptr, 0,
        [](void*) -> DWORD {
          for (int i = 0; i < kLines; ++i) Log("a line of some length, number %d\r\n", i);
          return 0;
        },
        nullptr, 0, nullptr);
    ASSERT_NE(thread, nullptr);
  }
  for (int i = 0; i < 20; ++i) {
    SetSyslogTarget(i % 2 == 0 ? 0 : 1, "not an address");
    CloseLogFile();
    Sleep(1);
  }
  SetSyslogTarget(0, "");
  for (HANDLE thread : threads) {
    WaitForSingleObject(thread, INFINITE);
    CloseHandle(thread);
  }

  const std::string log = LogOf(device().folder());
  for (std::size_t at = 0; at < log.size();) {
    const std::size_t end = log.find("\r\n", at);
    ASSERT_NE(end, std::string::npos);
    EXPECT_EQ(log.compare(at, 30, "a line of some length, number "), 0) << log.substr(at, 40);
    EXPECT_LE(end - at, 32U);
    at = end + 2;
  }
}

}  // namespace
