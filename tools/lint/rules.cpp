// The rules that jobs are checked against, and what devices do with a job that breaks them.
#include <algorithm>
#include <iterator>

#include "tools/lint/finding.h"

namespace tools {
namespace {

constexpr Level kError = Level::kError;
constexpr Level kWarning = Level::kWarning;
constexpr Level kNote = Level::kNote;

constexpr RuleRow kRules[] = {
    // ---- the walk through the configlet ----
    {Rule::kUnknownGroup, "unknown-group", kError,
     "answers 0x822B0003; the host ends the walk and no upgrade starts",
     "correct the group's name"},
    {Rule::kUnknownField, "unknown-field", kError,
     "answers 0x822B0003; the host ends the walk and no upgrade starts",
     "correct the field's name"},
    {Rule::kNoUpgrade, "no-upgrade", kError, "takes the settings and starts nothing",
     "put the job into a group \"Upgrade\" inside the group \"Orvenix\""},
    {Rule::kTwoUpgrades, "two-upgrades", kError,
     "refuses the second with 0xC4111001 while the first one runs",
     "keep one group \"Upgrade\"; send the other job when the first has ended"},
    {Rule::kLostSetting, "lost-setting", kError,
     "drops it: there is no job to set it in before \"Orvenix\" begins and after \"Upgrade\" has "
     "ended",
     "move it into the group \"Upgrade\""},
    {Rule::kStrayField, "stray-field", kWarning,
     "writes it into the record that was begun last, or nowhere",
     "move it into its own \"Store\" or \"Registry\" group"},
    {Rule::kIgnoredField, "ignored-field", kWarning, "accepts the field and drops it",
     "move it into the group that it belongs to"},
    {Rule::kGroupCase, "group-case", kWarning,
     "finds the group, but drops the field: for this field the letter case of the group's name "
     "counts",
     "write the group's name exactly so: File, Store, MulticastClient"},
    {Rule::kShortName, "short-name", kNote,
     "takes the first field of its list whose name begins like this", "write the whole name"},
    {Rule::kIdleFile, "idle-file", kWarning,
     "does nothing with a \"File\" that stands neither in \"Download\" nor in \"DiskCleanup\"",
     "move the group, or leave it out"},
    {Rule::kCutText, "cut-text", kError, "keeps the beginning of it and drops the rest",
     "shorten the text"},
    {Rule::kNotAscii, "not-ascii", kWarning,
     "has one-byte texts and reads other characters than meant", "use ASCII characters"},
    {Rule::kOuterBlanks, "outer-blanks", kWarning, "takes blanks and line ends as part of the text",
     "write the text without blanks around it"},
    {Rule::kSwitchText, "switch-text", kWarning,
     "takes it as true: only the exact text \"false\" is false", "write \"false\" or \"true\""},

    // ---- configuration files ----
    {Rule::kUnknownElement, "unknown-element", kWarning, "passes it over",
     "correct its name, in which letter case counts, or leave it out"},
    {Rule::kDownloadIncomplete, "download-incomplete", kError, "passes the file over",
     "give it a SourceDir and a DestDir, both with the file's name"},
    {Rule::kPackageNoHardware, "package-no-hardware", kError, "takes the package for other devices",
     "give HardwareVersion, * for every device"},
    {Rule::kPackageFlash, "package-flash", kError,
     "calls its flash \"0\" and takes no package for another one", "leave FLASH out"},
    {Rule::kPackageNoSource, "package-no-source", kError, "counts the package and does not take it",
     "give SourceDir, the folder on the server"},
    {Rule::kPackageSourceSlash, "package-source-slash", kError,
     "adds a backslash behind the slash, a path that no server has; asks every 3 s, for ever",
     "end SourceDir with its last name"},
    {Rule::kPackageNoFile, "package-no-file", kError, "fetches nothing for it",
     "give the file's name as Base, or a Count of parts"},
    {Rule::kPackageCount, "package-count", kError,
     "reads the digits in front; for a negative number no part comes",
     "give Count from 1 to 999, or leave it out for one file"},
    {Rule::kPassDigits, "pass-digits", kError,
     "reads one character behind \"Pass=\": a pass of two digits is that of the first",
     "number passes from 1 to 9"},
    {Rule::kPassNever, "pass-never", kError, "takes it for pass 0, which never comes",
     "number passes from 1 to 9"},
    {Rule::kPassGap, "pass-gap", kWarning, "runs a pass that fetches no package",
     "number the passes one after the other"},
    {Rule::kPassStateDeleted, "pass-state-deleted", kError,
     "deletes the file that says which pass was last: every run is the first pass again",
     "save \\kvoupgclnt.txt, or \\Flash File Store\\kvoupgclnt.txt of a family that begins with 7"},
    {Rule::kRamNoSize, "ram-no-size", kError,
     "makes no store for the image and never starts the flash",
     "add RAMAllocSize= to a package of the same pass"},
    {Rule::kRamSizeShort, "ram-size-short", kError,
     "makes a store of the first RAMAllocSize of the pass and 40,960 bytes; what does not fit is "
     "asked for every 3 s, for ever",
     "give the sum of the pass's images as RAMAllocSize"},
    {Rule::kDiskSize, "disk-size", kWarning, "finds no folder and size: no card is found good",
     "write DiskSize=FOLDER:BYTES"},
    {Rule::kInfName, "inf-name", kError, "keeps 63 characters of the INF file's name",
     "shorten the name"},
    {Rule::kInfPattern, "inf-pattern", kWarning,
     "takes * for one character and ? for itself, and compares to the end of its text: no file "
     "comes",
     "write one * for each character that may be any"},

    // ---- storage ----
    {Rule::kNoStorage, "no-storage", kError,
     "refuses every job without a storage requirement, with 0xC4111002",
     "add a \"Store\" with Name \\ and RequiredSpace"},
    {Rule::kStorageUnnamed, "storage-unnamed", kError,
     "asks for the free space of a folder without a name, which fails: not met",
     "give the Store a Name, for example \\"},
    {Rule::kStorageNumber, "storage-number", kError,
     "reads the digits in front as a 32-bit number with a sign; what is 2 GiB or more, or "
     "negative, "
     "is never met",
     "give RequiredSpace in bytes, from 0 to 2147483647"},
    {Rule::kStorageLast, "storage-last", kWarning,
     "lets the last requirement alone decide; those before it can be short",
     "put the store that matters most last"},
    {Rule::kStorageLastRam, "storage-last-ram", kWarning,
     "counts a \"RAM:\" requirement as met; as the last one it lets every device pass",
     "put the requirement of a folder last"},
    {Rule::kStorageSecondRam, "storage-second-ram", kNote,
     "takes the first \"RAM:\" requirement for the size of the buffer and no other",
     "keep one \"RAM:\" requirement, with the whole size"},

    // ---- registry tests ----
    {Rule::kTestNoType, "test-no-type", kError,
     "presets the type \"String\", which names no registry type: the test always fails",
     "add Type REG_SZ or REG_DWORD"},
    {Rule::kTestType, "test-type", kError, "knows no such type: the test always fails",
     "write REG_SZ or REG_DWORD, in capitals"},
    {Rule::kTestOperator, "test-operator", kError, "knows no such operator: the test always fails",
     "use EQ, NEQ, LT, LTE, GT or GTE, in capitals"},
    {Rule::kTestRoot, "test-root", kError,
     "looks under the root of the test before, the first time under HKEY_LOCAL_MACHINE",
     "use HKEY_LOCAL_MACHINE, HKEY_CURRENT_USER, HKEY_CLASSES_ROOT or HKEY_USERS"},
    {Rule::kTestNoKey, "test-no-key", kWarning, "looks for the value in the root itself",
     "add the Key"},
    {Rule::kTestNumber, "test-number", kWarning,
     "reads the digits in front, none as 0, and keeps 32 bits without a sign: -1 is 4294967295",
     "write a decimal number from 0 to 4294967295"},
    {Rule::kTestNoMessage, "test-no-message", kWarning,
     "reports \"Upgrade Failed: \" without a reason when the test fails", "add an ErrorMsg"},

    // ---- log and messages ----
    {Rule::kSyslogAddress, "syslog-address", kError,
     "opens no socket, keeps the port, and loses every line of its log",
     "give a dotted IPv4 address, or Port 0 for the file \\FileXfer.log"},
    {Rule::kSyslogPort, "syslog-port", kWarning,
     "keeps 16 bits of the number; 0 means: to the file \\FileXfer.log",
     "give a port from 1 to 65535, or 0"},
    {Rule::kEndWithoutBegin, "end-without-begin", kWarning,
     "ends with \"Upgrade Complete\": the end text is used only with a begin text",
     "add a BeginText, or leave the EndText out"},
    {Rule::kMarkupInText, "markup-in-text", kWarning,
     "puts the text into its status document as it stands, which is then no XML",
     "do without <, > and &"},

    // ---- server ----
    {Rule::kUrlMissing, "url-missing", kError,
     "cannot open an empty address; asks every 3 s, for ever",
     "add BaseURL, for example http://10.0.0.2"},
    {Rule::kUrlScheme, "url-scheme", kError, "reads http:// only; asks every 3 s, for ever",
     "begin BaseURL with http://"},
    {Rule::kUrlPathWithoutPort, "url-path-without-port", kError,
     "adds the port behind the path, finds none at the host, and asks every 3 s, for ever",
     "leave the path and the closing slash out of BaseURL, or give it its own port"},
    {Rule::kUrlOwnPortJoined, "url-own-port-joined", kError,
     "joins BaseURL and source without a slash, so that the source is read as part of the port",
     "end BaseURL with a slash, or leave its port to HTTPPort"},
    {Rule::kUrlOwnPort, "url-own-port", kWarning,
     "fetches without attempt counters and cannot send its report at the end",
     "leave the port out of BaseURL and give HTTPPort"},
    {Rule::kHttpPort, "http-port", kError, "cannot reach a server there; asks every 3 s, for ever",
     "give HTTPPort from 1 to 65535"},
    {Rule::kAddressDiffers, "address-differs", kNote, "uses BaseURL alone; IPAddress is only kept",
     "make IPAddress agree with BaseURL, or leave it out"},

    // ---- files ----
    {Rule::kNothingToFetch, "nothing-to-fetch", kNote, "brings no file",
     "add a FileList if files are meant to come"},
    {Rule::kFileNoSource, "file-no-source", kError, "asks for nothing and never gets the file",
     "add the Source"},
    {Rule::kFileNoDestination, "file-no-destination", kError, "cannot open a file without a name",
     "add the Dest"},
    {Rule::kFileNoMask, "file-no-mask", kError,
     "passes the file over: without a pattern no device is meant",
     "add MCTMask, * for every device"},
    {Rule::kPathNoLetter, "path-no-letter", kError,
     "drops what comes before the first letter; nothing is left, and it asks every 3 s, for ever",
     "rename the file on the server so that its path begins with a letter"},
    {Rule::kPathLeading, "path-leading", kError,
     "drops what comes before the first letter and asks for another file",
     "rename the file on the server so that its path begins with a letter"},
    {Rule::kDestinationName, "destination-name", kError,
     "cannot create a file of such a name; asks for it every 3 s, for ever",
     "do without < > : \" | ? * in names"},
    {Rule::kDestinationFolder, "destination-folder", kError, "cannot open a folder as a file",
     "put the file's name behind the last backslash"},
    {Rule::kDestinationRelative, "destination-relative", kNote,
     "has no current folder: it means the root", "begin the path with a backslash"},
    {Rule::kDestinationMacro, "destination-macro", kWarning,
     "expands no macro here: it makes a folder of that name",
     "write the folder itself; macros are for what a package installs"},
    {Rule::kDuplicateDestination, "duplicate-destination", kError,
     "brings one over the other, finds one of them wrong in every run and fetches it again",
     "give each file a destination of its own; letter case makes no difference"},
    {Rule::kDuplicateForOthers, "duplicate-for-others", kWarning,
     "brings one over the other if it is meant by both masks",
     "make sure that no device matches both"},
    {Rule::kRenameTarget, "rename-target", kWarning,
     "does not rename onto a file that is there, and this one is in the same job",
     "keep one of the two"},
    {Rule::kCrcZero, "crc-zero", kWarning, "does not look at the file: neither checked nor fetched",
     "give the file's CRC-32"},
    {Rule::kCrcNumber, "crc-number", kWarning,
     "reads the digits in front; no file has this CRC, so it is fetched in every run",
     "give the CRC-32 in unsigned decimal"},
    {Rule::kRamWithoutStore, "ram-without-store", kWarning,
     "has no RAM buffer of that size for the file",
     "add a Store named RAM: with its size; in a configuration file, RAMAllocSize to a package"},
    {Rule::kRamName, "ram-name", kError,
     "cuts names in its flash store to 19 characters: the flash gets an image of another name",
     "shorten the name behind RAM:"},
    {Rule::kRamCase, "ram-case", kError,
     "knows RAM: in capitals only, and cannot create a file of such a name",
     "write RAM: in capitals"},

    // ---- list file and the server's files ----
    {Rule::kListMissing, "list-missing", kError,
     "asks for its list three times, then checks nothing",
     "put the list file on the server, or correct its Source"},
    {Rule::kListCrc, "list-crc", kWarning, "deletes the list and fetches it again in every run",
     "give the CRC of the list that is served"},
    {Rule::kListShift, "list-shift", kError,
     "takes a run of commas and line ends as one: this record and all behind it are misread",
     "give every line five fields, none of them empty"},
    {Rule::kListZeroByte, "list-zero-byte", kError, "ends the list there", "remove the zero byte"},
    {Rule::kListFieldLong, "list-field-long", kError, "passes the record over",
     "keep paths within 259 characters, masks within 2007, numbers within 31"},
    {Rule::kSizeNumber, "size-number", kWarning,
     "counts wrong bytes for its progress and its report",
     "give the size in bytes, from 0 to 2147483647"},
    {Rule::kFileMissing, "file-missing", kError, "gets 404 and asks every 3 s, for ever",
     "put the file on the server, or take it off the list"},
    {Rule::kFileCrc, "file-crc", kError, "fetches the file in every run and never finds it right",
     "make the bundle anew"},
    {Rule::kFileSize, "file-size", kWarning, "counts wrong bytes for its progress and its report",
     "make the bundle anew"},
    {Rule::kSizeShort, "size-short", kWarning,
     "lets a device pass that has too little room, and shows 100 percent too early",
     "raise RequiredSpace to the sum of the list's sizes"},
    {Rule::kSizeReserve, "size-reserve", kNote, "never shows 100 percent before the end",
     "none is needed if the reserve is meant"},
    {Rule::kFileUnlisted, "file-unlisted", kNote, "never asks for it",
     "list the file, or remove it"},

    // ---- cleanup ----
    {Rule::kDeleteRoot, "delete-root", kError,
     "deletes every file of the device that is neither in ROM, nor on a card, nor in the save list",
     "name the folders that are meant"},
    {Rule::kDeleteWildcard, "delete-wildcard", kWarning,
     "knows no wildcards here: nothing is deleted", "name the folder, or each file"},
    {Rule::kDeleteDotFolder, "delete-dot-folder", kWarning,
     "takes a path with a dot as one file: a folder behind it is not emptied",
     "name a folder without a dot above it, or each file"},
    {Rule::kDeleteRelative, "delete-relative", kNote, "has no current folder: it means the root",
     "begin the path with a backslash"},
    {Rule::kCleanupIdle, "cleanup-idle", kWarning, "does nothing with the entry",
     "give it a Name and an Action, Delete or Save"},
    {Rule::kSaveDoubleBackslash, "save-double-backslash", kError,
     "deletes the file: behind a folder that is named with a backslash at its end paths have two",
     "name the folder of the delete entry without the backslash at its end"},
    {Rule::kSaveDirect, "save-direct", kWarning,
     "deletes the file: what the delete list itself names is not protected",
     "take the file off the delete list"},
    {Rule::kSaveNothing, "save-nothing", kWarning,
     "deletes nothing there anyway: the entry protects nothing",
     "name the whole path of a file below a folder of the delete list"},

    // ---- processes and multicast ----
    {Rule::kStopPath, "stop-path", kWarning,
     "compares with names of running programs, which have no folder: nothing is stopped",
     "give the program's file name alone"},
    {Rule::kStopName, "stop-name", kNote,
     "compares the whole name, ending and letter case included",
     "write the name as the device runs it, with .exe"},
    {Rule::kStopSystem, "stop-system", kError,
     "stops a part of the operating system and hangs or restarts", "take it off the list"},
    {Rule::kStartNoProgram, "start-no-program", kWarning, "starts nothing",
     "add the Process, or leave its Parameters out"},
    {Rule::kInstallerBlank, "installer-blank", kWarning,
     "takes the package's path from behind the last blank; without one it prepares no package",
     "write a blank between the options and the package, or in front of it"},
    {Rule::kInstallerCase, "installer-case", kNote,
     "prepares packages for a program spelt wceload.exe only", "write it in small letters"},
    {Rule::kCabinetBroken, "cabinet-broken", kError,
     "prepares nothing of the package, and its installer refuses what it cannot read",
     "make the package anew, for example with orvenix bundle cab"},
    {Rule::kCabinetCompressed, "cabinet-compressed", kWarning,
     "cannot look into a compressed package: files that are there and read-only stay as they are",
     "store the files in the cabinet, as orvenix bundle cab does"},
    {Rule::kCabinetFiles, "cabinet-files", kWarning,
     "prepares only the files whose folder and name the setup file has",
     "make the package anew, for example with orvenix bundle cab"},
    {Rule::kCabinetMacro, "cabinet-macro", kWarning,
     "knows %CE1% to %CE17% only, and prepares a file of that very name",
     "use one of these, or the folder itself"},
    {Rule::kMulticastParameters, "multicast-parameters", kWarning,
     "refuses the whole line, runs no multicast and fetches everything by HTTP",
     "begin every option with A, P, U, D or H; blanks, / and - divide options"},
    {Rule::kMulticastGroup, "multicast-group", kError,
     "cannot join such a group, runs no multicast and fetches everything by HTTP",
     "give -A= a multicast address, for example 239.1.1.1"},
    {Rule::kMulticastPort, "multicast-port", kError,
     "listens where nothing is announced, and goes on by HTTP after 300 s",
     "give -P= the port of the group, from 1 to 65535"},
    {Rule::kMulticastOption, "multicast-option", kWarning, "passes the option over",
     "use -A=, -P=, -HV=, and -DA= with -DP= for a log by syslog"},
    {Rule::kMulticastText, "multicast-text", kWarning,
     "ends the text of -HV at a - or /, keeps 63 characters of it, and takes the rest for an "
     "option",
     "give the part of the configuration text in front of it"},
    {Rule::kMulticastNoText, "multicast-no-text", kWarning,
     "takes every file that is announced, those for other devices too",
     "add -HV= with the beginning of the devices' configuration text"},
    {Rule::kMulticastStatus, "multicast-status", kNote,
     "adds -UA= and -UP= of its own behind them, which count", "leave -UA= and -UP= out"},
    {Rule::kMulticastDiffers, "multicast-differs", kNote,
     "uses the Parameters of \"MulticastClient\" alone; the fields of \"MultiCast\" are only "
     "kept",
     "make the two agree, or leave the fields out"},
    {Rule::kMulticastFolder, "multicast-folder", kNote,
     "makes the last folder of a path while it receives, but none above it; where that one is "
     "missing the file comes by HTTP",
     "none is needed; a small file in each folder on the way makes it"},
};

static_assert(std::size(kRules) == static_cast<std::size_t>(Rule::kCount));

constexpr bool InOrder() {
  for (std::size_t i = 0; i < std::size(kRules); ++i) {
    if (kRules[i].rule != static_cast<Rule>(i)) return false;
  }
  return true;
}
static_assert(InOrder(), "RowOf takes the place for the rule");

}  // namespace

const char* NameOf(Level level) {
  switch (level) {
    case Level::kError: return "error";
    case Level::kWarning: return "warning";
    case Level::kNote: return "note";
  }
  return "";
}

const RuleRow& RowOf(Rule rule) {
  return kRules[static_cast<std::size_t>(rule)];
}

void Findings::Add(Rule rule, std::string where, std::string found) {
  findings_.push_back({rule, std::move(where), std::move(found)});
}

void Findings::Sort() {
  const auto rank = [](const Finding& finding) {
    return std::pair(RowOf(finding.rule).level, finding.rule);
  };
  std::stable_sort(findings_.begin(), findings_.end(),
                   [&rank](const Finding& a, const Finding& b) { return rank(a) < rank(b); });
}

std::size_t Findings::Count(Level level) const {
  return static_cast<std::size_t>(std::count_if(
      findings_.begin(), findings_.end(),
      [level](const Finding& finding) { return RowOf(finding.rule).level == level; }));
}

std::string Findings::Ids(Level level) const {
  std::string ids;
  Rule last = Rule::kCount;
  for (const Finding& finding : findings_) {
    if (RowOf(finding.rule).level != level || finding.rule == last) continue;
    last = finding.rule;
    ids += (ids.empty() ? "" : ", ") + std::string(RowOf(last).id);
  }
  return ids;
}

}  // namespace tools
