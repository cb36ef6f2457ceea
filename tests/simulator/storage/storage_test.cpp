#include "storage/storage.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <atomic>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "ce/errors.h"
#include "ce/files.h"
#include "ce/kernel.h"
#include "ce/system.h"
#include "device/device.h"
#include "faults/faults.h"
#include "kernel/kernel.h"
#include "memory/memory.h"
#include "support/device_test.h"

namespace {

constexpr std::uint64_t kCardBytes = 10'000;

sim::Profile DeviceWithCards() {
  sim::Profile profile;
  profile.volumes = {{"\\Flash File Store", 1U << 20U, true},
                     {"\\SDMMC Disk", kCardBytes, true},
                     {"\\Storage Card", kCardBytes, false}};
  return profile;
}

class StorageTest : public DeviceTest {
 protected:
  StorageTest() : DeviceTest(DeviceWithCards()) {}

  [[nodiscard]] sim::Storage& storage() { return device().storage(); }
  [[nodiscard]] std::filesystem::path host() { return device().folder() / "storage"; }
  [[nodiscard]] std::uint64_t used() { return device().memory().store().figures().used; }

  static HANDLE Open(const WCHAR* name, DWORD access, DWORD disposition) {
    return CreateFileW(name, access, 0, nullptr, disposition, FILE_ATTRIBUTE_NORMAL, nullptr);
  }
  static bool WriteBytes(HANDLE file, std::size_t count) {
    const std::vector<char> bytes(count, 'x');
    DWORD written = 0xBDBDBDBD;
    const BOOL done = WriteFile(file, bytes.data(), static_cast<DWORD>(count), &written, nullptr);
    EXPECT_EQ(written, done ? count : 0);
    return done != FALSE;
  }
  static bool Make(const WCHAR* name, std::size_t size = 1) {
    const HANDLE file = Open(name, GENERIC_WRITE, CREATE_ALWAYS);
    if (file == INVALID_HANDLE_VALUE) return false;
    const bool whole = WriteBytes(file, size);
    CloseHandle(file);
    return whole;
  }
  static std::uint64_t FreeOn(const WCHAR* name) {
    ULARGE_INTEGER free = {};
    EXPECT_TRUE(GetDiskFreeSpaceExW(name, &free, nullptr, nullptr));
    return free.QuadPart;
  }
  static std::vector<std::u16string> List(const WCHAR* pattern) {
    std::vector<std::u16string> names;
    WIN32_FIND_DATAW data;
    const HANDLE search = FindFirstFileW(pattern, &data);
    if (search == INVALID_HANDLE_VALUE) return names;
    do {
      names.emplace_back(data.cFileName);
    } while (FindNextFileW(search, &data));
    FindClose(search);
    return names;
  }
  void PutOnHost(const std::string& name, const std::string& text) {
    std::ofstream(host() / name, std::ios::binary) << text;
  }
};

// ---- where things lie ----

TEST_F(StorageTest, LiesInTheDevicesFolderByItsOwnNames) {
  ASSERT_TRUE(CreateDirectoryW(TEXT("\\Temp"), nullptr));
  ASSERT_TRUE(Make(TEXT("\\TEMP\\\xC4 \x20AC.txt"), 3));

  EXPECT_EQ(std::filesystem::file_size(host() / "Temp" / "\xC3\x84 \xE2\x82\xAC.txt"), 3U);
  EXPECT_EQ(storage().HostPath(TEXT("\\temp\\\xE4 \x20AC.TXT")),
            host() / "Temp" / "\xC3\x84 \xE2\x82\xAC.txt");
  EXPECT_FALSE(storage().HostPath(TEXT("\\none")));
}

TEST_F(StorageTest, FindsWhatOthersPutThere) {
  PutOnHost("Mixed.Txt", "12345");

  EXPECT_EQ(GetFileAttributesW(TEXT("\\mixed.txt")), FILE_ATTRIBUTE_ARCHIVE);
  const HANDLE file = Open(TEXT("\\MIXED.TXT"), GENERIC_READ, OPEN_EXISTING);
  EXPECT_EQ(GetFileSize(file, nullptr), 5U);
  CloseHandle(file);
  EXPECT_EQ(used(), 0U) << "not counted yet";
  storage().Recount();
  EXPECT_EQ(used(), 5U);
  EXPECT_TRUE(DeleteFileW(TEXT("\\mixed.txt")));
  EXPECT_EQ(used(), 0U);
}

TEST_F(StorageTest, PrefersTheExactSpellingOfTwoThatTheHostHas) {
  PutOnHost("a.txt", "1");
  PutOnHost("A.TXT", "22");

  for (const auto& [name, size] : {std::pair{TEXT("\\a.txt"), 1U}, std::pair{TEXT("\\A.TXT"), 2U},
                                   std::pair{TEXT("\\A.txt"), 2U}}) {
    const HANDLE file = Open(name, GENERIC_READ, OPEN_EXISTING);
    EXPECT_EQ(GetFileSize(file, nullptr), size);
    CloseHandle(file);
  }
}

// ---- across a restart ----

TEST_F(StorageTest, KeepsAttributesAndTimesAcrossARestartAndACopyOfTheFolder) {
  ASSERT_TRUE(Make(TEXT("\\a.txt")));
  const FILETIME times[3] = {{1, 0x01C00000}, {2, 0x01C00000}, {3, 0x01C00000}};
  const HANDLE file = Open(TEXT("\\a.txt"), GENERIC_WRITE, OPEN_EXISTING);
  ASSERT_TRUE(SetFileTime(file, &times[0], &times[1], &times[2]));
  CloseHandle(file);
  constexpr DWORD kAttributes =
      FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_SYSTEM | FILE_ATTRIBUTE_TEMPORARY;
  ASSERT_TRUE(SetFileAttributesW(TEXT("\\a.txt"), kAttributes));
  ASSERT_TRUE(CreateDirectoryW(TEXT("\\hidden"), nullptr));
  ASSERT_TRUE(SetFileAttributesW(TEXT("\\hidden"), FILE_ATTRIBUTE_HIDDEN));

  Restart();
  const std::filesystem::path copy = folder() / "copy";
  std::filesystem::copy(device().folder(), copy, std::filesystem::copy_options::recursive);
  sim::Device copied(world(), DeviceWithCards(), copy);

  for (sim::Storage* const there : {&storage(), &copied.storage()}) {
    std::shared_ptr<sim::Search> search;
    WIN32_FIND_DATAW data = {};
    ASSERT_EQ(there->FindFirst(TEXT("\\a.txt"), search, data), DWORD{ERROR_SUCCESS});
    EXPECT_EQ(data.dwFileAttributes, kAttributes);
    EXPECT_EQ(data.ftCreationTime.dwLowDateTime, 1U);
    EXPECT_EQ(data.ftLastAccessTime.dwLowDateTime, 2U);
    EXPECT_EQ(data.ftLastWriteTime.dwLowDateTime, 3U);
    ASSERT_EQ(there->FindFirst(TEXT("\\hidden"), search, data), DWORD{ERROR_SUCCESS});
    EXPECT_EQ(data.dwFileAttributes, FILE_ATTRIBUTE_DIRECTORY | FILE_ATTRIBUTE_HIDDEN);
  }
}

TEST_F(StorageTest, ShowsNothingOfItsOwnInAListing) {
  ASSERT_TRUE(Make(TEXT("\\a.txt")));
  Restart();

  EXPECT_EQ(List(TEXT("\\*.*")),
            (std::vector<std::u16string>{u"a.txt", u"Flash File Store", u"SDMMC Disk"}));
}

TEST_F(StorageTest, KeepsTheRecordOfAFileThatIsStillOpenAtTheEnd) {
  const HANDLE file = Open(TEXT("\\a.txt"), GENERIC_WRITE, CREATE_ALWAYS);
  Sleep(60'000);
  ASSERT_TRUE(WriteBytes(file, 3));
  FILETIME before = {};
  ASSERT_TRUE(GetFileTime(file, nullptr, nullptr, &before));
  EXPECT_EQ(storage().open_files(), 1U);

  Restart();

  EXPECT_EQ(storage().open_files(), 0U);
  const HANDLE again = Open(TEXT("\\a.txt"), GENERIC_READ, OPEN_EXISTING);
  FILETIME after = {};
  ASSERT_TRUE(GetFileTime(again, nullptr, nullptr, &after));
  EXPECT_EQ(CompareFileTime(&before, &after), 0);
  EXPECT_EQ(GetFileSize(again, nullptr), 3U);
  CloseHandle(again);
}

TEST_F(StorageTest, TakesItsTimesFromTheDevicesClock) {
  const HANDLE file = Open(TEXT("\\a.txt"), GENERIC_WRITE, CREATE_ALWAYS);
  FILETIME created = {};
  FILETIME written = {};
  Sleep(1500);
  ASSERT_TRUE(WriteBytes(file, 1));
  ASSERT_TRUE(GetFileTime(file, &created, nullptr, &written));
  CloseHandle(file);

  SYSTEMTIME start = {};
  ASSERT_TRUE(FileTimeToSystemTime(&created, &start));
  EXPECT_EQ(start.wYear, 2006);
  EXPECT_EQ(start.wSecond, 9);
  EXPECT_EQ(written.dwLowDateTime - created.dwLowDateTime, 15'000'000U);
}

// ---- room ----

TEST_F(StorageTest, AWriteThatDoesNotFitChangesNothing) {
  const HANDLE file = Open(TEXT("\\SDMMC Disk\\a.bin"), GENERIC_WRITE, CREATE_ALWAYS);
  ASSERT_TRUE(WriteBytes(file, 6000));

  EXPECT_FALSE(WriteBytes(file, 4001));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_DISK_FULL});

