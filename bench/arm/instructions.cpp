// Does one thing of the library's, as often as it is told, and nothing else: a program for the
// device's processor, made by the device's compiler with the device's flags, whose instructions
// somebody counts. It stands on no system but for its end.
//
//     instructions NAME TIMES       TIMES: one digit
#include <coredll.h>

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <new>

#include "base/crc32.h"
#include "mcftp/cipher/fixed_key.h"
#include "mcftp/cipher/frame_cipher.h"
#include "mcftp/rules/block_bitmap.h"
#include "mcftp/wire/frames.h"
#include "xml/document.h"

namespace {

constexpr std::size_t kBlock = 1400;  ///< bytes of a file in one frame
constexpr std::size_t kFrame = mcftp::kDataOffset + kBlock;
constexpr std::size_t kCrcBlock = 4096;

constexpr char kDocument[] = R"(<?xml version="1.0" encoding="UTF-8"?>
<Configuration>
	<!-- Handhelds of the cold store -->
	<UpgradeConfig Version="7.1.19">
		<ShowGUI>true</ShowGUI>
		<BaseUrl>http://127.0.0.2/devices</BaseUrl>
		<HTTPPort>8080</HTTPPort>
		<Syslog Address="127.0.0.3" Port="514"/>
		<Downloads>
			<Download>
				<Source>bundle/part1.cab</Source>
				<Dest>\Application\part1.cab</Dest>
				<MCTMask>MR41*,TQ??&amp;52</MCTMask>
			</Download>
			<Download>
				<Source>bundle/part2.cab</Source>
				<Dest>\Application\part2.cab</Dest>
				<MCTMask>MR41*,TQ??&amp;52</MCTMask>
			</Download>
			<Download>
				<Source>bundle/part3.cab</Source>
				<Dest>\Application\part3.cab</Dest>
				<MCTMask>MR41*,TQ??&amp;52</MCTMask>
			</Download>
		</Downloads>
		<StopProcesses>
			<Process>worker1.exe</Process>
			<Process>worker2.exe</Process>
		</StopProcesses>
	</UpgradeConfig>
</Configuration>
)";

alignas(8) char heap[1U << 18U];
std::size_t heap_used = 0;

struct Bench {
  Bench() noexcept : cipher(key.bytes, mcftp::FixedKey::kLength) {
    for (std::size_t i = 0; i < sizeof bytes; ++i) bytes[i] = static_cast<std::uint8_t>(i * 7);
    const mcftp::DataFrame data{kBlock, 1, bytes};
    static_cast<void>(mcftp::EncodeData(data, clear, sizeof clear));
    std::memcpy(sealed, clear, sizeof sealed);
    sealed_length = mcftp::SealFrame(cipher, sealed, kFrame, sizeof sealed);
  }

  mcftp::FixedKey key;
  mcftp::Blowfish cipher;
  mcftp::BlockBitmap blocks;
  std::uint16_t next_block = 1;
  alignas(8) std::uint8_t bytes[kCrcBlock];
  alignas(8) std::uint8_t out[kCrcBlock];
  alignas(8) std::uint8_t clear[mcftp::EncipheredLength(kFrame)] = {};
  alignas(8) std::uint8_t sealed[mcftp::EncipheredLength(kFrame)] = {};
  std::size_t sealed_length = 0;
};
alignas(8) char bench_memory[sizeof(Bench)];

void Crc(Bench& bench) noexcept {
  base::Crc32 crc;
  crc.Update(bench.bytes, kCrcBlock);
  bench.out[0] = static_cast<std::uint8_t>(crc.value());
}

void Encipher(Bench& bench) noexcept {
  bench.cipher.Encipher(bench.bytes, bench.out, kBlock);
}

void Decipher(Bench& bench) noexcept {
  bench.cipher.Decipher(bench.bytes, bench.out, kBlock);
}

void ParseDocument(Bench& /*bench*/) noexcept {
  heap_used = 0;
  xml::XmlDocument document;
  if (!document.LoadFromText(kDocument, sizeof kDocument - 1)) heap_used = ~std::size_t{0};
}

void Copy(Bench& bench) noexcept {
  std::memcpy(bench.out, bench.sealed, sizeof bench.sealed);
}

/// What becomes of a received frame before its block is written. The frame is a fresh copy.
void Take(Bench& bench, const std::uint8_t* frame, std::size_t length) noexcept {
  std::memcpy(bench.out, frame, sizeof bench.sealed);
  mcftp::Header header;
  mcftp::DataFrame data;
  if (!mcftp::DecodeHeader(bench.out, length, header) ||
      !mcftp::OpenFrame(bench.cipher, bench.out, length) ||
      !mcftp::DecodeData(bench.out, length, data) || data.length != kBlock) {
    heap_used = ~std::size_t{0};
    return;
  }
  static_cast<void>(bench.blocks.Mark(bench.next_block++));
  bench.bytes[0] = static_cast<std::uint8_t>(bench.blocks.FirstMissing());
}

void ClearFrame(Bench& bench) noexcept {
  Take(bench, bench.clear, kFrame);
}

void SealedFrame(Bench& bench) noexcept {
  Take(bench, bench.sealed, bench.sealed_length);
}

struct Part {
  const char* name;
  void (*run)(Bench&) noexcept;
};

constexpr Part kParts[] = {
    {"crc", Crc},   {"encipher", Encipher}, {"decipher", Decipher},      {"xml", ParseDocument},
    {"copy", Copy}, {"clear", ClearFrame},  {"enciphered", SealedFrame},
};

}  // namespace

HLOCAL LocalAlloc(UINT flags, std::size_t size) {
  const std::size_t rounded = (size + 7) / 8 * 8;
  if (rounded > sizeof heap - heap_used) return nullptr;
  char* const block = heap + heap_used;
  heap_used += rounded;
  if ((flags & LMEM_ZEROINIT) != 0) std::memset(block, 0, size);
  return block;
}

HLOCAL LocalFree(HLOCAL /*block*/) {
  return nullptr;
}

/// @return 0 when the part has been run and has done what it should
extern "C" int Run(const char* const* arguments) noexcept {
  Bench& bench = *new (bench_memory) Bench;
  for (const Part& part : kParts) {
    if (std::strcmp(part.name, arguments[1]) != 0) continue;
    for (int times = *arguments[2] - '0'; times > 0; --times) part.run(bench);
    return heap_used == ~std::size_t{0} ? 1 : 0;
  }
  return 2;
}

// The kernel leaves the arguments on the stack; exit is its call 1.
asm(".global _start\n"
    "_start:\n"
    "  add r0, sp, #4\n"
    "  bl Run\n"
    "  mov r7, #1\n"
    "  svc 0\n");
