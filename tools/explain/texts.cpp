// The texts of the transfer log and of the screen, as the sources have them, slips included.
#include <iterator>

#include "tools/explain/catalogue.h"

namespace tools {
namespace {

constexpr Phase kAny = Phase::kAny;
constexpr Phase kFiles = Phase::kFiles;
constexpr Weight kStep = Weight::kStep;
constexpr Weight kGood = Weight::kGood;
constexpr Weight kTrouble = Weight::kTrouble;
constexpr Weight kFatal = Weight::kFatal;
constexpr CodeKind kNone = CodeKind::kNone;
constexpr CodeKind kError = CodeKind::kError;

constexpr const char* kCheckNetwork = "check BaseURL, HTTPPort, the network and the server";
constexpr const char* kCheckTest =
    "see the test's key and value in the job and in the device's registry";
constexpr const char* kMakeRoom = "make room on the device; check the path and the storage card";
constexpr const char* kRebuild =
    "compare the list, the job and the server's files: orvenix job lint";

constexpr TextRow Log(const char* format, Phase phase, Weight weight, const char* meaning,
                      const char* remedy = "", CodeKind number = kNone) {
  return {format, false, phase, weight, number, meaning, remedy};
}
constexpr TextRow Show(const char* format, Phase phase, Weight weight, const char* meaning,
                       const char* remedy = "") {
  return {format, true, phase, weight, kNone, meaning, remedy};
}

constexpr TextRow kTexts[] = {
    // ---- the host's walk ----
    Log("IcfgBeginGroup - %s\r\n", Phase::kSettings, kStep, "the host begins a group of the job"),
    Log("IcfgSetField - %s, %s\r\n", Phase::kSettings, kStep, "the host sets a field"),
    Log("Getting MCFTP Version\r\n", kAny, kStep, "the host asks for the version"),
    Log("MCFTP Version = %s\r\n", kAny, kStep, "the version that it was given"),
    Log("Allocating gpUpgCfg\r\n", Phase::kSettings, kStep, "a new job begins"),
    Log("Upgrade already in progress\r\n", Phase::kSettings, kFatal,
        "the job is refused with 0xC4111001: an upgrade is in progress",
        "wait for the end of the upgrade"),

    // ---- the upgrade configuration file ----
    Log("UpgradeConfig - Registry\r\n", Phase::kSettings, kStep,
        "the configuration file has a registry test"),
    Log("UpgradeConfig - Adding Registry Item\r\n", Phase::kSettings, kStep,
        "the registry test was added to the job"),

    // ---- checks before the start ----
    Log("Orvenix - PerformTests\r\n", Phase::kChecks, kStep,
        "power is there; the registry tests begin"),
    Log("PerformTests - %d\r\n", kAny, kStep, "so many registry tests"),
    Log("PerformTests - invalid registry item pointer\r\n", kAny, kTrouble,
        "a registry test could not be kept for want of memory; it is passed over",
        "restart the device"),
    Log("Orvenix - PerformTests - No such key\r\n", kAny, kFatal,
        "the registry key of a test does not exist", kCheckTest),
    Log("Orvenix - PerformTests - No such valuename\r\n", kAny, kFatal,
        "the registry value of a test does not exist, or is larger than its buffer", kCheckTest),
    Log("Orvenix - PerformTests - Unsupported reg type\r\n", kAny, kFatal,
        "the registry value of a test is neither a text nor a number", kCheckTest),
    Log("Orvenix - PerformTests - failed test\r\n", kAny, kFatal,
        "a registry test failed; the upgrade ends, the next line is the test's message",
        kCheckTest),
    Log("Orvenix - Cleanup\r\n", Phase::kChecks, kStep, "the tests passed; the device is cleaned"),
    Log("Orvenix - CheckSpace\r\n", Phase::kChecks, kStep, "the storage requirements are checked"),
    Log("Orvenix - CheckSpace, %s\r\n", Phase::kChecks, kStep,
        "the free space of a folder is asked"),
    Log("Orvenix - SetTransferBytes\r\n", Phase::kChecks, kStep, "there is enough space"),
    Log("Orvenix - StartUpgradeThread\r\n", Phase::kChecks, kStep,
        "all checks passed; the upgrade starts"),

    // ---- start ----
    Log("Orvenix thread - Started\r\n", Phase::kStart, kStep, "the upgrade thread runs"),
    Log("Orvenix - CretaeUpgradeInProgressEvent - Success\r\n", Phase::kStart, kStep,
        "other programs can see that an upgrade is in progress"),
    Log("Orvenix - CretaeUpgradeInProgressEvent - error, %d\r\n", Phase::kStart, kTrouble,
        "other programs cannot see that an upgrade is in progress", "restart the device", kError),
    Log("Orvenix - UpgradeThread - InitRAM\r\n", Phase::kStart, kStep,
        "a requirement for RAM is looked for"),
    Log("Orvenix - InitRAM - RAM needed = %s\r\n", Phase::kStart, kStep,
        "the job needs so much RAM"),
    Log("Orvenix - InitRAM - RAM init error = %s\r\n", Phase::kStart, kTrouble,
        "the flash driver's RAM could not be had",
        "restart the device; lower the job's RAM: requirement"),

    // ---- multicast ----
    Log("Orvenix - UpgradeThread - StartMulticastClient\r\n", Phase::kMulticast, kStep,
        "the multicast client is started"),
    Log("Orvenix - StartMulticastClient - mc.Start, !%s!\r\n", Phase::kMulticast, kStep,
        "the multicast client's command line"),
    Log("Orvenix - StartMulticastClient - Exiting\r\n", Phase::kMulticast, kStep,
        "the multicast transfer is over"),
    Log("Multicast complete - main logic...", Phase::kMulticast, kStep,
        "the multicast transfer is over"),
    Log("Orvenix - MCStatusThread, select error\r\n", kAny, kTrouble,
        "the multicast progress is no longer shown"),
    Log("Orvenix - MCStatusThread - recvfrom got error\r\n", kAny, kStep,
        "the multicast progress ends: its socket was closed"),

    // ---- files ----
    Log("UpgradeClient Mode...", kFiles, kStep,
        "the job was started by a program other than the host"),
    Log("Multicast Fallback Mode...", kFiles, kStep, "the files are checked and fetched by HTTP"),
    Log("Processing OS files...", kFiles, kStep, "the firmware's files are fetched"),
    Log("Processing INF files\r\n", kFiles, kStep, "the files of the INF file are fetched"),
    Log("Processing misc files\r\n", kFiles, kStep, "the other files are fetched"),
    Log("Server = !%s!", kFiles, kStep, "the server that the files come from"),
    Log("Error getting file %s\r\n", kFiles, kTrouble, "a firmware file could not be fetched",
        kCheckNetwork),
    Log("Error getting inf file %s\r\n", kFiles, kTrouble, "the INF file could not be fetched",
        kCheckNetwork),
    Log("Error getting some file %s\r\n", kFiles, kTrouble, "a file could not be fetched",
        kCheckNetwork),
    Log("Orvenix - UpgradeThread - Validate Files\r\n", kFiles, kStep, "the files are checked"),
    Log("Orvenix - ValidateFiles - Entering\r\n", kFiles, kStep, "the files are checked"),
    Log("Orvenix - ValidateFiles - LoadFileList\r\n", kFiles, kStep, "the list file is read"),
    Log("Orvenix - LoadFileList - multicast crc error, no file, %s\r\n", kFiles, kStep,
        "the list file is not on the device yet"),
    Log("Orvenix - LoadFileList - multicast list file crc mismatch, %s, %d, %d\r\n", kFiles, kStep,
        "the list file on the device is an older one; it is deleted and fetched"),
    Log("Orvenix - LoadFileList - multicast list file crc match\r\n", kFiles, kGood,
        "the list file on the device is the right one"),
    Log("Orvenix - LoadFileList, src file = !%s!\r\n", kFiles, kStep,
        "the list file on the server"),
    Log("Orvenix - LoadFileList, dest file = !%s!\r\n", kFiles, kStep,
        "the list file on the device"),
    Log("Orvenix - LoadFileList, open for reading1 = !%s!\r\n", kFiles, kStep,
        "the list file is opened"),
    Log("Orvenix - LoadFileList, open for reading2 = !%s!\r\n", kFiles, kStep,
        "the list file was fetched and is opened"),
    Log("Orvenix - LoadFileList, error getting multicast list file\r\n", kFiles, kTrouble,
        "the list file could not be fetched", kCheckNetwork),
    Log("Orvenix - LoadFileList, error getting list file", kFiles, kTrouble,
        "there is no list file after three attempts: no file is checked", kCheckNetwork),
    Log("Orvenix - LoadFileList, list too long, %d records taken\r\n", kFiles, kTrouble,
        "there was no memory for the whole list; its end is left out", "divide the bundle"),
    Log("Orvenix - ValidateFiles - check file !%s!\r\n", kFiles, kStep, "a file is checked"),
    Log("Orvenix - ValidateFiles - crc error, no file, %s\r\n", kFiles, kStep,
        "the file is not on the device; it is fetched"),
    Log("Orvenix - ValidateFiles - crc mismatch, %s, %d, %d\r\n", kFiles, kStep,
        "the file on the device is damaged or another one; it is fetched"),
    Log("Orvenix - ValidateFiles - http fetching !%s! to !%s!\r\n", kFiles, kStep,
        "a file is fetched"),
    Log("Orvenix - Rename settings file\r\n", kFiles, kStep,
        "files that end in .rename are renamed"),

    // ---- the connection to the server ----
    Log("Orvenix - before OpenURL\r\n", kAny, kStep, "an attempt to fetch a file begins"),
    Log("Orvenix - CHTTPClient::OpenURL - entering !%s!\r\n", kAny, kStep,
        "the server is connected"),
    Log("Orvenix - CHTTPClient::OpenURL ParseURL error\r\n", kAny, kTrouble,
        "the address does not begin with http://", "correct BaseURL: orvenix job lint"),
    Log("Orvenix - CHTTPClient::OpenURL - GetHostIp !%s, %d!\r\n", kAny, kStep,
        "the server's name and port"),
    Log("Orvenix - CHTTPClient::OpenURL - Already Connected\r\n", kAny, kStep,
        "the connection of the last file is used again"),
    Log("Orvenix - CHTTPClient::OpenURL - Connect, %d\r\n", kAny, kStep,
        "the server's address as a number; 0 means that its name is not known"),
    Log("Orvenix - CHTTPClient::OpenURL - Exiting\r\n", kAny, kStep, "the server is connected"),
    Log("Orvenix - OpenURL - could not create socket\r\n", kAny, kTrouble,
        "there is no socket to be had", "restart the device"),
    Log("Orvenix - OpenURL - could not connect\r\n", kAny, kTrouble, "the server cannot be reached",
        kCheckNetwork),
    Log("Orvenix - CSocketIO::CreateTcpSocket - Error Invalid Socket\r\n", kAny, kTrouble,
        "there is no socket to be had", "restart the device"),
    Log("Orvenix - CSocketIO::Connect - Error !%d%%\r\n", kAny, kTrouble,
        "the server cannot be reached", kCheckNetwork, kError),
    Log("Orvenix - CSocketIO::Connect - connect established\r\n", kAny, kGood,
        "the server is connected"),
    Log("Orvenix - CSocketIO::SocketWriteable - error = !%d!\r\n", kAny, kTrouble,
        "waiting for the connection failed", kCheckNetwork, kError),
    Log("Orvenix - CSocketIO::SocketWriteable - timeout error\r\n", kAny, kTrouble,
        "the server did not answer in time", kCheckNetwork),
    Log("Orvenix - CSocketIO::SocketWriteable - socket not set\r\n", kAny, kTrouble,
        "waiting for the connection failed", kCheckNetwork),
    Log("Orvenix - CSocketIO::Close\r\n", kAny, kStep, "the connection is closed"),
    Log("Orvenix - CSocketIO::IPToString bad ip \r\n", kAny, kTrouble,
        "the server's address cannot be written as text; the request goes without it"),

    // ---- one file ----
    Log("Orvnix - CHttpClient:Get - bad ret 1\r\n", kAny, kTrouble,
        "the path to ask for holds no letter",
        "rename the file on the server so that its path begins with a letter"),
    Log("Orvenix - CHttpClient:Get - bad ret %d\r\n", kAny, kTrouble, "a request failed",
        kCheckNetwork, CodeKind::kRequest),
    Log("Orvenix - CHTTPClinent::Get - bad alloc\r\n", kAny, kTrouble, "there is too little memory",
        "restart the device"),
    Log("Orvenix - CHttpClient:Get - No Content-Attributes\r\n", kAny, kStep,
        "the server gives no attributes for the file"),
    Log("Orvenix - CHttpClient:Get - No Content-timestamp\r\n", kAny, kStep,
        "the server gives no time for the file"),
    Log("Orvenix - Content-timestamp: %s\r\n", kAny, kStep, "the file's time on the server"),
    Log("Orvenix - check pointing is true\r\n", kAny, kStep, "the server offers checkpoints"),
    Log("Orvenix - after Ramfile::Init - opening, %s\r\n", kAny, kStep, "a file in RAM is opened"),
    Log("Orvenix - OpenForWriting - error, %s\r\n", kAny, kTrouble,
        "the file cannot be created on the device", kMakeRoom),
    Log("Orvenix - after OPenForWriting - success, !%s%%\r\n", kAny, kStep, "the file was created"),
    Log("Orvenix - after OpenForWriting - zero length file, !%s%%\r\n", kAny, kGood,
        "the file is empty"),
    Log("Orvenix - httpClient - first write error\r\n", kAny, kTrouble,
        "the file cannot be written", kMakeRoom),
    Log("Orvenix - httpClient - file complete in first frame\r\n", kAny, kGood,
        "a small file has come whole; it is not checked"),
    Log("Orvenix - httpclient, server not sending data 3\r\n", kAny, kTrouble,
        "the server stopped in the middle of a file; it is asked again",
        "check the server's load and the radio's coverage"),
    Log("Orvenix - m_HTTP.ReadData error\r\n", kAny, kTrouble,
        "the connection ended in the middle of a file",
        "check the server's log and the radio's coverage"),
    Log("Orvenix - file->Write error\r\n", kAny, kTrouble, "the file cannot be written", kMakeRoom),
    Log("Orvenix - http file size match, transfer success\r\n", kAny, kStep,
        "the whole file has come"),
    Log("Setting file attributes, %s, %d, %d\r\n", kAny, kStep, "the file gets its attributes"),
    Log("Orvenix - FILECRC32\r\n", kAny, kStep, "the file's CRC is computed"),
    Log("Orvenix - RAMFILECRC32\r\n", kAny, kStep, "the RAM file's CRC is computed"),
    Log("Orvenix - RAMFILECRC32 or FILECRC32 returned error\r\n", kAny, kTrouble,
        "the file cannot be read again; it is asked for again", kMakeRoom),
    Log("Orvenix - good CRC\r\n", kAny, kGood, "the file is right"),
    Log("Orvenix - CRC error, %s, %d, %d\r\n", kAny, kTrouble,
        "the file came damaged, or the server's CRC is wrong; it is asked for again, without end",
        kRebuild),

    // ---- the report to the server ----
    Log("Orvenix - SendUpgradeComplete\r\n", Phase::kReport, kStep,
        "the report to the server begins"),
    Log("Orvenix - SendUpgradeComplete - Entering\r\n", Phase::kReport, kStep,
        "the report to the server begins"),
    Log("Orvenix - SendUpgradeComplete - Exiting\r\n", Phase::kReport, kStep,
        "the report to the server is over"),
    Log("Orvenix - CHTTPClient::SendUpgradeComplete - Entering\r\n", Phase::kReport, kStep,
        "the report is sent"),
    Log("Orvenix - CHTTPClient::SendUpgradeComplete - Exiting\r\n", Phase::kReport, kStep,
        "the report was sent"),

    // ---- firmware and installer ----
    Log("Starting Eflash...", Phase::kFlash, kStep, "the firmware is written"),
    Log("After Eflash...", Phase::kFlash, kStep,
        "the firmware was written, or the flash driver did nothing"),
    Log("Local Upgrade Executing\r\n", Phase::kInstall, kGood,
        "the files are there; the job's program comes next"),
    Log("Orvenix - StartUpgrade - Entering\r\n", Phase::kInstall, kStep,
        "the job's program is started"),
    Log("Orvenix - StartUpgrade - Exiting\r\n", Phase::kInstall, kStep,
        "the job's program has ended, or goes on by itself, or there is none"),

    // ---- end ----
    Log("Orvenix - UpgradeThread - Exiting\r\n", Phase::kEnd, kStep, "the upgrade ends"),
    Log("Orvenix - DeleteUpgradeInProgressEvent\r\n", Phase::kEnd, kStep,
        "the upgrade is no longer in progress"),

    // ---- messages ----
    Log("Orvenix - InitKXTransfer - LoadLibrary\r\n", kAny, kStep,
        "the message queue's library is loaded"),
    Log("Orvenix - InitKXTransfer - GetHandles\r\n", kAny, kStep,
        "the message queue's functions are looked up"),
    Log("Orvenix - InitKXTransfer - open\r\n", kAny, kStep, "the message queue is opened"),
    Log("Orvenix - SetRWIStatus - entering\r\n", kAny, kStep, "a status is sent"),
    Log("Orvenix - SetRWIStatus - send msg\r\n", kAny, kStep,
        "the status goes to the message queue"),
    Log("Orvenix - SetRWIStatus - send msg lapi write\r\n", kAny, kStep,
        "the status goes to the message queue"),
    Log("Orvenix - SendDeviceEvent - entering\r\n", kAny, kStep, "an event is sent"),
    Log("Orvenix - SendDeviceEvent - send msg\r\n", kAny, kStep,
        "the event goes to the message queue"),
    Log("CloseTransferHandle", kAny, kStep, "the message queue is closed"),

    // ---- the screen ----
    Show("Upgrade Initialization...", Phase::kStart, kStep, "the upgrade has started"),
    Show("Start, CurrentPass = %d", Phase::kStart, kStep, "the pass of a job of several passes"),
    Show("InitRAM = %d", Phase::kStart, kStep, "bytes of RAM for the firmware"),
    Show("Starting FileXfer", Phase::kMulticast, kStep, "the multicast client is started"),
    Show("RAMSIZE From parms = %d", kFiles, kStep, "bytes of RAM that a firmware package asks for"),
    Show("Cleaning device...", kFiles, kStep, "the device is cleaned"),
    Show("Processing OS files", kFiles, kStep, "the firmware's files are fetched"),
    Show("Processing INF files...", kFiles, kStep, "the files of the INF file are fetched"),
    Show("Processing misc files...", kFiles, kStep, "the other files are fetched"),
    Show("Server = !%s!", kFiles, kStep, "the server that the files come from"),
    Show("Validating files", kFiles, kStep, "the files are checked"),
    Show("Validating, %s", kFiles, kStep, "a file is checked"),
    Show("No MCT on device", kFiles, kTrouble,
         "the device has no configuration text: no file is checked or fetched",
         "give the device its configuration text"),
    Show("RAMFile::Init - ok", kFiles, kStep, "the RAM for files is there"),
    Show("RAMFile::Init - error", kFiles, kTrouble, "the RAM for files could not be had",
         "restart the device"),
    Show("file open error", kAny, kTrouble, "the file of the next line cannot be created",
         kMakeRoom),
    Show("filesize = 0", kAny, kStep, "the file is empty"),
    Show("fileWrite error - %s", kAny, kTrouble, "the file cannot be written", kMakeRoom),
    Show("Read data error 2\r\n", kAny, kTrouble, "the connection ended in the middle of a file",
         "check the server's log and the radio's coverage"),
    Show("CRC failed\r\n", kAny, kTrouble, "the file came damaged, or the server's CRC is wrong",
         kRebuild),
    Show("Saving Network Parms...", kFiles, kStep, "the first of several passes is over"),
    Show("DOC is !%s!", Phase::kFlash, kStep,
         "the generation of the flash chip; none when it is not known"),
    Show("Deleting !%s!", Phase::kFlash, kStep, "a loader image for other flash chips is removed"),
    Show("Starting EFlash...", Phase::kFlash, kStep, "the firmware is written"),
    Show("This may take several minutes...", Phase::kFlash, kStep, "the firmware is written"),
    Show("Upgrade Complete", Phase::kEnd, kStep, "the upgrade has ended, well or not"),

    // ---- what the device logs of its messages to the server ----
    Log("GET HTTP/1.1\r\n", Phase::kReport, kStep, "the report to the server"),
    Log("GET %s HTTP/1.1\r\n", kAny, kStep,
        "a request; the numbers behind the colon count attempts and files"),
    Log("Bundle-rx: %d\r\n", kAny, kStep, "bytes that came by HTTP in this job"),
    Log("HTTP-fallback: %d\r\n", kAny, kStep, "1: the files come by HTTP"),
    Log("Bundle-transfer: COMPLETE\r\n", Phase::kReport, kStep, "the mark of a report"),
    Log("Error: %s\r\n", Phase::kReport, kTrouble,
        "the reason of a failed upgrade, as the server gets it"),
    Log("Version=%s\r\n", kAny, kStep, "the version that was written for the management client"),

    // ---- nothing but a text from elsewhere: last, because they match every line ----
    Show("%s", kAny, kStep, "a text of the job, or a path"),
    Log("%s\r\n", kAny, kStep, "a text of the job: an error message, a program, its parameters"),
    Log("%s", kAny, kStep,
        "a text of its own: an address, a request, a document, the time of an event"),
    Log("\r\n", kAny, kStep, "the end of a line"),
    Log("\r\n\r\n", kAny, kStep, "the end of a request"),
};

}  // namespace

const char* NameOf(Phase phase) {
  switch (phase) {
    case Phase::kAny: return "any";
    case Phase::kSettings: return "settings";
    case Phase::kChecks: return "checks";
    case Phase::kStart: return "start";
    case Phase::kMulticast: return "multicast";
    case Phase::kFiles: return "files";
    case Phase::kReport: return "report";
    case Phase::kFlash: return "flash";
    case Phase::kInstall: return "install";
    case Phase::kEnd: return "end";
  }
  return "";
}

TextRows Texts() {
  return {kTexts, std::size(kTexts)};
}

}  // namespace tools
