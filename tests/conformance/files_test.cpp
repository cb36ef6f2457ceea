// What the platform's files do, seen through the platform alone.
#include <gtest/gtest.h>

#include <array>
#include <cstring>
#include <string>
#include <string_view>
#include <vector>

#include "conformance/differences.h"
#include "conformance/wide_text.h"
#include "coredll.h"

namespace {

using conformance::Difference;
using conformance::Differs;
using conformance::WideText;

constexpr DWORD kPoison = 0xBDBDBDBD;
constexpr BYTE kPoisonByte = 0xBD;

/// An open file that closes itself.
class File {
 public:
  File(const WCHAR* name, DWORD access, DWORD disposition, DWORD share = 0,
       DWORD attributes = FILE_ATTRIBUTE_NORMAL)
      : handle_(CreateFileW(name, access, share, nullptr, disposition, attributes, nullptr)) {}
  ~File() { Close(); }
  File(const File&) = delete;
  File& operator=(const File&) = delete;

  [[nodiscard]] HANDLE get() const { return handle_; }
  [[nodiscard]] bool open() const { return handle_ != INVALID_HANDLE_VALUE; }
  void Close() {
    if (open()) CloseHandle(handle_);
    handle_ = INVALID_HANDLE_VALUE;
  }

 private:
  HANDLE handle_;
};

bool Write(const WCHAR* name, std::string_view text) {
  const File file(name, GENERIC_WRITE, CREATE_ALWAYS);
  DWORD written = 0;
  return file.open() &&
         WriteFile(file.get(), text.data(), static_cast<DWORD>(text.size()), &written, nullptr) &&
         written == text.size();
}

std::string Read(const WCHAR* name) {
  const File file(name, GENERIC_READ, OPEN_EXISTING, FILE_SHARE_READ | FILE_SHARE_WRITE);
  if (!file.open()) return "not there";
  std::string text(4096, '\0');
  DWORD read = 0;
  if (!ReadFile(file.get(), text.data(), 4096, &read, nullptr)) return "not readable";
  text.resize(read);
  return text;
}

/// Last error of a call that has to fail; poisoned before it.
template <typename Call>
DWORD ErrorOf(Call call) {
  SetLastError(kPoison);
  return call() ? DWORD{ERROR_SUCCESS} : GetLastError();
}

std::vector<WideText> List(const WCHAR* pattern) {
  std::vector<WideText> names;
  WIN32_FIND_DATAW data;
  const HANDLE search = FindFirstFileW(pattern, &data);
  if (search == INVALID_HANDLE_VALUE) return names;
  do {
    const WideText name = data.cFileName;
    const bool dots = name == TEXT(".") || name == TEXT("..");
    if (!dots || !Differs(Difference::kDots)) names.push_back(name);
  } while (FindNextFileW(search, &data));
  FindClose(search);
  return names;
}

/// The attributes as they were set.
DWORD Attributes(DWORD told) {
  if (!Differs(Difference::kNewAttribute)) return told;
  const DWORD set = told & ~DWORD{FILE_ATTRIBUTE_ARCHIVE};
  return set == 0 ? FILE_ATTRIBUTE_NORMAL : set;
}

// ---- opening ----

TEST(CreateFileWTest, FailsOnAMissingFileAndOnAMissingFolderWithDifferentErrors) {
  SetLastError(kPoison);
  EXPECT_EQ(CreateFileW(TEXT("\\none.txt"), GENERIC_READ, 0, nullptr, OPEN_EXISTING, 0, nullptr),
            INVALID_HANDLE_VALUE);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_FILE_NOT_FOUND});

  SetLastError(kPoison);
  EXPECT_EQ(
      CreateFileW(TEXT("\\none\\a.txt"), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, 0, nullptr),
      INVALID_HANDLE_VALUE);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_PATH_NOT_FOUND});
}

TEST(CreateFileWTest, SaysWhetherTheFileHadBeenThere) {
  SetLastError(kPoison);
  { const File file(TEXT("\\a.txt"), GENERIC_WRITE, CREATE_ALWAYS); }
  SetLastError(kPoison);
  const File again(TEXT("\\a.txt"), GENERIC_WRITE, CREATE_ALWAYS);

  ASSERT_TRUE(again.open());
  EXPECT_EQ(GetLastError(), DWORD{ERROR_ALREADY_EXISTS});

  SetLastError(kPoison);
  const File fresh(TEXT("\\b.txt"), GENERIC_WRITE, CREATE_ALWAYS);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_SUCCESS});
}