  EXPECT_EQ(GetFileSize(file, nullptr), 6000U);
  EXPECT_EQ(SetFilePointer(file, 0, nullptr, FILE_CURRENT), 6000U);
  EXPECT_TRUE(WriteBytes(file, 4000)) << "what fits exactly fits";
  EXPECT_EQ(FreeOn(TEXT("\\SDMMC Disk")), 0U);
  SetFilePointer(file, 0, nullptr, FILE_BEGIN);
  EXPECT_TRUE(WriteBytes(file, 10'000)) << "overwriting takes no room";
  CloseHandle(file);
}

TEST_F(StorageTest, EveryVolumeHasRoomOfItsOwn) {
  EXPECT_EQ(FreeOn(TEXT("\\SDMMC Disk")), kCardBytes);
  ASSERT_TRUE(Make(TEXT("\\SDMMC Disk\\a.bin"), 1000));
  ASSERT_TRUE(Make(TEXT("\\b.bin"), 500));

  EXPECT_EQ(FreeOn(TEXT("\\sdmmc disk")), kCardBytes - 1000);
  EXPECT_EQ(FreeOn(TEXT("\\SDMMC Disk\\No\\Such\\Folder")), kCardBytes - 1000);
  EXPECT_EQ(FreeOn(TEXT("\\Flash File Store")), 1U << 20U);
  EXPECT_EQ(used(), 500U);
  ULARGE_INTEGER total = {};
  ASSERT_TRUE(GetDiskFreeSpaceExW(TEXT("\\SDMMC Disk"), nullptr, &total, nullptr));
  EXPECT_EQ(total.QuadPart, kCardBytes);
  EXPECT_EQ(FreeOn(nullptr), FreeOn(TEXT("\\")));
}

TEST_F(StorageTest, GivesRoomBackWhenFilesShrinkOrGo) {
  ASSERT_TRUE(Make(TEXT("\\SDMMC Disk\\a.bin"), 8000));
  ASSERT_TRUE(Make(TEXT("\\SDMMC Disk\\a.bin"), 9000)) << "the old content goes first";
  HANDLE file = Open(TEXT("\\SDMMC Disk\\a.bin"), GENERIC_WRITE, OPEN_EXISTING);
  SetFilePointer(file, 100, nullptr, FILE_BEGIN);
  ASSERT_TRUE(SetEndOfFile(file));
  EXPECT_EQ(FreeOn(TEXT("\\SDMMC Disk")), kCardBytes - 100);
  SetFilePointer(file, 20'000, nullptr, FILE_BEGIN);
  EXPECT_FALSE(SetEndOfFile(file));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_DISK_FULL});
  CloseHandle(file);
  ASSERT_TRUE(DeleteFileW(TEXT("\\SDMMC Disk\\a.bin")));
  EXPECT_EQ(FreeOn(TEXT("\\SDMMC Disk")), kCardBytes);
}

TEST_F(StorageTest, CountsWhatIsThereWhenTheDeviceStarts) {
  ASSERT_TRUE(CreateDirectoryW(TEXT("\\SDMMC Disk\\Folder"), nullptr));
  ASSERT_TRUE(Make(TEXT("\\SDMMC Disk\\Folder\\a.bin"), 1000));
  ASSERT_TRUE(Make(TEXT("\\b.bin"), 500));

  Restart();

  EXPECT_EQ(FreeOn(TEXT("\\SDMMC Disk")), kCardBytes - 1000);
  EXPECT_EQ(used(), 500U);
}

TEST_F(StorageTest, ACopyThatDoesNotFitChangesNothing) {
  ASSERT_TRUE(Make(TEXT("\\big.bin"), 9000));
  ASSERT_TRUE(Make(TEXT("\\SDMMC Disk\\old.bin"), 2000));

  EXPECT_FALSE(CopyFileW(TEXT("\\big.bin"), TEXT("\\SDMMC Disk\\new.bin"), FALSE));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_DISK_FULL});
  EXPECT_EQ(FreeOn(TEXT("\\SDMMC Disk")), kCardBytes - 2000);
  EXPECT_EQ(GetFileAttributesW(TEXT("\\SDMMC Disk\\new.bin")), INVALID_FILE_ATTRIBUTES);

  EXPECT_TRUE(CopyFileW(TEXT("\\big.bin"), TEXT("\\SDMMC Disk\\old.bin"), FALSE))
      << "the replaced file's room counts";
  EXPECT_EQ(FreeOn(TEXT("\\SDMMC Disk")), kCardBytes - 9000);
}

