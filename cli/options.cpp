#include "options.h"

#include <winerror.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdlib>
#include <string_view>

#include "names.h"
#include "text.h"

namespace cli {
namespace {

// The parser would split a word like [a,b] into a list, take {} for an empty one, and would not
// take "--" before the last names. A mark before such words hides them from it.
constexpr char kLiteralMark = '\x01';
constexpr std::string_view kMarked = "[{%\x01";

// The parser puts its own words where an option's placeholder is empty.
const std::string kNoPlaceholder = " ";

std::wstring AsTyped(const std::string& word) { return ToUtf16(Unmarked(word)); }

}  // namespace

Failure UsageError(const std::string& meaning) {
  return {.exit = ExitCode::kUsage,
          .tried = "understand the command line",
          .code = E_INVALIDARG,
          .meaning = meaning,
          .hint =
              "`rcvlink-cli --help` lists the commands, `rcvlink-cli get --help` shows the help of "
              "one command."};
}

std::vector<std::string> Hidden(const std::vector<std::string>& words) {
  const auto separator = std::find(words.begin(), words.end(), "--");
  std::vector<std::string> hidden;
  for (auto word = words.begin(); word != words.end(); ++word) {
    if (word == separator) continue;
    const bool literal = word > separator ||
                         (!word->empty() && kMarked.find(word->front()) != std::string_view::npos);
    hidden.push_back(literal ? kLiteralMark + *word : *word);
  }
  std::reverse(hidden.begin(), hidden.end());
  return hidden;
}

std::string Unmarked(const std::string& word) {
  return word.starts_with(kLiteralMark) ? word.substr(1) : word;
}

void AddPort(CLI::App& app, Arguments& arguments, Need need) {
  // The parser's own `envname` would let the environment override a positional argument.
  const char* const usual = std::getenv("RCVLINK_PORT");
  if (usual != nullptr) {
    arguments.port = ToUtf16(usual);
    need = Need::kOptional;
  }
  AddText(app,
          "PORT",
          "COM port, such as COM7; with --link usb the path of the device",
          "",
          arguments.port,
          need);
  if (usual == nullptr) return;
  // In `get LOG1.DAT` the first word is then no port: the parser takes it for the next argument.
  app.validate_positionals();
  app.get_option("PORT")->check(
      [](const std::string& word) {
        return LooksLikePort(AsTyped(word)) ? "" : Printable(AsTyped(word)) + " is not a port";
      },
      "");
}

void AddNames(CLI::App& app,
              const std::string& name,
              const std::string& description,
              std::vector<std::wstring>& names,
              int least,
              int most) {
  const auto take = [&names](const std::vector<std::string>& words) {
    std::transform(words.begin(), words.end(), std::back_inserter(names), AsTyped);
  };
  app.add_option_function<std::vector<std::string>>(name, take, description)
      ->type_size(1)
      ->expected(least, most)
      ->allow_extra_args(most > 1)
      ->required(least > 0)
      ->option_text(kNoPlaceholder);
}

void AddText(CLI::App& app,
             const std::string& name,
             const std::string& description,
             const std::string& placeholder,
             std::wstring& text,
             Need need) {
  const auto take = [&text](const std::string& word) { text = AsTyped(word); };
  app.add_option_function<std::string>(name, take, description)
      ->required(need == Need::kRequired)
      ->option_text(placeholder.empty() ? kNoPlaceholder : placeholder);
}

void AddFlag(CLI::App& app, const std::string& name, const std::string& description, bool& flag) {
  app.add_flag(name, flag, description);
}

void AddWords(CLI::App& app,
              const std::string& name,
              const std::string& description,
              const std::string& placeholder,
              const std::map<std::string, std::function<void()>>& words) {
  const auto take = [words](const std::string& word) { words.at(Lowered(word))(); };
  app.add_option_function<std::string>(name, take, description)
      ->check(CLI::IsMember(words, CLI::ignore_case).description(""))
      ->option_text(placeholder);
}

void CheckNames(const std::vector<std::wstring>& names) {
  for (const std::wstring& name : names) {
    if (const auto reason = WhyNotSendable(name)) throw UsageError(*reason);
  }
}

}  // namespace cli
