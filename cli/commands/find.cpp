#include <CLI/CLI.hpp>
#include <algorithm>
#include <exception>
#include <iterator>
#include <optional>
#include <thread>
#include <utility>

#include "command.h"
#include "identity.h"
#include "names.h"
#include "options.h"
#include "port_list.h"
#include "receiver.h"
#include "text.h"

namespace cli {
namespace {

std::string InWords(const std::wstring& port, const Receiver& receiver, const Identity& identity) {
  return Printable(port) + " (" + LinkInWords(receiver) + "): " + FamilyName(identity.family) +
         " receiver, model " + Printable(identity.model) + ", id " + Printable(identity.id) + "\n";
}

// The result of the search on one of several ports.
struct Answer {
  Json receiver{};  // null when there is none
  std::optional<Failure> failure{};
};

// Searches one of several ports, on a thread of its own, and prints the result at once.
Answer Ask(Context& context, const SearchPlace& place, SearchDisplay& display) {
  Failure failure;
  try {
    Receiver receiver(context, FindReceiverAt(context, place, display));
    const Identity identity = receiver.Identify();
    display.PrintResult(InWords(place.port, receiver, identity));
    return {.receiver = ToJson(place.port, receiver, identity)};
  } catch (const Failure& thrown) {
    failure = thrown;
  } catch (const std::exception& error) {
    failure = {.tried = "find a receiver", .code = E_FAIL, .meaning = error.what()};
  }
  failure.port = Printable(place.port);
  display.PrintStatus(failure.port + ": " + MeaningOf(failure) + "\n");
  return {.failure = std::move(failure)};
}

std::vector<Answer> AskAll(Context& context, const std::vector<SearchPlace>& places) {
  std::vector<Answer> answers(places.size());
  SearchDisplay display(context, places.size());
  std::vector<std::jthread> threads;
  for (size_t i = 0; i < places.size(); ++i) {
    threads.emplace_back([&, i] { answers[i] = Ask(context, places[i], display); });
  }
  threads.clear();  // waits for them
  return answers;
}

// The outcome of a search on several ports: done when there is a receiver on any of them.
Outcome OutcomeOf(const std::vector<Answer>& answers, bool cancelled) {
  Outcome outcome{.exit = ExitCode::kNoReceiver,
                  .document = {{"receivers", Json::array()}, {"failures", Json::array()}}};
  for (const Answer& answer : answers) {
    if (answer.failure) {
      outcome.document["failures"].push_back(ToJson(*answer.failure));
    } else {
      outcome.document["receivers"].push_back(answer.receiver);
      outcome.exit = ExitCode::kDone;
    }
  }
  if (cancelled) outcome.exit = ExitCode::kCancelled;
  return outcome;
}

class Find : public Command {
 public:
  using Command::Command;

  void AddOptions(CLI::App& app, Arguments& arguments) override {
    read_ = &arguments;
    AddPort(app, arguments, Need::kOptional);
    port_ = app.get_option("PORT");
    AddNames(app, "MORE", "More ports, searched at the same time", more_, 0, kMostNames);
    AddFlag(app, "--all", "Search every COM port and USB device", all_);
  }

  void Check() const override {
    // The port of RCVLINK_PORT was not named on the command line.
    const bool is_named = port_->count() != 0;
    if (all_ ? is_named : read_->port.empty()) {
      throw UsageError("find needs either port names or --all");
    }
  }

  Outcome Run(Context& context) override {
    const Arguments& arguments = context.arguments;
    if (all_ || !more_.empty()) return FindOnMany(context);
    Receiver receiver(context);
    const Identity identity = receiver.Identify();
    context.PrintResult(InWords(arguments.port, receiver, identity));
    return {.document = ToJson(arguments.port, receiver, identity)};
  }

 private:
  Outcome FindOnMany(Context& context) const {
    const std::vector<SearchPlace> places = all_ ? AllPlaces() : NamedPlaces(context.arguments);
    if (places.empty()) {
      throw Failure{
          .exit = ExitCode::kNoReceiver,
          .tried = "find a receiver",
          .code = ResultOfWin32(ERROR_FILE_NOT_FOUND),
          .meaning = "this computer has no COM port and no USB device with the USBIO driver"};
    }
    const std::vector<Answer> answers = AskAll(context, places);
    const Outcome outcome = OutcomeOf(answers, context.interrupt.requested());
    if (outcome.exit == ExitCode::kNoReceiver) context.PrintStatus("No receiver was found.\n");
    return outcome;
  }

  static std::vector<SearchPlace> AllPlaces() {
    std::vector<SearchPlace> places;
    for (const Port& port : ListPorts()) places.push_back({port.name, port.link});
    return places;
  }

  // A COM port is serial whatever --link says, so that ports of both links can be named together.
  std::vector<SearchPlace> NamedPlaces(const Arguments& arguments) const {
    std::vector<std::wstring> names = {arguments.port};
    std::transform(more_.begin(), more_.end(), std::back_inserter(names), PlainPortName);
    std::vector<SearchPlace> places;
    for (const std::wstring& name : names) {
      const bool twice = std::any_of(places.begin(), places.end(), [&](const SearchPlace& place) {
        return SameLocalName(place.port, name);
      });
      if (!twice) places.push_back({name, IsComPort(name) ? eInstanceSerial : arguments.link});
    }
    return places;
  }

  const Arguments* read_ = nullptr;  // both while the command line is read
  const CLI::Option* port_ = nullptr;
  std::vector<std::wstring> more_;
  bool all_ = false;
};

}  // namespace

std::unique_ptr<Command> MakeFind() {
  return std::make_unique<Find>(Command::Text{
      "find",
      "Find the receiver on one port or on all ports",
      "Without --speed or --rts all settings are tried, the usual ones first. On a silent\n"
      "port this takes minutes. The setting found is saved and tried first the next time.\n"
      "A search writes to the device that is connected; --all writes to every port.\n"
      "Examples:\n"
      "  rcvlink-cli find COM7\n"
      "  rcvlink-cli find COM7 --protocol quorin --speed 115200\n"
      "  rcvlink-cli find --all --speed 9600"});
}

}  // namespace cli