TEST_F(StorageTest, MovesFilesBetweenVolumesAndFoldersWithinOneOnly) {
  ASSERT_TRUE(CreateDirectoryW(TEXT("\\Temp"), nullptr));
  ASSERT_TRUE(Make(TEXT("\\Temp\\a.bin"), 9000));

  EXPECT_TRUE(MoveFileW(TEXT("\\Temp\\a.bin"), TEXT("\\SDMMC Disk\\a.bin")));
  EXPECT_EQ(used(), 0U);
  EXPECT_EQ(FreeOn(TEXT("\\SDMMC Disk")), kCardBytes - 9000);
  EXPECT_EQ(GetFileAttributesW(TEXT("\\Temp\\a.bin")), INVALID_FILE_ATTRIBUTES);

  ASSERT_TRUE(Make(TEXT("\\b.bin"), 2000));
  EXPECT_FALSE(MoveFileW(TEXT("\\b.bin"), TEXT("\\SDMMC Disk\\b.bin")));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_DISK_FULL});
  EXPECT_EQ(GetFileAttributesW(TEXT("\\b.bin")), FILE_ATTRIBUTE_ARCHIVE) << "still there";
  EXPECT_FALSE(MoveFileW(TEXT("\\Temp"), TEXT("\\SDMMC Disk\\Temp")));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_NOT_SAME_DEVICE});
}