TEST(CreateFileWTest, CreateNewRefusesAFileThatIsThere) {
  ASSERT_TRUE(Write(TEXT("\\a.txt"), "kept"));

  EXPECT_EQ(ErrorOf([] { return File(TEXT("\\a.txt"), GENERIC_WRITE, CREATE_NEW).open(); }),
            DWORD{ERROR_FILE_EXISTS});
  EXPECT_EQ(Read(TEXT("\\a.txt")), "kept");
}

TEST(CreateFileWTest, OpenAlwaysKeepsTheContentAndTruncateExistingDoesNot) {
  ASSERT_TRUE(Write(TEXT("\\a.txt"), "content"));

  { const File file(TEXT("\\a.txt"), GENERIC_WRITE, OPEN_ALWAYS); }
  EXPECT_EQ(Read(TEXT("\\a.txt")), "content");

  { const File file(TEXT("\\a.txt"), GENERIC_WRITE, TRUNCATE_EXISTING); }
  EXPECT_EQ(Read(TEXT("\\a.txt")), "");
}

TEST(CreateFileWTest, CreateAlwaysIsRefusedOnReadOnlyHiddenAndSystemFiles) {
  if (Differs(Difference::kReplace)) GTEST_SKIP() << "such files are replaced here";
  for (const DWORD attribute :
       {FILE_ATTRIBUTE_READONLY, FILE_ATTRIBUTE_HIDDEN, FILE_ATTRIBUTE_SYSTEM}) {
    ASSERT_TRUE(Write(TEXT("\\a.txt"), "kept"));
    ASSERT_TRUE(SetFileAttributesW(TEXT("\\a.txt"), attribute));

    EXPECT_EQ(ErrorOf([] { return File(TEXT("\\a.txt"), GENERIC_WRITE, CREATE_ALWAYS).open(); }),
              DWORD{ERROR_ACCESS_DENIED});
    EXPECT_EQ(Read(TEXT("\\a.txt")), "kept");

    ASSERT_TRUE(SetFileAttributesW(TEXT("\\a.txt"), FILE_ATTRIBUTE_NORMAL));
    ASSERT_TRUE(DeleteFileW(TEXT("\\a.txt")));
  }
}

TEST(CreateFileWTest, OpensAReadOnlyFileForReadingButNotForWriting) {
  ASSERT_TRUE(Write(TEXT("\\a.txt"), "kept"));
  ASSERT_TRUE(SetFileAttributesW(TEXT("\\a.txt"), FILE_ATTRIBUTE_READONLY));

  EXPECT_TRUE(File(TEXT("\\a.txt"), GENERIC_READ, OPEN_EXISTING).open());
  if (Differs(Difference::kReadOnly)) return;
  EXPECT_EQ(ErrorOf([] { return File(TEXT("\\a.txt"), GENERIC_WRITE, OPEN_EXISTING).open(); }),
            DWORD{ERROR_ACCESS_DENIED});
}

TEST(CreateFileWTest, RefusesFoldersAndNamesThatCannotBe) {
  ASSERT_TRUE(CreateDirectoryW(TEXT("\\folder"), nullptr));
  const struct {
    const WCHAR* name;
    DWORD error;
  } kCases[] = {
      {TEXT("\\folder"), ERROR_ACCESS_DENIED}, {TEXT("\\"), ERROR_ACCESS_DENIED},
      {TEXT(""), ERROR_PATH_NOT_FOUND},        {TEXT("\\a*b"), ERROR_INVALID_NAME},
      {TEXT("\\a?b"), ERROR_INVALID_NAME},     {TEXT("\\a|b"), ERROR_INVALID_NAME},
      {TEXT("\\a<b"), ERROR_INVALID_NAME},     {TEXT("\\a\"b"), ERROR_INVALID_NAME},
      {TEXT("\\a\nb"), ERROR_INVALID_NAME},
  };
  for (const auto& c : kCases) {
    EXPECT_EQ(ErrorOf([&c] { return File(c.name, GENERIC_WRITE, CREATE_ALWAYS).open(); }), c.error)
        << std::string(c.name, c.name + std::char_traits<WCHAR>::length(c.name));
  }
}

TEST(CreateFileWTest, ComparesNamesWithoutRegardToCaseAndKeepsTheirSpelling) {
  ASSERT_TRUE(CreateDirectoryW(TEXT("\\Windows"), nullptr));
  ASSERT_TRUE(Write(TEXT("\\windows\\Some File.TXT"), "x"));

  EXPECT_EQ(Read(TEXT("\\WINDOWS\\sOME fILE.txt")), "x");
  EXPECT_EQ(List(TEXT("\\windows\\*")), (std::vector<WideText>{TEXT("Some File.TXT")}));
}

