#include "tools/run_view.h"

#include <algorithm>
#include <cstdio>
#include <iostream>

#include "tools/failure.h"

namespace tools {
namespace {

constexpr int kBarWidth = 20;
constexpr const char* kClearLine = "\r\x1b[K";

bool SameBar(const std::optional<sim::BarView>& a, const std::optional<sim::BarView>& b) {
  if (a.has_value() != b.has_value()) return false;
  return !a || (a->filled == b->filled && a->total == b->total);
}

/// Texts of the device may hold anything, and a terminal obeys control characters: those below the
/// blank, 0x7F, and those that UTF-8 writes as C2 80 to C2 9F.
std::string WithoutControls(std::string text) {
  for (std::size_t i = 0; i < text.size(); ++i) {
    const auto byte = static_cast<unsigned char>(text[i]);
    const bool is_second = byte >= 0x80 && byte < 0xA0 && i > 0 && text[i - 1] == '\xC2';
    if (is_second) text[i - 1] = ' ';
    if (is_second || byte < ' ' || byte == 0x7F) text[i] = ' ';
  }
  return text.substr(0, text.find_last_not_of(' ') + 1);
}

}  // namespace

std::vector<std::string> NewLines(const std::vector<std::string>& before,
                                  const std::vector<std::string>& now) {
  // The longest end of the old list that the new one begins with.
  std::size_t kept = std::min(before.size(), now.size());
  while (kept > 0 &&
         !std::equal(before.end() - static_cast<std::ptrdiff_t>(kept), before.end(), now.begin())) {
    --kept;
  }
  return {now.begin() + static_cast<std::ptrdiff_t>(kept), now.end()};
}

int Percent(const sim::BarView& bar) {
  return bar.total <= 0 ? 0 : std::clamp(100 * bar.filled / bar.total, 0, 100);
}

std::string FormatBar(const sim::BarView& bar, int width) {
  const int percent = Percent(bar);
  const int filled = width * percent / 100;
  std::string text = "[" + std::string(static_cast<std::size_t>(filled), '#') +
                     std::string(static_cast<std::size_t>(width - filled), '.') + "]";
  const std::string number = std::to_string(percent);
  return text + std::string(4 - number.size(), ' ') + number + "%";
}

RunView::RunView(Style style, const std::filesystem::path& record, bool append) : style_(style) {
  if (record.empty()) return;
  record_.open(record, std::ios::binary | (append ? std::ios::app : std::ios::trunc));
  if (!record_) {
    throw Failure(ExitCode::kCannotWrite, record.string(), "cannot be written",
                  "is the folder there and writable?");
  }
}

RunView::~RunView() {
  if (bars_shown_) std::cout << std::endl;
}

void RunView::Tell(const nlohmann::ordered_json& event) {
  if (style_ != Style::kJson && !record_.is_open()) return;
  const std::string line = event.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace);
  if (record_.is_open()) record_ << line << std::endl;
  if (style_ == Style::kJson) std::cout << line << std::endl;
}

void RunView::Line(const std::string& text) {
  if (bars_shown_) std::cout << kClearLine;
  bars_shown_ = false;
  std::cout << WithoutControls(text) << std::endl;
}

void RunView::Bars(const sim::ProgressView& view) {
  if (!view.overall || style_ == Style::kJson) return;
  std::string bars = "overall " + FormatBar(*view.overall, kBarWidth);
  if (!blocks_.empty()) {
    bars += "   " + blocks_;
  } else if (view.file) {
    bars += "   file " + FormatBar(*view.file, kBarWidth);
  }
  if (style_ == Style::kTerminal) {
    std::cout << kClearLine << bars << std::flush;
    bars_shown_ = true;
  } else if (!last_ || !SameBar(last_->overall, view.overall)) {
    Line(bars);
  }
}

void RunView::ShowProgress(const sim::ProgressView& view) {
  const std::lock_guard<std::mutex> hold(mutex_);
  if (is_over_) return;
  const std::vector<std::string> none;
  const auto lines = NewLines(last_ ? last_->status_lines : none, view.status_lines);
  for (const std::string& line : lines) {
    Tell({{"event", "status"}, {"text", line}});
    if (style_ != Style::kJson) Line("  " + line);
  }
  const bool moved =
      !last_ || !SameBar(last_->overall, view.overall) || !SameBar(last_->file, view.file);
  if (moved && view.overall) {
    nlohmann::ordered_json event{{"event", "progress"}, {"overall", Percent(*view.overall)}};
    if (view.file) event["file"] = Percent(*view.file);
    Tell(event);
  }
  if (moved || (style_ == Style::kTerminal && !lines.empty())) Bars(view);
  last_ = view;
}

void RunView::ShowMessage(const Message& message) {
  const std::lock_guard<std::mutex> hold(mutex_);
  if (is_over_) return;
  if (style_ != Style::kJson) Line(DescribeMessage(message));
  nlohmann::ordered_json event{{"event", "document"}};
  event.update(MessageMembers(message));
  event["text"] = message.document;
  Tell(event);
}

void RunView::ShowMulticast(const ReceptionEvent& event) {
  const std::lock_guard<std::mutex> hold(mutex_);
  if (is_over_) return;
  Tell(ToJson(event));
  if (style_ != Style::kJson) Line(ToLine(event));
}

void RunView::ShowBlocks(const Reception& state) {
  const std::lock_guard<std::mutex> hold(mutex_);
  if (is_over_) return;
  const std::string blocks = state.under_way ? FormatBlocks(state) : "";
  if (blocks == blocks_) return;
  blocks_ = blocks;
  if (state.under_way) {
    Tell({{"event", "blocks"},
          {"file", state.file},
          {"role", NameOf(state.role)},
          {"held", state.held},
          {"blocks", state.blocks},
          {"map", state.map}});
  }
  if (last_ && style_ == Style::kTerminal) Bars(*last_);
}

void RunView::EndUpgrade() {
  const std::lock_guard<std::mutex> hold(mutex_);
  is_over_ = true;
}

void RunView::ShowRemark(const std::string& text) {
  const std::lock_guard<std::mutex> hold(mutex_);
  if (style_ != Style::kJson) Line(text);
}

void RunView::ShowEvent(const nlohmann::ordered_json& event) {
  const std::lock_guard<std::mutex> hold(mutex_);
  Tell(event);
}

std::optional<sim::ProgressView> RunView::last() const {
  const std::lock_guard<std::mutex> hold(mutex_);
  return last_;
}

}  // namespace tools
