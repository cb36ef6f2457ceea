// The simulated flash driver, and the manager that loads it.
#include "driver/flash_driver.h"

#include <gmock/gmock.h>

#include <array>
#include <cstring>
#include <fstream>
#include <iterator>
#include <string>

#include "ce/errors.h"
#include "ce/files.h"
#include "ce/kernel.h"
#include "ce/system.h"
#include "driver/drivers.h"
#include "memory/memory.h"
#include "support/device_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

constexpr DWORD kTellSize = 0x22CFEE;
constexpr DWORD kDelete = 0x22CFF0;
constexpr DWORD kRead = 0x22CFF2;
constexpr DWORD kSeek = 0x22CFF4;
constexpr DWORD kMakeStore = 0x22CFF9;
constexpr DWORD kCreate = 0x22CFFA;
constexpr DWORD kClose = 0x22CFFB;
constexpr DWORD kWrite = 0x22CFFC;
constexpr DWORD kStart = 0x22CFFD;

std::string ContentOf(const std::filesystem::path& path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

class FlashDriverTest : public DeviceTest {
 protected:
  explicit FlashDriverTest(const sim::Profile& profile = {}) : DeviceTest(profile) {
    driver_ = std::make_shared<sim::FlashDriver>(device());
    pages_ =
        static_cast<char*>(VirtualAlloc(nullptr, 4096, MEM_RESERVE | MEM_COMMIT, PAGE_READWRITE));
  }

 public:
  DWORD Ask(DWORD code, void* input, std::size_t size) {
    sim::DriverRequest request{code, input, static_cast<DWORD>(size), nullptr, 0, 0};
    return driver_->Control(request);
  }

 protected:
  DWORD MakeStore(std::uint32_t size) { return Ask(kMakeStore, &size, sizeof size); }
  DWORD Ask(DWORD code) { return Ask(code, block_.data(), block_.size()); }
  DWORD Name(DWORD code, std::string_view name, std::uint32_t size = 0) {
    std::memset(block_.data(), 0, 20);
    name.copy(reinterpret_cast<char*>(block_.data()), 20);
    Set(20, size);
    return Ask(code);
  }
  DWORD Seek(std::uint32_t position) {
    Set(32, position);
    return Ask(kSeek);
  }
  DWORD Write(std::string_view bytes) {
    bytes.copy(pages_, bytes.size());
    SetData(bytes.size());
    return Ask(kWrite);
  }
  DWORD Read(std::uint32_t position, std::uint32_t count) {
    Set(32, position);
    SetData(count);
    return Ask(kRead);
  }
  void SetData(std::size_t count) {
    Set(24, static_cast<std::uint32_t>(count));
    Set(36, static_cast<std::uint32_t>(reinterpret_cast<std::uintptr_t>(pages_)));
  }
  void Set(std::size_t at, std::uint32_t value) {
    std::memcpy(block_.data() + at, &value, sizeof value);
  }
  std::uint32_t SizeField() const {
    std::uint32_t size = 0;
    std::memcpy(&size, block_.data() + 20, sizeof size);
    return size;
  }

  std::shared_ptr<sim::FlashDriver> driver_;
  char* pages_ = nullptr;
  std::array<std::uint8_t, 40> block_{};
};

TEST_F(FlashDriverTest, KeepsWhatIsWrittenAtItsPlace) {
  ASSERT_EQ(MakeStore(1000), 0U);
  ASSERT_EQ(Name(kCreate, "os.nb0", 10), 0U);
  EXPECT_EQ(Seek(6), 0U);
  EXPECT_EQ(Write("tail"), 0U);
  EXPECT_EQ(Seek(0), 0U);
  EXPECT_EQ(Write("he"), 0U);
  EXPECT_EQ(Write("ad--"), 0U) << "a write goes on where the last one ended";
  ASSERT_EQ(Read(4, 6), 0U);
  EXPECT_EQ(std::string(pages_, 6), "--tail");
  EXPECT_EQ(Ask(kTellSize), 0U);
  EXPECT_EQ(SizeField(), 10U);
}

TEST_F(FlashDriverTest, OpensAnExistingFileForTheSizeOfZero) {
  ASSERT_EQ(MakeStore(1000), 0U);
  ASSERT_EQ(Name(kCreate, "a", 3), 0U);
  ASSERT_EQ(Write("abc"), 0U);
  ASSERT_EQ(Ask(kClose), 0U);
  ASSERT_EQ(Name(kCreate, "a", 0), 0U);
  EXPECT_EQ(Read(0, 3), 0U);
  EXPECT_EQ(std::string(pages_, 3), "abc");
  ASSERT_EQ(Name(kCreate, "a", 5), 0U) << "and makes it anew for any other";
  EXPECT_EQ(Read(0, 3), DWORD{ERROR_HANDLE_EOF});
}

TEST_F(FlashDriverTest, RefusesEverythingWithoutAStore) {
  for (const DWORD code : {kCreate, kDelete, kClose, kTellSize, kSeek, kRead, kWrite, kStart}) {
    EXPECT_NE(Name(code, "a", 1), 0U) << code;
  }
  EXPECT_THAT(driver_->Files(), IsEmpty());
}

TEST_F(FlashDriverTest, RefusesWhatNeedsACurrentFile) {
  ASSERT_EQ(MakeStore(1000), 0U);
  for (const DWORD code : {kClose, kTellSize, kSeek, kRead, kWrite}) EXPECT_NE(Ask(code), 0U);
  ASSERT_EQ(Name(kCreate, "a", 1), 0U);
  ASSERT_EQ(Ask(kClose), 0U);
  for (const DWORD code : {kClose, kTellSize, kSeek, kRead, kWrite}) EXPECT_NE(Ask(code), 0U);
}

TEST_F(FlashDriverTest, RefusesBlocksAndCodesThatItDoesNotKnow) {
  ASSERT_EQ(MakeStore(1000), 0U);
  EXPECT_EQ(Ask(kCreate, block_.data(), 39), DWORD{ERROR_INVALID_PARAMETER});
  EXPECT_EQ(Ask(kMakeStore, block_.data(), 40), DWORD{ERROR_INVALID_PARAMETER});
  EXPECT_EQ(Ask(0x22CFF6), DWORD{ERROR_NOT_SUPPORTED});
  EXPECT_EQ(Name(kCreate, "", 1), DWORD{ERROR_INVALID_NAME});
  EXPECT_EQ(Name(kCreate, "12345678901234567890", 1), DWORD{ERROR_INVALID_NAME});
  EXPECT_EQ(Name(kCreate, "1234567890123456789", 1), 0U);
}

TEST_F(FlashDriverTest, RefusesBytesOutsideAFileAndAddressesOutsideItsPages) {
  ASSERT_EQ(MakeStore(1000), 0U);
  ASSERT_EQ(Name(kCreate, "a", 4), 0U);
  EXPECT_EQ(Write("12345"), DWORD{ERROR_DISK_FULL});
  EXPECT_EQ(Seek(4), 0U);
  EXPECT_EQ(Write("1"), DWORD{ERROR_DISK_FULL});
  EXPECT_EQ(Seek(5), DWORD{ERROR_NEGATIVE_SEEK});
  ASSERT_EQ(Seek(0), 0U);
  SetData(4);
  for (const std::uint32_t address : {0U, 1U, 0xFFFFFFFFU}) {
    Set(36, address);
    EXPECT_EQ(Ask(kWrite), DWORD{ERROR_NOACCESS});
  }
  SetData(0xFFFFFFFF);
  EXPECT_NE(Ask(kWrite), 0U);
  EXPECT_EQ(driver_->Files().at("a").written, 0U);
}

TEST_F(FlashDriverTest, TakesItsStoreFromProgramMemory) {
  const std::uint64_t free = device().memory().ram().figures().free();
  EXPECT_EQ(MakeStore(0), DWORD{ERROR_INVALID_PARAMETER});
  EXPECT_EQ(MakeStore(static_cast<std::uint32_t>(free + 1)), DWORD{ERROR_OUTOFMEMORY});
  ASSERT_EQ(MakeStore(100000), 0U);
  EXPECT_EQ(device().memory().ram().figures().free(), free - 100000);
  EXPECT_EQ(Name(kCreate, "a", 60000), 0U);
  EXPECT_EQ(Name(kCreate, "b", 40001), DWORD{ERROR_DISK_FULL});
  EXPECT_EQ(Name(kCreate, "b", 40000), 0U);
  EXPECT_EQ(Name(kDelete, "a"), 0U);
  EXPECT_EQ(Name(kDelete, "a"), DWORD{ERROR_FILE_NOT_FOUND});
  EXPECT_EQ(Name(kCreate, "c", 60000), 0U) << "the room of what was deleted";
  ASSERT_EQ(MakeStore(50), 0U);
  EXPECT_THAT(driver_->Files(), IsEmpty());
  driver_.reset();
  EXPECT_EQ(device().memory().ram().figures().free(), free);
}

TEST_F(FlashDriverTest, WritesItsFilesIntoTheFlashAndARecordOfThem) {
  ASSERT_EQ(MakeStore(1000), 0U);
  ASSERT_EQ(Name(kCreate, "../os", 100), 0U);
  ASSERT_EQ(Write("123456789"), 0U);
  EXPECT_EQ(Ask(kStart, nullptr, 0), 0U);
  EXPECT_EQ(ContentOf(device().folder() / "flash" / "%2E.%2Fos"), "123456789");
  EXPECT_EQ(ContentOf(device().folder() / "flash.record"),
            "{\"us\":0,\"name\":\"../os\",\"size\":9,\"crc32\":3421780262}\n");
}

class FailingFlashTest : public FlashDriverTest {
 protected:
  static sim::Profile Failing() {
    sim::Profile profile;
    profile.flash_start = "fails";
    return profile;
  }
  FailingFlashTest() : FlashDriverTest(Failing()) {}
};

TEST_F(FailingFlashTest, WritesNothing) {
  ASSERT_EQ(MakeStore(1000), 0U);
  ASSERT_EQ(Name(kCreate, "os", 1), 0U);
  EXPECT_EQ(Ask(kStart, nullptr, 0), DWORD{ERROR_WRITE_FAULT});
  EXPECT_FALSE(std::filesystem::exists(device().folder() / "flash"));
}

class RestartingFlashTest : public FlashDriverTest {
 protected:
  static sim::Profile Restarting() {
    sim::Profile profile;
    profile.flash_start = "restarts";
    return profile;
  }
  RestartingFlashTest() : FlashDriverTest(Restarting()) {}
};

TEST_F(RestartingFlashTest, NeverComesBack) {
  ASSERT_EQ(MakeStore(1000), 0U);
  ASSERT_EQ(Name(kCreate, "os", 3), 0U);
  ASSERT_EQ(Write("img"), 0U);
  const HANDLE thread = CreateThread(
      nullptr, 0,
      [](void* self) -> DWORD {
        return static_cast<RestartingFlashTest*>(self)->Ask(kStart, nullptr, 0);
      },
      this, 0, nullptr);
  EXPECT_EQ(WaitForSingleObject(thread, 60000), WAIT_TIMEOUT);
  EXPECT_TRUE(device().drivers().restart_requested());
  driver_.reset();
  Restart();
  EXPECT_FALSE(device().drivers().restart_requested());
  EXPECT_EQ(ContentOf(device().folder() / "flash" / "os"), "img");
}

// ---- the manager ----

/// Says how often it was asked.
class CountingDriver final : public sim::StreamDriver {
 public:
  DWORD Control(sim::DriverRequest& request) override {
    ++count;
    request.returned = request.code;
    return request.code == 99 ? DWORD{ERROR_WRITE_FAULT} : DWORD{ERROR_SUCCESS};
  }
  int count = 0;
};

class DriversTest : public DeviceTest {
 protected:
  void Register(const char16_t* key, std::u16string prefix, std::u16string dll) {
    HKEY opened = nullptr;
    RegCreateKeyExW(HKEY_LOCAL_MACHINE, key, 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &opened,
                    nullptr);
    const auto set = [&](const char16_t* name, const std::u16string& text) {
      RegSetValueExW(opened, name, 0, REG_SZ, reinterpret_cast<const BYTE*>(text.c_str()),
                     static_cast<DWORD>((text.size() + 1) * 2));
    };
    set(u"Prefix", prefix);
    set(u"Dll", dll);
    RegCloseKey(opened);
  }
  static HANDLE Open(const char16_t* name) {
    return CreateFileW(name, GENERIC_READ, 0, nullptr, OPEN_EXISTING, 0, nullptr);
  }
};

TEST_F(DriversTest, NumberLoadedDriversFromOneOn) {
  Register(u"Drivers\\A", u"efl", u"EFLASHDRV.dll");
  const HANDLE first = ActivateDevice(u"Drivers\\A", 0);
  EXPECT_NE(ActivateDevice(u"Drivers\\A", 0), nullptr);
  EXPECT_THAT(device().drivers().Names(), ElementsAre("EFL1:", "EFL2:"));
  EXPECT_TRUE(DeactivateDevice(first));
  EXPECT_NE(ActivateDevice(u"Drivers\\A", 0), nullptr);
  EXPECT_THAT(device().drivers().Names(), ElementsAre("EFL1:", "EFL2:"));
}

TEST_F(DriversTest, RefuseKeysThatDescribeNone) {
  EXPECT_EQ(ActivateDevice(nullptr, 0), nullptr);
  Register(u"Drivers\\A", u"LONG", u"eflashdrv.dll");
  EXPECT_EQ(ActivateDevice(u"Drivers\\A", 0), nullptr);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_INVALID_PARAMETER});
  Register(u"Drivers\\A", u"EFL", u"other.dll");
  EXPECT_EQ(ActivateDevice(u"Drivers\\A", 0), nullptr);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_FILE_NOT_FOUND});
  device().drivers().SetLibrary(u"eflashdrv.dll", {});
  Register(u"Drivers\\A", u"EFL", u"eflashdrv.dll");
  EXPECT_EQ(ActivateDevice(u"Drivers\\A", 0), nullptr);
  EXPECT_THAT(device().drivers().Names(), IsEmpty());
}

