// The link and the library of the message queue: whole, in part, or a crooked one.
#include <cstring>
#include <utility>

#include "ce/errors.h"
#include "ce/kernel.h"
#include "kernel/kernel.h"
#include "library/libraries.h"
#include "report/messages/message_link_test.h"

namespace report {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

// ---- the library's functions ----

TEST_F(MessageLinkTest, CallsTheLibraryWithExactlyTheseArguments) {
  SetRWIStatus(1, "x");
  SendDeviceEvent("id", 1, nullptr);
  CloseTransferHandle();
  EXPECT_THAT(Traced("lapi_open"),
              ElementsAre("\"args\":{\"host\":\"127.0.0.1\",\"queue\":\"UPG_KX_QUEUE\","
                          "\"numbers\":\"0 1 0 0 1 1\"},\"result\":0"));
  const auto written = [](std::size_t length, const char* to, const char* master) {
    return "\"args\":{\"connection\":14680065,\"numbers\":\"60 1 248 0 0 1 0 0 1\",\"length\":" +
           std::to_string(length) + ",\"destination\":\"" + to + "\",\"master\":\"" + master +
           "\",\"source\":\"\"},\"result\":0";
  };
  EXPECT_THAT(
      Traced("lapi_write"),
      ElementsAre(written(StatusText(1, "x").size() + 1, "TW_CLIENT", ""),
                  written(EventText(kTime, "id", 1).size() + 1, "TW_Event_DB", "~MASTERKX")));
  EXPECT_THAT(Traced("lapi_close"), ElementsAre("\"args\":{\"connection\":14680065},\"result\":0"));
}

TEST_F(MessageLinkTest, LooksPastResults) {
  device().faults().Add({"lapi_write", 1, 1, 0});
  SetRWIStatus(1, "lost");
  SetRWIStatus(1, "sent");
  EXPECT_THAT(Sent(), ElementsAre("TW_CLIENT: " + StatusText(1, "sent")));
  EXPECT_EQ(Calls("lapi_open"), 1U);
  EXPECT_EQ(ReadLog(), kStatusEntered + kStart + kStatusSent + kStatusEntered + kStatusSent);
}

TEST_F(MessageLinkTest, LooksPastTheResultOfAnEventAndOfTheEnd) {
  InitKXTransfer();
  device().faults().Add({"lapi_write", 1, 1, 0});
  device().faults().Add({"lapi_close", 1, 1, 0});
  SendDeviceEvent("id", 1, "lost");
  CloseTransferHandle();
  CloseTransferHandle();
  EXPECT_THAT(Sent(), IsEmpty());
  EXPECT_EQ(ReadLog(), kStart + EventLog("id", 1, "lost") + "CloseTransferHandle");
  EXPECT_EQ(device().messages().bad_uses(), 0U);
}

// ---- the link ----

TEST_F(MessageLinkTest, StartsOnceAndSaysSo) {
  InitKXTransfer();
  InitKXTransfer();
  EXPECT_EQ(ReadLog(), kStart);
  EXPECT_EQ(device().messages().open_connections(), 1U);
}

TEST_F(MessageLinkTest, KeepsOneHandleOfTheMutexThatMarksTheClient) {
  const std::size_t before = device().kernel().OpenHandles();
  for (int i = 0; i < 5; ++i) InitKXTransfer();
  EXPECT_EQ(Calls("CreateMutexW"), 5U) << "at every start";
  EXPECT_EQ(device().kernel().OpenHandles(), before + 1);
  EXPECT_THAT(device().kernel().NamedObjects(), ElementsAre("UPGRADE_CLIENT"));
  CloseTransferHandle();
  EXPECT_THAT(device().kernel().NamedObjects(), ElementsAre("UPGRADE_CLIENT"));
  HANDLE const other = CreateMutexW(nullptr, FALSE, TEXT("UPGRADE_CLIENT"));
  EXPECT_EQ(WaitForSingleObject(other, 0), WAIT_OBJECT_0) << "nobody owns it";
  ReleaseMutex(other);
  CloseHandle(other);
}

TEST_F(MessageLinkTest, KeepsTheMutexWhenItCannotBeMadeAgain) {
  InitKXTransfer();
  device().faults().Add({"CreateMutexW", 1, 0, 0});
  SetRWIStatus(1, "x");
  EXPECT_THAT(device().kernel().NamedObjects(), ElementsAre("UPGRADE_CLIENT"));
  EXPECT_THAT(Sent(), ElementsAre("TW_CLIENT: " + StatusText(1, "x")));
}

TEST_F(MessageLinkTest, EndsOnlyWhatIsOpen) {
  CloseTransferHandle();
  EXPECT_EQ(ReadLog(), "");
  InitKXTransfer();
  CloseTransferHandle();
  CloseTransferHandle();
  EXPECT_EQ(ReadLog(), kStart + "CloseTransferHandle") << "without a line end";
  EXPECT_EQ(device().messages().open_connections(), 0U);
  EXPECT_EQ(device().messages().bad_uses(), 0U);
}

TEST_F(MessageLinkTest, OpensAnotherConnectionAfterTheEndOfTheFirst) {
  SetRWIStatus(1, "first");
  CloseTransferHandle();
  SetRWIStatus(1, "second");
  EXPECT_EQ(ReadLog(), kStatusEntered + kStart + kStatusSent + "CloseTransferHandle" +
                           kStatusEntered + kOpen + kStatusSent)
      << "the library stays loaded";
  EXPECT_EQ(Sent().size(), 2U);
  EXPECT_EQ(Calls("LoadLibraryW"), 1U);
}

TEST_F(MessageLinkTest, TakesTheOldNameOfTheLibrary) {
  RestartWith("kx_lapi_c_wrapper", "");
  SetRWIStatus(1, "x");
  EXPECT_EQ(ReadLog(), kStatusEntered + kStart + kStatusSent);
  EXPECT_THAT(Traced("LoadLibraryW"), ElementsAre(HasSubstr("\"name\":\"kx_clapi_dll\"}"),
                                                  HasSubstr("\"name\":\"kx_lapi_c_wrapper\"}")));
  EXPECT_EQ(Sent().size(), 1U);
}

// ---- what may be missing ----

TEST_F(MessageLinkTest, LooksForAMissingLibraryWithEveryMessage) {
  RestartWith("", "");
  SetRWIStatus(4, "x");
  SendDeviceEvent("id", 1, "x");
  CloseTransferHandle();
  EXPECT_EQ(ReadLog(), std::string(kStatusEntered) + kLoad + kEventEntered + kLoad)
      << "neither a time nor a document";
  EXPECT_THAT(Sent(), IsEmpty());
  EXPECT_EQ(Calls("LoadLibraryW"), 4U) << "both names each time";

  device().libraries().Install(sim::MakeQueueLibrary(sim::kQueueLibrary));
  SetRWIStatus(1, "there");
  EXPECT_THAT(Sent(), ElementsAre("TW_CLIENT: " + StatusText(1, "there")));
}

TEST_F(MessageLinkTest, StillReachesTheHostWithoutALibrary) {
  RestartWith("", "");
  record().TakeStatuses();
  SetRWIStatus(4, "x");
  SendDeviceEvent("id", 1, "x");
  EXPECT_THAT(Sent(), ElementsAre("host: " + StatusText(4, "x")));
}

TEST_F(MessageLinkTest, LooksForAMissingOpenWithEveryMessage) {
  RestartWith("kx_clapi_dll", "lapi_open");
  SetRWIStatus(4, "x");
  SendDeviceEvent("id", 1, "x");
  CloseTransferHandle();
  EXPECT_EQ(ReadLog(), std::string(kStatusEntered) + kLoad + kFind + kEventEntered + kFind);
  EXPECT_THAT(Sent(), IsEmpty());
}

TEST_F(MessageLinkTest, LosesMessagesWithoutAWriteAndNothingElse) {
  RestartWith("kx_clapi_dll", "lapi_write");
  SetRWIStatus(4, "x");
  SendDeviceEvent("id", 1, "x");
  CloseTransferHandle();
  EXPECT_THAT(Sent(), IsEmpty());
  EXPECT_EQ(ReadLog(),
            kStatusEntered + kStart + kStatusSent + EventLog("id", 1, "x") + "CloseTransferHandle")
      << "the log calls them sent";
  EXPECT_EQ(device().messages().open_connections(), 0U);
}

TEST_F(MessageLinkTest, NeverLooksForAMissingWriteAgain) {
  RestartWith("kx_clapi_dll", "lapi_write");
  SetRWIStatus(4, "lost");
  device().libraries().Install(sim::MakeQueueLibrary(sim::kQueueLibrary));
  SetRWIStatus(1, "lost");
  CloseTransferHandle();
  SetRWIStatus(1, "lost, too");
  EXPECT_THAT(Sent(), IsEmpty());
  EXPECT_EQ(ReadLog(), kStatusEntered + kStart + kStatusSent + kStatusEntered + kStatusSent +
                           "CloseTransferHandle" + kStatusEntered + kOpen + kStatusSent);
  EXPECT_EQ(Calls("GetProcAddressW"), 3U);
}

TEST_F(MessageLinkTest, KeepsItsConnectionWithoutAClose) {
  RestartWith("kx_clapi_dll", "lapi_close");
  SetRWIStatus(4, "x");
  CloseTransferHandle();
  SetRWIStatus(1, "y");
  EXPECT_EQ(Sent().size(), 2U);
  EXPECT_EQ(ReadLog(), kStatusEntered + kStart + kStatusSent + kStatusEntered + kStatusSent);
  EXPECT_EQ(device().messages().open_connections(), 1U);
}

TEST_F(MessageLinkTest, AsksAgainForAConnectionThatWasRefused) {
  RestartWith("kx_clapi_dll", "", false);
  SetRWIStatus(4, "lost");
  SendDeviceEvent("id", 1, "lost");
  EXPECT_EQ(ReadLog(), kStatusEntered + kStart + kEventEntered + kOpen);
  device().messages().SetOpens(true);
  SendDeviceEvent("id", 1, "sent");
  EXPECT_THAT(Sent(), ElementsAre("TW_Event_DB@~MASTERKX: " + EventText(kNow, "id", 1, "sent")));
}

// ---- a library that keeps to nothing ----

// A library of the queue that keeps to nothing: it writes into the options, refuses with a
// connection and accepts without one.
struct CrookedLibrary {
  static inline std::int32_t open_result = 0;
  static inline HANDLE opened = nullptr;
  static inline std::vector<std::uint32_t> options_seen;
  static inline std::vector<HANDLE> written;
  static inline std::vector<HANDLE> closed;

