#include <algorithm>
#include <optional>

#include "command.h"
#include "download.h"
#include "file_report.h"
#include "formats.h"
#include "names.h"
#include "options.h"
#include "paths.h"
#include "receiver.h"
#include "targets.h"
#include "text.h"

namespace cli {
namespace {

struct Job {
  RemoteFile file;
  std::filesystem::path target;
};

/// Whether a failed download leaves hope for the next file.
bool MayGoOn(const Failure& failure) {
  const bool refused = failure.code == S_OK || failure.code == E_FAIL ||
                       failure.code == ResultOfWin32(ERROR_DEVICE_NOT_CONNECTED);
  return failure.exit == ExitCode::kFailed && refused;
}

/// The files named by the user, checked before anything is transferred.
std::vector<Job> NamedJobs(const std::vector<std::wstring>& names,
                           const std::vector<std::filesystem::path>& targets,
                           const std::vector<RemoteFile>& files) {
  std::vector<Job> jobs;
  for (std::size_t i = 0; i < targets.size(); ++i) {
    const std::wstring& name = names[i];
    jobs.push_back({FindFile(files, name, "download " + Printable(name)), targets[i]});
  }
  return jobs;
}

/// All files of the receiver; what cannot be kept is left out and reported.
std::vector<Job> AllJobs(Targets& targets,
                         const std::vector<RemoteFile>& files,
                         FileReport& report) {
  std::vector<Job> jobs;
  for (const RemoteFile& file : files) {
    try {
      if (const auto reason = WhyNotSendable(file.name)) {
        throw Failure{
            .tried = "download " + Printable(file.name), .code = E_INVALIDARG, .meaning = *reason};
      }
      jobs.push_back({file, targets.Choose(file.name)});
    } catch (const Failure& failure) {
      report.AddFailed(file.name, failure);
    }
  }
  return jobs;
}

class Get : public Command {
 public:
  using Command::Command;

  void AddOptions(CLI::App& app, Arguments& arguments) override {
    AddPort(app, arguments);
    AddNames(app, "NAME", "Files as `ls` shows them", names_, 0, kMostNames);
    AddText(app, "-o", "The folder, or the name for a single file", "PATH", output_);
    AddFlag(app, "--all", "Every file of the receiver", all_);
    AddFlag(app, "--force", "Overwrite files that exist already", force_);
  }

  void Check() const override {
    CheckNames(names_);
    if (all_ == !names_.empty()) throw UsageError("get needs either the names of files or --all");
  }

  Outcome Run(Context& context) override {
    Targets targets({.output = output_, .many = all_ || names_.size() > 1, .force = force_});
    std::vector<std::filesystem::path> named;
    // What is wrong with the names is told before a search that may take minutes.
    for (const std::wstring& name : names_) named.push_back(targets.Choose(name));
    Receiver receiver(context);
    const std::vector<RemoteFile> files = receiver.ListFiles();
    FileReport report(context);
    const std::vector<Job> jobs =
        all_ ? AllJobs(targets, files, report) : NamedJobs(names_, named, files);
    if (!jobs.empty()) MakeFolder(targets.folder());
    DownloadAll(context, receiver, jobs, report);
    if (all_ && files.empty()) context.PrintDone("The receiver has no files.\n");
    return std::move(report).Finish();
  }

 private:
  void DownloadAll(Context& context,
                   Receiver& receiver,
                   const std::vector<Job>& jobs,
                   FileReport& report) const {
    for (std::size_t i = 0; i < jobs.size(); ++i) {
      const Job& job = jobs[i];
      try {
        const std::uint64_t milliseconds =
            Download(context, receiver, job.file, job.target, force_);
        PrintDownload(context, job, milliseconds);
        report.AddDone(job.file.name,
                       {{"path", ToUtf8(job.target.native())},
                        {"bytes", job.file.size},
                        {"milliseconds", milliseconds}});
      } catch (const Failure& failure) {
        report.AddFailed(job.file.name, failure);
        if (MayGoOn(failure)) continue;
        report.AddUntried(jobs.size() - i - 1);
        return;
      }
    }
  }

  void PrintDownload(Context& context, const Job& job, std::uint64_t milliseconds) const {
    constexpr std::uint64_t kMsPerSecond = 1000;
    const std::wstring local = job.target.filename().native();
    context.PrintDone(Printable(job.file.name) + ": " + std::to_string(job.file.size) +
                      " bytes in " + FormatDuration(milliseconds / kMsPerSecond) + " -> " +
                      Printable(job.target.native()) + "\n");
    if (output_.empty() && local != job.file.name) {
      context.PrintStatus("  Windows cannot have the receiver's name, so it is kept as " +
                          Printable(local) + "\n");
    }
  }

  std::vector<std::wstring> names_;
  std::wstring output_;
  bool all_ = false;
  bool force_ = false;
};

}  // namespace

std::unique_ptr<Command> MakeGet() {
  return std::make_unique<Get>(
      Command::Text{"get",
                    "Download files, or all of them",
                    "Each file grows as NAME.part and gets its name when it is complete.\n"
                    "Examples:\n"
                    "  rcvlink-cli get COM7 LOG0001.DAT\n"
                    "  rcvlink-cli get COM7 LOG0001.DAT -o monday.dat --force\n"
                    "  rcvlink-cli get COM7 --all -o D:\\survey\\"});
}

}  // namespace cli
