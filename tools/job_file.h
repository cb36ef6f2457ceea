// Job files: the settings tree that a management host walks through the configlet.
#pragma once

#include <filesystem>
#include <string>
#include <string_view>
#include <variant>
#include <vector>

namespace tools {

struct JobField {
  std::string name;
  std::string value;
  int line = 0;  ///< in the file, from 1
};

struct JobGroup {
  using Child = std::variant<JobField, JobGroup>;

  std::string name;
  std::vector<Child> children;  ///< in document order, which is the order of the walk
  int line = 0;

  JobGroup& AddGroup(std::string group);
  void AddField(std::string field, std::string field_value);
};

/// A job is an XML document
///
///   <DevInfo>
///     <Subsystem Name="Orvenix">
///       <Group Name="Orvenix">
///         <Group Name="Upgrade">
///           <Group Name="HTTPServer">
///             <Field Name="HTTPPort">8080</Field>
///
/// A field's value is the element's text, every blank of it included. Other subsystems in the
/// document belong to other libraries and are passed over.
struct Job {
  std::vector<JobGroup> groups;  ///< of the subsystem "Orvenix"
};

/// Throws Failure kBadInput with file, line and what is wrong there.
[[nodiscard]] Job ReadJob(const std::filesystem::path& file);
/// The same from text; `name` stands for the file in messages.
[[nodiscard]] Job ParseJob(std::string_view text, const std::string& name);

/// The document, the same for the same job to the last byte.
[[nodiscard]] std::string FormatJob(const Job& job);

/// The first field of this name below `group`, letter case ignored; empty when there is none.
[[nodiscard]] std::string FindField(const Job& job, std::string_view group, std::string_view field);

}  // namespace tools
