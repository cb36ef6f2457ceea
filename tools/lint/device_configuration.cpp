#include "tools/lint/device_configuration.h"

#include <algorithm>
#include <cstdio>
#include <pugixml.hpp>

#include "base/number.h"
#include "base/text.h"
#include "tools/failure.h"
#include "tools/lint/checks.h"
#include "upgrade/list_file/package_options.h"
#include "upgrade_config/selection/package_selection.h"

namespace tools {
namespace {

constexpr int kMaxDepth = 64;
constexpr int kPartsListed = 1000;
constexpr std::size_t kPackageText = 255;
constexpr unsigned kParsing = pugi::parse_default | pugi::parse_ws_pcdata_single;

/// Elements that are their text, with the characters that the device keeps; 0: a number or a word.
struct TextElement {
  std::string_view name;
  std::size_t limit;
  Setting DeviceJob::*setting;  ///< null: no check asks for it
};

constexpr TextElement kTextElements[] = {
    {"HTTPPort", 0, &DeviceJob::http_port}, {"BaseUrl", 255, &DeviceJob::base_url},
    {"FlashFileDir", 127, nullptr},         {"FilePacketXferSize", 0, nullptr},
    {"InfFile", 259, &DeviceJob::inf},      {"BeginText", 63, &DeviceJob::begin_text},
    {"EndText", 63, &DeviceJob::end_text},  {"DownloadLoopCnt", 0, nullptr},
};

struct TestElement {
  std::string_view name;
  std::size_t limit;
  Setting TestSettings::*setting;
};

constexpr TestElement kTestElements[] = {
    {"Root", 259, &TestSettings::root},
    {"Key", 259, &TestSettings::key},
    {"ValueName", 259, &TestSettings::value_name},
    {"Type", 23, &TestSettings::type},
    {"Operator", 11, &TestSettings::operation},
    {"Value", 259, &TestSettings::value},
    {"ErrorMsg", 255, &TestSettings::message},
};

/// Only the text directly behind the start tag counts.
std::string_view TextOf(const pugi::xml_node& element) {
  const pugi::xml_node first = element.first_child();
  return first.type() == pugi::node_pcdata ? first.value() : "";
}

class Reader {
 public:
  Reader(std::string_view text, const std::string& name, Findings& findings)
      : text_(text), name_(name), findings_(findings) {}

  DeviceJob Read() {
    pugi::xml_document document;
    const auto parsed =
        document.load_buffer(text_.data(), text_.size(), kParsing, pugi::encoding_utf8);
    if (!parsed) {
      throw Failure(ExitCode::kBadInput, name_ + ":" + std::to_string(Line(parsed.offset)),
                    std::string("not well-formed XML: ") + parsed.description());
    }
    job_.is_configuration = true;
    job_.upgrade_line = 1;
    Walk(document.document_element(), 1);
    return std::move(job_);
  }

 private:
  void Walk(const pugi::xml_node& parent, int depth) {
    if (depth > kMaxDepth) return;  // where the device refuses the document
    for (const pugi::xml_node& node : parent.children()) {
      if (node.type() == pugi::node_element && !TakeList(node)) {
        TakeElement(node);
        Walk(node, depth + 1);
      }
    }
  }

  /// @return whether the element is a list, of which nothing but its own children counts.
  bool TakeList(const pugi::xml_node& node) {
    const std::string_view name = node.name();
    if (name == "Registry") return TakeTest(node), true;
    const auto take = name == "StopProcesses" ? &Reader::TakeStop
                      : name == "Downloads"   ? &Reader::TakeDownload
                      : name == "DiskCleanup" ? &Reader::TakeCleanup
                      : name == "OSFirmware"  ? &Reader::TakePackage
                                              : nullptr;
    if (take == nullptr) return false;
    ForAllBelow(node, [this, take](const pugi::xml_node& inner) { (this->*take)(inner); });
    return true;
  }

  template <typename Visit>
  static void ForAllBelow(const pugi::xml_node& node, Visit visit) {
    for (const pugi::xml_node& inner : node.children()) {
      if (inner.type() != pugi::node_element) continue;
      visit(inner);
      ForAllBelow(inner, visit);
    }
  }

