#include "simulator/program/damage_options.h"

#include <string>

#include "simulator/damage_text.h"
#include "simulator/program/text_option.h"

namespace sim {
namespace {

constexpr const char* kNoiseGroup = "Noise (the same for the same seed)";
constexpr const char* kEventGroup =
    "Events of the line, each once (WHEN is time=SECONDS after the host's first byte, byte=NUMBER "
    "of those sent, or block=NUMBER of a file)";

void AddNoiseOptions(CLI::App& command, DamageOptions& damage) {
  AddTextOption(command,
                "--noise",
                "RATE",
                "the chance of a byte to be damaged on its way to the host, 0 to 1",
                [&damage](const std::string& text) { damage.rate = ParseRate(text); })
      ->group(kNoiseGroup);
  AddTextOption(command,
                "--command-noise",
                "RATE",
                "the same on its way to the receiver",
                [&damage](const std::string& text) { damage.command_rate = ParseRate(text); })
      ->group(kNoiseGroup);
  AddTextOption(command,
                "--noise-kinds",
                "KIND,...",
                "only these of flip, drop, insert, double, burst, stall and unplug",
                [&damage](const std::string& text) { damage.kinds = ParseNoiseKinds(text); })
      ->group(kNoiseGroup);
  command.add_option("--seed", damage.seed, "another seed gives other damage")
      ->capture_default_str()
      ->type_name("NUMBER")
      ->group(kNoiseGroup);
}

void AddEvent(CLI::App& command,
              const char* name,
              const char* form,
              const char* help,
              LineEventKind kind,
              DamageOptions& damage) {
  AddTextOption(command, name, form, help, [&damage, kind](const std::string& text) {
    damage.events.push_back(ParseLineEvent(kind, text));
  })->group(kEventGroup);
}

}  // namespace

void AddDamageOptions(CLI::App& command, DamageOptions& damage) {
  AddNoiseOptions(command, damage);
  AddEvent(command,
           "--unplug",
           "WHEN[:SECONDS]",
           "the line is dead so long; for ever by default",
           LineEventKind::kUnplug,
           damage);
  AddEvent(command,
           "--silence",
           "WHEN:SECONDS",
           "what the receiver sends comes so late",
           LineEventKind::kSilence,
           damage);
}

}  // namespace sim
