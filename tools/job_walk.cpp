#include "tools/job_walk.h"

#include "tools/failure.h"

namespace tools {
namespace {

class Walk {
 public:
  Walk(const ConfigletLibrary& configlet, const std::string& job_name,
       const std::function<void(const WalkedCall&)>& seen)
      : configlet_(configlet), job_name_(job_name), seen_(seen) {}

  void Group(const JobGroup& group) {
    Check({"IcfgBeginGroup", group.name, "", configlet_.begin_group(group.name.c_str(), 0, 0)},
          group.line);
    for (const JobGroup::Child& child : group.children) {
      if (const auto* inner = std::get_if<JobGroup>(&child)) {
        Group(*inner);
      } else {
        Field(std::get<JobField>(child));
      }
    }
    Check({"IcfgEndGroup", group.name, "", configlet_.end_group(group.name.c_str(), 0, 0)},
          group.line);
  }

 private:
  void Field(const JobField& field) {
    Check({"IcfgSetField", field.name, field.value,
           configlet_.set_field(field.name.c_str(), 0, field.value.c_str())},
          field.line);
  }

  void Check(const WalkedCall& call, int line) const {
    if (seen_) seen_(call);
    const std::string where = job_name_ + ":" + std::to_string(line);
    switch (call.result) {
      case ICFG_OK: return;
      case ICFG_UNKNOWN_NAME:
        throw Failure(ExitCode::kUnknownName, where,
                      "the configlet knows no group or field \"" + call.name + "\"",
                      "correct its name");
      case ICFG_UPGRADE_RUNNING:
        throw Failure(ExitCode::kUpgradeRunning, where, "an upgrade is in progress",
                      "wait for its end");
      case ICFG_NO_SPACE:
        throw Failure(ExitCode::kNoSpace, where, "there is not enough storage on the device",
                      "make room, or lower the job's RequiredSpace");
      case ICFG_NO_POWER:
        throw Failure(ExitCode::kNoPower, where, "the device has neither line power nor battery",
                      "put it into its cradle: set the profile's power");
      case ICFG_TEST_FAILED:
        throw Failure(ExitCode::kTestFailed, where, "a registry test of the job failed",
                      "see the device's registry and the job's Tests");
      default:
        throw Failure(ExitCode::kInternal, where,
                      std::string(call.function) + " gave " + std::to_string(call.result));
    }
  }

  const ConfigletLibrary& configlet_;
  const std::string& job_name_;
  const std::function<void(const WalkedCall&)>& seen_;
};

}  // namespace

void WalkJob(const ConfigletLibrary& configlet, const Job& job, const std::string& job_name,
             const std::function<void(const WalkedCall&)>& seen) {
  Walk walk(configlet, job_name, seen);
  for (const JobGroup& group : job.groups) walk.Group(group);
}

}  // namespace tools
