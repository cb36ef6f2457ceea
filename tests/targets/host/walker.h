// Does what the lines of a walk say and tells what came of each.
#pragma once

#include <coredll.h>

#include <atomic>
#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "targets/host/configlet.h"
#include "targets/host/host.h"
#include "targets/host/walk_line.h"

namespace host {

/// Lives as long as its process: the library keeps its address with the callbacks.
class Walker {
 public:
  explicit Walker(const Configlet& configlet);
  Walker(const Walker&) = delete;
  Walker& operator=(const Walker&) = delete;

  /// Goes on with the next line whatever comes of one, unless it cannot be understood.
  Outcome Walk(std::string_view walk);

 private:
  using Results = std::vector<std::string>;
  using Arguments = std::vector<Word>;
  struct Verb {
    const char* name;
    std::size_t least;  ///< arguments
    std::size_t most;
    Results (Walker::*action)(const Arguments& arguments);
  };
  static const Verb kVerbs[];

  bool Step(std::string_view text, std::size_t number);

  // The functions of the library
  Results Initialize(const Arguments& arguments);
  Results Uninitialize(const Arguments& arguments);
  Results InterfaceVersion(const Arguments& arguments);
  Results SchemaVersion(const Arguments& arguments);
  Results FirstInstance(const Arguments& arguments);
  Results NextInstance(const Arguments& arguments);
  Results SetCallbacks(const Arguments& arguments);
  Results BeginGroup(const Arguments& arguments);
  Results SetField(const Arguments& arguments);
  Results GetField(const Arguments& arguments);
  Results EndGroup(const Arguments& arguments);

  // What else happens on the device
  Results AwaitEnd(const Arguments& arguments);
  Results IsRunning(const Arguments& arguments);
  Results IsProcess(const Arguments& arguments);
  Results TakeLog(const Arguments& arguments);
  Results HasLogged(const Arguments& arguments);
  Results MakeFolder(const Arguments& arguments);
  Results MakeFile(const Arguments& arguments);
  Results ShowAttributes(const Arguments& arguments);
  Results ShowWriteTime(const Arguments& arguments);
  Results ShowFile(const Arguments& arguments);
  Results SetText(const Arguments& arguments);
  Results SetNumber(const Arguments& arguments);
  Results ShowValue(const Arguments& arguments);
  Results TakeDocuments(const Arguments& arguments);

  static int TakeDocument(std::uintptr_t context, const char* text, std::int32_t length,
                          const IcfgCallbacks* table);

  const Configlet configlet_;
  IcfgCallbacks table_{};
  IcfgCallbacks deaf_table_{};
  std::atomic<bool> reads_inside_{false};  ///< the host calls the library inside its callback
  std::size_t log_taken_ = 0;
  std::size_t documents_taken_ = 0;
  bool all_as_expected_ = true;
};

}  // namespace host