TEST_F(DriversTest, OpenBuiltInsUnderTheirNameInAnyCase) {
  const auto driver = std::make_shared<CountingDriver>();
  device().drivers().AddBuiltIn(u"DSK0:", driver);
  const HANDLE disk = Open(u"dsk0:");
  ASSERT_NE(disk, INVALID_HANDLE_VALUE);
  DWORD returned = 0;
  EXPECT_TRUE(DeviceIoControl(disk, 7, nullptr, 0, nullptr, 0, &returned, nullptr));
  EXPECT_EQ(returned, 7U);
  EXPECT_FALSE(DeviceIoControl(disk, 99, nullptr, 0, nullptr, 0, &returned, nullptr));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_WRITE_FAULT});
  EXPECT_EQ(driver->count, 2);
  EXPECT_EQ(Open(u"DSK1:"), INVALID_HANDLE_VALUE);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_DEV_NOT_EXIST});
}

TEST_F(DriversTest, AnswerNothingAnyMoreOnceTheyAreGone) {
  Register(u"Drivers\\A", u"EFL", u"eflashdrv.dll");
  const HANDLE loaded = ActivateDevice(u"Drivers\\A", 0);
  const HANDLE opened = Open(u"EFL1:");
  ASSERT_TRUE(DeactivateDevice(loaded));
  DWORD returned = 0;
  EXPECT_FALSE(DeviceIoControl(opened, 7, nullptr, 0, nullptr, 0, &returned, nullptr));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_INVALID_HANDLE});
  EXPECT_TRUE(CloseHandle(opened));
}

TEST_F(DriversTest, TellDevicesFromFiles) {
  EXPECT_TRUE(sim::Drivers::IsDeviceName(u"EFL1:"));
  EXPECT_TRUE(sim::Drivers::IsDeviceName(u"dsk0:"));
  for (const char16_t* name : {u"", u"E", u"EFL1", u"EFL:", u"EFLA:", u"EFL1:x", u"\\EF1:"}) {
    EXPECT_FALSE(sim::Drivers::IsDeviceName(name));
  }
  EXPECT_FALSE(sim::Drivers::IsDeviceName(nullptr));
}

}  // namespace
