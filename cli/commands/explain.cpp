#include <optional>

#include "command.h"
#include "options.h"
#include "text.h"
#include "troubleshooting.h"

namespace cli {
namespace {

class Explain : public Command {
 public:
  using Command::Command;

  void AddOptions(CLI::App& app, Arguments& /*arguments*/) override {
    AddText(
        app, "CODE", "Result code, such as 0x8007048F; without it all codes are listed", "", code_);
  }

  void Check() const override {
    if (!code_.empty() && !ParseCode(ToUtf8(code_))) {
      throw UsageError("a result code is a number such as 0x8007048F, not " + Printable(code_));
    }
  }

  Outcome Run(Context& context) override { return code_.empty() ? List(context) : Entry(context); }

 private:
  static Outcome List(Context& context) {
    Json list = Json::array();
    for (const TroubleshootingEntry& entry : TroubleshootingEntries()) {
      context.PrintResult(HexCode(entry.code) + "  " + entry.title + "\n");
      list.push_back({{"code", HexCode(entry.code)}, {"title", entry.title}});
    }
    return {.document = {{"entries", list}}};
  }

  Outcome Entry(Context& context) const {
    const long code = *ParseCode(ToUtf8(code_));
    const auto entry = FindTroubleshooting(code);
    const std::string title = entry ? entry->title : cli::MeaningOf(code);
    const std::string text =
        entry ? entry->text
              : "This code has no entry; the title is the text of Windows. Run the command again "
                "with --report NAME for a trace of the library.\n";
    context.PrintResult(HexCode(code) + " " + title + "\n\n" + text);
    return {.document = {{"code", HexCode(code)}, {"title", title}, {"text", text}}};
  }

  std::wstring code_;
};

}  // namespace

std::unique_ptr<Command> MakeExplain() {
  return std::make_unique<Explain>(Command::Text{"explain",
                                                 "Explain a result code and say what to try",
                                                 "Examples:\n"
                                                 "  rcvlink-cli explain 0x8007048F\n"
                                                 "  rcvlink-cli explain"});
}

}  // namespace cli
