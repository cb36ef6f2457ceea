// What the system says, and what it means: its numbers and the texts of its log and screen. This is
// the one place that `orvenix explain` knows them from; a test holds it against the sources.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace tools {

/// What a number is a number of.
enum class CodeKind : std::uint8_t {
  kNone,
  kResult,   ///< of the configlet's functions
  kEvent,    ///< device event
  kState,    ///< of the ready-to-work status
  kError,    ///< of the device's operating system or its sockets
  kRequest,  ///< "bad ret N" in the log
  kXml,      ///< of an XML document
  kPackage,  ///< of preparing a cabinet
  kExit,     ///< of the program orvenix
};
[[nodiscard]] const char* NameOf(CodeKind kind);

struct CodeRow {
  CodeKind kind;
  std::uint32_t value;
  const char* name;
  const char* meaning;
  const char* remedy;  ///< empty: there is nothing to mend
};

/// Every number, by kind.
struct CodeRows {
  const CodeRow* first;
  std::size_t count;
  [[nodiscard]] const CodeRow* begin() const { return first; }
  [[nodiscard]] const CodeRow* end() const { return first + count; }
};
[[nodiscard]] CodeRows Codes();
/// Null for one that is not known.
[[nodiscard]] const CodeRow* FindCode(CodeKind kind, std::uint32_t value);

/// What the device is at when it writes a text.
enum class Phase : std::uint8_t {
  kAny,       ///< belongs to the phase it stands in
  kSettings,  ///< the host walks its settings
  kChecks,    ///< power, tests, cleanup and space, before anything starts
  kStart,
  kMulticast,
  kFiles,
  kReport,  ///< to the server
  kFlash,
  kInstall,
  kEnd,
};
[[nodiscard]] const char* NameOf(Phase phase);

enum class Weight : std::uint8_t {
  kStep,     ///< as it should be
  kGood,     ///< something that may have failed before has come about
  kTrouble,  ///< a failure that the device goes on from
  kFatal,    ///< the job ends of it
};

struct TextRow {
  const char* format;  ///< as the sources have it
  bool on_screen;      ///< a status line; else a text of the log
  Phase phase;
  Weight weight;
  CodeKind number;  ///< what its last number is a number of
  const char* meaning;
  const char* remedy;
};

struct TextRows {
  const TextRow* first;
  std::size_t count;
  [[nodiscard]] const TextRow* begin() const { return first; }
  [[nodiscard]] const TextRow* end() const { return first + count; }
};
/// Every text. Formats that are nothing but a text from elsewhere come last.
[[nodiscard]] TextRows Texts();
/// Every text of the multicast client, which has a log of its own.
[[nodiscard]] TextRows ClientTexts();

}  // namespace tools
