#include "server/http_session.h"

#include <algorithm>
#include <cstdio>
#include <ctime>
#include <utility>

namespace server {
namespace {

constexpr std::string_view kNotFound = "HTTP/1.1 404 Not Found\r\nContent-Length: 0\r\n\r\n";

/// The head of an answer. Devices search it by plain text in the first block they receive, letter
/// case included, and read the numbers in unsigned decimal: the spelling is the interface.
std::string FileHead(const SiteFile& file, const SessionOptions& options) {
  const std::time_t modified = file.modified();
  std::tm when{};
  ::gmtime_r(&modified, &when);
  char text[320];
  std::snprintf(text, sizeof text,
                "HTTP/1.1 200 OK\r\n"
                "Content-Length: %lu\r\n"
                "Content-Attributes: %lu\r\n"
                "Content-timestamp: %04d-%02d-%02d %02d:%02d:%02d\r\n"
                "Content-CRC32: %lu\r\n",
                static_cast<unsigned long>(file.size()),
                static_cast<unsigned long>(file.attributes()), when.tm_year + 1900, when.tm_mon + 1,
                when.tm_mday, when.tm_hour, when.tm_min, when.tm_sec,
                static_cast<unsigned long>(file.crc32()));
  std::string head = text;
  if (options.checkpoint_block_size) {
    head += "CheckPoint-BlockSize: " + std::to_string(*options.checkpoint_block_size) + "\r\n";
  }
  return head + "\r\n";
}

/// Where the first head ends, and where the next one begins.
struct HeadEnd {
  std::size_t end;
  std::size_t next;
};

std::optional<HeadEnd> FindHeadEnd(std::string_view input) {
  for (std::size_t line = 0;;) {
    const std::size_t feed = input.find('\n', line);
    if (feed == std::string_view::npos) return std::nullopt;
    const std::string_view text = input.substr(line, feed - line);
    if (text.empty() || text == "\r") return HeadEnd{line, feed + 1};
    line = feed + 1;
  }
}

}  // namespace

HttpSession::HttpSession(Site& site, DeviceLedger& ledger, const SessionOptions& options,
                         std::string address, Time now)
    : site_(site), ledger_(ledger), options_(options), address_(std::move(address)) {
  WaitForRequest(now);
}

HttpSession::~HttpSession() = default;

void HttpSession::OnBytes(std::string_view bytes, Time now) {
  if (phase_ == Phase::kClosed) return;
  if (phase_ == Phase::kRefusing || phase_ == Phase::kFarewell) {
    dropped_ += bytes.size();
    if (dropped_ > options_.farewell_bytes) Close("", now);
    return;
  }
  const bool idle = phase_ == Phase::kReading && input_.empty();
  if (idle) deadline_ = now + options_.head_limit;
  input_.append(bytes);
  if (phase_ == Phase::kReading) Advance(now);
}

void HttpSession::OnPeerClosed(Time now) {
  if (phase_ == Phase::kClosed) return;
  Close("the device closed the connection", now);
  // A report wants no answer, so one that waits behind an unfinished transfer still counts.
  Request request;
  while (TakeRequest(request) == Start::kRequest) {
    if (request.kind == RequestKind::kReport) ledger_.OnReport(request, address_, now);
  }
}

void HttpSession::OnSent(std::size_t count, Time now) {
  if (phase_ == Phase::kClosed || count == 0) return;
  output_sent_ = std::min(output_sent_ + count, output_.size());
  deadline_ = now + options_.stall_limit;
  if (phase_ == Phase::kBody) {
    body_sent_ += count;
    ledger_.OnBytes(*device_, path_, count, now);
  }
  if (output_sent_ < output_.size()) return;
  switch (phase_) {
    case Phase::kAnswering: WaitForRequest(now); break;
    case Phase::kHead:
      output_.clear();
      output_sent_ = 0;
      phase_ = Phase::kPause;
      deadline_ = file_->size() == 0 ? now : now + options_.body_pause;
      if (deadline_ <= now) NextBlock(now);
      break;
    case Phase::kBody: NextBlock(now); break;
    case Phase::kRefusing:
      phase_ = Phase::kFarewell;
      deadline_ = now + options_.farewell_limit;
      break;
    default: break;
  }
  Advance(now);
}

void HttpSession::OnTime(Time now) {
  if (now < deadline_) return;
  switch (phase_) {
    case Phase::kPause: NextBlock(now); break;
    case Phase::kReading:
      if (input_.empty()) {
        Close("", now);
      } else {
        Refuse("408 Request Timeout", "the request did not come to its end", now);
      }
      break;
    default: Close("the device takes no more data", now); break;
  }
}

std::string_view HttpSession::output() const {
  if (phase_ == Phase::kClosed) return {};
  return std::string_view(output_).substr(output_sent_);
}

bool HttpSession::wants_input() const {
  return phase_ != Phase::kClosed && input_.size() < 2 * options_.max_head;
}

void HttpSession::Advance(Time now) {
  while (phase_ == Phase::kReading) {
    Request request;
    switch (TakeRequest(request)) {
      case Start::kPartOfHead: return;
      case Start::kHeadTooLong:
        Refuse("431 Request Header Fields Too Large", "the request is too long", now);
        return;
      case Start::kRequest:
        WaitForRequest(now);
        Handle(request, now);
        break;
    }
  }
}

/// Takes the first request off the input, when its head is complete.
HttpSession::Start HttpSession::TakeRequest(Request& request) {
  // Line ends before a request line mean nothing; an error text in a report may leave some.
  input_.erase(0, std::min(input_.find_first_not_of("\r\n"), input_.size()));
  const auto head = FindHeadEnd(input_);
  const std::size_t size = head ? head->end : input_.size();
  if (size > options_.max_head) return Start::kHeadTooLong;
  if (!head) return Start::kPartOfHead;
  request = ParseRequest(std::string_view(input_).substr(0, size));
  input_.erase(0, head->next);
  return Start::kRequest;
}

void HttpSession::Handle(const Request& request, Time now) {
  switch (request.kind) {
    case RequestKind::kFile: Serve(request, now); break;
    case RequestKind::kReport: ledger_.OnReport(request, address_, now); break;
    case RequestKind::kBadMethod:
      Refuse("405 Method Not Allowed\r\nAllow: GET", "a method other than GET", now);
      break;
    case RequestKind::kMalformed: Refuse("400 Bad Request", "not a request", now); break;
  }
}

void HttpSession::Serve(const Request& request, Time now) {
  file_ = site_.Open(request.path);
  if (file_ == nullptr) {
    ledger_.OnNotFound(request, address_, now);
    Say(kNotFound, Phase::kAnswering, now);
    return;
  }
  path_ = request.path;
  body_read_ = 0;
  body_sent_ = 0;
  device_ = &ledger_.OnRequest(request, address_, file_->size(), now);
  Say(FileHead(*file_, options_), Phase::kHead, now);
}

void HttpSession::Say(std::string_view answer, Phase phase, Time now) {
  output_ = answer;
  output_sent_ = 0;
  phase_ = phase;
  deadline_ = now + options_.stall_limit;
}

/// Answers and ends the connection: what follows a broken request cannot be told from its rest.
void HttpSession::Refuse(std::string_view status, std::string_view why, Time now) {
  ledger_.OnBadRequest(address_, why, now);
  input_.clear();
  std::string answer = "HTTP/1.1 ";
  answer.append(status).append("\r\nContent-Length: 0\r\nConnection: close\r\n\r\n");
  Say(answer, Phase::kRefusing, now);
}

void HttpSession::NextBlock(Time now) {
  phase_ = Phase::kBody;
  output_sent_ = 0;
  if (body_read_ == file_->size()) {
    EndFile(now);
    return;
  }
  const auto wanted = static_cast<std::size_t>(
      std::min<std::uint64_t>(options_.block_size, file_->size() - body_read_));
  output_.resize(wanted);
  output_.resize(file_->ReadAt(body_read_, output_.data(), wanted));
  if (output_.empty()) {
    // The length has been promised; only the end of the connection can take it back.
    Close("the file became shorter while it was sent", now);
    return;
  }
  body_read_ += output_.size();
  deadline_ = now + options_.stall_limit;
}

void HttpSession::EndFile(Time now) {
  ledger_.OnSent(*device_, path_, file_->size(), now);
  file_.reset();
  WaitForRequest(now);
}

void HttpSession::Close(std::string_view why, Time now) {
  if (file_ != nullptr) ledger_.OnAborted(*device_, path_, body_sent_, why, now);
  file_.reset();
  output_ = std::string();
  output_sent_ = 0;
  phase_ = Phase::kClosed;
}

void HttpSession::WaitForRequest(Time now) {
  phase_ = Phase::kReading;
  output_ = std::string();
  output_sent_ = 0;
  deadline_ = now + (input_.empty() ? options_.idle_limit : options_.head_limit);
}

}  // namespace server