// ---- volumes ----

TEST_F(StorageTest, ShowsVolumesAsFoldersWithTheirAttribute) {
  constexpr DWORD kVolume = FILE_ATTRIBUTE_DIRECTORY | FILE_ATTRIBUTE_TEMPORARY;
  EXPECT_EQ(GetFileAttributesW(TEXT("\\SDMMC Disk")), kVolume);
  EXPECT_EQ(GetFileAttributesW(TEXT("\\")), FILE_ATTRIBUTE_DIRECTORY);
  WIN32_FIND_DATAW data = {};
  FindClose(FindFirstFileW(TEXT("\\Flash*"), &data));
  EXPECT_EQ(data.dwFileAttributes, kVolume);

  EXPECT_FALSE(RemoveDirectoryW(TEXT("\\SDMMC Disk")));
  EXPECT_FALSE(SetFileAttributesW(TEXT("\\SDMMC Disk"), FILE_ATTRIBUTE_HIDDEN));
  EXPECT_FALSE(MoveFileW(TEXT("\\SDMMC Disk"), TEXT("\\x")));
  EXPECT_FALSE(CreateDirectoryW(TEXT("\\SDMMC Disk"), nullptr));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_ALREADY_EXISTS});
}

TEST_F(StorageTest, ACardThatIsNotInIsNotThere) {
  ULARGE_INTEGER free = {};
  EXPECT_EQ(GetFileAttributesW(TEXT("\\Storage Card")), INVALID_FILE_ATTRIBUTES);
  EXPECT_FALSE(GetDiskFreeSpaceExW(TEXT("\\Storage Card"), &free, nullptr, nullptr));
  EXPECT_FALSE(Make(TEXT("\\Storage Card\\a.txt")));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_PATH_NOT_FOUND});
  EXPECT_FALSE(CreateDirectoryW(TEXT("\\Storage Card"), nullptr)) << "the name stays the card's";
  EXPECT_FALSE(Make(TEXT("\\Storage Card")));
}

TEST_F(StorageTest, ACardKeepsItsFilesWhileItIsOut) {
  ASSERT_TRUE(Make(TEXT("\\SDMMC Disk\\a.txt"), 5));
  const HANDLE open =
      Open(TEXT("\\SDMMC Disk\\a.txt"), GENERIC_READ | GENERIC_WRITE, OPEN_EXISTING);
  ASSERT_TRUE(storage().SetVolumePresent(TEXT("\\sdmmc disk"), false));
  EXPECT_FALSE(storage().SetVolumePresent(TEXT("\\No Disk"), false));

  EXPECT_TRUE(List(TEXT("\\SDMMC*")).empty());
  EXPECT_FALSE(WriteBytes(open, 1));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_NOT_READY});
  EXPECT_FALSE(storage().HostPath(TEXT("\\SDMMC Disk\\a.txt")));

  ASSERT_TRUE(storage().SetVolumePresent(TEXT("\\SDMMC Disk"), true));
  EXPECT_TRUE(WriteBytes(open, 1));
  EXPECT_EQ(List(TEXT("\\SDMMC Disk\\*")), (std::vector<std::u16string>{u"a.txt"}));
  CloseHandle(open);
}

