#include "command_line.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdlib>
#include <sstream>

#include "families.h"
#include "names.h"
#include "options.h"
#include "results.h"
#include "text.h"

namespace cli {
namespace {

constexpr unsigned kDefaultStallTimeoutS = 30;
constexpr unsigned kLongestStallTimeoutS = 86'400;
constexpr int kHelpColumn = 28;

// Shows NAME... where the parser's own help shows NAME(0x).
class HelpFormatter : public CLI::Formatter {
 public:
  std::string make_option_usage(const CLI::Option* option) const override {
    const bool many = option->get_items_expected_max() > 1;
    const std::string name = option->get_name(true) + (many ? "..." : "");
    return option->get_required() ? name : "[" + name + "]";
  }

  // A command's help has the options of all commands too.
  std::string make_footer(const CLI::App* app) const override {
    const CLI::App* const all = app->get_parent();
    if (all == nullptr) return Formatter::make_footer(app);
    const auto is_common = [all](const CLI::Option* option) {
      return option != all->get_help_ptr() && option != all->get_version_ptr();
    };
    // Both the group and the text before it supply a line end.
    return make_group("Options of all commands", false, all->get_options(is_common)).substr(1) +
           "\n" + Formatter::make_footer(app);
  }
};

// The command that is most similar to a word; empty when none is.
std::string MostLike(const std::string& word, const Commands& commands) {
  constexpr size_t kMostChanges = 2;
  std::string best;
  size_t least = kMostChanges + 1;
  for (const auto& command : commands) {
    const std::string candidate = command->text().word;
    const size_t changes = ChangesBetween(word, candidate);
    if (changes >= least || changes >= candidate.size()) continue;
    least = changes;
    best = candidate;
  }
  return best;
}

// Turns `help`, `help get` and `/?` into --help.
std::vector<std::string> WithHelp(std::vector<std::string> words) {
  const auto end = std::find(words.begin(), words.end(), "--");
  std::replace(words.begin(), end, std::string("/?"), std::string("--help"));
  if (words.empty() || words.front() != "help") return words;
  words.erase(words.begin());
  words.insert(words.end(), "--help");
  return words;
}

std::string Examples() {
  return ExitCodeTable() +
         "\nOptions are also read from the file of --config, by default\n"
         "%APPDATA%\\rcvlink\\rcvlink-cli.ini, and from RCVLINK_PORT, RCVLINK_LINK,\n"
         "RCVLINK_PROTOCOL and RCVLINK_SPEED. The command line comes first, then the file.\n"
         "\nExamples:\n"
         "  rcvlink-cli ports                          list the ports of this computer\n"
         "  rcvlink-cli find COM7                      find the receiver on COM7\n"
         "  rcvlink-cli ls COM7 --speed 115200         list its files at a known speed\n"
         "  rcvlink-cli get COM7 --all -o D:\\survey\\   download all files into a folder\n"
         "\n`rcvlink-cli COMMAND --help` shows the help of one command. The options above may "
         "stand\n"
         "before or after the command.";
}

std::map<std::string, EProtocol> FamilyWords() {
  std::map<std::string, EProtocol> words = {{"any", eProtocolAny}};
  for (const Family& family : kFamilies) {
    words.emplace(FamilyWord(family.protocol), family.protocol);
  }
  return words;
}

// "The receiver family: any (default), quorin or velmar"
std::string FamilyHelp() {
  std::string help = "The receiver family: any (default)";
  for (const Family& family : kFamilies) {
    help += (&family == &kFamilies.back() ? " or " : ", ") + FamilyWord(family.protocol);
  }
  return help;
}

void AddLinkOptions(CLI::App& app, Arguments& arguments) {
  AddWord<EInstanceType>(
      app,
      "--link",
      "The link: serial (default), usb or any",
      "LINK",
      {{"serial", eInstanceSerial}, {"usb", eInstanceUSB}, {"any", eInstanceAny}},
      arguments.link);
  AddWord<EProtocol>(app, "--protocol", FamilyHelp(), "FAMILY", FamilyWords(), arguments.protocol);
  app.get_option("--link")->envname("RCVLINK_LINK");
  app.get_option("--protocol")->envname("RCVLINK_PROTOCOL");
  app.add_option("--speed", arguments.speed, "Try only this speed; do not search for it")
      ->check(CLI::Range(kSlowestSpeed, kFastestSpeed).description(""))
      ->option_text("BITS/S")
      ->envname("RCVLINK_SPEED");
  AddWord<RtsMode>(app,
                   "--rts",
                   "Try only this RTS mode: handshake, on or off",
                   "MODE",
                   {{"handshake", RtsMode::kHandshake},
                    {"on", RtsMode::kOn},
                    {"enable", RtsMode::kOn},
                    {"off", RtsMode::kOff},
                    {"disable", RtsMode::kOff}},
                   arguments.rts);
  AddFlag(
      app, "--no-memory", "Neither use nor save the setting found last time", arguments.no_memory);
}

// The file with the user's own options; it need not exist.
std::string DefaultConfig() {
  const char* const folder = std::getenv("APPDATA");
  return folder == nullptr ? "" : std::string(folder) + "\\rcvlink\\rcvlink-cli.ini";
}

// The options of all commands.
void AddOptions(CLI::App& app, Arguments& arguments) {
  AddLinkOptions(app, arguments);
  arguments.stall_timeout_s = kDefaultStallTimeoutS;
  app.add_option("--stall-timeout",
                 arguments.stall_timeout_s,
                 "Abort a download without new data (30; 0: never)")
      ->check(CLI::Range(0U, kLongestStallTimeoutS).description(""))
      ->option_text("SECONDS");
  AddText(app,
          "--report",
          "Write a trace of the library to this file in %TEMP%",
          "NAME",
          arguments.report);
  AddFlag(app, "--force", "Overwrite existing files on this computer", arguments.force);
  AddWord<ProgressMode>(app,
                        "--progress",
                        "Show progress as auto (default), bar, lines, json or none",
                        "HOW",
                        {{"auto", ProgressMode::kAuto},
                         {"bar", ProgressMode::kBar},
                         {"lines", ProgressMode::kLines},
                         {"json", ProgressMode::kJson},
                         {"none", ProgressMode::kNone}},
                        arguments.progress);
  app.set_config("--config", DefaultConfig(), "Read options from this file, such as json = true")
      ->option_text("FILE");
  AddFlag(app, "--json", "Print the result or the error as one JSON value", arguments.json);
  AddFlag(app,
          "--verbose",
          "Print more: SHA-256 of downloads, why --link any tried USB",
          arguments.verbose);
  AddFlag(app, "--quiet", "Print only results and errors", arguments.quiet);
}

void AddCommands(CLI::App& app, Arguments& arguments, const Commands& commands) {
  for (const auto& command : commands) {
    CLI::App* const sub = app.add_subcommand(command->text().word, command->text().summary);
    command->AddOptions(*sub, arguments);
    sub->footer(command->text().examples);
  }
}

// "ports, find or check"
std::string Words(const Commands& commands) {
  std::string words;
  for (size_t i = 0; i < commands.size(); ++i) {
    if (i > 0) words += i + 1 == commands.size() ? " or " : ", ";
    words += commands[i]->text().word;
  }
  return words;
}

// Why the parser refused the words.
Failure ParseFailure(const CLI::App& app, const CLI::ParseError& error, const Commands& commands) {
  const std::vector<std::string> rest = app.remaining();
  if (!app.get_subcommands().empty() || rest.empty() || rest.front().starts_with('-')) {
    return UsageError(Printable(ToUtf16(error.what())));
  }
  const std::string word = Printable(ToUtf16(Unmarked(rest.front())));
  const std::string similar = MostLike(Lowered(word), commands);
  return UsageError("unknown command " + word +
                    (similar.empty() ? "; the commands are " + Words(commands)
                                     : "; did you mean " + similar + "?"));
}

std::unique_ptr<Command> TakeChosen(const CLI::App& app, Commands& commands) {
  for (auto& command : commands) {
    if (app.got_subcommand(command->text().word)) return std::move(command);
  }
  throw UsageError("a command is missing; the commands are " + Words(commands));
}

void CheckArguments(const Arguments& arguments, bool needs_port) {
  const bool control = std::any_of(arguments.port.begin(), arguments.port.end(), IsControl);
  if ((needs_port && arguments.port.empty()) || control) {
    throw UsageError("the port name is empty or contains a control character");
  }
  // RCVLINK_SPEED is meant for serial ports, and is no mistake with --link usb.
  const bool asked_speed = arguments.speed && std::getenv("RCVLINK_SPEED") == nullptr;
  if (needs_port && arguments.link == eInstanceUSB && (asked_speed || arguments.rts)) {
    throw UsageError("--speed and --rts apply to serial ports, not to --link usb");
  }
  if (!arguments.report.empty() && !IsPlainFileName(arguments.report)) {
    throw UsageError("--report takes a plain file name without a folder, not " +
                     Printable(arguments.report));
  }
}

// Checks what the parser itself does not check.
CommandLine Checked(CLI::App& app, Arguments& arguments, Commands commands) {
  std::unique_ptr<Command> command = TakeChosen(app, commands);
  arguments.port = PlainPortName(arguments.port);
  const CLI::Option* const port =
      app.get_subcommand(command->text().word)->get_option_no_throw("PORT");
  try {
    CheckArguments(arguments, port != nullptr && (port->count() > 0 || !arguments.port.empty()));
    command->Check();
  } catch (Failure& failure) {
    const std::string word = command->text().word;
    failure.tried = "start `" + word + "`";
    failure.hint = "`rcvlink-cli " + word + " --help` shows its arguments and options.";
    failure.port = Printable(arguments.port);
    throw;
  }
  return {std::move(arguments), std::move(command)};
}

std::vector<CommandWords::Word> OptionsOf(const CLI::App& app) {
  std::vector<CommandWords::Word> words;
  for (const CLI::Option* const option : app.get_options()) {
    if (option->get_positional()) continue;
    const std::string& word = option->get_name();  // the long one where there are two
    words.push_back({word, option->get_description()});
  }
  return words;
}

}  // namespace

std::vector<CommandWords> WordsOf(const Commands& commands) {
  CLI::App app;
  Arguments arguments;
  AddOptions(app, arguments);
  AddCommands(app, arguments, commands);
  std::vector<CommandWords> all = {{.command = {}, .options = OptionsOf(app)}};
  for (const auto& command : commands) {
    const auto [word, summary, examples] = command->text();
    all.push_back({{word, summary}, OptionsOf(*app.get_subcommand(word))});
  }
  return all;
}

std::variant<CommandLine, HelpText> ParseCommandLine(const std::vector<std::string>& args,
                                                     Commands commands) {
  CLI::App app("Finds Quorin and Velmar GNSS receivers and manages their files.", "rcvlink-cli");
  app.formatter(std::make_shared<HelpFormatter>());
  app.get_formatter()->column_width(kHelpColumn);
  app.allow_windows_style_options(false);  // a file's name may begin with a slash
  app.fallthrough();
  app.allow_config_extras(CLI::config_extras_mode::error);
  app.require_subcommand(0, 1);  // none: `TakeChosen` has the better message
  app.set_version_flag("--version", "rcvlink-cli " RCVLINK_VERSION);
  Arguments arguments;
  AddOptions(app, arguments);
  AddCommands(app, arguments, commands);
  app.footer(Examples());  // after the commands, which would inherit it
  try {
    app.parse(Hidden(WithHelp(args)));
  } catch (const CLI::ParseError& error) {
    if (error.get_exit_code() != 0) throw ParseFailure(app, error, commands);
    std::ostringstream text;
    app.exit(error, text, text);
    return HelpText{text.str()};
  }
  return Checked(app, arguments, std::move(commands));
}

}  // namespace cli
