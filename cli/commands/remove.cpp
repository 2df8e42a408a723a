#include <algorithm>
#include <map>
#include <optional>

#include "command.h"
#include "file_report.h"
#include "options.h"
#include "receiver.h"
#include "text.h"

namespace cli {
namespace {

std::string Tried(const std::wstring& name) { return "delete " + Printable(name); }

std::optional<Failure> WhyStillThere(const std::vector<RemoteFile>& files,
                                     const std::wstring& name) {
  if (!HasFile(files, name)) return std::nullopt;
  return Failure{.tried = Tried(name),
                 .code = S_OK,
                 .meaning = "the command was sent, but the receiver still has the file"};
}

// Deletes each file; stops when cancelled.
// Returns the names for which the library reported no failure.
std::vector<std::wstring> RemoveAll(Context& context,
                                    Receiver& receiver,
                                    const std::vector<std::wstring>& names,
                                    FileReport& report) {
  std::vector<std::wstring> removed;
  for (size_t i = 0; i < names.size(); ++i) {
    std::wstring name = names[i];
    const bool cancelled = context.interrupt.requested();
    const long code = cancelled ? ResultOfWin32(ERROR_CANCELLED)
                                : devapi::DeleteFileW(receiver.handle(), name.data());
    if (code == S_OK) {
      removed.push_back(name);
      continue;
    }
    const Failure failure = receiver.FailureOf(Tried(name), code);
    report.AddFailed(name, failure);
    if (failure.exit != ExitCode::kCancelled) continue;
    report.AddUntried(names.size() - i - 1);
    break;
  }
  return removed;
}

// The library may not notice a refusal, so the directory is read again.
void Verify(Context& context,
            Receiver& receiver,
            size_t listed_before,
            const std::vector<std::wstring>& removed,
            FileReport& report) {
  if (removed.empty()) return;
  std::vector<RemoteFile> files;
  std::optional<Failure> unread;
  try {
    files = receiver.ListFiles().files;
    if (files.empty() && listed_before > removed.size()) {
      // An empty list is no answer: the files that were not deleted are missing too.
      unread = Failure{.code = ResultOfWin32(ERROR_TIMEOUT),
                       .meaning = "the receiver did not list its files again"};
    }
  } catch (const Failure& failure) {
    unread = failure;
  }
  for (const std::wstring& name : removed) {
    if (unread) unread->tried = "verify that " + Printable(name) + " is deleted";
    if (const auto failure = unread ? unread : WhyStillThere(files, name)) {
      report.AddFailed(name, *failure);
    } else {
      context.PrintDone(Printable(name) + ": deleted\n");
      report.AddDone(name, {{"deleted", true}});
    }
  }
}

class Remove : public Command {
 public:
  using Command::Command;

  void AddOptions(CLI::App& app, Arguments& arguments) override {
    AddPort(app, arguments);
    AddNames(app, "NAME", "File names as listed by `ls`", names_, 1, kMostNames);
  }

  void Check() const override { CheckNames(names_); }

  Outcome Run(Context& context) override {
    Receiver receiver(context);
    const std::vector<RemoteFile> files = receiver.ListFiles().files;
    std::vector<std::wstring> names;
    for (const std::wstring& name : names_) {
      FindFile(files, name, Tried(name));
      if (std::find(names.begin(), names.end(), name) == names.end()) names.push_back(name);
    }
    FileReport report(context);
    const std::vector<std::wstring> removed = RemoveAll(context, receiver, names, report);
    Verify(context, receiver, files.size(), removed, report);
    return std::move(report).Finish();
  }

 private:
  std::vector<std::wstring> names_;
};

}  // namespace

std::unique_ptr<Command> MakeRemove() {
  return std::make_unique<Remove>(
      Command::Text{"rm",
                    "Delete files on the receiver",
                    "Example: rcvlink-cli rm COM7 LOG0001.DAT LOG0002.DAT"});
}

}  // namespace cli