TEST(CreateFileWTest, TakesSeveralBackslashesForOne) {
  const bool machine = Differs(Difference::kBackslashes);
  ASSERT_TRUE(CreateDirectoryW(machine ? TEXT("\\folder") : TEXT("\\\\folder"), nullptr));
  ASSERT_TRUE(Write(TEXT("\\folder\\\\\\a.txt"), "x"));

  EXPECT_EQ(Read(TEXT("\\folder\\a.txt")), "x");
}

struct SharingCase {
  DWORD first_access;
  DWORD first_share;
  DWORD second_access;
  DWORD second_share;
  bool allowed;
};

TEST(CreateFileWTest, EnforcesSharingInBothDirections) {
  constexpr DWORD kRead = GENERIC_READ;
  constexpr DWORD kWrite = GENERIC_WRITE;
  constexpr DWORD kBoth = FILE_SHARE_READ | FILE_SHARE_WRITE;
  constexpr SharingCase kCases[] = {
      {kRead, FILE_SHARE_READ, kRead, FILE_SHARE_READ, true},
      {kRead, 0, kRead, FILE_SHARE_READ, false},       // the first bars reading
      {kRead, FILE_SHARE_READ, kRead, 0, false},       // the second would bar the first
      {kRead, FILE_SHARE_READ, kWrite, kBoth, false},  // the first bars writing
      {kRead, kBoth, kWrite, FILE_SHARE_READ, true},
      {kWrite, FILE_SHARE_READ, kRead, FILE_SHARE_READ, false},  // does not bear the writer
      {kWrite, FILE_SHARE_READ, kRead, kBoth, true},
      {kWrite, kBoth, kWrite, kBoth, true},
      {kWrite, 0, kRead, kBoth, false},
      {kWrite, 0, 0, 0, true},  // asks about the file only
  };
  ASSERT_TRUE(Write(TEXT("\\a.txt"), "x"));
  for (const SharingCase& c : kCases) {
    const File first(TEXT("\\a.txt"), c.first_access, OPEN_EXISTING, c.first_share);
    ASSERT_TRUE(first.open());
    const DWORD error = ErrorOf([&c] {
      return File(TEXT("\\A.TXT"), c.second_access, OPEN_EXISTING, c.second_share).open();
    });
    EXPECT_EQ(error, c.allowed ? DWORD{ERROR_SUCCESS} : DWORD{ERROR_SHARING_VIOLATION})
        << "case " << &c - kCases;
  }
}

TEST(CreateFileWTest, LetsNobodyReplaceAFileThatAnotherHasOpen) {
  ASSERT_TRUE(Write(TEXT("\\a.txt"), "kept"));
  const File reader(TEXT("\\a.txt"), GENERIC_READ, OPEN_EXISTING, FILE_SHARE_READ);

  EXPECT_EQ(ErrorOf([] {
              return File(TEXT("\\a.txt"), GENERIC_WRITE, CREATE_ALWAYS, FILE_SHARE_READ).open();
            }),
            DWORD{ERROR_SHARING_VIOLATION});
  if (Differs(Difference::kReplaceOpen)) return;
  EXPECT_EQ(ErrorOf([] {
              return File(TEXT("\\a.txt"), GENERIC_READ, CREATE_ALWAYS, FILE_SHARE_READ).open();
            }),
            DWORD{ERROR_SHARING_VIOLATION});
}

// ---- reading, writing, positions ----

TEST(ReadFileTest, ReadsAtMostWhatIsThereAndNothingBehindTheEnd) {
  ASSERT_TRUE(Write(TEXT("\\a.txt"), "abc"));
  const File file(TEXT("\\a.txt"), GENERIC_READ, OPEN_EXISTING);
  std::array<BYTE, 8> buffer;
  buffer.fill(kPoisonByte);
  DWORD read = kPoison;

  ASSERT_TRUE(ReadFile(file.get(), buffer.data(), 8, &read, nullptr));
  EXPECT_EQ(read, 3U);
  EXPECT_EQ(std::memcmp(buffer.data(), "abc", 3), 0);
  for (std::size_t i = 3; i < buffer.size(); ++i) EXPECT_EQ(buffer[i], kPoisonByte) << i;

  read = kPoison;
  EXPECT_TRUE(ReadFile(file.get(), buffer.data(), 8, &read, nullptr)) << "the end is no error";
  EXPECT_EQ(read, 0U);
}

TEST(ReadFileTest, NeedsTheRightToReadAndAHandle) {
  ASSERT_TRUE(Write(TEXT("\\a.txt"), "abc"));
  const File file(TEXT("\\a.txt"), GENERIC_WRITE, OPEN_EXISTING);
  BYTE buffer[4] = {};
  DWORD read = kPoison;

  EXPECT_EQ(ErrorOf([&] { return ReadFile(file.get(), buffer, 4, &read, nullptr); }),
            DWORD{ERROR_ACCESS_DENIED});
  EXPECT_EQ(read, 0U);
  EXPECT_EQ(ErrorOf([&] { return ReadFile(INVALID_HANDLE_VALUE, buffer, 4, &read, nullptr); }),
            DWORD{ERROR_INVALID_HANDLE});
  EXPECT_EQ(ErrorOf([&] { return ReadFile(nullptr, buffer, 4, &read, nullptr); }),
            DWORD{ERROR_INVALID_HANDLE});
}