TEST_F(StorageTest, RefusesAProfileWithAVolumeThatCannotBe) {
  for (const char* path : {"\\a\\b", "\\a:", "", "\\\xFF"}) {
    sim::Profile profile;
    profile.volumes = {{path, 1, true}};
    EXPECT_THROW(sim::Device(world(), profile, folder() / "other"), std::runtime_error) << path;
  }
  sim::Profile twice;
  twice.volumes = {{"\\Card", 1, true}, {"\\CARD", 1, true}};
  EXPECT_THROW(sim::Device(world(), twice, folder() / "other"), std::runtime_error);
}

// ---- ROM files ----

TEST_F(StorageTest, ARomFileCanBeReplacedButNotChanged) {
  ASSERT_TRUE(Make(TEXT("\\rom.dll"), 3));
  ASSERT_EQ(
      storage().SetAllAttributes(TEXT("\\rom.dll"), FILE_ATTRIBUTE_INROM | FILE_ATTRIBUTE_SYSTEM),
      DWORD{ERROR_SUCCESS});
  Restart();
  EXPECT_EQ(GetFileAttributesW(TEXT("\\rom.dll")), FILE_ATTRIBUTE_INROM | FILE_ATTRIBUTE_SYSTEM);

  EXPECT_FALSE(DeleteFileW(TEXT("\\rom.dll")));
  EXPECT_FALSE(MoveFileW(TEXT("\\rom.dll"), TEXT("\\b.dll")));
  EXPECT_EQ(Open(TEXT("\\rom.dll"), GENERIC_WRITE, OPEN_EXISTING), INVALID_HANDLE_VALUE);
  EXPECT_EQ(Open(TEXT("\\rom.dll"), GENERIC_WRITE, CREATE_ALWAYS), INVALID_HANDLE_VALUE)
      << "it is a system file";
  ASSERT_TRUE(SetFileAttributesW(TEXT("\\rom.dll"), FILE_ATTRIBUTE_NORMAL));
  EXPECT_EQ(GetFileAttributesW(TEXT("\\rom.dll")), FILE_ATTRIBUTE_INROM)
      << "a program cannot take a file out of ROM";
  EXPECT_TRUE(Make(TEXT("\\rom.dll"), 5));
  EXPECT_EQ(GetFileAttributesW(TEXT("\\rom.dll")), FILE_ATTRIBUTE_ARCHIVE);
}

// ---- nothing leads out ----

TEST_F(StorageTest, FollowsNoLinkOutOfItsFolder) {
  const std::filesystem::path outside = folder() / "outside";
  std::filesystem::create_directories(outside);
  std::ofstream(outside / "secret.txt") << "secret";
  std::filesystem::create_symlink(outside, host() / "linked");
  std::filesystem::create_symlink(outside / "secret.txt", host() / "link.txt");
  std::filesystem::create_symlink(outside / "new.txt", host() / "dangling.txt");

  for (const WCHAR* name :
       {TEXT("\\link.txt"), TEXT("\\dangling.txt"), TEXT("\\linked"), TEXT("\\LINK.txt"),
        TEXT("\\linked\\secret.txt"), TEXT("\\linked\\new.txt")}) {
    EXPECT_EQ(GetFileAttributesW(name), INVALID_FILE_ATTRIBUTES);
    EXPECT_EQ(Open(name, GENERIC_READ, OPEN_EXISTING), INVALID_HANDLE_VALUE);
    EXPECT_FALSE(DeleteFileW(name));
    EXPECT_FALSE(RemoveDirectoryW(name));
    EXPECT_FALSE(SetFileAttributesW(name, FILE_ATTRIBUTE_HIDDEN));
  }
  for (const WCHAR* name :
       {TEXT("\\link.txt"), TEXT("\\dangling.txt"), TEXT("\\linked"), TEXT("\\linked\\new.txt")}) {
    EXPECT_FALSE(Make(name));
    EXPECT_FALSE(CreateDirectoryW(name, nullptr));
  }
  ASSERT_TRUE(Make(TEXT("\\own.txt")));
  EXPECT_FALSE(MoveFileW(TEXT("\\own.txt"), TEXT("\\linked\\own.txt")));
  EXPECT_FALSE(MoveFileW(TEXT("\\own.txt"), TEXT("\\dangling.txt")));
  EXPECT_FALSE(CopyFileW(TEXT("\\own.txt"), TEXT("\\link.txt"), FALSE));
  EXPECT_FALSE(CopyFileW(TEXT("\\link.txt"), TEXT("\\copy.txt"), FALSE));
  for (const std::u16string& name : List(TEXT("\\*"))) EXPECT_EQ(name.find(u"link"), name.npos);

  EXPECT_EQ(std::filesystem::file_size(outside / "secret.txt"), 6U);
  EXPECT_FALSE(std::filesystem::exists(outside / "new.txt"));
  EXPECT_FALSE(std::filesystem::exists(outside / "own.txt"));
}

