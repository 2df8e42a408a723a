// What a search for receivers shows while it goes on.
#ifndef RCVLINK_CLI_SEARCH_DISPLAY_H_
#define RCVLINK_CLI_SEARCH_DISPLAY_H_

#include <cstdint>
#include <mutex>
#include <optional>
#include <string>

#include "context.h"
#include "sweep.h"
#include "ticker.h"

namespace cli {

// Shows the current try and the time where a bar would be shown, otherwise one line per try, as
// --progress says. While it lives, all output of the program goes through it, from any thread.
class SearchDisplay {
 public:
  // `ports`: how many are searched at the same time.
  SearchDisplay(Context& context, size_t ports);

  // Erases the line.
  ~SearchDisplay();
  SearchDisplay(const SearchDisplay&) = delete;
  SearchDisplay& operator=(const SearchDisplay&) = delete;

  // A try begins.
  void Begin(const std::wstring& port, size_t number, size_t count, const LineSetting& line);

  // As the functions of `Context`.
  void PrintResult(const std::string& text);
  void PrintStatus(const std::string& text);
  void PrintFailure(const Failure& failure);

 private:
  static constexpr std::chrono::milliseconds kInterval{1000};

  void Draw();
  void Erase();

  Context& context_;
  const ProgressMode mode_;
  const size_t ports_;
  const uint64_t start_ms_;
  std::mutex mutex_;
  std::string doing_;
  size_t drawn_width_ = 0;
  std::optional<Ticker> ticker_;  // ends before all that it uses
};

}  // namespace cli

#endif  // RCVLINK_CLI_SEARCH_DISPLAY_H_
