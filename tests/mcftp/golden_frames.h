// Frames of MCFTP, written down by hand, byte by byte. Client, server and dissector are held
// against these, so that no two of them can agree on a mistake.
#pragma once

namespace golden {

/// "\Temp\a.bin", 1,300 bytes in blocks of 512, last file, transfer 0x11, from 10.0.0.2:7001.
inline constexpr char kAnnouncement[] =
    "00 21"                                                        // announcement, last file
    "00 00"                                                        // nothing
    "02 00"                                                        // block size 512
    "00 00 05 14"                                                  // file size 1300: 3 blocks
    "00 00 03 e8"                                                  // wait 1000 ms for the OACK
    "00 00 00 20"                                                  // attributes: archive
    "00 00 00 11"                                                  // transfer
    "32 30 30 36 2d 30 33 2d 30 31 20 31 34 3a 30 35 3a 30 39 00"  // 2006-03-01 14:05:09
    "1b 59 0a 00 00 02"                                            // 7001, 10.0.0.2
    "05 00 00"                                                     // every 5 percent, no KiB
    "5c 54 65 6d 70 5c 61 2e 62 69 6e 00"                          // \Temp\a.bin
    "00";                                                          // for everyone

/// "\Temp\b.bin", 2,500 bytes, not the last, transfer 0x12, masks "TQ5*".
inline constexpr char kMaskedAnnouncement[] =
    "00 20 00 00 02 00 00 00 09 c4 00 00 03 e8 00 00 00 20 00 00 00 12"
    "32 30 30 36 2d 30 33 2d 30 31 20 31 34 3a 30 35 3a 30 39 00"
    "1b 59 0a 00 00 02 05 00 00"
    "5c 54 65 6d 70 5c 62 2e 62 69 6e 00 54 51 35 2a 00";

/// "\Temp\e.bin", no bytes, last file, transfer 0x14, no time stamp.
inline constexpr char kEmptyLastFile[] =
    "00 21 00 00 02 00 00 00 00 00 00 00 03 e8 00 00 00 20 00 00 00 14"
    "00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00"
    "1b 59 0a 00 00 02 05 00 00"
    "5c 54 65 6d 70 5c 65 2e 62 69 6e 00 00";

/// Asks for "\Temp\a.bin" of transfer 0x11.
inline constexpr char kReadRequest[] =
    "00 11"
    "00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00"
    "00 00 00 11"
    "00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00"
    "5c 54 65 6d 70 5c 61 2e 62 69 6e 00";

/// Private group 239.1.1.2:7000, by role.
inline constexpr char kOackPassive[] = "00 70 00 00 1b 58 ef 01 01 02";
inline constexpr char kOackAckMaster[] = "00 74 00 00 1b 58 ef 01 01 02";
inline constexpr char kOackNakMaster[] = "00 78 00 00 1b 58 ef 01 01 02";

/// Block 3 of 5 bytes: "hello".
inline constexpr char kData[] = "00 30 00 05 00 03 68 65 6c 6c 6f";

inline constexpr char kAck0[] = "00 40 00 00 00 00";
inline constexpr char kAck5[] = "00 40 00 00 00 05";
inline constexpr char kDuplicateAck5[] = "01 40 00 00 00 05";
inline constexpr char kNak2[] = "00 50 00 00 00 02";

/// Code 64, "Overrun:6750:120".
inline constexpr char kOverrun[] =
    "00 60 00 00 00 40 4f 76 65 72 72 75 6e 3a 36 37 35 30 3a 31 32 30 00";
inline constexpr char kUnknownTransfer[] =
    "00 60 00 00 00 05"
    "55 6e 6b 6e 6f 77 6e 20 74 72 61 6e 73 66 65 72 20 49 44 00";
inline constexpr char kDiskFull[] =
    "00 60 00 00 00 03"
    "44 69 73 6b 20 66 75 6c 6c 20 6f 72 20 61 6c 6c 6f 63 61 74 69 6f 6e 20 65 78 63 65 65 64"
    "65 64 00";

// The same frames, enciphered with the key of clients and servers.
inline constexpr char kEncipheredAck0[] = "80 40 5f 48 a0 27 68 25 8c 6b";
inline constexpr char kEncipheredAck5[] = "80 40 5b 7c ed 9d cb 76 89 c0";
inline constexpr char kEncipheredNak2[] = "80 50 f5 24 9a 92 0c b0 6a 63";
inline constexpr char kEncipheredOackAckMaster[] = "80 74 7d 62 39 a1 3a 38 a4 d8";
inline constexpr char kEncipheredOverrun[] =
    "80 60 b0 04 7e 04 5c 17 8f e4 4c 49 58 a3 f5 6b c4 c8 be c6 3b 38 03 5d 5e b8";

/// 39 percent of "\Temp\a.bin", 512 bytes so far.
inline constexpr char kStatus[] =
    "01 00 00 27 00 00 02 00 00 00 05 14 5c 54 65 6d 70 5c 61 2e 62 69 6e 00";

}  // namespace golden
