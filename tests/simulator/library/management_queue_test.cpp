#include "library/management_queue.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "ce/errors.h"
#include "ce/kernel.h"
#include "faults/faults.h"
#include "support/device_test.h"

namespace {

namespace fs = std::filesystem;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

struct Party {
  char name[16] = {};
  char master[16] = {};
};

/// What the queue's library declares.
using Open = std::int32_t (*)(HANDLE*, const char*, const char*, std::int32_t, std::int32_t,
                              std::int32_t, std::int32_t, std::uint32_t*, std::int32_t);
using Write = std::int32_t (*)(HANDLE, std::int32_t, std::int32_t, std::int32_t, std::int32_t,
                               std::int32_t, Party*, Party*, const char*, std::int32_t,
                               std::int32_t, std::int32_t, std::int32_t, std::uint32_t*);
using Close = std::int32_t (*)(HANDLE);

sim::Profile With(const char* library, const char* lacks = "", bool opens = true) {
  sim::Profile profile;
  profile.message_library = library;
  profile.message_library_lacks = lacks;
  profile.message_queue_opens = opens;
  return profile;
}

class ManagementQueueTest : public DeviceTest {
 protected:
  template <typename Type = void (*)()>
  static Type Function(const WCHAR* name) {
    const FARPROC function = GetProcAddressW(LoadLibraryW(u"kx_clapi_dll"), name);
    return reinterpret_cast<Type>(reinterpret_cast<void (*)()>(function));
  }
  HANDLE Connect() {
    HANDLE connection = nullptr;
    result_ =
        Function<Open>(u"lapi_open")(&connection, "127.0.0.1", "A_QUEUE", 0, 1, 0, 0, &options_, 1);
    return connection;
  }
  std::int32_t Send(HANDLE connection, const char* name, const char* master,
                    const std::string& text) {
    return SendBytes(connection, name, master, text.c_str(), text.size() + 1);
  }
  std::int32_t SendBytes(HANDLE connection, const char* name, const char* master, const char* bytes,
                         std::size_t length) {
    Party to;
    Party from;
    std::memcpy(to.name, name, std::min<std::size_t>(std::strlen(name), 16));
    std::memcpy(to.master, master, std::min<std::size_t>(std::strlen(master), 16));
    return Function<Write>(u"lapi_write")(connection, 60, 1, 248, 0, 0, &to, &from, bytes,
                                          static_cast<std::int32_t>(length), 1, 0, 0, &options_);
  }
  static std::int32_t Disconnect(HANDLE connection) {
    return Function<Close>(u"lapi_close")(connection);
  }

  /// Name and content of the files in the folder of messages.
  std::vector<std::string> Files() {
    std::vector<std::string> files;
    if (!fs::exists(device().folder() / "messages")) return files;
    for (const auto& file : fs::directory_iterator(device().folder() / "messages")) {
      std::ifstream in(file.path(), std::ios::binary);
      files.push_back(file.path().filename().string() + ": " +
                      std::string(std::istreambuf_iterator<char>(in), {}));
    }
    std::sort(files.begin(), files.end());
    return files;
  }