TEST_F(StorageTest, DoesNotStartOnALinkInPlaceOfItsFolder) {
  const std::filesystem::path other = folder() / "other";
  std::filesystem::create_directories(other);
  std::filesystem::create_symlink(host(), other / "storage");

  EXPECT_THROW(sim::Device(world(), sim::Profile{}, other), std::runtime_error);
}

TEST_F(StorageTest, NeverClimbsOut) {
  std::ofstream(device().folder() / "beside.txt") << "x";
  for (const WCHAR* name :
       {TEXT("\\..\\beside.txt"), TEXT("..\\beside.txt"), TEXT("\\.\\..\\beside.txt"),
        TEXT("\\x\\..\\..\\beside.txt"), TEXT("/../beside.txt"), TEXT("\\../beside.txt")}) {
    EXPECT_EQ(Open(name, GENERIC_READ, OPEN_EXISTING), INVALID_HANDLE_VALUE);
    EXPECT_EQ(GetLastError(), DWORD{ERROR_INVALID_NAME});
    EXPECT_FALSE(Make(name));
  }
}

TEST_F(StorageTest, SeesNeitherPipesNorNamesThatTheDeviceCannotSay) {
  ASSERT_EQ(::mkfifo((host() / "pipe").c_str(), 0600), 0);
  PutOnHost("a:b", "x");
  PutOnHost("bad\xFF", "x");
  PutOnHost("line\nend", "x");

  EXPECT_EQ(List(TEXT("\\*.*")), (std::vector<std::u16string>{u"Flash File Store", u"SDMMC Disk"}));
  EXPECT_EQ(Open(TEXT("\\pipe"), GENERIC_READ, OPEN_EXISTING), INVALID_HANDLE_VALUE);
  EXPECT_FALSE(Make(TEXT("\\pipe")));
}

TEST_F(StorageTest, TakesNamesWithHalfASurrogatePair) {
  const std::u16string name = u"\\half\xD800.txt";
  ASSERT_TRUE(Make(name.c_str(), 2));
  ASSERT_TRUE(SetFileAttributesW(name.c_str(), FILE_ATTRIBUTE_HIDDEN));
  Restart();

  EXPECT_EQ(GetFileAttributesW(name.c_str()), FILE_ATTRIBUTE_HIDDEN);
  EXPECT_EQ(List(TEXT("\\half*")), (std::vector<std::u16string>{name.substr(1)}));
}

TEST_F(StorageTest, RefusesANameThatIsTooLongForTheHost) {
  const std::u16string name = u"\\" + std::u16string(200, u'\x20AC');  // 600 bytes in UTF-8

  EXPECT_FALSE(Make(name.c_str()));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_FILENAME_EXCED_RANGE});
}

// ---- open files ----

TEST_F(StorageTest, WillNotMoveWhatIsOpen) {
  ASSERT_TRUE(CreateDirectoryW(TEXT("\\folder"), nullptr));
  const HANDLE file = Open(TEXT("\\folder\\a.txt"), GENERIC_WRITE, CREATE_ALWAYS);

  EXPECT_FALSE(MoveFileW(TEXT("\\folder\\a.txt"), TEXT("\\b.txt")));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_SHARING_VIOLATION});
  EXPECT_FALSE(MoveFileW(TEXT("\\folder"), TEXT("\\other")));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_SHARING_VIOLATION});
  CloseHandle(file);
  EXPECT_TRUE(MoveFileW(TEXT("\\folder"), TEXT("\\other")));
}

TEST_F(StorageTest, AttributesSetWhileAFileIsOpenStay) {
  const HANDLE file = Open(TEXT("\\a.txt"), GENERIC_WRITE, CREATE_ALWAYS);
  ASSERT_TRUE(WriteBytes(file, 1));
  ASSERT_TRUE(SetFileAttributesW(TEXT("\\a.txt"), FILE_ATTRIBUTE_READONLY));
  CloseHandle(file);

  EXPECT_EQ(GetFileAttributesW(TEXT("\\a.txt")), FILE_ATTRIBUTE_READONLY);
}

TEST_F(StorageTest, EndsFilesBelowFourGigabytes) {
  const HANDLE file = Open(TEXT("\\a.bin"), GENERIC_WRITE, CREATE_ALWAYS);
  LONG high = 1;
  EXPECT_EQ(SetFilePointer(file, 0, &high, FILE_BEGIN), 0U);
  EXPECT_EQ(high, 1);
  EXPECT_FALSE(WriteBytes(file, 1));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_DISK_FULL});
  EXPECT_FALSE(SetEndOfFile(file));
  EXPECT_EQ(SetFilePointer(file, 1, nullptr, FILE_CURRENT), INVALID_SET_FILE_POINTER)
      << "without room for the upper half";
  EXPECT_EQ(GetLastError(), DWORD{ERROR_INVALID_PARAMETER});
  CloseHandle(file);
}

