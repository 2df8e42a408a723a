#include "context.h"

#include "text.h"

namespace cli {

Json ToJson(const Failure& failure) {
  Json json = {{"tried", failure.tried},
               {"port", failure.port.empty() ? Json(nullptr) : Json(failure.port)},
               {"code", HexCode(failure.code)},
               {"meaning", MeaningOf(failure)}};
  if (!failure.hint.empty()) json["hint"] = failure.hint;
  json["exit"] = static_cast<int>(failure.exit);
  return json;
}

}  // namespace cli
