#include "tests/host/support/program.h"

namespace bed {
namespace {

const char* NameOf(Output output) {
  switch (output) {
    case Output::kClosed:
      return "closed";
    case Output::kTerminal:
      return "terminal";
    case Output::kPipe:
      break;
  }
  return "pipe";
}

nlohmann::json RunRequest(const std::string& file_name,
                          const std::vector<std::string>& arguments,
                          Output output,
                          const std::string& unix_folder) {
  nlohmann::json request = {{"do", "run"}, {"program", file_name}, {"arguments", arguments}};
  request["output"] = NameOf(output);
  if (!unix_folder.empty()) request["folder"] = unix_folder;
  return request;
}

}  // namespace

Program::Program(const std::string& file_name,
                 const std::vector<std::string>& arguments,
                 Output output,
                 const std::string& unix_folder)
    : job_(connection_.Request(RunRequest(file_name, arguments, output, unix_folder))
               .at("job")
               .get<int>()) {}

void Program::Expect(std::string_view text, std::chrono::seconds timeout) {
  connection_.Request(
      {{"do", "expect"}, {"job", job_}, {"text", text}, {"seconds", timeout.count()}});
}

void Program::Interrupt() { connection_.Request({{"do", "interrupt"}, {"job", job_}}); }

ProgramResult Program::Finish(std::chrono::seconds timeout) {
  const nlohmann::json answer =
      connection_.Request({{"do", "finish"}, {"job", job_}, {"seconds", timeout.count()}});
  return {answer.at("status").get<int>(),
          answer.at("output").get<std::string>(),
          answer.at("errors").get<std::string>(),
          answer.at("history").get<std::vector<std::string>>()};
}

}  // namespace bed
