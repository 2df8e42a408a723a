#include "command_line.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <sstream>

#include "names.h"
#include "options.h"
#include "results.h"
#include "text.h"

namespace cli {
namespace {

constexpr unsigned kDefaultStallTimeoutS = 30;
constexpr unsigned kLongestStallTimeoutS = 86'400;
constexpr int kHelpColumn = 28;

/// Shows NAME... where the parser's own help shows NAME(0x).
class HelpFormatter : public CLI::Formatter {
 public:
  std::string make_option_usage(const CLI::Option* option) const override {
    const bool many = option->get_items_expected_max() > 1;
    const std::string name = option->get_name(true) + (many ? "..." : "");
    return option->get_required() ? name : "[" + name + "]";
  }
};

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

void AddLinkOptions(CLI::App& app, Arguments& arguments) {
  AddWord<EInstanceType>(
      app,
      "--link",
      "The cable: serial (default), usb or any",
      "LINK",
      {{"serial", eInstanceSerial}, {"usb", eInstanceUSB}, {"any", eInstanceAny}},
      arguments.link);
  AddWord<EProtocol>(
      app,
      "--protocol",
      "The family: any (default), quorin or velmar",
      "FAMILY",
      {{"any", eProtocolAny}, {"quorin", eProtocolQuorin}, {"velmar", eProtocolVelmar}},
      arguments.protocol);
  app.add_option("--speed", arguments.speed, "Try this speed only, instead of searching for it")
      ->check(CLI::Range(kSlowestSpeed, kFastestSpeed).description(""))
      ->option_text("BITS/S");
  AddWord<RtsMode>(app,
                   "--rts",
                   "Try this RTS only: handshake, on, off (with --speed: on)",
                   "MODE",
                   {{"handshake", RtsMode::kHandshake},
                    {"on", RtsMode::kOn},
                    {"enable", RtsMode::kOn},
                    {"off", RtsMode::kOff},
                    {"disable", RtsMode::kOff}},
                   arguments.rts);
  AddFlag(app,
          "--no-memory",
          "Neither begin with what was found last time nor remember it",
          arguments.no_memory);
}

/// The options of all commands.
void AddOptions(CLI::App& app, Arguments& arguments) {
  AddLinkOptions(app, arguments);
  arguments.stall_timeout_s = kDefaultStallTimeoutS;
  app.add_option("--stall-timeout",
                 arguments.stall_timeout_s,
                 "End a download that brings nothing new (30; 0: never)")
      ->check(CLI::Range(0U, kLongestStallTimeoutS).description(""))
      ->option_text("SECONDS");
  AddText(app,
          "--report",
          "Trace the library's doings into this file in %TEMP%",
          "NAME",
          arguments.report);
  AddFlag(app, "--json", "Print one JSON value, errors included", arguments.json);
  AddFlag(app, "--verbose", "Tell also why --link any went on to USB", arguments.verbose);
  AddFlag(app, "--quiet", "Print only errors and what was asked for", arguments.quiet);
}

void AddCommands(CLI::App& app, Arguments& arguments, const Commands& commands) {
  for (const auto& command : commands) {
    CLI::App* const sub = app.add_subcommand(command->text().word, command->text().summary);
    command->AddOptions(*sub, arguments);
    sub->footer(command->text().examples);
  }
}

/// "ports, find or check"
std::string Words(const Commands& commands) {
  std::string words;
  for (std::size_t i = 0; i < commands.size(); ++i) {
    if (i > 0) words += i + 1 == commands.size() ? " or " : ", ";
    words += commands[i]->text().word;
  }
  return words;
}

std::unique_ptr<Command> TakeChosen(const CLI::App& app, Commands& commands) {
  for (auto& command : commands) {
    if (app.got_subcommand(command->text().word)) return std::move(command);
  }
  throw UsageError("a command is missing: " + Words(commands));
}

void CheckArguments(const Arguments& arguments, bool needs_port) {
  const bool control = std::any_of(arguments.port.begin(), arguments.port.end(), IsControl);
  if ((needs_port && arguments.port.empty()) || control) {
    throw UsageError("the port's name is empty or garbled");
  }
  if (needs_port && arguments.link == eInstanceUSB && (arguments.speed || arguments.rts)) {
    throw UsageError("--speed and --rts are about serial ports, not about --link usb");
  }
  if (!arguments.report.empty() && !IsPlainFileName(arguments.report)) {
    throw UsageError("the report's name must be a bare file name: " + Printable(arguments.report));
  }
}

/// Reads the words and checks them, as far as the parser's own checks do not do that.
CommandLine Checked(CLI::App& app, Arguments& arguments, Commands commands) {
  std::unique_ptr<Command> command = TakeChosen(app, commands);
  const CLI::Option* const port =
      app.get_subcommand(command->text().word)->get_option_no_throw("PORT");
  try {
    CheckArguments(arguments, port != nullptr && port->count() > 0);
    command->Check();
  } catch (Failure& failure) {
    failure.tried = std::string("start `") + command->text().word + "`";
    failure.port = Printable(arguments.port);
    throw;
  }
  return {std::move(arguments), std::move(command)};
}

}  // namespace

std::variant<CommandLine, HelpText> ParseCommandLine(const std::vector<std::string>& args,
                                                     Commands commands) {
  CLI::App app("Reaches Quorin and Velmar GNSS receivers on this computer's ports.", "rcvlink-cli");
  app.formatter(std::make_shared<HelpFormatter>());
  app.get_formatter()->column_width(kHelpColumn);
  app.allow_windows_style_options(false);  // a file's name may begin with a slash
  app.fallthrough();
  app.require_subcommand(0, 1);  // none: `TakeChosen` says it better
  app.set_version_flag("--version", "rcvlink-cli " RCVLINK_VERSION);
  Arguments arguments;
  AddOptions(app, arguments);
  AddCommands(app, arguments, commands);
  app.footer(Examples());  // after the commands, which would inherit it
  try {
    app.parse(Hidden(args));
  } catch (const CLI::ParseError& error) {
    if (error.get_exit_code() != 0) throw UsageError(Printable(ToUtf16(error.what())));
    std::ostringstream text;
    app.exit(error, text, text);
    return HelpText{text.str()};
  }
  return Checked(app, arguments, std::move(commands));
}

}  // namespace cli