TEST(WriteFileTest, NeedsTheRightToWriteAndReportsTheCount) {
  ASSERT_TRUE(Write(TEXT("\\a.txt"), "abc"));
  const File file(TEXT("\\a.txt"), GENERIC_READ, OPEN_EXISTING);
  DWORD written = kPoison;

  EXPECT_EQ(ErrorOf([&] { return WriteFile(file.get(), "x", 1, &written, nullptr); }),
            DWORD{ERROR_ACCESS_DENIED});
  EXPECT_EQ(written, 0U);
}

TEST(WriteFileTest, WritesBytesAsTheyAre) {
  std::string bytes;
  for (int i = 0; i < 256; ++i) bytes.push_back(static_cast<char>(i));

  ASSERT_TRUE(Write(TEXT("\\a.bin"), bytes));

  EXPECT_EQ(Read(TEXT("\\a.bin")), bytes);
}

TEST(WriteFileTest, FillsAGapWithZeros) {
  {
    const File file(TEXT("\\a.bin"), GENERIC_WRITE, CREATE_ALWAYS);
    DWORD written = 0;
    ASSERT_EQ(SetFilePointer(file.get(), 3, nullptr, FILE_BEGIN), 3U);
    ASSERT_TRUE(WriteFile(file.get(), "x", 1, &written, nullptr));
  }

  EXPECT_EQ(Read(TEXT("\\a.bin")), std::string("\0\0\0x", 4));
}

TEST(SetFilePointerTest, MovesFromTheBeginningThePositionAndTheEnd) {
  ASSERT_TRUE(Write(TEXT("\\a.txt"), "0123456789"));
  const File file(TEXT("\\a.txt"), GENERIC_READ, OPEN_EXISTING);

  EXPECT_EQ(SetFilePointer(file.get(), 4, nullptr, FILE_BEGIN), 4U);
  EXPECT_EQ(SetFilePointer(file.get(), -1, nullptr, FILE_CURRENT), 3U);
  EXPECT_EQ(SetFilePointer(file.get(), -2, nullptr, FILE_END), 8U);
  LONG high = 0;
  EXPECT_EQ(SetFilePointer(file.get(), 5, &high, FILE_BEGIN), 5U);
  EXPECT_EQ(high, 0);
}

TEST(SetFilePointerTest, RefusesAPositionBeforeTheBeginningAndStaysWhereItIs) {
  ASSERT_TRUE(Write(TEXT("\\a.txt"), "0123456789"));
  const File file(TEXT("\\a.txt"), GENERIC_READ, OPEN_EXISTING);
  ASSERT_EQ(SetFilePointer(file.get(), 4, nullptr, FILE_BEGIN), 4U);

  SetLastError(kPoison);
  EXPECT_EQ(SetFilePointer(file.get(), -5, nullptr, FILE_CURRENT), INVALID_SET_FILE_POINTER);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_NEGATIVE_SEEK});
  EXPECT_EQ(SetFilePointer(file.get(), 0, nullptr, FILE_CURRENT), 4U);
}

TEST(GetFileSizeTest, TellsTheSizeAndFailsOnWhatIsNoFile) {
  ASSERT_TRUE(Write(TEXT("\\a.txt"), "0123456789"));
  const File file(TEXT("\\a.txt"), GENERIC_READ, OPEN_EXISTING);
  DWORD high = kPoison;

  EXPECT_EQ(GetFileSize(file.get(), &high), 10U);
  EXPECT_EQ(high, 0U);
  SetLastError(kPoison);
  EXPECT_EQ(GetFileSize(INVALID_HANDLE_VALUE, nullptr), INVALID_FILE_SIZE);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_INVALID_HANDLE});
}

TEST(SetEndOfFileTest, CutsAndLengthensTheFile) {
  ASSERT_TRUE(Write(TEXT("\\a.txt"), "0123456789"));
  {
    const File file(TEXT("\\a.txt"), GENERIC_READ | GENERIC_WRITE, OPEN_EXISTING);
    SetFilePointer(file.get(), 4, nullptr, FILE_BEGIN);
    ASSERT_TRUE(SetEndOfFile(file.get()));
    EXPECT_EQ(GetFileSize(file.get(), nullptr), 4U);
    SetFilePointer(file.get(), 6, nullptr, FILE_BEGIN);
    ASSERT_TRUE(SetEndOfFile(file.get()));
    EXPECT_TRUE(FlushFileBuffers(file.get()));
  }

  EXPECT_EQ(Read(TEXT("\\a.txt")), std::string("0123\0\0", 6));
}

