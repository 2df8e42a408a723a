// find, info and check: is there a receiver, and which?
#include <windows.h>

#include <wtypes.h>

#include "commands.h"
#include "receiver.h"
#include "text.h"

namespace cli {
namespace {

std::string LinkWord(const Receiver& receiver) {
  return receiver.link() == eInstanceUSB ? "usb" : "serial";
}

std::string Row(const std::string& label, const std::string& value) {
  constexpr std::size_t kLabelWidth = 10;
  return PadRight(label, kLabelWidth) + value + "\n";
}

Json ToJson(const Arguments& arguments, const Receiver& receiver, const Identity& identity) {
  return {{"port", ToUtf8(arguments.port)},
          {"link", LinkWord(receiver)},
          {"protocol", FamilyWord(identity.family)},
          {"id", ToUtf8(identity.id)},
          {"model", ToUtf8(identity.model)}};
}

}  // namespace

Outcome RunFind(Context& context) {
  const Arguments& arguments = context.arguments;
  Receiver receiver(context);
  const Identity identity = receiver.Identify();
  context.Say(Printable(arguments.port) + " (" + LinkWord(receiver) +
              "): " + FamilyName(identity.family) + " receiver, model " +
              Printable(identity.model) + ", id " + Printable(identity.id) + "\n");
  return {.document = ToJson(arguments, receiver, identity)};
}

Outcome RunInfo(Context& context) {
  const Arguments& arguments = context.arguments;
  Receiver receiver(context);
  const Identity identity = receiver.Identify();
  const bool renaming = identity.offers_renaming();
  context.Say(Row("Port", Printable(arguments.port) + " (" + LinkWord(receiver) + ")") +
              Row("Id", Printable(identity.id)) + Row("Model", Printable(identity.model)) +
              Row("Family", FamilyName(identity.family)) +
              Row("Variant", std::to_string(identity.variant)) +
              Row("Renaming", renaming ? "offered" : "not offered") +
              Row("Features", std::to_string(identity.features)));
  Json document = ToJson(arguments, receiver, identity);
  document["variant"] = identity.variant;
  document["features"] = identity.features;
  document["renaming"] = renaming;
  return {.document = document};
}

Outcome RunCheck(Context& context) {
  const Arguments& arguments = context.arguments;
  const std::string tried = "check the connection";
  Receiver receiver(context);
  receiver.ThrowIfCancelled(tried);
  short answer = VARIANT_FALSE;
  const long code = devapi::CheckConnection(receiver.handle(), context.interrupt.event(), &answer);
  if (code != S_OK || answer == VARIANT_FALSE) {
    Failure failure = receiver.FailureOf(tried, code, "the receiver does not answer");
    if (failure.exit != ExitCode::kCancelled) failure.exit = ExitCode::kNoReceiver;
    throw failure;
  }
  context.Say(Printable(arguments.port) + ": the receiver answers\n");
  return {.document = {{"port", ToUtf8(arguments.port)}, {"answers", true}}};
}

}  // namespace cli
