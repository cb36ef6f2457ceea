#include "tools/job_file.h"

#include <algorithm>
#include <optional>
#include <pugixml.hpp>
#include <sstream>
#include <utility>

#include "base/text.h"
#include "tools/failure.h"
#include "tools/file_text.h"

namespace tools {
namespace {

constexpr int kMaxDepth = 64;

/// Turns the nodes of one document into groups and fields.
class JobReader {
 public:
  JobReader(std::string_view text, std::string name) : text_(text), name_(std::move(name)) {}

  [[nodiscard]] Job Read() const;

 private:
  [[nodiscard]] int Line(std::ptrdiff_t offset) const {
    const auto end =
        std::clamp<std::ptrdiff_t>(offset, 0, static_cast<std::ptrdiff_t>(text_.size()));
    // Asked for one node after the other: only what lies between two of them is counted.
    if (end < counted_to_) counted_to_ = counted_ = 0;
    counted_ += std::count(text_.begin() + counted_to_, text_.begin() + end, '\n');
    counted_to_ = end;
    return 1 + static_cast<int>(counted_);
  }
  [[noreturn]] void Fail(std::ptrdiff_t offset, const std::string& what,
                         const std::string& advice = {}) const {
    throw Failure(ExitCode::kBadInput, name_ + ":" + std::to_string(Line(offset)), what, advice);
  }
  [[nodiscard]] std::string NameOf(const pugi::xml_node& node) const;
  [[nodiscard]] JobGroup Group(const pugi::xml_node& node, int depth) const;
  [[nodiscard]] JobField Field(const pugi::xml_node& node) const;

  std::string_view text_;
  std::string name_;
  mutable std::ptrdiff_t counted_ = 0;     ///< line ends in front of counted_to_
  mutable std::ptrdiff_t counted_to_ = 0;  ///< an offset
};

std::string JobReader::NameOf(const pugi::xml_node& node) const {
  std::string name = node.attribute("Name").value();
  if (name.empty()) {
    Fail(node.offset_debug(), std::string("<") + node.name() + "> has no Name",
         "write <" + std::string(node.name()) + " Name=\"...\">");
  }
  return name;
}

JobField JobReader::Field(const pugi::xml_node& node) const {
  JobField field;
  field.name = NameOf(node);
  field.line = Line(node.offset_debug());
  for (const pugi::xml_node& part : node.children()) {
    if (part.type() == pugi::node_element) {
      Fail(part.offset_debug(),
           "the field \"" + field.name + "\" holds an element <" + part.name() + ">",
           "a field holds text only");
    }
    field.value += part.value();
  }
  return field;
}

JobGroup JobReader::Group(const pugi::xml_node& node, int depth) const {
  if (depth > kMaxDepth) Fail(node.offset_debug(), "groups are nested too deeply");
  JobGroup group;
  group.name = NameOf(node);
  group.line = Line(node.offset_debug());
  for (const pugi::xml_node& child : node.children()) {
    if (child.type() != pugi::node_element) continue;
    const std::string_view kind = child.name();
    if (kind == "Group") {
      group.children.emplace_back(Group(child, depth + 1));
    } else if (kind == "Field") {
      group.children.emplace_back(Field(child));
    } else {
      Fail(child.offset_debug(), "unknown element <" + std::string(kind) + ">",
           "a group holds <Group> and <Field> only");
    }
  }
  return group;
}

Job JobReader::Read() const {
  pugi::xml_document document;
  const auto parsed =
      document.load_buffer(text_.data(), text_.size(),
                           pugi::parse_default | pugi::parse_ws_pcdata_single, pugi::encoding_utf8);
  if (!parsed) Fail(parsed.offset, std::string("not well-formed XML: ") + parsed.description());
  const pugi::xml_node root = document.document_element();
  if (std::string_view(root.name()) != "DevInfo") {
    Fail(root.offset_debug(), "the document is not a <DevInfo>", "is this a job file?");
  }
  Job job;
  bool found = false;
  for (const pugi::xml_node& subsystem : root.children("Subsystem")) {
    if (!base::EqualIgnoringCase(subsystem.attribute("Name").value(), "Orvenix")) continue;
    found = true;
    for (const pugi::xml_node& child : subsystem.children("Group")) {
      job.groups.push_back(Group(child, 1));
    }
  }
  if (!found) Fail(root.offset_debug(), "there is no <Subsystem Name=\"Orvenix\">");
  if (job.groups.empty()) Fail(root.offset_debug(), "the subsystem has no <Group>");
  return job;
}

void Write(pugi::xml_node parent, const JobGroup& group) {
  pugi::xml_node node = parent.append_child("Group");
  node.append_attribute("Name").set_value(group.name.c_str());
  for (const JobGroup::Child& child : group.children) {
    if (const auto* inner = std::get_if<JobGroup>(&child)) {
      Write(node, *inner);
      continue;
    }
    const auto& field = std::get<JobField>(child);
    pugi::xml_node written = node.append_child("Field");
    written.append_attribute("Name").set_value(field.name.c_str());
    written.text().set(field.value.c_str());
  }
}

const JobGroup* FindGroup(const std::vector<JobGroup>& groups, std::string_view name);

const JobGroup* FindBelow(const JobGroup& group, std::string_view name) {
  if (base::EqualIgnoringCase(group.name, name)) return &group;
  for (const JobGroup::Child& child : group.children) {
    const auto* inner = std::get_if<JobGroup>(&child);
    const JobGroup* found = inner == nullptr ? nullptr : FindBelow(*inner, name);
    if (found != nullptr) return found;
  }
  return nullptr;
}

const JobGroup* FindGroup(const std::vector<JobGroup>& groups, std::string_view name) {
  for (const JobGroup& group : groups) {
    if (const JobGroup* found = FindBelow(group, name)) return found;
  }
  return nullptr;
}

}  // namespace

JobGroup& JobGroup::AddGroup(std::string group) {
  children.emplace_back(JobGroup{});
  auto& added = std::get<JobGroup>(children.back());
  added.name = std::move(group);
  return added;
}

void JobGroup::AddField(std::string field, std::string field_value) {
  children.emplace_back(JobField{std::move(field), std::move(field_value), 0});
}

Job ReadJob(const std::filesystem::path& file) {
  return ParseJob(ReadWholeFile(file), file.string());
}

Job ParseJob(std::string_view text, const std::string& name) {
  return JobReader(text, name).Read();
}

std::string FormatJob(const Job& job) {
  pugi::xml_document document;
  pugi::xml_node declaration = document.append_child(pugi::node_declaration);
  declaration.append_attribute("version").set_value("1.0");
  declaration.append_attribute("encoding").set_value("utf-8");
  pugi::xml_node subsystem = document.append_child("DevInfo").append_child("Subsystem");
  subsystem.append_attribute("Name").set_value("Orvenix");
  for (const JobGroup& group : job.groups) Write(subsystem, group);
  std::ostringstream out;
  document.save(out, "  ", pugi::format_indent, pugi::encoding_utf8);
  return out.str();
}

std::string FindField(const Job& job, std::string_view group, std::string_view field) {
  const JobGroup* found = FindGroup(job.groups, group);
  if (found == nullptr) return {};
  for (const JobGroup::Child& child : found->children) {
    const auto* here = std::get_if<JobField>(&child);
    if (here != nullptr && base::EqualIgnoringCase(here->name, field)) return here->value;
  }
  return {};
}

}  // namespace tools
