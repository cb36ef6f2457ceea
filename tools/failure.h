// Why a verb of the program cannot do its work: one line for people, a code for scripts.
#pragma once

#include <stdexcept>
#include <string>
#include <utility>

#include "tools/exit_codes.h"

namespace tools {

/// Shown as "orvenix: <where>: <what>; <advice>".
class Failure : public std::runtime_error {
 public:
  /// @param where   the file, folder, option or address that is concerned
  /// @param what    what is wrong with it
  /// @param advice  what to do about it; may be empty
  Failure(ExitCode code, std::string where, std::string what, std::string advice = {})
      : std::runtime_error(where + ": " + what + (advice.empty() ? "" : "; " + advice)),
        code_(code),
        where_(std::move(where)),
        what_(std::move(what)),
        advice_(std::move(advice)) {}

  [[nodiscard]] ExitCode code() const { return code_; }
  [[nodiscard]] const std::string& where() const { return where_; }
  [[nodiscard]] const std::string& reason() const { return what_; }
  [[nodiscard]] const std::string& advice() const { return advice_; }

 private:
  ExitCode code_;
  std::string where_;
  std::string what_;
  std::string advice_;
};

}  // namespace tools
