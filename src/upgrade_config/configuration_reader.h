// Puts what an upgrade configuration file says into a job.
#pragma once

#include <string_view>

#include "orvenix/upgrade_config.h"
#include "xml/document.h"

namespace orvenix {

/// One walk over a parsed configuration file. Elements are known by their names, wherever they
/// stand; what is unknown or lacks a part that it needs is passed over. So is what there is no
/// memory for, and its list says that it is incomplete.
class ConfigurationReader {
 public:
  explicit ConfigurationReader(UpgradeConfig& job) noexcept : job_(job) {}

  /// Acts on every element below the document's root, in the order of the text. A document without
  /// a root, or with nothing below it, says nothing.
  void Read(xml::XmlDocument& document) noexcept;

 private:
  /// Elements that are their text.
  struct TextElement {
    std::string_view name;
    void (*take)(UpgradeConfig& job, const char* text) noexcept;
    bool in_any_letter_case = false;
  };
  /// Elements that have attributes or children.
  struct OtherElement {
    std::string_view name;
    void (ConfigurationReader::*take)() noexcept;
  };
  static const TextElement kTextElements[];
  static const OtherElement kOtherElements[];

  [[nodiscard]] std::string_view Name() const noexcept { return cursor_.Name(); }
  /// The next stop of the walk. Once that is over, it stays so.
  xml::XmlStep Next() noexcept;
  /// Acts on the element that starts here.
  void TakeElement() noexcept;
  /// Goes through a list element, which has just started, up to its end and calls `take` at the
  /// start of each element inside it. An element inside that has the list's own name ends it too.
  template <typename Take>
  void ReadList(std::string_view list, Take take) noexcept;

  void TakeVersion() noexcept;
  void TakeSyslog() noexcept;
  void TakeFlashWriter() noexcept;
  void ReadStopProcesses() noexcept;
  void ReadDownloads() noexcept;
  void TakeDownload() noexcept;
  void ReadDiskCleanup() noexcept;
  void TakeCleanup() noexcept;
  void ReadRegistry() noexcept;
  void ReadFirmware() noexcept;
  void TakePackage() noexcept;
  [[nodiscard]] bool IsPackageForDevice() const noexcept;

  UpgradeConfig& job_;
  xml::XmlCursor cursor_;
  xml::XmlStep step_ = xml::XmlStep::kOver;
};

}  // namespace orvenix