// ---- times and attributes ----

TEST(SetFileTimeTest, SetsTheTimesThatAreGivenAndLeavesTheOthers) {
  const File file(TEXT("\\a.txt"), GENERIC_READ | GENERIC_WRITE, CREATE_ALWAYS);
  FILETIME before = {};
  ASSERT_TRUE(GetFileTime(file.get(), &before, nullptr, nullptr));
  const FILETIME given = {0x11223344, 0x01C00000};

  ASSERT_TRUE(SetFileTime(file.get(), nullptr, nullptr, &given));

  FILETIME created = {kPoison, kPoison};
  FILETIME written = {kPoison, kPoison};
  ASSERT_TRUE(GetFileTime(file.get(), &created, nullptr, &written));
  EXPECT_EQ(std::memcmp(&written, &given, sizeof given), 0);
  if (Differs(Difference::kCreationTime)) return;
  EXPECT_EQ(std::memcmp(&created, &before, sizeof before), 0);
}

TEST(SetFileAttributesWTest, SetsAndClearsAndAnswersNormalForNone) {
  ASSERT_TRUE(Write(TEXT("\\a.txt"), "x"));
  EXPECT_EQ(GetFileAttributesW(TEXT("\\a.txt")), FILE_ATTRIBUTE_ARCHIVE) << "a new file";

  constexpr DWORD kSome = FILE_ATTRIBUTE_HIDDEN | FILE_ATTRIBUTE_SYSTEM;
  ASSERT_TRUE(SetFileAttributesW(TEXT("\\a.txt"), kSome));
  EXPECT_EQ(Attributes(GetFileAttributesW(TEXT("\\A.TXT"))), kSome);
  constexpr DWORD kAll = kSome | FILE_ATTRIBUTE_READONLY;
  ASSERT_TRUE(SetFileAttributesW(TEXT("\\a.txt"), kAll));
  const DWORD told = Attributes(GetFileAttributesW(TEXT("\\A.TXT")));
  EXPECT_EQ(Differs(Difference::kNewAttribute) ? told | kSome : told, kAll);

  ASSERT_TRUE(SetFileAttributesW(TEXT("\\a.txt"), FILE_ATTRIBUTE_NORMAL));
  EXPECT_EQ(Attributes(GetFileAttributesW(TEXT("\\a.txt"))), FILE_ATTRIBUTE_NORMAL);
}

TEST(GetFileAttributesWTest, KnowsFoldersAndWhatIsNotThere) {
  ASSERT_TRUE(CreateDirectoryW(TEXT("\\folder"), nullptr));

  EXPECT_EQ(GetFileAttributesW(TEXT("\\folder")), FILE_ATTRIBUTE_DIRECTORY);
  EXPECT_EQ(GetFileAttributesW(TEXT("\\folder\\")), FILE_ATTRIBUTE_DIRECTORY);
  SetLastError(kPoison);
  EXPECT_EQ(GetFileAttributesW(TEXT("\\none")), INVALID_FILE_ATTRIBUTES);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_FILE_NOT_FOUND});
}

// ---- by name ----

TEST(DeleteFileWTest, FailsOnReadOnlyFilesFoldersAndOpenFiles) {
  ASSERT_TRUE(Write(TEXT("\\a.txt"), "x"));
  ASSERT_TRUE(CreateDirectoryW(TEXT("\\folder"), nullptr));
  ASSERT_TRUE(SetFileAttributesW(TEXT("\\a.txt"), FILE_ATTRIBUTE_READONLY));
  EXPECT_EQ(ErrorOf([] { return DeleteFileW(TEXT("\\a.txt")); }), DWORD{ERROR_ACCESS_DENIED});
  EXPECT_EQ(ErrorOf([] { return DeleteFileW(TEXT("\\folder")); }), DWORD{ERROR_ACCESS_DENIED});
  EXPECT_EQ(ErrorOf([] { return DeleteFileW(TEXT("\\none")); }), DWORD{ERROR_FILE_NOT_FOUND});

  ASSERT_TRUE(SetFileAttributesW(TEXT("\\a.txt"), FILE_ATTRIBUTE_NORMAL));
  {
    const File open(TEXT("\\a.txt"), GENERIC_READ, OPEN_EXISTING, FILE_SHARE_READ);
    EXPECT_EQ(ErrorOf([] { return DeleteFileW(TEXT("\\a.txt")); }), DWORD{ERROR_SHARING_VIOLATION});
  }
  EXPECT_TRUE(DeleteFileW(TEXT("\\A.txt")));
  EXPECT_EQ(Read(TEXT("\\a.txt")), "not there");
}