TEST_F(StorageTest, InjectedFailuresLeaveFilesAlone) {
  const HANDLE file = Open(TEXT("\\a.bin"), GENERIC_WRITE, CREATE_ALWAYS);
  device().faults().Add({"WriteFile", 2, 1, 0});
  ASSERT_TRUE(WriteBytes(file, 10));

  EXPECT_FALSE(WriteBytes(file, 10));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_DISK_FULL});

  EXPECT_EQ(GetFileSize(file, nullptr), 10U);
  CloseHandle(file);
}

// ---- mappings and streams ----

TEST_F(StorageTest, AMappingOwnsItsFilesHandle) {
  ASSERT_TRUE(Make(TEXT("\\a.bin"), 10));
  const std::size_t before = device().kernel().OpenHandles();
  const HANDLE file = CreateFileForMappingW(TEXT("\\a.bin"), GENERIC_READ, FILE_SHARE_READ, nullptr,
                                            OPEN_EXISTING, 0, nullptr);
  const HANDLE mapping = CreateFileMappingW(file, nullptr, PAGE_READONLY, 0, 0, nullptr);
  const void* const view = MapViewOfFile(mapping, FILE_MAP_READ, 0, 0, 0);
  ASSERT_NE(view, nullptr);

  EXPECT_TRUE(CloseHandle(mapping));
  EXPECT_FALSE(DeleteFileW(TEXT("\\a.bin"))) << "the view keeps the file open";
  EXPECT_TRUE(UnmapViewOfFile(view));

  EXPECT_EQ(device().kernel().OpenHandles(), before);
  EXPECT_EQ(storage().open_files(), 0U);
  EXPECT_TRUE(DeleteFileW(TEXT("\\a.bin")));
}

TEST_F(StorageTest, OnlyAFileOpenedForItCanBeMapped) {
  ASSERT_TRUE(Make(TEXT("\\a.bin"), 10));
  const HANDLE file = Open(TEXT("\\a.bin"), GENERIC_READ, OPEN_EXISTING);

  EXPECT_EQ(CreateFileMappingW(file, nullptr, PAGE_READONLY, 0, 0, nullptr), nullptr);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_INVALID_HANDLE});
  CloseHandle(file);
}

TEST_F(StorageTest, AWritableMappingReachesTheFileAndLengthensIt) {
  const HANDLE file = CreateFileForMappingW(TEXT("\\a.bin"), GENERIC_READ | GENERIC_WRITE, 0,
                                            nullptr, CREATE_ALWAYS, 0, nullptr);
  const HANDLE mapping = CreateFileMappingW(file, nullptr, PAGE_READWRITE, 0, 4, nullptr);
  ASSERT_NE(mapping, nullptr);
  EXPECT_EQ(used(), 4U);
  auto* const view = static_cast<char*>(MapViewOfFile(mapping, FILE_MAP_WRITE, 0, 0, 0));
  ASSERT_NE(view, nullptr);
  std::string_view("abcd").copy(view, 4);
  EXPECT_TRUE(UnmapViewOfFile(view));
  EXPECT_TRUE(CloseHandle(mapping));

  std::ifstream in(host() / "a.bin", std::ios::binary);
  EXPECT_EQ(std::string(std::istreambuf_iterator<char>(in), {}), "abcd");
}

TEST_F(StorageTest, KeepsWhatAMappingHeldWhenTheDeviceEnds) {
  const HANDLE file = CreateFileForMappingW(TEXT("\\a.bin"), GENERIC_READ | GENERIC_WRITE, 0,
                                            nullptr, CREATE_ALWAYS, 0, nullptr);
  const HANDLE mapping = CreateFileMappingW(file, nullptr, PAGE_READWRITE, 0, 4, nullptr);
  auto* const view = static_cast<char*>(MapViewOfFile(mapping, FILE_MAP_WRITE, 0, 0, 0));
  ASSERT_NE(view, nullptr);
  std::string_view("wxyz").copy(view, 4);

  Restart();

  std::ifstream in(host() / "a.bin", std::ios::binary);
  EXPECT_EQ(std::string(std::istreambuf_iterator<char>(in), {}), "wxyz");
}