  static std::int32_t Open(HANDLE* connection, const char*, const char*, std::int32_t, std::int32_t,
                           std::int32_t, std::int32_t, std::uint32_t* options, std::int32_t) {
    options_seen.push_back(std::exchange(*options, 99));
    if (opened != nullptr) *connection = opened;
    return open_result;
  }
  static std::int32_t Write(HANDLE connection, std::int32_t, std::int32_t, std::int32_t,
                            std::int32_t, std::int32_t, void* destination, void* source,
                            const char*, std::int32_t, std::int32_t, std::int32_t, std::int32_t,
                            std::uint32_t* options) {
    options_seen.push_back(std::exchange(*options, 99));
    written.push_back(connection);
    std::memset(destination, 'x', 32);
    std::memset(source, 'x', 32);
    return -1;
  }
  static std::int32_t Close(HANDLE connection) {
    closed.push_back(connection);
    return -1;
  }

  template <typename Function>
  static FARPROC Address(Function* function) {
    return reinterpret_cast<FARPROC>(reinterpret_cast<void (*)()>(function));
  }
  static sim::Library Make() {
    return {std::u16string(sim::kQueueLibrary),
            {{u"lapi_open", Address(&Open)},
             {u"lapi_write", Address(&Write)},
             {u"lapi_close", Address(&Close)}}};
  }
};

TEST_F(MessageLinkTest, PassesTheSameOptionsWhateverTheLibraryWritesThere) {
  CrookedLibrary::opened = reinterpret_cast<HANDLE>(0x77);
  device().libraries().Install(CrookedLibrary::Make());
  SetRWIStatus(1, "x");
  SendDeviceEvent("id", 1, "x");
  EXPECT_THAT(CrookedLibrary::options_seen, ElementsAre(1U, 1U, 1U));
}

TEST_F(MessageLinkTest, TakesAConnectionAlthoughItsOpeningFailed) {
  HANDLE const handle = reinterpret_cast<HANDLE>(0x77);
  CrookedLibrary::open_result = -1;
  CrookedLibrary::opened = handle;
  device().libraries().Install(CrookedLibrary::Make());
  SetRWIStatus(1, "x");
  SendDeviceEvent("id", 1, "x");
  CloseTransferHandle();
  CloseTransferHandle();
  EXPECT_THAT(CrookedLibrary::written, ElementsAre(handle, handle));
  EXPECT_THAT(CrookedLibrary::closed, ElementsAre(handle)) << "although it said that it failed";
  EXPECT_EQ(ReadLog(),
            kStatusEntered + kStart + kStatusSent + EventLog("id", 1, "x") + "CloseTransferHandle");
}

TEST_F(MessageLinkTest, TakesNoConnectionFromAnOpeningThatOnlySaysSo) {
  device().libraries().Install(CrookedLibrary::Make());
  SetRWIStatus(1, "x");
  SetRWIStatus(1, "x");
  CloseTransferHandle();
  EXPECT_THAT(CrookedLibrary::written, IsEmpty());
  EXPECT_THAT(CrookedLibrary::closed, IsEmpty());
  EXPECT_EQ(ReadLog(), kStatusEntered + kStart + kStatusEntered + kOpen);
}

}  // namespace
}  // namespace report