TEST(MoveFileWTest, NeverReplaces) {
  ASSERT_TRUE(Write(TEXT("\\a.txt"), "a"));
  ASSERT_TRUE(Write(TEXT("\\b.txt"), "b"));

  EXPECT_EQ(ErrorOf([] { return MoveFileW(TEXT("\\a.txt"), TEXT("\\B.TXT")); }),
            DWORD{ERROR_ALREADY_EXISTS});
  EXPECT_EQ(Read(TEXT("\\a.txt")), "a");
  EXPECT_EQ(Read(TEXT("\\b.txt")), "b");
}

TEST(MoveFileWTest, MovesFilesAndFoldersWithWhatTheyHold) {
  ASSERT_TRUE(CreateDirectoryW(TEXT("\\from"), nullptr));
  ASSERT_TRUE(Write(TEXT("\\from\\a.txt"), "a"));
  ASSERT_TRUE(SetFileAttributesW(TEXT("\\from\\a.txt"), FILE_ATTRIBUTE_READONLY));

  ASSERT_TRUE(MoveFileW(TEXT("\\from"), TEXT("\\to")));

  EXPECT_EQ(Read(TEXT("\\to\\a.txt")), "a");
  EXPECT_EQ(Attributes(GetFileAttributesW(TEXT("\\to\\a.txt"))), FILE_ATTRIBUTE_READONLY);
  EXPECT_EQ(GetFileAttributesW(TEXT("\\from")), INVALID_FILE_ATTRIBUTES);
  EXPECT_EQ(ErrorOf([] { return MoveFileW(TEXT("\\none"), TEXT("\\x")); }),
            DWORD{ERROR_FILE_NOT_FOUND});
}

TEST(MoveFileWTest, ChangesTheCaseOfAName) {
  ASSERT_TRUE(Write(TEXT("\\name.txt"), "a"));

  ASSERT_TRUE(MoveFileW(TEXT("\\name.txt"), TEXT("\\NAME.txt")));

  const bool kept = Differs(Difference::kMoveCase);
  EXPECT_EQ(List(TEXT("\\*.txt")),
            (std::vector<WideText>{kept ? TEXT("name.txt") : TEXT("NAME.txt")}));
}

TEST(CopyFileWTest, CopiesContentAndAttributesAndAsksBeforeReplacing) {
  ASSERT_TRUE(Write(TEXT("\\a.txt"), "a"));
  ASSERT_TRUE(Write(TEXT("\\b.txt"), "longer"));

  EXPECT_EQ(ErrorOf([] { return CopyFileW(TEXT("\\a.txt"), TEXT("\\b.txt"), TRUE); }),
            DWORD{ERROR_FILE_EXISTS});
  EXPECT_EQ(Read(TEXT("\\b.txt")), "longer");
  ASSERT_TRUE(SetFileAttributesW(TEXT("\\a.txt"), FILE_ATTRIBUTE_HIDDEN));
  ASSERT_TRUE(CopyFileW(TEXT("\\a.txt"), TEXT("\\b.txt"), FALSE));
  EXPECT_EQ(Read(TEXT("\\b.txt")), "a");
  if (Differs(Difference::kCopyAttributes)) return;
  EXPECT_EQ(GetFileAttributesW(TEXT("\\b.txt")), FILE_ATTRIBUTE_HIDDEN);
  EXPECT_EQ(ErrorOf([] { return CopyFileW(TEXT("\\a.txt"), TEXT("\\b.txt"), FALSE); }),
            DWORD{ERROR_ACCESS_DENIED})
      << "the target is hidden now";
}

TEST(RemoveDirectoryWTest, RemovesEmptyFoldersOnly) {
  ASSERT_TRUE(CreateDirectoryW(TEXT("\\folder"), nullptr));
  EXPECT_EQ(ErrorOf([] { return CreateDirectoryW(TEXT("\\FOLDER"), nullptr); }),
            DWORD{ERROR_ALREADY_EXISTS});
  EXPECT_EQ(ErrorOf([] { return CreateDirectoryW(TEXT("\\x\\y"), nullptr); }),
            DWORD{ERROR_PATH_NOT_FOUND});
  ASSERT_TRUE(Write(TEXT("\\folder\\a.txt"), "a"));

  EXPECT_EQ(ErrorOf([] { return RemoveDirectoryW(TEXT("\\folder")); }), DWORD{ERROR_DIR_NOT_EMPTY});
  ASSERT_TRUE(DeleteFileW(TEXT("\\folder\\a.txt")));
  EXPECT_TRUE(RemoveDirectoryW(TEXT("\\folder")));
  EXPECT_EQ(ErrorOf([] { return RemoveDirectoryW(TEXT("\\folder")); }),
            DWORD{ERROR_FILE_NOT_FOUND});
  EXPECT_FALSE(RemoveDirectoryW(TEXT("")));
}

