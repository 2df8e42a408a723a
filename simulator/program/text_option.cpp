#include "simulator/program/text_option.h"

#include <stdexcept>
#include <vector>

namespace sim {

CLI::Option* AddTextOption(CLI::App& command,
                           const std::string& name,
                           const std::string& form,
                           const std::string& help,
                           std::function<void(const std::string&)> take) {
  const auto take_all = [name, take](const std::vector<std::string>& texts) {
    for (const std::string& text : texts) {
      try {
        take(text);
      } catch (const std::invalid_argument& error) {
        throw CLI::ValidationError(name, error.what());
      }
    }
  };
  return command.add_option_function<std::vector<std::string>>(name, take_all, help)
      ->allow_extra_args(false)
      ->type_name(form);
}

}  // namespace sim
