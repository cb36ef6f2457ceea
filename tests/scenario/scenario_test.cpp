#include "scenario/scenario_test.h"

#include <algorithm>

#include "window/screen.h"

namespace test {
namespace {

std::vector<std::string> TextsOf(const sim::FinishedPaint& paint) {
  std::vector<std::string> texts;
  for (const sim::Drawn& drawn : paint.calls) {
    if (const auto* text = std::get_if<sim::DrawnText>(&drawn)) {
      texts.emplace_back(text->text.begin(), text->text.end());
    }
  }
  return texts;
}

/// Adds what a paint shows beyond what was shown before. The window scrolls: the paint begins with
/// lines that are known already.
void Merge(std::vector<std::string>& known, const std::vector<std::string>& now) {
  for (std::size_t overlap = std::min(known.size(), now.size());; --overlap) {
    const auto tail = known.end() - static_cast<std::ptrdiff_t>(overlap);
    const auto rest = now.begin() + static_cast<std::ptrdiff_t>(overlap);
    if (std::equal(tail, known.end(), now.begin(), rest)) {
      known.insert(known.end(), rest, now.end());
      return;
    }
  }
}

}  // namespace

ScenarioTest::ScenarioTest(const sim::Profile& profile)
    : DeviceTest(profile), server_(world()), network_(world()) {
  device().screen().OnPaint(
      [this](const sim::FinishedPaint& paint) { Merge(shown_, TextsOf(paint)); });
}

ScenarioTest::~ScenarioTest() {
  device().screen().OnPaint({});
  DropKeptJob();
}

std::vector<std::string> ScenarioTest::ShownLines() const {
  return shown_;
}

}  // namespace test
