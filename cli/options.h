// Helpers with which commands declare their options.
#ifndef RCVLINK_CLI_OPTIONS_H_
#define RCVLINK_CLI_OPTIONS_H_

#include <functional>
#include <map>
#include <string>
#include <vector>

#include "arguments.h"
#include "results.h"

namespace CLI {
class App;
}

namespace cli {

// The failure for an invalid command line.
Failure UsageError(const std::string& meaning);

// Prepares words for the parser: in reverse order, as it takes them, and with a mark before those
// that it would change.
std::vector<std::string> Hidden(const std::vector<std::string>& words);

// Removes the mark: the word as it was typed.
std::string Unmarked(const std::string& word);

enum class Need { kRequired, kOptional };

// PORT, the port of the receiver.
void AddPort(CLI::App& app, Arguments& arguments, Need need = Need::kRequired);

// Names of files, `least` to `most` of them.
void AddNames(CLI::App& app,
              const std::string& name,
              const std::string& description,
              std::vector<std::wstring>& names,
              int least,
              int most);

inline constexpr int kMostNames = 100'000;

// Text that is taken as it was typed, such as a path.
// `placeholder`: what the help shows in place of the text; may be empty.
void AddText(CLI::App& app,
             const std::string& name,
             const std::string& description,
             const std::string& placeholder,
             std::wstring& text,
             Need need = Need::kOptional);

void AddFlag(CLI::App& app, const std::string& name, const std::string& description, bool& flag);

// An option whose value is one of some words, in any letter case.
// `words`: each with what it does.
void AddWords(CLI::App& app,
              const std::string& name,
              const std::string& description,
              const std::string& placeholder,
              const std::map<std::string, std::function<void()>>& words);

// The same for words that stand for values.
template <typename T, typename Target>
void AddWord(CLI::App& app,
             const std::string& name,
             const std::string& description,
             const std::string& placeholder,
             const std::map<std::string, T>& words,
             Target& target) {
  std::map<std::string, std::function<void()>> takes;
  for (const auto& [word, value] : words) {
    takes.emplace(word, [&target, value = value] { target = value; });
  }
  AddWords(app, name, description, placeholder, takes);
}

// Refuses names that must not reach a receiver.
// Throws Failure.
void CheckNames(const std::vector<std::wstring>& names);

}  // namespace cli

#endif  // RCVLINK_CLI_OPTIONS_H_
