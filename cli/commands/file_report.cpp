#include "file_report.h"

#include <utility>

#include "text.h"

namespace cli {

FileReport::FileReport(Context& context)
    : context_(context),
      document_({{"port", ToUtf8(context.arguments.port)}, {"files", Json::array()}}) {}

void FileReport::AddDone(const std::wstring& name, const Json& details) {
  Json entry = {{"name", ToUtf8(name)}};
  entry.update(details);
  document_["files"].push_back(entry);
}

void FileReport::AddFailed(const std::wstring& name, Failure failure) {
  failure.port = Printable(context_.arguments.port);
  context_.PrintFailure(failure);
  document_["files"].push_back({{"name", ToUtf8(name)}, {"error", ToJson(failure)}});
  if (!failure_ || failure.exit == ExitCode::kCancelled) failure_ = std::move(failure);
}

void FileReport::AddUntried(size_t count) {
  if (count == 0) return;
  const std::string files = count == 1 ? " more file was" : " more files were";
  context_.PrintStatus("  " + std::to_string(count) + files + " not tried.\n");
  document_["untried"] = count;
}

void FileReport::SetComplete(const std::string& doubt) {
  document_["complete"] = doubt.empty();
  if (doubt.empty()) return;
  document_["warning"] = doubt;
  if (failure_) return;
  failure_ = Failure{.tried = "download all files",
                     .port = Printable(context_.arguments.port),
                     .code = ResultOfWin32(ERROR_MORE_DATA),
                     .meaning = "files may be missing. " + doubt};
}

Outcome FileReport::Finish() && {
  if (failure_) document_["error"] = ToJson(*failure_);
  return {.exit = failure_ ? failure_->exit : ExitCode::kDone, .document = std::move(document_)};
}

}  // namespace cli