// ---- searches ----

TEST(FindFirstFileWTest, ListsInOrderWithoutTheDotEntries) {
  for (const WCHAR* name : {TEXT("\\b"), TEXT("\\C.txt"), TEXT("\\a.txt"), TEXT("\\d.cab")}) {
    ASSERT_TRUE(Write(name, "x"));
  }
  const std::vector<WideText> all = {TEXT("a.txt"), TEXT("b"), TEXT("C.txt"), TEXT("d.cab")};

  EXPECT_EQ(List(TEXT("\\*.*")), all) << "names without a dot, too";
  EXPECT_EQ(List(TEXT("\\*")), all);
  EXPECT_EQ(List(TEXT("\\*.TXT")), (std::vector<WideText>{TEXT("a.txt"), TEXT("C.txt")}));
  EXPECT_EQ(List(TEXT("\\?.txt")), (std::vector<WideText>{TEXT("a.txt"), TEXT("C.txt")}));
  EXPECT_EQ(List(TEXT("\\B")), (std::vector<WideText>{TEXT("b")}));
  EXPECT_TRUE(List(TEXT("\\*.exe")).empty());
}

TEST(FindFirstFileWTest, DescribesWhatItFindsAndWritesNothingBehindTheRecord) {
  ASSERT_TRUE(Write(TEXT("\\a.txt"), "12345"));
  ASSERT_TRUE(SetFileAttributesW(TEXT("\\a.txt"), FILE_ATTRIBUTE_SYSTEM));
  struct {
    WIN32_FIND_DATAW data;
    std::array<BYTE, 8> behind;
  } guarded;
  std::memset(&guarded, kPoisonByte, sizeof guarded);

  const HANDLE search = FindFirstFileW(TEXT("\\a.txt"), &guarded.data);

  ASSERT_NE(search, INVALID_HANDLE_VALUE);
  EXPECT_EQ(Attributes(guarded.data.dwFileAttributes), FILE_ATTRIBUTE_SYSTEM);
  EXPECT_EQ(guarded.data.nFileSizeLow, 5U);
  EXPECT_EQ(guarded.data.nFileSizeHigh, 0U);
  EXPECT_EQ(WideText(guarded.data.cFileName), TEXT("a.txt"));
  for (const BYTE byte : guarded.behind) EXPECT_EQ(byte, kPoisonByte);
  SetLastError(kPoison);
  EXPECT_FALSE(FindNextFileW(search, &guarded.data));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_NO_MORE_FILES});
  EXPECT_TRUE(FindClose(search));
  if (Differs(Difference::kFindClose)) return;
  EXPECT_FALSE(FindClose(search)) << "closed already";
}

TEST(FindFirstFileWTest, FailsWhenNothingMatches) {
  WIN32_FIND_DATAW data;
  SetLastError(kPoison);
  EXPECT_EQ(FindFirstFileW(TEXT("\\none*"), &data), INVALID_HANDLE_VALUE);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_FILE_NOT_FOUND});
  SetLastError(kPoison);
  EXPECT_EQ(FindFirstFileW(TEXT("\\none\\*"), &data), INVALID_HANDLE_VALUE);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_PATH_NOT_FOUND});
}

TEST(FindFirstFileWTest, LetsAWalkDeleteWhatItFinds) {
  for (const WCHAR* name : {TEXT("\\a"), TEXT("\\b"), TEXT("\\c")}) ASSERT_TRUE(Write(name, "x"));
  WIN32_FIND_DATAW data;
  const HANDLE search = FindFirstFileW(TEXT("\\*.*"), &data);
  ASSERT_NE(search, INVALID_HANDLE_VALUE);

  int found = 0;
  do {
    const WideText path = TEXT("\\") + WideText(data.cFileName);
    if ((data.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY) != 0) continue;
    EXPECT_TRUE(DeleteFileW(path.c_str()));
    ++found;
  } while (FindNextFileW(search, &data));
  FindClose(search);

  EXPECT_EQ(found, 3);
  EXPECT_TRUE(List(TEXT("\\*.*")).empty());
}

// ---- room ----

