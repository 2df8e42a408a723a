#include "search_display.h"

#include "formats.h"
#include "text.h"

namespace cli {

SearchDisplay::SearchDisplay(Context& context, size_t ports)
    : context_(context),
      mode_(ProgressModeOf(context)),
      ports_(ports),
      start_ms_(GetTickCount64()) {
  doing_ = ports_ == 1 ? "Searching" : "Searching " + std::to_string(ports_) + " ports";
  if (mode_ != ProgressMode::kBar) return;
  ticker_.emplace(kInterval, [this] {
    const std::scoped_lock lock(mutex_);
    Draw();
  });
}

SearchDisplay::~SearchDisplay() {
  ticker_.reset();
  Erase();
}

void SearchDisplay::Begin(const std::wstring& port,
                          size_t number,
                          size_t count,
                          const LineSetting& line) {
  const std::scoped_lock lock(mutex_);
  const bool one_try = count == 1;
  const std::string numbers =
      one_try ? "" : "try " + std::to_string(number) + " of " + std::to_string(count) + ": ";
  const std::string text = Printable(port) + ": " + numbers + InWords(line);
  if (ports_ == 1) doing_ = text;
  if (mode_ == ProgressMode::kBar) Draw();
  if (mode_ == ProgressMode::kLines && !one_try) context_.err.Write(text + "\n");
  if (mode_ == ProgressMode::kJson && !one_try) {
    const Json json = {{"port", ToUtf8(port)},
                       {"try", number},
                       {"tries", count},
                       {"speed", line.speed},
                       {"rts", RtsWord(line.rts)}};
    context_.err.Write(json.dump() + "\n");
  }
}

void SearchDisplay::PrintResult(const std::string& text) {
  const std::scoped_lock lock(mutex_);
  Erase();
  context_.PrintResult(text);
}

void SearchDisplay::PrintStatus(const std::string& text) {
  const std::scoped_lock lock(mutex_);
  Erase();
  context_.PrintStatus(text);
}

void SearchDisplay::PrintFailure(const Failure& failure) {
  const std::scoped_lock lock(mutex_);
  Erase();
  context_.PrintFailure(failure);
}

void SearchDisplay::Draw() {
  const std::string seconds = FormatDuration((GetTickCount64() - start_ms_) / kMsPerSecond);
  // The last column stays free, because a full line would wrap.
  const size_t width = context_.err.Width() - 1;
  const std::string line = (doing_ + ", " + seconds + " (Ctrl-C stops it)").substr(0, width);
  context_.err.Write(Redrawn(line, drawn_width_));
  drawn_width_ = line.size();
}

void SearchDisplay::Erase() {
  if (drawn_width_ > 0) context_.err.Write(Erased(drawn_width_));
  drawn_width_ = 0;
}

}  // namespace cli
