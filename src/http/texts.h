// Every text of the HTTP client that others see: the transfer log, the debugger's output, the
// status lines and the messages to the server. They are fixed, slips included: people and scripts
// search for them, and servers in the field read the messages by their letters.
//
// A "%%" is one "%" in the line: several texts close with it where they open with "!".
#pragma once

namespace http::texts {

// ---- log: connection ----
inline constexpr char kInvalidSocket[] =
    "Orvenix - CSocketIO::CreateTcpSocket - Error Invalid Socket\r\n";
inline constexpr char kConnectError[] = "Orvenix - CSocketIO::Connect - Error !%d%%\r\n";
inline constexpr char kConnected[] = "Orvenix - CSocketIO::Connect - connect established\r\n";
inline constexpr char kWriteableError[] = "Orvenix - CSocketIO::SocketWriteable - error = !%d!\r\n";
inline constexpr char kWriteableTimeout[] =
    "Orvenix - CSocketIO::SocketWriteable - timeout error\r\n";
inline constexpr char kWriteableNotSet[] =
    "Orvenix - CSocketIO::SocketWriteable - socket not set\r\n";
inline constexpr char kClose[] = "Orvenix - CSocketIO::Close\r\n";
inline constexpr char kBadAddress[] = "Orvenix - CSocketIO::IPToString bad ip \r\n";

// ---- log: OpenURL ----
inline constexpr char kOpenEntering[] = "Orvenix - CHTTPClient::OpenURL - entering !%s!\r\n";
inline constexpr char kParseError[] = "Orvenix - CHTTPClient::OpenURL ParseURL error\r\n";
inline constexpr char kGetHostIp[] = "Orvenix - CHTTPClient::OpenURL - GetHostIp !%s, %d!\r\n";
inline constexpr char kAlreadyConnected[] =
    "Orvenix - CHTTPClient::OpenURL - Already Connected\r\n";
inline constexpr char kConnecting[] = "Orvenix - CHTTPClient::OpenURL - Connect, %d\r\n";
inline constexpr char kOpenExiting[] = "Orvenix - CHTTPClient::OpenURL - Exiting\r\n";
inline constexpr char kNoSocket[] = "Orvenix - OpenURL - could not create socket\r\n";
inline constexpr char kNoConnection[] = "Orvenix - OpenURL - could not connect\r\n";

// ---- log: Get ----
// KEPT ODDITY: this one line carries a shorter program name.
inline constexpr char kBadReturn1[] = "Orvnix - CHttpClient:Get - bad ret 1\r\n";
inline constexpr char kBadReturn[] = "Orvenix - CHttpClient:Get - bad ret %d\r\n";
inline constexpr char kBadAlloc[] = "Orvenix - CHTTPClinent::Get - bad alloc\r\n";
inline constexpr char kBeforeRequest[] = "\r\n";
inline constexpr char kAfterRequest[] = "\r\n\r\n";
inline constexpr char kNoAttributes[] = "Orvenix - CHttpClient:Get - No Content-Attributes\r\n";
inline constexpr char kTimeStamp[] = "Orvenix - Content-timestamp: %s\r\n";
inline constexpr char kNoTimeStamp[] = "Orvenix - CHttpClient:Get - No Content-timestamp\r\n";
inline constexpr char kCheckpoints[] = "Orvenix - check pointing is true\r\n";
inline constexpr char kRamFile[] = "Orvenix - after Ramfile::Init - opening, %s\r\n";
inline constexpr char kOpenError[] = "Orvenix - OpenForWriting - error, %s\r\n";
inline constexpr char kOpened[] = "Orvenix - after OPenForWriting - success, !%s%%\r\n";
inline constexpr char kEmptyFile[] = "Orvenix - after OpenForWriting - zero length file, !%s%%\r\n";
inline constexpr char kFirstWriteError[] = "Orvenix - httpClient - first write error\r\n";
inline constexpr char kCompleteAtOnce[] = "Orvenix - httpClient - file complete in first frame\r\n";
inline constexpr char kServerSilent[] = "Orvenix - httpclient, server not sending data 3\r\n";
inline constexpr char kReadError[] = "Orvenix - m_HTTP.ReadData error\r\n";
inline constexpr char kWriteError[] = "Orvenix - file->Write error\r\n";
inline constexpr char kSizeMatch[] = "Orvenix - http file size match, transfer success\r\n";
inline constexpr char kAttributes[] = "Setting file attributes, %s, %d, %d\r\n";
inline constexpr char kFileCrc[] = "Orvenix - FILECRC32\r\n";
inline constexpr char kRamFileCrc[] = "Orvenix - RAMFILECRC32\r\n";
inline constexpr char kNoCrcComputed[] = "Orvenix - RAMFILECRC32 or FILECRC32 returned error\r\n";
inline constexpr char kGoodCrc[] = "Orvenix - good CRC\r\n";
inline constexpr char kCrcError[] = "Orvenix - CRC error, %s, %d, %d\r\n";

// ---- log: the report ----
inline constexpr char kReportEntering[] =
    "Orvenix - CHTTPClient::SendUpgradeComplete - Entering\r\n";
inline constexpr char kReportExiting[] = "Orvenix - CHTTPClient::SendUpgradeComplete - Exiting\r\n";
inline constexpr char kEngineReportEntering[] = "Orvenix - SendUpgradeComplete - Entering\r\n";
inline constexpr char kEngineReportExiting[] = "Orvenix - SendUpgradeComplete - Exiting\r\n";

// ---- status lines; two carry their line end into the window ----
inline constexpr char kShowRamReady[] = "RAMFile::Init - ok";
inline constexpr char kShowNoRam[] = "RAMFile::Init - error";
inline constexpr char kShowOpenError[] = "file open error";
inline constexpr char kShowEmptyFile[] = "filesize = 0";
inline constexpr char kShowWriteError[] = "fileWrite error - %s";
inline constexpr char kShowReadError[] = "Read data error 2\r\n";
inline constexpr char kShowCrcFailed[] = "CRC failed\r\n";

// ---- messages to the server ----
// Path, host, type, family, model, serial number, core name, BundleRx, HttpFallback.
inline constexpr char kRequest[] =
    "GET %s HTTP/1.1\r\nHost: %s\r\nUser-Agent: UpgradeClient\r\nAccept: */*\r\n"
    "Connection: Keep-Alive\r\nType: %s\r\nFamily: %s\r\nModel: %s\r\nSerialNum: %s\r\n"
    "Core-name: %s\r\nBundle-rx: %d\r\nHTTP-fallback: %d\r\nCache-Control: no-cache\r\n\r\n";
// KEPT ODDITY: the report's request line has no path; that is how servers know it.
inline constexpr char kReport[] =
    "GET HTTP/1.1\r\nCore-name: %s\r\nBundle-rx: %d\r\nHTTP-fallback: %d\r\n"
    "Bundle-transfer: COMPLETE\r\n%s%s%s\r\n";
inline constexpr char kReportError[] = "Error: ";
inline constexpr char kLineEnd[] = "\r\n";

}  // namespace http::texts