  void TakeElement(const pugi::xml_node& node) {
    const std::string_view name = node.name();
    const auto* const element =
        std::find_if(std::begin(kTextElements), std::end(kTextElements),
                     [name](const TextElement& known) { return known.name == name; });
    if (element != std::end(kTextElements)) {
      const Setting setting = Take(node, TextOf(node), element->limit, name);
      // The first address stays.
      const bool kept = name == "BaseUrl" && !job_.base_url.text.empty();
      if (element->setting != nullptr && !kept) job_.*element->setting = setting;
    } else if (base::EqualIgnoringCase(name, "ShowGUI")) {
      job_.show_window = Take(node, TextOf(node), 0, name);
    } else if (name == "Syslog") {
      TakeAttribute(node, "Address", 31, job_.syslog_address);
      TakeAttribute(node, "Port", 0, job_.syslog_port);
    } else if (name == "FlashWriter") {
      TakeAttribute(node, "Name", 259, job_.program);
      TakeAttribute(node, "CmdLine", 259, job_.parameters);
      TakeAttribute(node, "Wait", 0, job_.wait);
    } else if (name != "UpgradeConfig") {
      Add(Rule::kUnknownElement, node, "there is no element " + Quoted(name));
    }
  }

  void TakeStop(const pugi::xml_node& node) {
    if (std::string_view(node.name()) != "Process") return Unknown(node);
    job_.stops.push_back({std::string(TextOf(node)), Line(node.offset_debug())});
  }

  void TakeDownload(const pugi::xml_node& node) {
    if (std::string_view(node.name()) != "File") return Unknown(node);
    DownloadSettings file;
    file.line = Line(node.offset_debug());
    TakeAttribute(node, "SourceDir", 259, file.source);
    TakeAttribute(node, "DestDir", 259, file.destination);
    if (!file.source.given() || !file.destination.given()) {
      Add(Rule::kDownloadIncomplete, node,
          std::string("a \"File\" without ") + (file.source.given() ? "DestDir" : "SourceDir"));
      return;
    }
    job_.downloads.push_back(std::move(file));
  }

  void TakeCleanup(const pugi::xml_node& node) {
    if (std::string_view(node.name()) != "File") return Unknown(node);
    const std::string_view action = node.attribute("Action").value();
    const std::string_view path = TextOf(node);
    const bool remove = base::EqualIgnoringCase(action, "delete");
    if (path.empty() || !(remove || base::EqualIgnoringCase(action, "save"))) {
      Add(Rule::kCleanupIdle, node,
          path.empty() ? "a \"File\" without a path" : Quoted(path) + " without delete or save");
      return;
    }
    (remove ? job_.deletes : job_.saves).push_back({std::string(path), Line(node.offset_debug())});
  }

  void TakeTest(const pugi::xml_node& node) {
    TestSettings test;
    test.line = Line(node.offset_debug());
    ForAllBelow(node, [this, &test](const pugi::xml_node& inner) {
      const std::string_view name = inner.name();
      const auto* const element =
          std::find_if(std::begin(kTestElements), std::end(kTestElements),
                       [name](const TestElement& known) { return known.name == name; });
      if (element == std::end(kTestElements)) return Unknown(inner);
      test.*element->setting = Take(inner, TextOf(inner), element->limit, name);
    });
    job_.tests.push_back(std::move(test));
  }

  void TakePackage(const pugi::xml_node& node) {
    if (std::string_view(node.name()) != "Package") return Unknown(node);
    PackageSettings package;
    package.line = Line(node.offset_debug());
    TakeAttribute(node, "HardwareVersion", 0, package.hardware);
    TakeAttribute(node, "FLASH", 0, package.flash);
    TakeAttribute(node, "SourceDir", kPackageText - 1, package.source);
    TakeAttribute(node, "Base", kPackageText, package.base);
    TakeAttribute(node, "DestDir", kPackageText - 1, package.destination);
    TakeAttribute(node, "Count", 0, package.count);
    TakeAttribute(node, "CmdLine", kPackageText, package.command_line);
    TakeAttribute(node, "AdditionalParms", kPackageText, package.options);
    if (package.source.given()) EndFolder(package.source);
    const bool is_ram = base::EqualIgnoringCase(package.destination.text, "RAM:");
    if (package.destination.given() && !is_ram) EndFolder(package.destination);
    job_.packages.push_back(std::move(package));
  }

