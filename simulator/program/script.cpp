#include "simulator/program/script.h"

#include <algorithm>
#include <fstream>
#include <iterator>
#include <nlohmann/json.hpp>
#include <optional>
#include <stdexcept>
#include <utility>

#include "simulator/program/port_options.h"

namespace sim {
namespace {

using nlohmann::ordered_json;

constexpr const char* kScriptSwitch = "--script";

const CLI::Option* SwitchOf(const std::string& key, const CLI::App& command) {
  const CLI::Option* const option = command.get_option_no_throw("--" + key);
  const bool unfit = option == command.get_help_ptr() || key == kScriptSwitch + 2;
  return unfit || key.empty() ? nullptr : option;
}

std::string TextOf(const ordered_json& value) {
  return value.is_string() ? value.get<std::string>() : value.dump();
}

void AppendWord(const std::string& key,
                const ordered_json& value,
                bool is_flag,
                std::vector<std::string>& words) {
  const bool fits = is_flag ? value.is_boolean() : value.is_string() || value.is_number();
  if (!fits) {
    throw std::invalid_argument(key + ": " + value.dump() +
                                (is_flag ? " is not true or false" : " is no text and no number"));
  }
  if (!is_flag) {
    words.push_back("--" + key + "=" + TextOf(value));
  } else if (value.get<bool>()) {
    words.push_back("--" + key);
  }
}

std::string ReadScript(const std::string& path) {
  std::ifstream file(ToPath(path), std::ios::binary);
  std::string text(std::istreambuf_iterator<char>(file), {});
  if (!file) {
    throw std::invalid_argument("cannot be read");
  }
  return text;
}

// The value of a switch in the words; nothing when it is not there.
std::optional<std::string> ValueOf(const std::string& name, const std::vector<std::string>& words) {
  for (size_t i = 0; i < words.size(); ++i) {
    if (words[i].starts_with(name + "=")) {
      return words[i].substr(name.size() + 1);
    }
    if (words[i] == name && i + 1 < words.size()) {
      return words[i + 1];
    }
  }
  return std::nullopt;
}

// "--speed" of "--speed=9600".
std::string NameOf(const std::string& word) { return word.substr(0, word.find('=')); }

}  // namespace

void AddScriptOption(CLI::App& command) {
  command.add_option(kScriptSwitch, "switches from a file, as JSON")->type_name("FILE");
}

std::vector<std::string> ScriptWords(std::string_view json, const CLI::App& command) {
  ordered_json script;
  try {
    script = ordered_json::parse(json);
  } catch (const ordered_json::exception& error) {  // a number that is too large is no parse_error
    throw std::invalid_argument(error.what());
  }
  if (!script.is_object()) {
    throw std::invalid_argument("it is no JSON object");
  }
  std::vector<std::string> words;
  for (const auto& [key, value] : script.items()) {
    const CLI::Option* const option = SwitchOf(key, command);
    if (option == nullptr) {
      throw std::invalid_argument(key + ": there is no such switch for a script");
    }
    const bool is_flag = option->get_items_expected_max() == 0;
    if (!value.is_array()) {
      AppendWord(key, value, is_flag, words);
      continue;
    }
    for (const ordered_json& one : value) {
      AppendWord(key, one, is_flag, words);
    }
  }
  return words;
}

std::vector<std::string> WithScript(std::vector<std::string> words, const CLI::App& app) {
  const std::optional<std::string> path = ValueOf(kScriptSwitch, words);
  const auto is_named = [&words](const CLI::App* command) {
    return !words.empty() && command->get_name() == words.front();
  };
  const std::vector<const CLI::App*> commands = app.get_subcommands(is_named);
  if (!path || commands.empty()) {
    return words;
  }
  std::vector<std::string> of_script;
  try {
    of_script = ScriptWords(ReadScript(*path), *commands.front());
  } catch (const std::invalid_argument& error) {
    throw std::invalid_argument("script " + *path + ": " + error.what());
  }
  const auto is_replaced = [&words](const std::string& of_file) {
    return std::ranges::any_of(
        words, [&](const std::string& word) { return NameOf(word) == NameOf(of_file); });
  };
  std::erase_if(of_script, is_replaced);
  words.insert(words.end(), of_script.begin(), of_script.end());
  return words;
}

}  // namespace sim
