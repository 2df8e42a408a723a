#include "command.h"
#include "options.h"
#include "receiver.h"
#include "text.h"

namespace cli {
namespace {

void Rename(Receiver& receiver,
            const std::wstring& old_name,
            const std::wstring& new_name,
            const std::string& tried) {
  std::wstring from = old_name;
  std::wstring to = new_name;
  receiver.ThrowIfCancelled(tried);
  const long code = devapi::RenameFile(receiver.handle(), from.data(), to.data());
  if (code != S_OK) throw receiver.FailureOf(tried, code);
  // The library may not notice a refusal, so the directory is read again.
  const std::vector<RemoteFile> files = receiver.ListFiles().files;
  if (!HasFile(files, new_name) || HasFile(files, old_name)) {
    throw receiver.FailureOf(
        tried, code, "the command was sent, but the receiver's file list does not show the change");
  }
}

class Move : public Command {
 public:
  using Command::Command;

  void AddOptions(CLI::App& app, Arguments& arguments) override {
    AddPort(app, arguments);
    AddNames(app, "OLD", "Current name of the file", old_names_, 1, 1);
    AddNames(app, "NEW", "New name of the file", new_names_, 1, 1);
  }

  void Check() const override {
    CheckNames(old_names_);
    CheckNames(new_names_);
    if (old_names_ == new_names_) throw UsageError("the old and the new name are the same");
  }

  Outcome Run(Context& context) override {
    const Arguments& arguments = context.arguments;
    const std::wstring& old_name = old_names_.front();
    const std::wstring& new_name = new_names_.front();
    const std::string tried = "rename " + Printable(old_name) + " to " + Printable(new_name);
    Receiver receiver(context);
    const Identity identity = receiver.Identify();
    if (!identity.offers_renaming()) {
      throw Failure{
          .tried = tried,
          .code = E_NOTIMPL,
          .meaning = "a " + FamilyName(identity.family) + " receiver cannot rename files"};
    }
    const std::vector<RemoteFile> files = receiver.ListFiles().files;
    FindFile(files, old_name, tried);
    if (HasFile(files, new_name)) {
      throw Failure{.tried = tried,
                    .code = ResultOfWin32(ERROR_FILE_EXISTS),
                    .meaning = "the receiver already has a file of that name"};
    }
    Rename(receiver, old_name, new_name, tried);
    context.PrintDone(Printable(old_name) + " is now " + Printable(new_name) + "\n");
    return {.document = {{"port", ToUtf8(arguments.port)},
                         {"old", ToUtf8(old_name)},
                         {"new", ToUtf8(new_name)}}};
  }

 private:
  std::vector<std::wstring> old_names_;
  std::vector<std::wstring> new_names_;
};

}  // namespace

std::unique_ptr<Command> MakeMove() {
  return std::make_unique<Move>(
      Command::Text{"mv",
                    "Rename a file (Velmar receivers only)",
                    "Example: rcvlink-cli mv COM7 LOG0001.DAT MONDAY.DAT"});
}

}  // namespace cli
