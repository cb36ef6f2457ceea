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

// The same frames, enciphered with the key of clients and servers; by a few lines of another
// language, so that the product's cipher has not written its own examination.
inline constexpr char kEncipheredAck0[] = "80 40 5f 48 a0 27 68 25 8c 6b";
inline constexpr char kEncipheredAck5[] = "80 40 5b 7c ed 9d cb 76 89 c0";
inline constexpr char kEncipheredNak2[] = "80 50 f5 24 9a 92 0c b0 6a 63";
inline constexpr char kEncipheredOackAckMaster[] = "80 74 7d 62 39 a1 3a 38 a4 d8";
inline constexpr char kEncipheredOverrun[] =
    "80 60 b0 04 7e 04 5c 17 8f e4 4c 49 58 a3 f5 6b c4 c8 be c6 3b 38 03 5d 5e b8";
inline constexpr char kEncipheredAnnouncement[] =
    "80 21 0c a7 ab af c9 3e 0c db 17 25 87 75 20 d3 d1 90 6e 9c fe 6f 39 b3 b1 16 95 c9 "
    "57 93 9d b2 4a 87 fb c3 48 a1 b8 d4 34 31 09 0b fb 19 34 58 ad a1 6e 39 ce df 64 85 "
    "8f a5 5c ea f7 bd bf 4f 61 f1";
inline constexpr char kEncipheredMaskedAnnouncement[] =
    "80 20 cc b0 bf 7c 54 b6 ef 1f 17 25 87 75 20 d3 d1 90 c5 c5 9d 78 55 f0 5d a6 95 c9 "
    "57 93 9d b2 4a 87 fb c3 48 a1 b8 d4 34 31 09 0b fb 19 34 58 ad a1 f7 a8 61 ba be 53 "
    "58 5b f7 57 40 c8 92 da 61 77 c1 19 70 98 2f e1 f0 9d";
inline constexpr char kEncipheredEmptyLastFile[] =
    "80 21 1a 38 ed 37 4b 31 a6 16 17 25 87 75 20 d3 d1 90 4e 50 cf 18 88 68 d6 31 5f 48 "
    "a0 27 68 25 8c 6b 5f 48 a0 27 68 25 8c 6b 09 0b fb 19 34 58 ad a1 60 3d 0a 86 ce 87 "
    "c3 5e 5c ea f7 bd bf 4f 61 f1";
inline constexpr char kEncipheredReadRequest[] =
    "80 11 5f 48 a0 27 68 25 8c 6b 5f 48 a0 27 68 25 8c 6b a2 01 90 9c 62 d5 c4 d4 5f 48 "
    "a0 27 68 25 8c 6b 5f 48 a0 27 68 25 8c 6b 5f 48 a0 27 68 25 8c 6b 6e 39 ce df 64 85 "
    "8f a5 5c ea f7 bd bf 4f 61 f1";
inline constexpr char kEncipheredOackPassive[] = "80 70 7d 62 39 a1 3a 38 a4 d8";
inline constexpr char kEncipheredOackNakMaster[] = "80 78 7d 62 39 a1 3a 38 a4 d8";
inline constexpr char kEncipheredData[] = "80 30 55 c8 ec d9 68 ce 52 62 d3 2b 6c 22 aa 4b 0f 9a";
inline constexpr char kEncipheredDuplicateAck5[] = "81 40 5b 7c ed 9d cb 76 89 c0";
inline constexpr char kEncipheredUnknownTransfer[] =
    "80 60 71 d3 7b ba 9b 0f b4 c1 2f e8 b8 c6 b2 6b 74 e0 f5 a5 d5 f8 e9 04 6e 74";
inline constexpr char kEncipheredDiskFull[] =
    "80 60 ed 92 77 b9 9c 01 c4 04 6b 6f cf 93 4c b4 5d ea 88 74 92 c0 cd 6b 32 39 6f e7 "
    "f3 3d 21 1a 25 35 da dc 15 8d 98 a2 75 71";

/// 39 percent of "\Temp\a.bin", 512 bytes so far.
inline constexpr char kStatus[] =
    "01 00 00 27 00 00 02 00 00 00 05 14 5c 54 65 6d 70 5c 61 2e 62 69 6e 00";

}  // namespace golden