  std::int32_t result_ = 0;
  std::uint32_t options_ = 1;
};

TEST_F(ManagementQueueTest, DeliversToTheFolderAndToListeners) {
  std::vector<std::string> heard;
  device().messages().Listen([&heard](const sim::QueuedMessage& message) {
    heard.push_back(std::to_string(message.number) + ' ' + message.queue + ' ' +
                    message.destination + '/' + message.master + ' ' + message.text);
  });
  HANDLE const connection = Connect();
  EXPECT_EQ(result_, 0);
  ASSERT_NE(connection, nullptr);
  EXPECT_EQ(Send(connection, "TW_CLIENT", "", "<a/>"), 0);
  EXPECT_EQ(Send(connection, "TW_Event_DB", "~MASTERKX", "<b/>"), 0);
  EXPECT_EQ(Disconnect(connection), 0);

  EXPECT_THAT(heard,
              ElementsAre("1 A_QUEUE TW_CLIENT/ <a/>", "2 A_QUEUE TW_Event_DB/~MASTERKX <b/>"));
  EXPECT_THAT(Files(),
              ElementsAre("000001-TW_CLIENT.xml: <a/>", "000002-TW_Event_DB.~MASTERKX.xml: <b/>"));
  EXPECT_EQ(device().messages().Messages().size(), 2U);
  EXPECT_EQ(device().messages().open_connections(), 0U);
}

TEST_F(ManagementQueueTest, GoesOnCountingWhenTheDeviceStartsAgain) {
  Send(Connect(), "A", "", "one");
  Restart();
  EXPECT_THAT(device().messages().Messages(), IsEmpty());
  Send(Connect(), "A", "", "two");
  EXPECT_THAT(Files(), ElementsAre("000001-A.xml: one", "000002-A.xml: two"));
}

TEST_F(ManagementQueueTest, CountsOnFromNoFileOfSomebodyElse) {
  fs::create_directory(device().folder() / "messages");
  for (const char* name : {"4294967295-A.xml", "99999999999999999999-A.xml", "1000000000-A.xml",
                           "-5-A.xml", "x.xml", "000041-A.xml"}) {
    std::ofstream(device().folder() / "messages" / name) << "old";
  }
  Send(Connect(), "A", "", "new");
  EXPECT_THAT(Files(), ::testing::Contains("000042-A.xml: new"));
}

TEST_F(ManagementQueueTest, MakesNoFolderWithoutMessages) {
  Disconnect(Connect());
  EXPECT_FALSE(fs::exists(device().folder() / "messages"));
}

TEST_F(ManagementQueueTest, TakesNamesThatFillTheirPlaceAndNoPathsFromThem) {
  HANDLE const connection = Connect();
  Send(connection, "0123456789ABCDEF", "fedcba9876543210", "full");
  Send(connection, "../../x y", "\\", "path");
  EXPECT_THAT(Files(), ElementsAre("000001-0123456789ABCDEF.fedcba9876543210.xml: full",
                                   "000002-.._.._x_y._.xml: path"));
}

TEST_F(ManagementQueueTest, TakesMessagesWithoutAZeroAndWithZerosInside) {
  HANDLE const connection = Connect();
  EXPECT_EQ(SendBytes(connection, "A", "", "abcdef", 3), 0);
  EXPECT_EQ(SendBytes(connection, "A", "", "a\0b\0", 4), 0);
  EXPECT_EQ(SendBytes(connection, "A", "", "", 1), 0);
  const std::vector<sim::QueuedMessage> messages = device().messages().Messages();
  ASSERT_EQ(messages.size(), 3U);
  EXPECT_EQ(messages[0].text, "abc");
  EXPECT_EQ(messages[1].text, std::string("a\0b", 3));
  EXPECT_EQ(messages[2].text, "");
}

TEST_F(ManagementQueueTest, RefusesWhatIsNoMessageOrNoConnection) {
  HANDLE const connection = Connect();
  EXPECT_NE(SendBytes(connection, "A", "", "a", 0), 0);
  EXPECT_NE(SendBytes(connection, "A", "", nullptr, 4), 0);
  EXPECT_EQ(device().messages().bad_uses(), 0U);
  EXPECT_EQ(Disconnect(connection), 0);
  EXPECT_NE(Send(connection, "A", "", "late"), 0);
  EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
  EXPECT_NE(Disconnect(connection), 0);
  EXPECT_NE(Send(nullptr, "A", "", "nowhere"), 0);
  EXPECT_EQ(device().messages().bad_uses(), 3U);
  EXPECT_THAT(Files(), IsEmpty());
  EXPECT_NE(Connect(), connection) << "no number is used twice";
}

TEST_F(ManagementQueueTest, RefusesConnectionsWhenTheProfileSaysSo) {
  Restart(With("kx_clapi_dll", "", false));
  EXPECT_EQ(Connect(), nullptr);
  EXPECT_NE(result_, 0);
  device().messages().SetOpens(true);
  EXPECT_NE(Connect(), nullptr);
}

TEST_F(ManagementQueueTest, HasTheLibraryThatTheProfileNames) {
  Restart(With("kx_lapi_c_wrapper"));
  EXPECT_EQ(LoadLibraryW(u"kx_clapi_dll"), nullptr);
  EXPECT_NE(LoadLibraryW(u"kx_lapi_c_wrapper"), nullptr);
  Restart(With(""));
  EXPECT_EQ(LoadLibraryW(u"kx_clapi_dll"), nullptr);
  EXPECT_EQ(LoadLibraryW(u"kx_lapi_c_wrapper"), nullptr);
}

TEST_F(ManagementQueueTest, LacksTheFunctionThatTheProfileNames) {
  for (const char* lacks : {"lapi_open", "lapi_write", "lapi_close"}) {
    Restart(With("kx_clapi_dll", lacks));
    for (const std::u16string name : {u"lapi_open", u"lapi_write", u"lapi_close"}) {
      const bool there = name != std::u16string(lacks, lacks + std::strlen(lacks));
      EXPECT_EQ(Function(name.c_str()) != nullptr, there) << lacks;
    }
  }
}

TEST_F(ManagementQueueTest, CanBeMadeToFail) {
  device().faults().Add({"lapi_open", 1, 1, 0});
  EXPECT_EQ(Connect(), nullptr);
  HANDLE const connection = Connect();
  device().faults().Add({"lapi_write", 1, 1, 0});
  EXPECT_NE(Send(connection, "A", "", "lost"), 0);
  EXPECT_THAT(device().messages().Messages(), IsEmpty());
  device().faults().Add({"lapi_close", 1, 1, 0});
  EXPECT_NE(Disconnect(connection), 0);
  EXPECT_EQ(device().messages().open_connections(), 0U) << "it cannot be closed again";
}

TEST_F(ManagementQueueTest, WritesThroughNoLinkOfTheHost) {
  const fs::path outside = folder() / "outside";
  fs::create_directory(outside);
  fs::create_directory_symlink(outside, device().folder() / "messages");
  EXPECT_NE(Send(Connect(), "A", "", "text"), 0);
  EXPECT_EQ(GetLastError(), ERROR_DISK_FULL);
  EXPECT_TRUE(fs::is_empty(outside));
  EXPECT_EQ(device().messages().Messages().size(), 1U) << "listeners have it all the same";
}

}  // namespace
