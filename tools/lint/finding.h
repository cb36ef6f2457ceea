// What a check of a job finds: every finding belongs to a rule, and a rule says what the device
// does about such a job and how to mend it.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace tools {

enum class Level : std::uint8_t {
  kError,    ///< the job cannot do what it is for
  kWarning,  ///< the device does something that is hardly meant
  kNote,     ///< worth knowing
};
[[nodiscard]] const char* NameOf(Level level);

/// Every rule, in the order in which findings are shown.
enum class Rule : std::uint8_t {
  // the walk through the configlet
  kUnknownGroup,
  kUnknownField,
  kNoUpgrade,
  kTwoUpgrades,
  kLostSetting,
  kStrayField,
  kIgnoredField,
  kGroupCase,
  kShortName,
  kIdleFile,
  kCutText,
  kNotAscii,
  kOuterBlanks,
  kSwitchText,
  // configuration files
  kUnknownElement,
  kDownloadIncomplete,
  kPackageNoHardware,
  kPackageFlash,
  kPackageNoSource,
  kPackageSourceSlash,
  kPackageNoFile,
  kPackageCount,
  kPassDigits,
  kPassNever,
  kPassGap,
  kPassStateDeleted,
  kRamNoSize,
  kRamSizeShort,
  kDiskSize,
  kInfName,
  kInfPattern,
  // storage
  kNoStorage,
  kStorageUnnamed,
  kStorageNumber,
  kStorageLast,
  kStorageLastRam,
  kStorageSecondRam,
  // registry tests
  kTestNoType,
  kTestType,
  kTestOperator,
  kTestRoot,
  kTestNoKey,
  kTestNumber,
  kTestNoMessage,
  // log and messages
  kSyslogAddress,
  kSyslogPort,
  kEndWithoutBegin,
  kMarkupInText,
  // server
  kUrlMissing,
  kUrlScheme,
  kUrlPathWithoutPort,
  kUrlOwnPortJoined,
  kUrlOwnPort,
  kHttpPort,
  kAddressDiffers,
  // files
  kNothingToFetch,
  kFileNoSource,
  kFileNoDestination,
  kFileNoMask,
  kPathNoLetter,
  kPathLeading,
  kDestinationName,
  kDestinationFolder,
  kDestinationRelative,
  kDestinationMacro,
  kDuplicateDestination,
  kDuplicateForOthers,
  kRenameTarget,
  kCrcZero,
  kCrcNumber,
  kRamWithoutStore,
  kRamName,
  kRamCase,
  // list file and server's files
  kListMissing,
  kListCrc,
  kListShift,
  kListZeroByte,
  kListFieldLong,
  kSizeNumber,
  kFileMissing,
  kFileCrc,
  kFileSize,
  kSizeShort,
  kSizeReserve,
  kFileUnlisted,
  // cleanup
  kDeleteRoot,
  kDeleteWildcard,
  kDeleteDotFolder,
  kDeleteRelative,
  kCleanupIdle,
  kSaveDoubleBackslash,
  kSaveDirect,
  kSaveNothing,
  // processes and multicast
  kStopPath,
  kStopName,
  kStopSystem,
  kStartNoProgram,
  kInstallerBlank,
  kInstallerCase,
  kCabinetBroken,
  kCabinetCompressed,
  kCabinetFiles,
  kCabinetMacro,
  kMulticastParameters,
  kMulticastGroup,
  kMulticastPort,
  kMulticastOption,
  kMulticastText,
  kMulticastNoText,
  kMulticastStatus,
  kMulticastDiffers,
  kMulticastFolder,
  kCount,
};

struct RuleRow {
  Rule rule;
  const char* id;  ///< as scripts know it
  Level level;
  const char* device;  ///< what the device does
  const char* fix;
};
[[nodiscard]] const RuleRow& RowOf(Rule rule);

struct Finding {
  Rule rule = Rule::kCount;
  std::string where;  ///< "job.xml:12", "bundle.lst:3"
  std::string found;
};

/// The findings of one job, in the order of the rules once they are sorted.
class Findings {
 public:
  void Add(Rule rule, std::string where, std::string found);
  /// By rule; findings of one rule stay in the order in which they came.
  void Sort();

  [[nodiscard]] const std::vector<Finding>& all() const { return findings_; }
  [[nodiscard]] std::size_t Count(Level level) const;
  /// "no-storage, test-type": the ids of the rules that findings of this level belong to.
  [[nodiscard]] std::string Ids(Level level) const;

 private:
  std::vector<Finding> findings_;
};

}  // namespace tools
