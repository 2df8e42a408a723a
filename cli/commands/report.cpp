#include <windows.h>

#include <algorithm>
#include <filesystem>
#include <string>

#include "command.h"
#include "exchange.h"
#include "exchange_page.h"
#include "exchange_text.h"
#include "handle.h"
#include "options.h"
#include "paths.h"
#include "text.h"

namespace cli {
namespace {

// Far more than the report of a long session has, which is some 100 kB.
constexpr size_t kMostBytes = 16'777'216;

struct Content {
  std::string bytes{};
  bool is_whole = true;
};

// Throws Failure.
Content ReadFileContent(const std::filesystem::path& path) {
  const std::string tried = "read the report " + Printable(path.native());
  const HANDLE opened = CreateFileW(path.c_str(),
                                    GENERIC_READ,
                                    FILE_SHARE_READ | FILE_SHARE_WRITE | FILE_SHARE_DELETE,
                                    nullptr,
                                    OPEN_EXISTING,
                                    FILE_ATTRIBUTE_NORMAL,
                                    nullptr);
  if (opened == INVALID_HANDLE_VALUE) throw LocalFailure(tried, GetLastError());
  const UniqueHandle file(opened);
  Content content{.bytes = std::string(kMostBytes + 1, '\0')};
  size_t size = 0;
  DWORD count = 0;
  do {
    if (!ReadFile(file.get(),
                  content.bytes.data() + size,
                  static_cast<DWORD>(content.bytes.size() - size),
                  &count,
                  nullptr)) {
      throw LocalFailure(tried, GetLastError());
    }
    size += count;
  } while (count != 0);
  content.is_whole = size <= kMostBytes;
  content.bytes.resize(std::min(size, kMostBytes));
  return content;
}

// Throws Failure when the page exists and may not be replaced, or cannot be written.
void WritePage(const std::filesystem::path& path, const std::string& page, bool force) {
  const std::string tried = "write the page " + Printable(path.native());
  const HANDLE opened = CreateFileW(path.c_str(),
                                    GENERIC_WRITE,
                                    0,
                                    nullptr,
                                    force ? CREATE_ALWAYS : CREATE_NEW,
                                    FILE_ATTRIBUTE_NORMAL,
                                    nullptr);
  if (opened == INVALID_HANDLE_VALUE) {
    Failure failure = LocalFailure(tried, GetLastError());
    if (failure.code == ResultOfWin32(ERROR_FILE_EXISTS)) {
      failure.meaning = "it already exists";
      failure.hint = "--force replaces it; --html with another name keeps it.";
    }
    throw failure;
  }
  const UniqueHandle file(opened);
  DWORD written = 0;
  if (WriteFile(file.get(), page.data(), static_cast<DWORD>(page.size()), &written, nullptr) ==
      FALSE) {
    throw LocalFailure(tried, GetLastError());
  }
}

Json ToJson(const ExchangeEntry& entry) {
  Json json = {{"time", TimeOfDay(entry.ms_of_day)},
               {"elapsed_ms", entry.elapsed_ms},
               {"since_ms", entry.since_ms},
               {"thread", entry.thread},
               {"kind", NameOf(entry.kind)},
               {"meaning", entry.meaning},
               {"line", entry.text.empty() ? Json(nullptr) : Json(entry.text)}};
  if (entry.code) {
    json["code"] = HexCode(*entry.code);
    json["title"] = TitleOf(*entry.code);
  }
  if (entry.until_ms) json["until_ms"] = *entry.until_ms;
  return json;
}

Json ToJson(const Exchange& exchange) {
  Json entries = Json::array();
  for (const ExchangeEntry& entry : exchange.entries) entries.push_back(ToJson(entry));
  return {{"duration_ms", exchange.DurationMs()},
          {"commands", exchange.Count(TraceKind::kCommand)},
          {"retries", exchange.Count(TraceKind::kRetry)},
          {"silences", exchange.Count(TraceKind::kTimeout)},
          {"failures", exchange.Count(TraceKind::kFailure)},
          {"remarks", exchange.remarks},
          {"entries", entries}};
}

class Report : public Command {
 public:
  using Command::Command;

  void AddOptions(CLI::App& app, Arguments& /*arguments*/) override {
    AddText(app,
            "FILE",
            "Report file; a name without a folder is also looked for in %TEMP%",
            "",
            file_,
            Need::kRequired);
    AddText(app, "--html", "Write the exchange as an HTML page", "PAGE", page_);
  }

  Outcome Run(Context& context) override {
    const std::filesystem::path path = Find();
    const Content content = ReadFileContent(path);
    Exchange exchange = ReadExchange(content.bytes, GetACP());
    if (exchange.entries.empty()) throw NoReport(path, exchange);
    if (!content.is_whole) {
      exchange.remarks.push_back("Only the first " + std::to_string(kMostBytes) +
                                 " bytes of the report are shown.");
    }
    if (!context.arguments.json) {
      for (const std::string& remark : exchange.remarks) context.PrintWarning(remark + "\n");
    }
    Json document = ToJson(exchange);
    if (page_.empty()) {
      context.PrintResult(ToText(exchange, context.arguments.verbose));
    } else {
      MakePage(context, path, exchange);
      document["page"] = ToUtf8(page_);
    }
    return {.document = std::move(document)};
  }

 private:
  std::filesystem::path Find() const {
    const std::filesystem::path path(file_);
    if (Exists(path) || path.has_parent_path() || path.has_root_path()) return path;
    const std::filesystem::path other = std::filesystem::temp_directory_path() / path;
    return Exists(other) ? other : path;
  }

  static Failure NoReport(const std::filesystem::path& path, const Exchange& exchange) {
    Failure failure{.tried = "read the report " + Printable(path.native()),
                    .code = ResultOfWin32(ERROR_INVALID_DATA),
                    .meaning = "the file contains no line of a report",
                    .hint =
                        "A report is a file written with --report; its lines begin with "
                        "hh:mm:ss.mmmm and a thread number."};
    if (!exchange.remarks.empty()) failure.hint = exchange.remarks.front() + " " + failure.hint;
    return failure;
  }

  void MakePage(Context& context,
                const std::filesystem::path& report,
                const Exchange& exchange) const {
    std::error_code ignored;
    if (std::filesystem::equivalent(report, page_, ignored)) {
      throw UsageError("the page would overwrite the report");
    }
    WritePage(
        page_, ToPage(exchange, Printable(report.filename().native())), context.arguments.force);
    context.PrintDone(Summary(exchange) + "\nThe page was written to " + Printable(page_) + "\n");
  }

  std::wstring file_;
  std::wstring page_;
};

}  // namespace

std::unique_ptr<Command> MakeReport() {
  return std::make_unique<Report>(
      Command::Text{"report",
                    "Show a report as an exchange between host and receiver",
                    "A report has no lines for replies: a reply arrived before the next line.\n"
                    "Examples:\n"
                    "  rcvlink-cli report trace.txt\n"
                    "  rcvlink-cli report trace.txt --html trace.html\n"
                    "  rcvlink-cli report trace.txt --json"});
}

}  // namespace cli