  static void EndFolder(Setting& folder) {
    if (!base::EndsWith(folder.text, "\\")) folder.text += '\\';
  }

  void TakeAttribute(const pugi::xml_node& node, const char* name, std::size_t limit,
                     Setting& setting) {
    const pugi::xml_attribute attribute = node.attribute(name);
    if (attribute) setting = Take(node, attribute.value(), limit, name);
  }

  Setting Take(const pugi::xml_node& node, std::string_view text, std::size_t limit,
               std::string_view name) {
    const Setting whole{std::string(text), Line(node.offset_debug())};
    CheckTextOf(whole, name, limit, name_, findings_);
    return {limit > 0 ? whole.text.substr(0, limit) : whole.text, whole.line};
  }

  void Unknown(const pugi::xml_node& node) {
    Add(Rule::kUnknownElement, node,
        Quoted(node.name()) + " has no meaning in " + Quoted(node.parent().name()));
  }
  void Add(Rule rule, const pugi::xml_node& node, std::string found) {
    findings_.Add(rule, name_ + ":" + std::to_string(Line(node.offset_debug())), std::move(found));
  }

  [[nodiscard]] int Line(std::ptrdiff_t offset) {
    const auto end =
        std::clamp<std::ptrdiff_t>(offset, 0, static_cast<std::ptrdiff_t>(text_.size()));
    // Asked for one node after the other: only what lies between two of them is counted.
    if (end < counted_to_) counted_to_ = counted_ = 0;
    counted_ += std::count(text_.begin() + counted_to_, text_.begin() + end, '\n');
    counted_to_ = end;
    return 1 + static_cast<int>(counted_);
  }

  const std::string_view text_;
  const std::string& name_;
  Findings& findings_;
  DeviceJob job_;
  std::ptrdiff_t counted_ = 0;     ///< line ends in front of counted_to_
  std::ptrdiff_t counted_to_ = 0;  ///< an offset
};

}  // namespace

DeviceJob ReadConfiguration(std::string_view text, const std::string& name, Findings& findings) {
  return Reader(text, name, findings).Read();
}

bool IsConfiguration(std::string_view text) {
  pugi::xml_document document;
  document.load_buffer(text.data(), text.size(), kParsing, pugi::encoding_utf8);
  const pugi::xml_node root = document.document_element();
  return root && std::string_view(root.name()) != "DevInfo";
}

std::vector<const PackageSettings*> PackagesFor(const DeviceJob& job,
                                                const std::string& configuration) {
  std::vector<const PackageSettings*> packages;
  for (const PackageSettings& package : job.packages) {
    // A device calls its flash "0".
    const bool fits = !package.flash.given() || package.flash.text == "0";
    if (fits && package.source.given() &&
        orvenix::SelectsDevice(package.hardware.text, configuration)) {
      packages.push_back(&package);
    }
  }
  return packages;
}

bool IsMultiPass(const std::vector<const PackageSettings*>& packages) {
  return std::any_of(packages.begin(), packages.end(), [](const PackageSettings* package) {
    return package->options.text.find("Pass=") != std::string::npos;
  });
}

int LastPass(const std::vector<const PackageSettings*>& packages) {
  int last = 1;
  if (!IsMultiPass(packages)) return last;
  for (const PackageSettings* package : packages) {
    last = std::max(last, static_cast<int>(upgrade::PackagePass(package->options.text)));
  }
  return last;
}

std::vector<PackageFile> FilesOf(const PackageSettings& package) {
  const std::int32_t count = base::LeadingInt(package.count.text);
  const auto file = [&package](const std::string& ending) {
    return PackageFile{package.source.text + package.base.text + ending,
                       package.destination.text + package.base.text + ending};
  };
  if (count == 0 && package.base.text.empty()) return {};
  if (count == 0) return {file("")};
  std::vector<PackageFile> files;
  for (int part = 1; part <= std::min<std::int32_t>(count, kPartsListed); ++part) {
    char ending[24];
    std::snprintf(ending, sizeof ending, "%03d.zip", part);
    files.push_back(file(ending));
  }
  return files;
}

}  // namespace tools