TEST(GetDiskFreeSpaceExWTest, CountsWhatAFileTakes) {
  ULARGE_INTEGER before = {};
  ULARGE_INTEGER total = {};
  ASSERT_TRUE(GetDiskFreeSpaceExW(TEXT("\\"), &before, &total, nullptr));
  EXPECT_LE(before.QuadPart, total.QuadPart);

  ASSERT_TRUE(Write(TEXT("\\a.bin"), std::string(100000, 'x')));

  ULARGE_INTEGER after = {};
  ASSERT_TRUE(GetDiskFreeSpaceExW(TEXT("\\"), nullptr, nullptr, &after));
  EXPECT_LE(after.QuadPart, before.QuadPart - 100000);
}

TEST(GetDiskFreeSpaceExWTest, FailsForAFolderThatDoesNotExist) {
  ULARGE_INTEGER free = {};
  EXPECT_EQ(
      ErrorOf([&] { return GetDiskFreeSpaceExW(TEXT("\\No Card"), &free, nullptr, nullptr); }),
      Differs(Difference::kFreeSpace) ? DWORD{ERROR_FILE_NOT_FOUND} : DWORD{ERROR_PATH_NOT_FOUND});
}

// ---- mappings ----

TEST(MapViewOfFileTest, ShowsTheFile) {
  ASSERT_TRUE(Write(TEXT("\\a.inf"), "[files]"));
  const HANDLE file = CreateFileForMappingW(TEXT("\\a.inf"), GENERIC_READ, FILE_SHARE_READ, nullptr,
                                            OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
  ASSERT_NE(file, INVALID_HANDLE_VALUE);
  const HANDLE mapping = CreateFileMappingW(file, nullptr, PAGE_READONLY, 0, 0, nullptr);
  ASSERT_NE(mapping, nullptr);

  const void* view = MapViewOfFile(mapping, FILE_MAP_READ, 0, 0, 0);

  ASSERT_NE(view, nullptr);
  EXPECT_EQ(std::memcmp(view, "[files]", 7), 0);
  EXPECT_EQ(GetFileSize(file, nullptr), 7U) << "the file's handle still serves";
  EXPECT_TRUE(CloseHandle(mapping));
  EXPECT_EQ(std::memcmp(view, "[files]", 7), 0) << "the view outlives the mapping's handle";
  EXPECT_TRUE(UnmapViewOfFile(view));
  EXPECT_FALSE(UnmapViewOfFile(view));
  CloseHandle(file);  // it may have gone with the mapping
}

TEST(MapViewOfFileTest, RefusesAnEmptyFileAndAWindowBeyondTheEnd) {
  ASSERT_TRUE(Write(TEXT("\\empty"), ""));
  HANDLE file = CreateFileForMappingW(TEXT("\\empty"), GENERIC_READ, FILE_SHARE_READ, nullptr,
                                      OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
  EXPECT_EQ(CreateFileMappingW(file, nullptr, PAGE_READONLY, 0, 0, nullptr), nullptr);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_FILE_INVALID});
  CloseHandle(file);

  ASSERT_TRUE(Write(TEXT("\\a.inf"), "[files]"));
  file = CreateFileForMappingW(TEXT("\\a.inf"), GENERIC_READ, FILE_SHARE_READ, nullptr,
                               OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
  const HANDLE mapping = CreateFileMappingW(file, nullptr, PAGE_READONLY, 0, 0, nullptr);
  EXPECT_EQ(MapViewOfFile(mapping, FILE_MAP_READ, 0, 0, 9000), nullptr);
  CloseHandle(mapping);
  CloseHandle(file);
}

// ---- streams ----

TEST(FopenTest, AppendsBytesAsTheyAre) {
  for (const char* line : {"one\r\n", "two\n"}) {
    FILE* stream = fopen("\\log.txt", "a");
    ASSERT_NE(stream, nullptr);
    EXPECT_EQ(fwrite(line, 1, std::strlen(line), stream), std::strlen(line));
    EXPECT_EQ(fclose(stream), 0);
  }

  EXPECT_EQ(Read(TEXT("\\log.txt")), "one\r\ntwo\n");
}

TEST(FopenTest, OverwritesWithWAndFailsOnAMissingFileWithR) {
  ASSERT_TRUE(Write(TEXT("\\log.txt"), "old content"));
  FILE* stream = fopen("\\log.txt", "w");
  ASSERT_NE(stream, nullptr);
  fwrite("new", 1, 3, stream);
  fclose(stream);

  EXPECT_EQ(Read(TEXT("\\log.txt")), "new");
  EXPECT_EQ(fopen("\\none.txt", "r"), nullptr);
}

TEST(FopenTest, FailsWhileAnotherHasTheFileForItself) {
  const File other(TEXT("\\log.txt"), GENERIC_WRITE, CREATE_ALWAYS, /*share=*/0);

  EXPECT_EQ(fopen("\\log.txt", "a"), nullptr);
}

}  // namespace