TEST_F(StorageTest, CountsStreamsAndRefusesOnesThatAreClosed) {
  ce_FILE* const stream = ce_fopen("\\log.txt", "ab");
  ASSERT_NE(stream, nullptr);
  EXPECT_EQ(storage().streams().open(), 1U);
  EXPECT_EQ(ce_fwrite("ab", 2, 1, stream), 1U);
  EXPECT_EQ(ce_fclose(stream), 0);

  EXPECT_EQ(storage().streams().open(), 0U);
  EXPECT_EQ(ce_fclose(stream), -1);
  EXPECT_EQ(ce_fwrite("ab", 2, 1, stream), 0U);
  EXPECT_EQ(ce_fclose(nullptr), -1);
  for (const char* mode : {"", "x", "rw", "a,ccs=UTF-8"}) {
    EXPECT_EQ(ce_fopen("\\log.txt", mode), nullptr) << mode;
  }
  EXPECT_EQ(ce_fopen(nullptr, "a"), nullptr);
  EXPECT_EQ(ce_fopen("\\log.txt", nullptr), nullptr);
}

TEST_F(StorageTest, GivesTheConsoleByItsNumberAsTheDevicesLibraryAsksForIt) {
  EXPECT_NE(_getstdfilex(1), nullptr);
  EXPECT_EQ(_getstdfilex(1), ce_stdout());
  EXPECT_EQ(_getstdfilex(0), nullptr);
}

TEST_F(StorageTest, AFullVolumeTakesNoLine) {
  ASSERT_TRUE(Make(TEXT("\\SDMMC Disk\\a.bin"), kCardBytes - 3));
  ce_FILE* const stream = ce_fopen("\\SDMMC Disk\\log.txt", "a");
  ASSERT_NE(stream, nullptr);

  EXPECT_EQ(ce_fwrite("line", 1, 4, stream), 0U);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_DISK_FULL});
  EXPECT_EQ(ce_fwrite("end", 1, 3, stream), 3U);
  EXPECT_EQ(ce_fclose(stream), 0);
}

TEST_F(StorageTest, AnInjectedFailureOfClosingStillCloses) {
  ce_FILE* const stream = ce_fopen("\\log.txt", "a");
  WIN32_FIND_DATAW data = {};
  const HANDLE search = FindFirstFileW(TEXT("\\*"), &data);
  device().faults().Add({"fclose", 1, 1, 0});
  device().faults().Add({"FindClose", 1, 1, 0});

  EXPECT_EQ(ce_fclose(stream), -1);
  EXPECT_FALSE(FindClose(search));

  EXPECT_EQ(storage().open_files(), 0U);
  EXPECT_EQ(device().kernel().OpenHandles(), 0U);
}

// ---- many threads ----

class StorageThreadsTest : public RealDeviceTest {
 protected:
  StorageThreadsTest() : RealDeviceTest(DeviceWithCards()) {}
};

TEST_F(StorageThreadsTest, SharesTheRoomOfAVolumeWithoutLosingAByte) {
  std::atomic<std::uint64_t> total{0};
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([this, t, &total] {
      const sim::AttachedThread program(device());
      const std::u16string name =
          u"\\SDMMC Disk\\" + std::u16string(1, static_cast<char16_t>(u'a' + t));
      const HANDLE file =
          CreateFileW(name.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, 0, nullptr);
      const std::vector<char> bytes(7, 'x');
      DWORD written = 0;
      while (WriteFile(file, bytes.data(), 7, &written, nullptr)) total += written;
      CloseHandle(file);
    });
  }
  for (std::thread& thread : threads) thread.join();

  EXPECT_EQ(total.load(), kCardBytes / 7 * 7);
  std::uint64_t on_host = 0;
  for (const auto& entry :
       std::filesystem::directory_iterator(device().folder() / "storage" / "SDMMC Disk")) {
    on_host += entry.file_size();
  }
  EXPECT_EQ(on_host, total.load());
}

TEST_F(StorageThreadsTest, OpensClosesAndListsAtTheSameTime) {
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([this, t] {
      const sim::AttachedThread program(device());
      const std::u16string own = u"\\own" + std::u16string(1, static_cast<char16_t>(u'a' + t));
      for (int i = 0; i < 50; ++i) {
        CloseHandle(CreateFileW(own.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, 0, nullptr));
        const HANDLE shared =
            CreateFileW(TEXT("\\shared"), GENERIC_WRITE, FILE_SHARE_READ | FILE_SHARE_WRITE,
                        nullptr, OPEN_ALWAYS, 0, nullptr);
        DWORD written = 0;
        EXPECT_TRUE(WriteFile(shared, "x", 1, &written, nullptr));
        WIN32_FIND_DATAW data = {};
        FindClose(FindFirstFileW(TEXT("\\own*"), &data));
        CloseHandle(shared);
        EXPECT_TRUE(DeleteFileW(own.c_str()));
        if (i % 10 == 0) device().storage().Recount();
      }
    });
  }
  for (std::thread& thread : threads) thread.join();

  EXPECT_EQ(device().storage().open_files(), 0U);
  EXPECT_EQ(device().memory().store().figures().used, 1U);
}

}  // namespace
