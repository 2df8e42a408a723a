#include "arguments.h"

#include <winerror.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <functional>
#include <map>
#include <sstream>

#include "names.h"
#include "results.h"
#include "text.h"

namespace cli {
namespace {

constexpr unsigned kDefaultStallTimeoutS = 30;
constexpr unsigned kLongestStallTimeoutS = 86'400;
constexpr int kHelpColumn = 28;

// The parser would split a word like [a,b] into a list, and would not take "--" before the last
// names. A mark in front of such words hides them from it; `Unmarked` takes it off.
constexpr char kLiteralMark = '\x01';

std::string Unmarked(const std::string& word) {
  return word.starts_with(kLiteralMark) ? word.substr(1) : word;
}

std::wstring Shown(const std::string& word) { return ToUtf16(Unmarked(word)); }

/// The command line as the parser is to see it: from its end to its beginning.
std::vector<std::string> Hidden(const std::vector<std::string>& words) {
  const auto separator = std::find(words.begin(), words.end(), "--");
  std::vector<std::string> hidden;
  for (auto word = words.begin(); word != words.end(); ++word) {
    if (word == separator) continue;
    const bool literal =
        word > separator || word->starts_with('[') || word->starts_with(kLiteralMark);
    hidden.push_back(literal ? kLiteralMark + *word : *word);
  }
  std::reverse(hidden.begin(), hidden.end());
  return hidden;
}

/// What the parser fills; turned into `Arguments` afterwards.
struct RawArguments {
  Arguments values;
  std::string port;
  std::string output;
  std::string report;
  std::string setting;
  std::string value;
};

/// Shows NAME... where the parser's own help shows NAME(0x).
class HelpFormatter : public CLI::Formatter {
 public:
  std::string make_option_usage(const CLI::Option* option) const override {
    const bool many = option->get_items_expected_max() > 1;
    const std::string name = option->get_name(true) + (many ? "..." : "");
    return option->get_required() ? name : "[" + name + "]";
  }
};

Failure UsageError(const std::string& meaning) {
  return {.exit = ExitCode::kUsage,
          .tried = "understand the command line",
          .code = E_INVALIDARG,
          .meaning = meaning,
          .hint =
              "`rcvlink-cli --help` tells what there is, `rcvlink-cli get --help` tells it "
              "for one command."};
}

std::string Examples() {
  return ExitCodeTable() +
         "\nExamples:\n"
         "  rcvlink-cli ports                          which ports does this computer have?\n"
         "  rcvlink-cli find COM7                      is there a receiver, and which?\n"
         "  rcvlink-cli ls COM7 --speed 115200         its files, without the search for the "
         "speed\n"
         "  rcvlink-cli get COM7 --all -o D:\\survey\\   all of them, into a folder\n"
         "\n`rcvlink-cli COMMAND --help` explains a command. The options above may follow a "
         "command.";
}

/// An option whose value is one of some words.
template <typename T>
void AddWordOption(CLI::App& app,
                   const std::string& name,
                   const std::string& description,
                   const std::string& placeholder,
                   const std::map<std::string, T>& words,
                   std::function<void(T)> take) {
  app.add_option_function<std::string>(
         name,
         [words, take](const std::string& word) { take(words.at(CLI::detail::to_lower(word))); },
         description)
      ->check(CLI::IsMember(words, CLI::ignore_case).description(""))
      ->option_text(placeholder);
}

void AddLinkOptions(CLI::App& app, Arguments& values) {
  AddWordOption<EInstanceType>(
      app,
      "--link",
      "The cable: serial (default), usb or any",
      "LINK",
      {{"serial", eInstanceSerial}, {"usb", eInstanceUSB}, {"any", eInstanceAny}},
      [&values](EInstanceType link) { values.link = link; });
  AddWordOption<EProtocol>(
      app,
      "--protocol",
      "The family: any (default), quorin or velmar",
      "FAMILY",
      {{"any", eProtocolAny}, {"quorin", eProtocolQuorin}, {"velmar", eProtocolVelmar}},
      [&values](EProtocol protocol) { values.protocol = protocol; });
  app.add_option("--speed", values.speed, "Try this speed only, instead of searching for it")
      ->check(CLI::Range(kSlowestSpeed, kFastestSpeed).description(""))
      ->option_text("BITS/S");
  AddWordOption<RtsMode>(app,
                         "--rts",
                         "Try this RTS only: handshake, on, off (with --speed: on)",
                         "MODE",
                         {{"handshake", RtsMode::kHandshake},
                          {"on", RtsMode::kOn},
                          {"enable", RtsMode::kOn},
                          {"off", RtsMode::kOff},
                          {"disable", RtsMode::kOff}},
                         [&values](RtsMode rts) { values.rts = rts; });
}

void AddOptions(CLI::App& app, RawArguments& raw) {
  Arguments& values = raw.values;
  AddLinkOptions(app, values);
  values.stall_timeout_s = kDefaultStallTimeoutS;
  app.add_option("--stall-timeout",
                 values.stall_timeout_s,
                 "End a download that brings nothing new (30; 0: never)")
      ->check(CLI::Range(0U, kLongestStallTimeoutS).description(""))
      ->option_text("SECONDS");
  app.add_option("--report", raw.report, "Trace the library's doings into this file in %TEMP%")
      ->option_text("NAME");
  app.add_flag("--json", values.json, "Print one JSON value, errors included");
  app.add_flag("--verbose", values.verbose, "Tell also why --link any went on to USB");
  app.add_flag("--quiet", values.quiet, "Print only errors and what was asked for");
}

CLI::App* AddCommand(
    CLI::App& app, RawArguments& raw, Command command, std::string name, std::string description) {
  CLI::App* const sub = app.add_subcommand(std::move(name), std::move(description));
  sub->callback([&raw, command] { raw.values.command = command; });
  if (command != Command::kPorts) {
    sub->add_option(
           "PORT", raw.port, "The port's name, as in COM7; with --link usb the device's path")
        ->required()
        ->option_text(" ");
  }
  return sub;
}

/// Names are read from the option afterwards, as they were typed: converted, {} would be no name.
void AddNames(
    CLI::App& sub, const char* name, const std::string& description, int least, int most) {
  sub.add_option(name, description)
      ->type_size(1)
      ->expected(least, most)
      ->allow_extra_args(most > 1)
      ->required(least > 0)
      ->option_text(" ");
}

void AddFileCommands(CLI::App& app, RawArguments& raw) {
  constexpr int kMostNames = 100'000;
  AddCommand(app, raw, Command::kList, "ls", "List the receiver's files")
      ->footer("Example: rcvlink-cli ls COM7");
  CLI::App* const get =
      AddCommand(app, raw, Command::kGet, "get", "Download files, or all of them");
  AddNames(*get, "NAME", "Files as `ls` shows them", 0, kMostNames);
  get->add_option("-o", raw.output, "The folder, or the name for a single file")
      ->option_text("PATH");
  get->add_flag("--all", raw.values.all, "Every file of the receiver");
  get->add_flag("--force", raw.values.force, "Overwrite files that exist already");
  get->footer(
      "Each file grows as NAME.part and gets its name when it is complete.\n"
      "Examples:\n"
      "  rcvlink-cli get COM7 LOG0001.DAT\n"
      "  rcvlink-cli get COM7 LOG0001.DAT -o monday.dat --force\n"
      "  rcvlink-cli get COM7 --all -o D:\\survey\\");
  CLI::App* const remove = AddCommand(app, raw, Command::kRemove, "rm", "Delete receiver's files");
  AddNames(*remove, "NAME", "Files as `ls` shows them", 1, kMostNames);
  remove->footer("Example: rcvlink-cli rm COM7 LOG0001.DAT LOG0002.DAT");
  CLI::App* const move =
      AddCommand(app, raw, Command::kMove, "mv", "Rename a file (only the Velmar family can)");
  AddNames(*move, "OLD", "The file's name", 1, 1);
  AddNames(*move, "NEW", "Its new name", 1, 1);
  move->footer("Example: rcvlink-cli mv COM7 LOG0001.DAT MONDAY.DAT");
}

void AddCommands(CLI::App& app, RawArguments& raw) {
  AddCommand(app, raw, Command::kPorts, "ports", "List this computer's COM ports")
      ->footer("Example: rcvlink-cli ports");
  AddCommand(app, raw, Command::kFind, "find", "Find the receiver on a port")
      ->footer(
          "Without --speed or --rts all speeds are tried, which takes minutes on a silent port.\n"
          "Examples:\n"
          "  rcvlink-cli find COM7\n"
          "  rcvlink-cli find COM7 --protocol quorin --speed 115200");
  AddCommand(app, raw, Command::kInfo, "info", "Tell all about the receiver")
      ->footer("Example: rcvlink-cli info COM7 --json");
  AddFileCommands(app, raw);
  CLI::App* const set =
      AddCommand(app, raw, Command::kSet, "set", "Change the receiver's own port settings");
  set->add_option("SETTING", raw.setting, "baud, parity, stopbits or rts")
      ->required()
      ->option_text(" ");
  set->add_option("VALUE", raw.value, "Bits per second; none, odd, even; 1, 2; on, off")
      ->required()
      ->option_text(" ");
  set->footer(
      "The change is the receiver's: from then on its port is reached with the new setting only.\n"
      "Examples:\n"
      "  rcvlink-cli set COM7 baud 115200\n"
      "  rcvlink-cli set COM7 parity none");
  AddCommand(app, raw, Command::kCheck, "check", "Ask whether the receiver still answers")
      ->footer("Example: rcvlink-cli check COM7 --speed 115200 && echo it does");
}

void TakeNames(const CLI::App& app, Arguments& values) {
  for (const CLI::App* sub : app.get_subcommands()) {
    for (const char* option_name : {"NAME", "OLD", "NEW"}) {
      const CLI::Option* const option = sub->get_option_no_throw(option_name);
      if (option == nullptr) continue;
      for (const std::string& name : option->results()) values.names.push_back(Shown(name));
    }
  }
}

void CheckPort(const Arguments& values) {
  if (values.command == Command::kPorts) return;
  const bool control = std::any_of(values.port.begin(), values.port.end(), IsControl);
  if (values.port.empty() || control) throw UsageError("the port's name is empty or garbled");
  if (values.link == eInstanceUSB && (values.speed || values.rts)) {
    throw UsageError("--speed and --rts are about serial ports, not about --link usb");
  }
}

void CheckNames(const Arguments& values) {
  for (const std::wstring& name : values.names) {
    if (const auto reason = WhyNotSendable(name)) throw UsageError(*reason);
  }
  if (values.command == Command::kGet && values.all == !values.names.empty()) {
    throw UsageError("get needs either the names of files or --all");
  }
  if (values.command == Command::kMove && values.names.front() == values.names.back()) {
    throw UsageError("the old and the new name are the same");
  }
  if (!values.report.empty() && !IsPlainFileName(values.report)) {
    throw UsageError("the report's name must be a bare file name: " + Printable(values.report));
  }
}

SettingChange CheckedChange(const std::string& setting, const std::string& value) {
  const auto change = ParseSetting(CLI::detail::to_lower(Unmarked(setting)),
                                   CLI::detail::to_lower(Unmarked(value)));
  if (!change) {
    throw UsageError("`set` does not know " + Printable(Shown(setting)) + " " +
                     Printable(Shown(value)) +
                     "; there is baud 110 to 4000000, parity none, odd or even, stopbits 1 or 2, "
                     "and rts on or off");
  }
  return *change;
}

Arguments Checked(const CLI::App& app, const RawArguments& raw) {
  if (app.get_subcommands().empty()) {
    throw UsageError("a command is missing: ports, find, info, ls, get, rm, mv, set or check");
  }
  Arguments values = raw.values;
  values.port = Shown(raw.port);
  values.output = Shown(raw.output);
  values.report = Shown(raw.report);
  TakeNames(app, values);
  try {
    CheckPort(values);
    CheckNames(values);
    if (values.command == Command::kSet) values.change = CheckedChange(raw.setting, raw.value);
  } catch (Failure& failure) {
    failure.tried = "start `" + app.get_subcommands().front()->get_name() + "`";
    failure.port = Printable(values.port);
    throw;
  }
  return values;
}

}  // namespace

std::variant<Arguments, HelpText> ParseCommandLine(const std::vector<std::string>& args) {
  CLI::App app("Reaches Quorin and Velmar GNSS receivers on this computer's ports.", "rcvlink-cli");
  app.formatter(std::make_shared<HelpFormatter>());
  app.get_formatter()->column_width(kHelpColumn);
  app.allow_windows_style_options(false);  // a file's name may begin with a slash
  app.fallthrough();
  app.require_subcommand(0, 1);  // none: `Checked` says it better
  app.set_version_flag("--version", "rcvlink-cli " RCVLINK_VERSION);
  RawArguments raw;
  AddOptions(app, raw);
  AddCommands(app, raw);
  app.footer(Examples());  // after the commands, which would inherit it
  try {
    app.parse(Hidden(args));
  } catch (const CLI::ParseError& error) {
    if (error.get_exit_code() != 0) throw UsageError(Printable(ToUtf16(error.what())));
    std::ostringstream text;
    app.exit(error, text, text);
    return HelpText{text.str()};
  }
  return Checked(app, raw);
}

}  // namespace cli
