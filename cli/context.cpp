#include "context.h"

#include "text.h"

namespace cli {

ProgressMode ProgressModeOf(const Context& context) {
  const Arguments& arguments = context.arguments;
  if (arguments.progress != ProgressMode::kAuto) return arguments.progress;
  if (arguments.quiet || arguments.json) return ProgressMode::kNone;
  return context.err.is_terminal() ? ProgressMode::kBar : ProgressMode::kLines;
}

Json ToJson(const Failure& failure) {
  Json json = {{"tried", failure.tried},
               {"port", failure.port.empty() ? Json(nullptr) : Json(failure.port)},
               {"code", HexCode(failure.code)},
               {"meaning", MeaningOf(failure)}};
  if (const std::string hint = HintOf(failure); !hint.empty()) json["hint"] = hint;
  if (!failure.kept.empty()) json["kept"] = failure.kept;
  json["exit"] = static_cast<int>(failure.exit);
  return json;
}

}  // namespace cli
